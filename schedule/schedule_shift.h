// Moving a task to a later minute of the day.
#ifndef SCHEDULE_SHIFT_H
#define SCHEDULE_SHIFT_H

#include <zelosched.h>

#include <cstdint>

// So many minutes later its last run of a day still comes on that day. For hours and minutes of a
// day alone.
uint32_t schedMostShift(const ZELO_SCHED_TASK &task);

// Every run comes that much later; with at most schedMostShift none is lost, and none leaves its
// day.
void schedShift(ZELO_SCHED_TASK *task, uint32_t minutes);

#endif
