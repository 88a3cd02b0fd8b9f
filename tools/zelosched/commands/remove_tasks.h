// Removing tasks, with a question before each where that is wanted.
#pragma once

#include <cstdint>
#include <cstdio>
#include <functional>
#include <vector>

#include "commands/command.h"
#include "commands/expected_task.h"
#include "store/task_list.h"

struct RemoveRules {
  bool isSure;         // without a question
  bool insists;        // whatever the application allows
  bool powerOnly;      // a task that is no power time is refused
  bool stops = false;  // ends its runs under way
  ExpectedTask expected = {};
};

using TaskStep = std::function<void(const TaskRecord &task)>;

// Removes the task by `remove` and reports it by `tell`. Waiting runs are cancelled before and
// again after the removal, as a run may have read the task in between. Runs under way are left to
// the caller. Throws Failure.
void removeAndCancel(const TaskRecord &task, const TaskStep &remove, const TaskStep &tell,
                     FILE *to = stdout);

// Returns the exit status. Throws UsageError when a question is needed and there is no terminal.
int removeTasks(const std::vector<int64_t> &ids, const RemoveRules &rules);
