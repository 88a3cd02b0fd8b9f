// The next trigger times of the tasks of a list, all for the same time.
#ifndef SCHED_TRIGGER_CLOCK_H
#define SCHED_TRIGGER_CLOCK_H

#include <zelosched.h>

// Caches the current time and the last date that was normalised. Both take system calls, which
// most tasks of a list would only repeat.
class SchedTriggerClock {
 public:
  // Reads the clock, once. 0 or -1.
  int read();
  const ZELO_SCHED_DATE &now() const { return now_; }
  // ZELOSchedDateNormalize.
  int normalize(ZELO_SCHED_DATE *pDate);

 private:
  bool isRead_ = false;
  bool isNormalized_ = false;
  ZELO_SCHED_DATE now_ = {};
  ZELO_SCHED_DATE given_ = {};
  ZELO_SCHED_DATE normalized_ = {};
};

// ZELOSchedNextTriggerTime with the clock's time.
int schedNextTriggerTime(ZELO_SCHED_TASK *pTask, SchedTriggerClock *clock);

#endif
