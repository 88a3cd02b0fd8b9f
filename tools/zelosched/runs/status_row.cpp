#include "runs/status_row.h"

#include <zelosched.h>

#include "runs/time_limit.h"
#include "terminal/number.h"

namespace {

constexpr int64_t kMostSignal = 1000;
constexpr int64_t kMostExitCode = 255;

std::optional<int> numberIn(const std::string &comment, int64_t most) {
  const std::optional<int64_t> number = parseNumber(comment);
  if (!number || *number < 0 || *number > most) return std::nullopt;
  return static_cast<int>(*number);
}

}  // namespace

void takeStatus(const Run &row, KeptRun *run) {
  run->start = row.start;
  run->statusId = row.statusId;
  run->process.pid = row.pid;
  run->state = RunState::kEnded;
  switch (row.statusCode) {
    case ZELO_SCHED_STATUS_RUNNING:
      run->state = RunState::kRunning;
      run->outcome = Outcome::kNone;
      break;
    case ZELO_SCHED_STATUS_FINISHED:
      run->outcome = Outcome::kFinished;
      run->exitCode = 0;
      break;
    case ZELO_SCHED_STATUS_EXIT_NONZERO:
      run->outcome = Outcome::kFailed;
      run->exitCode = numberIn(row.comment, kMostExitCode);
      break;
    case ZELO_SCHED_STATUS_STOPPED:
    case ZELO_SCHED_STATUS_KILLED:
      run->outcome = Outcome::kKilled;
      run->signal = numberIn(row.comment, kMostSignal);
      break;
    case ZELO_SCHED_STATUS_NONE:
    case ZELO_SCHED_STATUS_NOT_STARTED:
      run->outcome = Outcome::kNotStarted;
      break;
    default:
      run->outcome = Outcome::kLost;
      break;
  }
}

// A run that was asked to stop, and finished successfully all the same, counts as finished.
void judgeEnd(std::string_view command, bool isStopAsked, RunRecord *run) {
  const bool isByItself = run->outcome != Outcome::kFailed && run->outcome != Outcome::kKilled;
  if (isByItself) return;
  if (isStopAsked) {
    run->outcome = Outcome::kStopped;
  } else if (run->exitCode && run->duration &&
             isEndedByLimit(command, *run->exitCode, *run->duration)) {
    run->outcome = Outcome::kTimeLimit;
  }
}
