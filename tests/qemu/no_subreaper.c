/* The emulator refuses PR_SET_CHILD_SUBREAPER. 0 where it does not. */
#include <sys/prctl.h>

int main(void) {
  return prctl(PR_SET_CHILD_SUBREAPER, 1) != 0;
}
