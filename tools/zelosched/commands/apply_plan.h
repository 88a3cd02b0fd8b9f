// The changes that make the stored tasks match a file.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "json/task_json.h"
#include "store/task_list.h"

struct ApplyRules {
  std::string undone;               // "nothing was applied", for a file that has faults
  bool isDryRun = false;            // the changes are reported and not made
  bool insists = false;             // also changes that the applications do not allow
  bool showsDifferences = false;    // of each task, member by member
  bool isJson = false;              // prints a JSON object
  std::vector<std::string> pruned;  // applications of which a task that the file lacks is removed
  std::optional<uint32_t> window;   // minutes: times are spread over so many (stagger.h)
};

enum class Change { kCreated, kChanged, kUnchanged, kRemoved };

struct ApplyStep {
  Change change;
  const TaskRecord *before;  // the stored task; null for a new one
  Task after;                // null unless the task is created or changed
};

// The steps in their order, those of tasks that cron cannot read first. They point into `stored`,
// and may be taken only when no fault was added.
std::vector<ApplyStep> planOf(const std::vector<TaskText> &texts, const TaskList &stored,
                              const ApplyRules &rules, JsonFaults *faults);

// Throws Failure when the steps leave a task that cron cannot read, or the crontab has no room.
void requireFit(const std::vector<ApplyStep> &steps, const TaskList &stored);
