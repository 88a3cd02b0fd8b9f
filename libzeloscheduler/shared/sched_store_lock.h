// The lock for changes of the store, the power schedule and the system crontab.
#ifndef SCHED_STORE_LOCK_H
#define SCHED_STORE_LOCK_H

#include <sys/types.h>

constexpr char kSchedStoreLockFile[] = "/run/zeloscheduler.lock";

// Keeps two processes from changing these files at once, as each would overwrite the other's
// change. The lock is on a file that only its owner, root, can open: any other user could block
// all changes. It is not recursive: an operation that holds it calls functions that do not take
// it.
//
// When the lock is not free within 30 seconds, or the file cannot be opened or locked, isHeld() is
// false, the code is 0x0400, and one log line says why, with the process that holds it if known.
// Nothing may be changed then.
class StoreLock {
 public:
  StoreLock();
  ~StoreLock();
  StoreLock(const StoreLock &) = delete;
  StoreLock &operator=(const StoreLock &) = delete;

  bool isHeld() const { return file_ >= 0; }

 private:
  int file_;
};

// The process that holds the lock (flock) on a file, 0 when there is none. Does not block.
pid_t schedLockHolder(const char *szFile);

constexpr pid_t kSchedUnknownHolder = -1;  // in another container, for example

#endif
