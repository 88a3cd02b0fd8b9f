/* To be preloaded into a program: it gets no other process. */
#include <errno.h>
#include <unistd.h>

pid_t fork(void) {
  errno = EAGAIN;
  return -1;
}
