// The keeper of a run: the process that starts it, reads what it prints, and writes into the
// history how it went. The run does not depend on it: it goes on when its keeper is killed, and it
// takes place when none can be made or nothing can be written.
#pragma once

#include <cstdint>
#include <optional>

#include "runs/run_record.h"

struct RunOrder {
  long task = 0;
  bool isAnyTime = false;  // otherwise only when the task is due in this minute
  bool isDisabledSkipped = true;
  Trigger trigger = Trigger::kSchedule;
  std::optional<int64_t> due;  // this minute, when it is not said
  // What somebody who waits wants to know; -1 for none. Lines (run_events.h), and all that the run
  // prints until its end.
  int tellTo = -1;
  int copyTo = -1;
};

// Has a keeper start the run. What ZELOSchedTaskRun gave, with its error record.
int runWithKeeper(const RunOrder &order);

// In the place of a keeper that was killed, in a process of its own. The exit status.
int keepOn(int64_t run);
