// The hours of a day at which a task starts: the one walk that the next trigger time, the crontab
// line and the check whether a run is due have in common.
#ifndef SCHED_RUN_HOURS_H
#define SCHED_RUN_HOURS_H

#include <zelosched.h>

#include <algorithm>
#include <cstdint>

constexpr uint32_t kLastHourOfDay = 23;

// Calls visit(hour) for each of them, in ascending order, until it returns true; the result says
// whether it did. The first hour is visited whatever it is. No run can be due in an hour above 23,
// so the repeats end there, which also bounds the walk for any number that a record may hold.
template <class Visit>
bool anyRunHour(const ZELO_SCHED_TASK &task, Visit visit) {
  if (visit(task.RunHour)) {
    return true;
  }
  if (task.RepeatHour == 0) {
    return false;
  }
  const uint32_t last = std::min(std::max(task.RunHour, task.LastWorkHour), kLastHourOfDay);
  uint64_t hour = task.RunHour;
  while ((hour += task.RepeatHour) <= last) {
    if (visit(static_cast<uint32_t>(hour))) {
      return true;
    }
  }
  return false;
}

#endif
