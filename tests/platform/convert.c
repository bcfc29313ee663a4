/* Converts one name through the platform, for tests against a real directory.
 *   convert NAME [SIZE]      prints the result; exit status 1 for a negative one
 */
#include <stdio.h>
#include <stdlib.h>

#include "platform/platform.h"

int main(int argc, char** argv) {
  char result[1024] = {0};
  size_t size = sizeof result - 1;
  if (argc < 2 || argc > 3) return 2;
  if (argc == 3) size = strtoul(argv[2], NULL, 10);
  if (size >= sizeof result) return 2;
  if (QOVAWinsUserNameFqdn2Netbios(argv[1], result, size) < 0) return 1;
  puts(result);
  return 0;
}
