#include "runs/result_text.h"

#include <string.h>
#include <zelosched.h>

#include <climits>

#include "terminal/number.h"
#include "terminal/text.h"

namespace {

std::string signalName(const std::string &number) {
  const std::optional<int64_t> signal = parseNumber(number);
  const char *name = signal && *signal > 0 && *signal < INT_MAX
                         ? sigabbrev_np(static_cast<int>(*signal))
                         : nullptr;
  if (name == nullptr) return "signal " + printable(number);
  return std::string("signal SIG") + name + " (" + number + ")";
}

}  // namespace

std::string resultInWords(int statusCode, const std::string &comment) {
  switch (statusCode) {
    case ZELO_SCHED_STATUS_NONE:
      return "ended without a result";
    case ZELO_SCHED_STATUS_GONE:
      return "was running but its process is gone";
    case ZELO_SCHED_STATUS_RUNNING:
      return "running";
    case ZELO_SCHED_STATUS_FINISHED:
      return "finished";
    case ZELO_SCHED_STATUS_NOT_STARTED:
      return "could not start";
    case ZELO_SCHED_STATUS_STOPPED:
      return "stopped by " + signalName(comment);
    case ZELO_SCHED_STATUS_KILLED:
      return "killed by " + signalName(comment);
    case ZELO_SCHED_STATUS_EXIT_NONZERO:
      return "failed with exit code " + printable(comment);
    default:
      return "ended with the unknown status " + std::to_string(statusCode);
  }
}

std::string resultInWords(const RunRecord &run) {
  if (run.state == RunState::kWaiting) return "waits for its turn";
  if (run.state == RunState::kRunning) return "running";
  switch (run.outcome) {
    case Outcome::kFinished:
      return "finished";
    case Outcome::kFailed:
      return run.exitCode ? "failed with exit code " + std::to_string(*run.exitCode) : "failed";
    case Outcome::kKilled:
      return run.signal ? "killed by " + signalName(std::to_string(*run.signal)) : "killed";
    case Outcome::kNotStarted:
      return "could not start";
    case Outcome::kTimeLimit:
      return "ended by its time limit";
    case Outcome::kGaveUp:
      return "gave up waiting";
    case Outcome::kCancelled:
      return "cancelled while it waited";
    case Outcome::kStopped:
      return "stopped";
    case Outcome::kNone:
    case Outcome::kLost:
      break;
  }
  return "was running but its process is gone";
}

bool isBadResult(int statusCode) {
  return statusCode != ZELO_SCHED_STATUS_FINISHED && statusCode != ZELO_SCHED_STATUS_RUNNING;
}
