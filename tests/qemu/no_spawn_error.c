/* The emulator starts what is not there: its vfork is a fork, so the child cannot tell. 0 where it
 * can. */
#include <spawn.h>

int main(void) {
  char *const none[] = {"none", 0};
  pid_t pid;
  return posix_spawn(&pid, "/nonexistent", 0, 0, none, none + 1) == 0;
}
