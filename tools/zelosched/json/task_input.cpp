#include "json/task_input.h"

#include <json/json.h>

#include <algorithm>
#include <cstdio>
#include <cstring>

#include "terminal/failure.h"
#include "terminal/text.h"

namespace {

constexpr size_t kMostBytes = size_t{1} << 20;
constexpr char kPlace[] = "tasks[0].";
constexpr char kSchedule[] = "schedule";

std::string standardInput() {
  std::string text;
  char buffer[65536];
  for (size_t count; (count = std::fread(buffer, 1, sizeof buffer, stdin)) > 0;) {
    text.append(buffer, count);
    if (text.size() > kMostBytes) throw Failure("one task has less than 1 MB");
  }
  if (std::ferror(stdin) != 0) throw Failure("cannot read the standard input");
  return text;
}

}  // namespace

void fillFromInput(ZELO_SCHED_TASK *task, JsonFaults *faults) {
  const std::vector<TaskText> texts = taskTextsOf(standardInput(), faults);
  if (!faults->empty()) return;
  if (texts.size() != 1) {
    faults->push_back({"tasks", "must be one task, and are " + std::to_string(texts.size())});
    return;
  }
  fillTask(texts.front(), task, faults);
}

void fillFromInput(ZELO_SCHED_TASK *task) {
  JsonFaults faults;
  fillFromInput(task, &faults);
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
