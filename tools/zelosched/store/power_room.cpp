#include "store/power_room.h"

#include <algorithm>
#include <cstring>

#include "schedule_days.h"
#include "store/task_list.h"
#include "terminal/failure.h"

namespace {

constexpr size_t kMostTimes = 100;  // of each direction; the platform takes no more
constexpr int32_t kPowerOn = 60000000;
constexpr int32_t kPowerOff = 80000000;
constexpr int32_t kEnabled = 10000000;
constexpr int32_t kWeekdays = 10000;
constexpr int32_t kHours = 100;

}  // namespace

std::string directionOf(const ZELO_SCHED_TASK &task) {
  return std::strcmp(task.AppArgs, "poweroff") == 0 ? "off" : "on";
}

int32_t powerId(const ZELO_SCHED_TASK &task) {
  const auto weekdays = static_cast<int32_t>(schedWeekdayMaskOf(task));
  const int32_t base = directionOf(task) == "off" ? kPowerOff : kPowerOn;
  return base + (isEnabled(task) ? kEnabled : 0) + weekdays * kWeekdays +
         static_cast<int32_t>(task.RunHour) * kHours + static_cast<int32_t>(task.RunMin);
}

PowerRoom::PowerRoom() {
  const TaskList list;
  for (const ZELO_SCHED_TASK *task : list.tasks()) {
    if (isPower(*task)) ids_.insert(task->ID);
  }
}

void PowerRoom::take(const ZELO_SCHED_TASK &task) {
  const int32_t id = powerId(task);
  if (ids_.count(id) != 0) {
    throw Failure("there is such a power time already: it is task " + std::to_string(id));
  }
  const bool isOff = directionOf(task) == "off";
  const auto taken = std::count_if(ids_.begin(), ids_.end(),
                                   [&](int32_t other) { return (other >= kPowerOff) == isOff; });
  if (static_cast<size_t>(taken) >= kMostTimes) {
    throw Failure("there are " + std::to_string(taken) + " power-" + directionOf(task) +
                  " times already, and no more fit: remove one first");
  }
  ids_.insert(id);
}
