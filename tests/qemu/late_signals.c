/* Of two signals the emulator delivers only the second when that one is SIGKILL. 0 where the first
 * is delivered. */
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

int main(void) {
  int status = 0;
  const pid_t pid = fork();
  if (pid == 0) return pause();
  usleep(100000);
  kill(pid, SIGHUP);
  kill(pid, SIGKILL);
  waitpid(pid, &status, 0);
  return !(WIFSIGNALED(status) && WTERMSIG(status) == SIGHUP);
}
