/* Preloaded into a program: its clock shows the time in CLOCK_AT, in seconds since the
 * epoch. */
#include <stdlib.h>
#include <time.h>

time_t time(time_t* into) {
  const char* at = getenv("CLOCK_AT");
  const time_t now = at != NULL ? (time_t)strtoll(at, NULL, 10) : 0;
  if (into != NULL) *into = now;
  return now;
}
