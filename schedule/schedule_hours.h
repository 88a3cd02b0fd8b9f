// The hours of a day at which a task runs.
#ifndef SCHEDULE_HOURS_H
#define SCHEDULE_HOURS_H

#include <zelosched.h>

#include <cstddef>
#include <cstdint>

constexpr uint32_t kLastHourOfDay = 23;
constexpr uint32_t kLastMinuteOfHour = 59;

struct SchedHours {
  uint32_t hours[kLastHourOfDay + 1];
  size_t count;

  const uint32_t *begin() const { return hours; }
  const uint32_t *end() const { return hours + count; }
};

// At least one, in ascending order. The first is the task's RunHour, also one above 23; repeats
// end at 23.
SchedHours schedHoursOf(const ZELO_SCHED_TASK &task);

#endif
