#include "schedule_due.h"

#include <algorithm>

#include "schedule_days.h"
#include "schedule_hours.h"

namespace {

bool repeats(const ZELO_SCHED_TASK &task) {
  return task.Type >= ZELO_SCHED_TYPE_DAILY && task.Type <= ZELO_SCHED_TYPE_YEARLY;
}

}  // namespace

bool schedIsDueDay(const ZELO_SCHED_TASK &task, const ZELO_SCHED_DATE &day) {
  const int dayToStart = schedCompareDays(day, schedStartDay(task));
  return dayToStart == 0 || (dayToStart > 0 && repeats(task) && schedIsCronDay(task, day));
}

bool schedIsDue(const ZELO_SCHED_TASK &task, const ZELO_SCHED_DATE &now) {
  if (now.minute != task.RunMin || !schedIsDueDay(task, now)) {
    return false;
  }
  const SchedHours hours = schedHoursOf(task);
  return std::find(hours.begin(), hours.end(), now.hour) != hours.end();
}
