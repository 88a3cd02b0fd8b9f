/* posix_spawn of a missing program succeeds: the emulator's vfork is a fork, so the child cannot
 * report the error. 0 where it can. */
#include <spawn.h>

int main(void) {
  char *const none[] = {"none", 0};
  pid_t pid;
  return posix_spawn(&pid, "/nonexistent", 0, 0, none, none + 1) == 0;
}
