/* The emulator refuses to make a process the parent of its orphans. 0 where it can. */
#include <sys/prctl.h>

int main(void) {
  return prctl(PR_SET_CHILD_SUBREAPER, 1) != 0;
}
