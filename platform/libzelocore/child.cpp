#include "child.h"

#include <fcntl.h>
#include <sys/wait.h>

#include <cerrno>

namespace zelo {

ChildStatusGuard::ChildStatusGuard() noexcept {
  sigset_t child;
  sigemptyset(&child);
  sigaddset(&child, SIGCHLD);
  pthread_sigmask(SIG_BLOCK, &child, &mask_);

  sigaction(SIGCHLD, nullptr, &action_);
  replaced_ = action_.sa_handler == SIG_IGN || (action_.sa_flags & SA_NOCLDWAIT) != 0;
  if (replaced_) {
    struct sigaction standard {};
    standard.sa_handler = SIG_DFL;
    sigaction(SIGCHLD, &standard, nullptr);
  }
}

ChildStatusGuard::~ChildStatusGuard() {
  if (replaced_) {
    sigaction(SIGCHLD, &action_, nullptr);
  }
  pthread_sigmask(SIG_SETMASK, &mask_, nullptr);
}

Launch::Launch() noexcept {
  note(posix_spawnattr_init(&attributes_));
  note(posix_spawn_file_actions_init(&actions_));
  sigset_t signals;
  sigfillset(&signals);
  note(posix_spawnattr_setsigdefault(&attributes_, &signals));
  sigemptyset(&signals);
  note(posix_spawnattr_setsigmask(&attributes_, &signals));
}

Launch::~Launch() {
  posix_spawn_file_actions_destroy(&actions_);
  posix_spawnattr_destroy(&attributes_);
}

void Launch::inOwnGroup() noexcept {
  flags_ |= POSIX_SPAWN_SETPGROUP;
  note(posix_spawnattr_setpgroup(&attributes_, 0));
}

void Launch::open(int fd, const char *path, int flags) noexcept {
  note(posix_spawn_file_actions_addopen(&actions_, fd, path, flags, 0));
}

void Launch::closeFrom(int fd) noexcept {
  note(posix_spawn_file_actions_addclosefrom_np(&actions_, fd));
}

void Launch::changeDirectory(const char *path) noexcept {
  note(posix_spawn_file_actions_addchdir_np(&actions_, path));
}

pid_t Launch::start(const char *path, char *const *argv, char *const *envp) noexcept {
  note(posix_spawnattr_setflags(&attributes_, flags_));
  pid_t pid = -1;
  if (failed_ || posix_spawn(&pid, path, &actions_, &attributes_, argv, envp) != 0) {
    return -1;
  }
  return pid;
}

bool waitForChild(pid_t pid, int *status) noexcept {
  pid_t waited;
  do {
    waited = waitpid(pid, status, 0);
  } while (waited < 0 && errno == EINTR);
  return waited == pid;
}

int exitCode(int status) noexcept {
  constexpr int kSignalBase = 128;
  return WIFEXITED(status) ? WEXITSTATUS(status) : kSignalBase + WTERMSIG(status);
}

}  // namespace zelo
