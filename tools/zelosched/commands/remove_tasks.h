// Removing tasks with a question before each.
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
  bool stops = false;  // ends the runs of it that go on
  ExpectedTask expected = {};
};

using TaskStep = std::function<void(const TaskRecord &task)>;

// Takes the step that removes it, and tells of it. A run that waits for its turn must not begin
// when the task is gone: neither one from before, nor one that read the task just then. What goes
// on is looked after when others may change tasks again. Throws Failure.
void removeAndCancel(const TaskRecord &task, const TaskStep &remove, const TaskStep &tell,
                     FILE *to = stdout);

// The exit status. Throws UsageError when there is nobody to ask.
int removeTasks(const std::vector<int64_t> &ids, const RemoveRules &rules);
