/* A libcurl of a host's own: every request ends at once, with a text that no other has. */
#include <stdarg.h>

int curl_global_init(long flags);
void curl_global_cleanup(void);
void* curl_easy_init(void);
void curl_easy_cleanup(void* handle);
int curl_easy_setopt(void* handle, int option, ...);
int curl_easy_perform(void* handle);
const char* curl_easy_strerror(int code);

static int handle_;

int curl_global_init(long flags) {
  return flags == 3 ? 0 : 1;
}
void curl_global_cleanup(void) {}
void* curl_easy_init(void) {
  return &handle_;
}
void curl_easy_cleanup(void* handle) {
  (void)handle;
}
int curl_easy_setopt(void* handle, int option, ...) {
  return handle != &handle_ || option == 0;
}
int curl_easy_perform(void* handle) {
  return handle == &handle_ ? 77 : 1;
}
#ifndef WITHOUT_TEXTS
const char* curl_easy_strerror(int code) {
  return code == 77 ? "the stub was asked" : "not mine";
}
#endif
