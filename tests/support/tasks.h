// Task records for tests.
//
//   Task task = makeTask("backup", "/bin/true");   new, enabled, root's, daily at 00:00 since 2012
//   setText(task->Week, "0111110");                bounded copy into a text field
//   long id = saveTask(task);                      through the library; fails the test on failure
//   Task copy = loadTask(id);                      through the library; State 2 when there is none
#pragma once

#include <cstddef>
#include <memory>
#include <string>

#include "zelosched.h"

namespace support {

struct FreeTask {
  void operator()(ZELO_SCHED_TASK *task) const;
};
using Task = std::unique_ptr<ZELO_SCHED_TASK, FreeTask>;

// A list as ZELOSchedTaskListGet makes it.
struct FreeTaskList {
  void operator()(ZELO_SCHED_TASK *list) const;
};
using TaskList = std::unique_ptr<ZELO_SCHED_TASK, FreeTaskList>;

Task makeTask(const std::string &name, const std::string &command);
long saveTask(const Task &task);
Task loadTask(long id);

void copyText(char *field, size_t capacity, const std::string &text);

template <size_t capacity>
void setText(char (&field)[capacity], const std::string &text) {
  copyText(field, capacity, text);
}

}  // namespace support
