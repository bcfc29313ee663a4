# 64-bit RISC-V.
set(target riscv64)
set(triplet riscv64-linux-gnu)
set(multiarch riscv64-linux-gnu)
set(processor riscv64)
set(time32 OFF)
set(emulator qemu-riscv64)
# Debian 12's compiler brings a C library that is older than the one in the sysroot (Debian 13).
add_link_options(LINKER:--allow-shlib-undefined)
include(${CMAKE_CURRENT_LIST_DIR}/debian.cmake)
