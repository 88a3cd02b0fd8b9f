// Tasks in the JSON format that zelosched-json(5) describes.
#pragma once

#include <json/value.h>
#include <zelosched.h>

#include <optional>
#include <string>
#include <vector>

#include "runs/coming_runs.h"
#include "runs/latest_runs.h"

// ---- writing --------------------------------------------------------------------------------

// The members of a task in a file of tasks.
Json::Value settingsOf(const ZELO_SCHED_TASK &task);

// All that is known of a task. Its runs are left out where this user may not see them.
Json::Value jsonOf(const ZELO_SCHED_TASK &task, const std::optional<LocalMinute> &next,
                   const LatestRuns &runs);

// A time at which the machine switches on or off.
Json::Value powerTimeOf(const ZELO_SCHED_TASK &task, const std::optional<LocalMinute> &next);

Json::Value jsonOf(const LocalMinute &minute);

// The members whose texts have bytes that JSON cannot carry.
std::vector<std::string> lossyMembersOf(const ZELO_SCHED_TASK &task);

// ---- reading --------------------------------------------------------------------------------

struct JsonFault {
  std::string place;  // "tasks[2].schedule.at"
  std::string what;
};
using JsonFaults = std::vector<JsonFault>;

// A task of a file, before it is known which stored one it is for.
struct TaskText {
  std::string place;  // "tasks[2]"
  Json::Value object;
};

// The tasks of a file, whose top object is checked. Throws Failure for what is not JSON.
std::vector<TaskText> taskTextsOf(const std::string &text, JsonFaults *faults);

// Replaces the times of day in the text by those of the task.
void setTimes(const ZELO_SCHED_TASK &task, TaskText *text);

// Sets what the text names, on the defaults or on a stored task. Members that are absent keep what
// the task has; another kind of schedule, or another day of it, takes the start date away. Without
// a fault the task is fit to be saved.
enum class Needed { kAll, kNone };  // whether required members may be absent
void fillTask(const TaskText &text, ZELO_SCHED_TASK *task, JsonFaults *faults,
              Needed needed = Needed::kAll);

// Each on a line of standard error.
void complainOf(const JsonFaults &faults);
