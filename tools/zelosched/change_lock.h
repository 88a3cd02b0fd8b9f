// Keeps zelosched commands that change tasks from doing so at once: of two that read a task, change
// it and save it, the second would undo the first.
#pragma once

#include <sys/types.h>

#include <string>

constexpr char kChangeLockFile[] = "/run/zelosched.lock";

// "process 12 (cp)", for the holder of a lock.
std::string processText(pid_t pid);

class ChangeLock {
 public:
  // Waits for its turn. Throws Failure when that does not come in time.
  ChangeLock();
  ~ChangeLock();
  ChangeLock(const ChangeLock &) = delete;
  ChangeLock &operator=(const ChangeLock &) = delete;

 private:
  int file_;
};
