// Tasks of the library as objects that free them, and texts in their fields.
#pragma once

#include <zelosched.h>

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

using TaskRecord = ZELO_SCHED_TASK;

using Task = std::unique_ptr<TaskRecord>;

// A new task with the defaults of the backend. Throws Failure.
Task newTask(int32_t backend);

// The stored task; null when there is none of that id. Throws Failure.
Task findTask(int64_t id);

// findTask, for which an id without a task is a Failure too.
Task loadTask(int64_t id);

class TaskList {
 public:
  enum class Unreadable { kIsFailure, kIsLeftOut };

  // Every task of every backend, or of those that can be read. Throws Failure.
  explicit TaskList(Unreadable backend = Unreadable::kIsFailure);
  ~TaskList();
  TaskList(const TaskList &) = delete;
  TaskList &operator=(const TaskList &) = delete;

  // In the order of their ids.
  const std::vector<const TaskRecord *> &tasks() const { return tasks_; }

 private:
  TaskRecord *head_ = nullptr;
  std::vector<const TaskRecord *> tasks_;
};

bool isEnabled(const TaskRecord &task);
bool isListed(const TaskRecord &task);
bool isPower(const TaskRecord &task);
const char *stateName(const TaskRecord &task);
const char *typeName(const TaskRecord &task);

// "task 3 (backup)", printable.
std::string titleOf(const TaskRecord &task);

void setText(char *field, size_t capacity, const char *what, const std::string &text);

// Throws Failure for a text that the field cannot hold whole.
template <size_t capacity>
void setText(char (&field)[capacity], const char *what, const std::string &text) {
  setText(field, capacity, what, text);
}
