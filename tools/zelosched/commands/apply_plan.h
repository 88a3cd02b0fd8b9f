// What makes the stored tasks be as a file says.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "json/task_json.h"
#include "store/task_list.h"

struct ApplyRules {
  std::string undone;               // "nothing was applied", for a file that has faults
  bool isDryRun = false;            // tells what there is to do
  bool insists = false;             // whatever the applications allow
  bool showsDifferences = false;    // of each task, member by member
  bool isJson = false;              // tells it as an object
  std::vector<std::string> pruned;  // applications of which a task that the file lacks is removed
  std::optional<uint32_t> window;   // minutes: times are spread over so many (stagger.h)
};

enum class Change { kCreated, kChanged, kUnchanged, kRemoved };

struct ApplyStep {
  Change change;
  const TaskRecord *before;  // the stored task; null for a new one
  Task after;                // of a task that is created or changed
};

// The steps in their order, those that end harm first. `stored` must stay as long as they do.
// Without a fault each of them can be taken.
std::vector<ApplyStep> planOf(const std::vector<TaskText> &texts, const TaskList &stored,
                              const ApplyRules &rules, JsonFaults *faults);

// The crontab is fit for all of them. Throws Failure.
void requireFit(const std::vector<ApplyStep> &steps, const TaskList &stored);
