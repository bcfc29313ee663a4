/* In place of winbind's client library: WINBIND=up answers and knows the user alice alone. */
#include <stdlib.h>
#include <string.h>

int wbcPing(void);
int wbcLookupName(const char* domain, const char* name, void* sid, int* type);

int wbcPing(void) {
  const char* state = getenv("WINBIND");
  return state != NULL && strcmp(state, "up") == 0 ? 0 : 1;
}

int wbcLookupName(const char* domain, const char* name, void* sid, int* type) {
  (void)sid;
  *type = 1;
  return strcmp(domain, "PLANT7") == 0 && strcmp(name, "alice") == 0 ? 0 : 1;
}
