// Starting a program and getting its exit status, whatever the caller does with its signals.
#ifndef ZELOCORE_CHILD_H
#define ZELOCORE_CHILD_H

#include <signal.h>
#include <spawn.h>
#include <sys/types.h>

namespace zelo {

// While it lives, a child that ends stays a zombie until we wait for it. SIGCHLD has its default
// action for that long, since a process that ignores it, or sets SA_NOCLDWAIT, would lose the exit
// status. The signal is blocked in this thread, lest the caller's handler takes the status first.
// The price: where the caller ignores its children, one that ends meanwhile stays a zombie until
// the caller ends.
class ChildStatusGuard {
 public:
  ChildStatusGuard() noexcept;
  ChildStatusGuard(const ChildStatusGuard &) = delete;
  ChildStatusGuard &operator=(const ChildStatusGuard &) = delete;
  ~ChildStatusGuard();

 private:
  bool replaced_ = false;
  struct sigaction action_ {};
  sigset_t mask_{};
};

// How a program starts: with the default action for every signal and none blocked, as from a
// shell. posix_spawn shares the caller's memory until the program runs, so a large caller starts
// one as fast as a small one.
class Launch {
 public:
  Launch() noexcept;
  Launch(const Launch &) = delete;
  Launch &operator=(const Launch &) = delete;
  ~Launch();

  void inOwnGroup() noexcept;
  // The start fails when one of these does.
  void open(int fd, const char *path, int flags) noexcept;
  void closeFrom(int fd) noexcept;
  void changeDirectory(const char *path) noexcept;

  // The child, or -1 when nothing was started.
  pid_t start(const char *path, char *const *argv, char *const *envp) noexcept;

 private:
  void note(int error) noexcept { failed_ = failed_ || error != 0; }

  posix_spawnattr_t attributes_;
  posix_spawn_file_actions_t actions_;
  short flags_ = POSIX_SPAWN_SETSIGDEF | POSIX_SPAWN_SETSIGMASK;
  bool failed_ = false;
};

// Waits for the child. False when its status cannot be had, such as after another wait for it.
bool waitForChild(pid_t pid, int *status) noexcept;

// As a shell has it: the exit status, or 128 plus the signal's number.
int exitCode(int status) noexcept;

}  // namespace zelo

#endif
