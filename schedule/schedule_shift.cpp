#include "schedule_shift.h"

#include <algorithm>

#include "schedule_hours.h"

namespace {

constexpr uint32_t kMinutesOfHour = kLastMinuteOfHour + 1;

}  // namespace

uint32_t schedMostShift(const ZELO_SCHED_TASK &task) {
  const SchedHours hours = schedHoursOf(task);
  return (kLastHourOfDay - *(hours.end() - 1)) * kMinutesOfHour + kLastMinuteOfHour - task.RunMin;
}

void schedShift(ZELO_SCHED_TASK *task, uint32_t minutes) {
  const uint32_t minute = task->RunMin + minutes;
  const uint32_t hours = minute / kMinutesOfHour;
  task->RunMin = minute % kMinutesOfHour;
  task->RunHour += hours;
  if (task->RepeatHour != 0) {
    task->LastWorkHour =
        std::min(std::min(task->LastWorkHour, kLastHourOfDay) + hours, kLastHourOfDay);
  }
}
