// The coming runs of a task: the minutes at which cron starts it and it is due. No time zone is
// applied, so a minute that a change of the clock skips is among them.
#ifndef SCHEDULE_RUNS_H
#define SCHEDULE_RUNS_H

#include <zelosched.h>

#include <cstddef>

#include "schedule_hours.h"

constexpr uint32_t kLastYear = 9999;  // of a start date; a task with a later one has no runs

class SchedRuns {
 public:
  // The runs after that minute, of a date that exists. The task must outlive this object. A
  // disabled task has the same runs.
  SchedRuns(const ZELO_SCHED_TASK &task, const ZELO_SCHED_DATE &after);

  // Each call gives the next run; false when there are no more.
  bool next(ZELO_SCHED_DATE *run);

 private:
  bool isRunDay() const;
  bool isRunLeft() const;
  void goToNextDay();

  const ZELO_SCHED_TASK *task_;
  ZELO_SCHED_DATE after_;
  SchedHours hours_;
  size_t hour_ = 0;  // index of the first of hours_ that is left on this day
  ZELO_SCHED_DATE day_;
  unsigned daysLeft_;  // to search for another day with a run
};

#endif
