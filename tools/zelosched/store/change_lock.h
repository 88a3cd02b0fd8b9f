// Serializes the zelosched commands that change tasks, by an advisory lock: of two that read,
// change and save a task, the second would undo the first.
#pragma once

#include <sys/types.h>

#include <string>

constexpr char kChangeLockFile[] = "/run/zelosched.lock";

// "process 12 (cp)", for the holder of a lock.
std::string processText(pid_t pid);

class ChangeLock {
 public:
  // Waits for the lock. Throws Failure after 30 seconds.
  ChangeLock();
  ~ChangeLock();
  ChangeLock(const ChangeLock &) = delete;
  ChangeLock &operator=(const ChangeLock &) = delete;

 private:
  int file_;
};
