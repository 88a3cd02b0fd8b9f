/* What the emulated C library ignores in a command, 32 and 33, are other signals there. 0 where
 * they are not. */
#include <stdlib.h>

int main(void) {
  return system("grep -q '^SigIgn:.*180000000$' /proc/self/status") != 0;
}
