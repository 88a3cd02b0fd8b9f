// Turns at what tasks are kept in: the store, the power schedule and the system crontab.
#ifndef SCHED_STORE_LOCK_H
#define SCHED_STORE_LOCK_H

#include <sys/types.h>

constexpr char kSchedStoreLockFile[] = "/run/zeloscheduler.lock";

// Keeps two processes from changing these files at once: each would write what it read over the
// other's change. The lock is on a file that nobody else can open: one that anyone could take would
// keep everyone waiting. It is not taken twice: an operation that holds it calls what needs it and
// does not take it.
//
// Whoever has not had his turn after 30 seconds, or cannot open or lock the file, must change
// nothing: isHeld() is false, the code is 0x0400, and one log line says why, with the process that
// holds it.
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

// The process that holds the lock on a file (flock), 0 when there is none. It waits for nothing.
pid_t schedLockHolder(const char *szFile);

constexpr pid_t kSchedUnknownHolder = -1;  // of another container, say

#endif
