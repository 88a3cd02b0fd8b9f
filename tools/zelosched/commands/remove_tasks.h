// Removing tasks with a question before each.
#pragma once

#include <cstdint>
#include <vector>

#include "commands/command.h"

struct RemoveRules {
  bool isSure;         // without a question
  bool insists;        // whatever the application allows
  bool powerOnly;      // a task that is no power time is refused
  bool stops = false;  // ends the runs of it that go on
};

// The exit status. Throws UsageError when there is nobody to ask.
int removeTasks(const std::vector<int64_t> &ids, const RemoveRules &rules);
