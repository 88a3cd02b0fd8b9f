// The minutes at which a task will run.
//
// They follow the library's days and hours. They differ from its next trigger time, which is for
// display, where the task does not run at that one:
//   - a daily or weekly task whose start date is still ahead does not run before it;
//   - cron passes over a month that lacks the day (the 31st of April is shown as 1 May), and over a
//     weekly task without days;
//   - in the last hour of a day in summer time the display is one day late;
//   - a time that the change to summer time skips does not come that day.
#pragma once

#include <zelosched.h>

#include <chrono>
#include <compare>
#include <ctime>
#include <optional>
#include <string>
#include <vector>

#include "schedule_runs.h"

// A minute on the local clock.
struct LocalMinute {
  std::chrono::sys_days day;
  int hour = 0;
  int minute = 0;
  auto operator<=>(const LocalMinute &) const = default;
};

LocalMinute localMinute(time_t moment);

// When it begins; nothing for one that the change to summer time skips. Of one that comes twice,
// the first.
std::optional<time_t> momentOf(const LocalMinute &minute);

std::string dayText(const LocalMinute &minute);   // "2026-12-24"
std::string timeText(const LocalMinute &minute);  // "18:30"
std::string minuteText(const LocalMinute &minute);
const char *weekdayName(const LocalMinute &minute);

// The runs of a task after a minute, one after the other, until there are no more. The task must
// stay as long as this does. Whether it is enabled is not asked.
class ComingRuns {
 public:
  ComingRuns(const ZELO_SCHED_TASK &task, const LocalMinute &after);
  std::optional<LocalMinute> next();

 private:
  SchedRuns runs_;
};

// Every run after `after`, up to and including `last`.
std::vector<LocalMinute> runsBetween(const ZELO_SCHED_TASK &task, const LocalMinute &after,
                                     const LocalMinute &last);

// The next run of an enabled task.
std::optional<LocalMinute> nextRun(const ZELO_SCHED_TASK &task, const LocalMinute &after);
