// The keeper of a run: the process that starts it, reads its output, and records its outcome in the
// history. The run does not depend on it: it goes on when its keeper is killed, and it is started
// when no keeper can be forked or the history cannot be written.
#pragma once

#include <cstdint>
#include <optional>

#include "runs/run_record.h"

struct RunOrder {
  long task = 0;
  bool isAnyTime = false;  // otherwise only when the task is due in this minute
  bool isDisabledSkipped = true;
  Trigger trigger = Trigger::kSchedule;
  std::optional<int64_t> due;  // unset: the current minute for kSchedule, else none
  // File descriptors for a caller that waits, -1 for none: for the events (run_events.h), and for
  // what the run prints until its end.
  int tellTo = -1;
  int copyTo = -1;
};

// Forks a keeper, which starts the run. Returns what ZELOSchedTaskRun did, with its error record.
int runWithKeeper(const RunOrder &order);

// Forks a new keeper for a run whose keeper was killed. Returns the exit status.
int keepOn(int64_t run);
