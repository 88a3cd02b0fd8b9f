// Keeps zelosched commands that change tasks from doing so at once: of two that read a task, change
// it and save it, the second would undo the first.
#pragma once

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
