// Turns at what tasks are kept in: the store, the power schedule and the system crontab.
#ifndef SCHED_STORE_LOCK_H
#define SCHED_STORE_LOCK_H

#include <fcntl.h>
#include <sys/file.h>
#include <unistd.h>

// Keeps two processes from changing these files at once: each would write what it read over the
// other's change. It is held on a file that nobody else can open: a lock that anyone could take
// would keep everyone waiting. Whoever cannot get it in time goes on without: a change may then be
// lost, but none is refused. It is not taken twice: an operation that holds it calls what needs it
// and does not take it.
class StoreLock {
 public:
  StoreLock() : file_(open(kFile, O_RDWR | O_CREAT | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC, kMode)) {
    for (int i = 0; file_ >= 0 && flock(file_, LOCK_EX | LOCK_NB) != 0 && i < kTries; ++i) {
      usleep(kPause);
    }
  }
  ~StoreLock() {
    if (file_ >= 0) {
      close(file_);
    }
  }
  StoreLock(const StoreLock &) = delete;
  StoreLock &operator=(const StoreLock &) = delete;

 private:
  static constexpr char kFile[] = "/run/zeloscheduler.lock";
  static constexpr mode_t kMode = 0600;
  static constexpr int kTries = 1000;  // five seconds in all
  static constexpr useconds_t kPause = 5000;
  int file_;
};

#endif
