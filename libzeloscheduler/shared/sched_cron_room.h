// How many lines "/etc/crontab" has room for. Debian's cron ignores the whole of a crontab that has
// too many lines, and then starts nothing at all: whoever may save many tasks could stop every job
// of the machine.
#ifndef SCHED_CRON_ROOM_H
#define SCHED_CRON_ROOM_H

#include <cstddef>

// Of a crontab with more lines than these, comments and empty ones among them, cron reads none.
constexpr size_t kSchedMostCronLines = 10000;

// No task's line is added beyond these. The rest is for lines that are not counted beforehand: up
// to a hundred of power-off times, those that others save at this moment, and those that other
// programs and root's own add later.
constexpr size_t kSchedMostFilledCronLines = kSchedMostCronLines - 200;

// The lines of the crontab, the last one also where it does not end. One that is missing or cannot
// be read counts as empty: nothing is written into it.
size_t schedCountCronLines();

// Whether so many more lines fit.
bool schedHasCronRoom(size_t lines);

#endif
