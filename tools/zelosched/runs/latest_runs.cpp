#include "runs/latest_runs.h"

#include <string.h>
#include <zelosched.h>

#include <algorithm>

#include "runs/runs.h"
#include "terminal/failure.h"
#include "terminal/number.h"

namespace {

std::optional<int> numberOf(const std::string &comment) {
  const std::optional<int64_t> number = parseNumber(comment);
  if (!number || *number < 0 || *number > INT32_MAX) return std::nullopt;
  return static_cast<int>(*number);
}

RunRecord recordOf(const Run &run) {
  RunRecord record;
  record.task = run.taskId;
  record.app = run.app;
  record.start = run.start;
  record.state = RunState::kEnded;
  switch (run.statusCode) {
    case ZELO_SCHED_STATUS_RUNNING:
      record.state = RunState::kRunning;
      break;
    case ZELO_SCHED_STATUS_FINISHED:
      record.outcome = Outcome::kFinished;
      record.exitCode = 0;
      break;
    case ZELO_SCHED_STATUS_NOT_STARTED:
      record.outcome = Outcome::kNotStarted;
      break;
    case ZELO_SCHED_STATUS_STOPPED:
    case ZELO_SCHED_STATUS_KILLED:
      record.outcome = Outcome::kKilled;
      record.signal = numberOf(run.comment);
      break;
    case ZELO_SCHED_STATUS_EXIT_NONZERO:
      record.outcome = Outcome::kFailed;
      record.exitCode = numberOf(run.comment);
      break;
    default:
      record.outcome = Outcome::kLost;
  }
  return record;
}

std::string signalName(int signal) {
  const char *name = sigabbrev_np(signal);
  return name != nullptr ? name : std::to_string(signal);
}

// In the largest unit of which it is one at least.
std::string spanText(int64_t seconds) {
  constexpr int64_t kMinute = 60;
  constexpr int64_t kHour = 60 * kMinute;
  constexpr int64_t kDay = 24 * kHour;
  constexpr struct {
    int64_t seconds;
    const char *name;
  } kUnits[] = {{kDay, " d"}, {kHour, " h"}, {kMinute, " min"}, {1, " s"}};
  for (const auto &unit : kUnits) {
    if (seconds >= unit.seconds) return std::to_string(seconds / unit.seconds) + unit.name;
  }
  return "0 s";  // also where the clock was set back
}

}  // namespace

const RunRecord *LatestRuns::of(int64_t task) const {
  const auto found = ofEach.find(task);
  return found == ofEach.end() ? nullptr : &found->second;
}

// The status database is in "/tmp", where anybody can be in its way: tasks are shown without it.
LatestRuns latestRuns() {
  LatestRuns latest;
  if (!mayReadRuns()) return latest;
  try {
    const RunDatabase database;
    for (const auto &[task, run] : database.latestOfEach()) latest.ofEach[task] = recordOf(run);
    for (const Run &run : database.running()) latest.running.insert(run.taskId);
    latest.isKnown = true;
  } catch (const Failure &failure) {
    latest = {};
    latest.fault = failure.what();
  }
  return latest;
}

std::string outcomeInBrief(const RunRecord &run) {
  if (run.state != RunState::kEnded) return nameOf(run.state);
  switch (run.outcome) {
    case Outcome::kFailed:
      return "failed" + (run.exitCode ? " " + std::to_string(*run.exitCode) : "");
    case Outcome::kKilled:
      return "killed" + (run.signal ? " " + signalName(*run.signal) : "");
    case Outcome::kNotStarted:
      return "not started";
    case Outcome::kTimeLimit:
      return "time limit";
    case Outcome::kGaveUp:
      return "gave up";
    default:
      return nameOf(run.outcome);
  }
}

std::string runInBrief(const RunRecord &run, int64_t now) {
  const std::optional<int64_t> moment = run.end ? run.end : run.start ? run.start : run.queued;
  std::string outcome = outcomeInBrief(run);
  if (!moment) return outcome;
  const std::string span = spanText(now - *moment);
  return run.state == RunState::kEnded ? outcome + ", " + span + " ago" : outcome + " for " + span;
}

bool endedBadly(const RunRecord &run) {
  return run.state == RunState::kEnded && run.outcome != Outcome::kFinished;
}
