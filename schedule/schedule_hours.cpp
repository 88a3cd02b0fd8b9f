#include "schedule_hours.h"

#include <algorithm>

SchedHours schedHoursOf(const ZELO_SCHED_TASK &task) {
  SchedHours result = {};
  result.hours[0] = task.RunHour;
  result.count = 1;
  if (task.RepeatHour == 0) {
    return result;
  }
  const uint32_t last = std::min(task.LastWorkHour, kLastHourOfDay);
  uint64_t hour = task.RunHour;  // wide enough for the sum of any two numbers of a record
  while ((hour += task.RepeatHour) <= last) {
    result.hours[result.count++] = static_cast<uint32_t>(hour);
  }
  return result;
}
