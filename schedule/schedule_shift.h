// Moving a task to a later minute of the day.
#ifndef SCHEDULE_SHIFT_H
#define SCHEDULE_SHIFT_H

#include <zelosched.h>

#include <cstdint>

// The most minutes by which the last run of a day can be moved without leaving it. The hour and
// the minute of the task must be in range.
uint32_t schedMostShift(const ZELO_SCHED_TASK &task);

// Moves every run by that much. With at most schedMostShift none is lost, and none leaves its day.
void schedShift(ZELO_SCHED_TASK *task, uint32_t minutes);

#endif
