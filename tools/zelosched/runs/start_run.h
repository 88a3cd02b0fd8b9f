// Starting a run of a task now, whatever its times say: as cron would, by the same program.
#pragma once

#include <zelosched.h>

#include <chrono>
#include <cstdint>
#include <optional>
#include <string>

#include "runs/run_events.h"

struct RunRequest {
  Trigger trigger = Trigger::kManual;
  std::optional<int64_t> due;
  bool isDisabledSkipped = false;  // a task that is disabled by now is skipped silently
  bool wantsOutput = false;
};

// A run that was started, with the events of its keeper, which does not depend on this object.
class StartedRun {
 public:
  // Throws Failure.
  StartedRun(const ZELO_SCHED_TASK &task, const RunRequest &request);
  ~StartedRun();
  StartedRun(const StartedRun &) = delete;
  StartedRun &operator=(const StartedRun &) = delete;

  // Waits so long for events, and takes them. False when no more will come, or after a signal.
  bool listen(std::chrono::milliseconds time);
  const RunEvents &events() const { return events_; }
  // No more events will come: at the end, or as the keeper was killed.
  bool isSilent() const { return telling_ < 0; }
  // The descriptor to read what the run prints from; -1 when that was not wanted.
  int output() const { return output_; }

 private:
  int telling_ = -1;
  int output_ = -1;
  std::string line_;  // whose end is still to come
  RunEvents events_;
};
