// A login program for the doctor's tests: what it does depends on the name it is started under.
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

static int is(const char* path, const char* name) {
  const char* const slash = strrchr(path, '/');
  return strcmp(slash != NULL ? slash + 1 : path, name) == 0;
}

int main(int argc, char** argv) {
  const char* const self = argc > 0 ? argv[0] : "";
  if (is(self, "hang.cgi")) pause();
  if (is(self, "crash.cgi")) raise(SIGSEGV);
  if (is(self, "mute.cgi")) return 3;
  if (is(self, "complain.cgi")) {
    fputs("cannot open the session store\n", stderr);
    return 4;
  }
  if (is(self, "text.cgi")) return puts("hello") < 0;
  if (is(self, "broken.cgi")) return puts("Status: 500 Internal Server Error\n") < 0;
  if (is(self, "launcher.cgi")) {
    return puts("Status: 302 Found\nLocation: /webman/ssoclient/relay.html#success=false\n") < 0;
  }
  if (is(self, "internal.cgi") || is(self, "reference.cgi")) {
    return printf(
               "Status: 302 Found\nLocation: "
               "/webman/ssoclient/relay.html#reason=%s.K7M2P9QA&success=false\n\n",
               is(self, "internal.cgi") ? "internal" : "bad-request") < 0;
  }
  const char* const method = getenv("REQUEST_METHOD");
  if (method == NULL || strcmp(method, "HEAD") != 0) return 5;
  return puts("Status: 400 Bad Request\nContent-Type: text/plain\n") < 0;
}
