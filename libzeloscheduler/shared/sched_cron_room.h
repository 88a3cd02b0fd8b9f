// The number of lines in "/etc/crontab". Debian's cron ignores the whole of a crontab that has too
// many, and starts nothing: whoever may save many tasks could stop every job of the machine.
#ifndef SCHED_CRON_ROOM_H
#define SCHED_CRON_ROOM_H

#include <cstddef>

// Cron ignores a crontab with more lines than these, comments and empty ones included.
constexpr size_t kSchedMostCronLines = 10000;

// The limit for those who check before they add a task. The rest is for lines that are not
// checked: up to a hundred of power-off times, those of tasks that are saved at the same moment,
// and those that root and other programs add.
constexpr size_t kSchedMostFilledCronLines = kSchedMostCronLines - 200;

// The lines of the crontab, a last one without a line feed included. A crontab that is missing or
// cannot be read counts as empty: no line is added to it.
size_t schedCountCronLines();

// Whether that many lines can be added.
bool schedHasCronRoom(size_t lines);

#endif
