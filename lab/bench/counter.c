/* A plugin for QEMU's user emulation: counts the instructions of an emulated program, and writes
 * the sum to a file when it ends. qemu-arm -plugin COUNTER,out=FILE PROGRAM ARGUMENT... Debian's
 * QEMU loads plugins, but comes without their header: what is needed of it is here (QEMU's
 * interface for plugins, version 1). */
#include <inttypes.h>
#include <stddef.h>
#include <stdint.h>
#include <stdio.h>
#include <string.h>

typedef uint64_t qemu_plugin_id_t;
struct qemu_plugin_tb;
enum qemu_plugin_op { QEMU_PLUGIN_INLINE_ADD_U64 };

void qemu_plugin_register_vcpu_tb_trans_cb(qemu_plugin_id_t id,
                                           void (*translated)(qemu_plugin_id_t id,
                                                              struct qemu_plugin_tb* block));
void qemu_plugin_register_vcpu_tb_exec_inline(struct qemu_plugin_tb* block, enum qemu_plugin_op op,
                                              void* counter, uint64_t value);
void qemu_plugin_register_atexit_cb(qemu_plugin_id_t id, void (*ended)(qemu_plugin_id_t, void*),
                                    void* data);
size_t qemu_plugin_tb_n_insns(const struct qemu_plugin_tb* block);

#define EXPORT __attribute__((visibility("default")))
EXPORT int qemu_plugin_version = 1;
EXPORT int qemu_plugin_install(qemu_plugin_id_t id, const void* info, int count, char** arguments);

static uint64_t instructions;
static char path[4096];

/* Each time the block runs, its instructions are added. */
static void translated(qemu_plugin_id_t id, struct qemu_plugin_tb* block) {
  (void)id;
  qemu_plugin_register_vcpu_tb_exec_inline(block, QEMU_PLUGIN_INLINE_ADD_U64, &instructions,
                                           qemu_plugin_tb_n_insns(block));
}

static void ended(qemu_plugin_id_t id, void* data) {
  FILE* const file = fopen(path, "w");
  (void)id;
  (void)data;
  if (file == NULL) return;
  fprintf(file, "%" PRIu64 "\n", instructions);
  fclose(file);
}

int qemu_plugin_install(qemu_plugin_id_t id, const void* info, int count, char** arguments) {
  (void)info;
  if (count != 1 || strncmp(arguments[0], "out=", 4) != 0) return -1;
  snprintf(path, sizeof path, "%s", arguments[0] + 4);
  qemu_plugin_register_vcpu_tb_trans_cb(id, translated);
  qemu_plugin_register_atexit_cb(id, ended, NULL);
  return 0;
}
