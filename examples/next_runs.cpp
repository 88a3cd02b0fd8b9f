// next_runs - every task with the time of its next run, in the order of their names.
//
// The library's interface is plain C. A class of a dozen lines owns what it returns; copy it.
#include <zelosched.h>

#include <iostream>
#include <stdexcept>

class TaskList {
 public:
  TaskList() {
    if (ZELOSchedTaskListGet(&head_, nullptr) < 0) throw std::runtime_error("cannot list tasks");
  }
  ~TaskList() { ZELOSchedTaskListFree(&head_); }
  TaskList(const TaskList &) = delete;
  TaskList &operator=(const TaskList &) = delete;

  void sortBy(const char *key) { ZELOSchedTaskListSort(&head_, key, 1); }
  const ZELO_SCHED_TASK *first() const { return head_; }

 private:
  ZELO_SCHED_TASK *head_ = nullptr;
};

int main() try {
  TaskList tasks;
  tasks.sortBy("name");
  for (const ZELO_SCHED_TASK *task = tasks.first(); task != nullptr; task = task->next) {
    std::cout << task->Name << ": " << task->NextTriggerTime << "\n";
  }
} catch (const std::exception &error) {
  std::cerr << error.what() << "\n";
  return 1;
}
