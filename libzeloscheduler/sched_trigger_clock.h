// The next trigger times of many tasks at one moment: what a list of tasks shows.
#ifndef SCHED_TRIGGER_CLOCK_H
#define SCHED_TRIGGER_CLOCK_H

#include <zelosched.h>

// The moment, and the last day that was normalised. Reading the clock and normalising a date cost
// the C library several system calls, which most tasks of a list would only repeat.
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

// ZELOSchedNextTriggerTime at the clock's moment.
int schedNextTriggerTime(ZELO_SCHED_TASK *pTask, SchedTriggerClock *clock);

#endif
