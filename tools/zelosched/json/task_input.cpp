#include "json/task_input.h"

#include <json/json.h>

#include <algorithm>
#include <cstring>

#include "terminal/failure.h"
#include "terminal/text.h"

namespace {

constexpr char kPlace[] = "tasks[0].";
constexpr char kSchedule[] = "schedule";

}  // namespace

void fillFromText(const std::string &text, ZELO_SCHED_TASK *task, JsonFaults *faults) {
  const std::vector<TaskText> texts = taskTextsOf(text, faults);
  if (!faults->empty()) return;
  if (texts.size() != 1) {
    faults->push_back({"tasks", "must be one task, and are " + std::to_string(texts.size())});
    return;
  }
  const bool isStored = task->ID != ZELO_SCHED_ID_NEW;
  fillTask(texts.front(), task, faults, isStored ? Needed::kNone : Needed::kAll);
}

void fillFromText(const std::string &text, ZELO_SCHED_TASK *task) {
  JsonFaults faults;
  fillFromText(text, task, &faults);
  if (faults.empty()) return;
  complainOf(faults);
  throw Failure("nothing was saved, because of " + counted(faults.size(), "fault"));
}

bool isScheduleSound(const JsonFaults &faults) {
  return std::all_of(faults.begin(), faults.end(), [](const JsonFault &fault) {
    return fault.place.starts_with(kPlace) &&
           fault.place.compare(strlen(kPlace), strlen(kSchedule), kSchedule) != 0;
  });
}
