// Turns at what tasks are kept in: the store, the power schedule and the system crontab.
#ifndef SCHED_STORE_LOCK_H
#define SCHED_STORE_LOCK_H

#include <fcntl.h>
#include <sys/file.h>
#include <unistd.h>

// Keeps two processes from changing these files at once: each would write what it read over the
// other's change. It is held on the persistent store's directory, which only root can replace.
// Whoever cannot get it in time goes on without: a change may then be lost, but none is refused.
// It is not taken twice: an operation that holds it calls what needs it and does not take it.
class StoreLock {
 public:
  StoreLock() : directory_(open(kDirectory, O_RDONLY | O_DIRECTORY | O_CLOEXEC)) {
    for (int i = 0; directory_ >= 0 && flock(directory_, LOCK_EX | LOCK_NB) != 0 && i < kTries;
         ++i) {
      usleep(kPause);
    }
  }
  ~StoreLock() {
    if (directory_ >= 0) {
      close(directory_);
    }
  }
  StoreLock(const StoreLock &) = delete;
  StoreLock &operator=(const StoreLock &) = delete;

 private:
  static constexpr char kDirectory[] = "/usr/zelo/etc";
  static constexpr int kTries = 1000;  // five seconds in all
  static constexpr useconds_t kPause = 5000;
  int directory_;
};

#endif
