// A task's line in the system crontab, and whether cron can read it.
#ifndef SCHEDULE_CRON_H
#define SCHEDULE_CRON_H

#include <zelosched.h>

// The program that the line starts, whose name also marks a line as a task's.
constexpr char kSchedCronProgram[] = "/tmp/zeloschedtask";

struct SchedCronLine {
  char text[192];  // the longest has 141 characters
};

// Minute, hours, day, month, weekdays, user and command, with tabs between them and no line feed.
// Numbers out of range are written as they are.
SchedCronLine schedCronLineOf(const ZELO_SCHED_TASK &task);

struct SchedWeekdayList {
  char text[16];  // "0,1,2,3,4,5,6", or "" when no day is on
};

SchedWeekdayList schedWeekdayListOf(const ZELO_SCHED_TASK &task);

// Debian's cron ignores the whole of /etc/crontab, and starts nothing, when it cannot read one
// field. It can read a day that its month never has (30 February), which then never comes.
bool schedIsMinuteReadable(const ZELO_SCHED_TASK &task);
bool schedAreHoursReadable(const ZELO_SCHED_TASK &task);
bool schedIsDayReadable(const ZELO_SCHED_TASK &task);
bool schedIsMonthReadable(const ZELO_SCHED_TASK &task);
bool schedAreWeekdaysReadable(const ZELO_SCHED_TASK &task);

// All of them.
bool schedIsCronLineReadable(const ZELO_SCHED_TASK &task);

#endif
