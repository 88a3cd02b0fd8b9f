// Stores of many tasks, and reading a file as fast as it can be done.
#ifndef BENCH_STORED_TASKS_H
#define BENCH_STORED_TASKS_H

#include <zelosched.h>

#include <cstddef>
#include <memory>

constexpr char kStore[] = "/tmp/scheduled_tasks";

struct TaskFree {
  void operator()(ZELO_SCHED_TASK *task) const { ZELOSchedTaskFree(task); }
};
using Task = std::unique_ptr<ZELO_SCHED_TASK, TaskFree>;

// A new task as a user might make one, different for each number.
Task newTask(int number);

// Makes a store of `count` tasks, with the platform's header and trailer. For 0 there is no file.
void fillStore(int count);

// Waits until the store is too old to be taken for a copy in progress.
void growOld();

// Makes the platform forget what it has read of the store, as in a process that has just started.
void forgetStore();

// All tasks of the store, listed and freed.
void list(int count);

// Opens, reads and closes the store. Its size.
size_t readStore();

#endif
