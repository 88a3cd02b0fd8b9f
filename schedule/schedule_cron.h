// A task's line in the system crontab, and whether cron can read it.
#ifndef SCHEDULE_CRON_H
#define SCHEDULE_CRON_H

#include <zelosched.h>

// What the line starts, and what marks a line as a task's.
constexpr char kSchedCronProgram[] = "/tmp/zeloschedtask";

struct SchedCronLine {
  char text[192];  // the longest has 141 characters
};

// Minute, hours, day, month, weekdays, user and command, with tabs between them and no line feed.
// Numbers out of range stand in it as they are.
SchedCronLine schedCronLineOf(const ZELO_SCHED_TASK &task);

struct SchedWeekdayList {
  char text[16];  // "0,1,2,3,4,5,6", or "" when no day is on
};

SchedWeekdayList schedWeekdayListOf(const ZELO_SCHED_TASK &task);

// Debian's cron passes over the whole of /etc/crontab for one field that it cannot read, and then
// starts nothing at all. A day that its month never has is none of them: cron reads it, and it
// never comes.
bool schedIsMinuteReadable(const ZELO_SCHED_TASK &task);
bool schedAreHoursReadable(const ZELO_SCHED_TASK &task);
bool schedIsDayReadable(const ZELO_SCHED_TASK &task);
bool schedIsMonthReadable(const ZELO_SCHED_TASK &task);
bool schedAreWeekdaysReadable(const ZELO_SCHED_TASK &task);

// All of them.
bool schedIsCronLineReadable(const ZELO_SCHED_TASK &task);

#endif
