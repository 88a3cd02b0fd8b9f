#include "runs/latest_runs.h"

#include <string.h>

#include "runs/history.h"
#include "runs/history_keep.h"
#include "runs/time_units.h"
#include "terminal/failure.h"

namespace {

std::string signalName(int signal) {
  const char *name = sigabbrev_np(signal);
  return name != nullptr ? name : std::to_string(signal);
}

// In the largest unit of which it is one at least.
std::string spanText(int64_t seconds) {
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

// When the sweep fails, such as for another user's file in "/tmp", that is reported, and the
// history is shown all the same.
LatestRuns latestRuns(const TaskList &list) {
  LatestRuns latest;
  if (!mayReadAllRuns()) return latest;
  try {
    sweepRuns(list);
  } catch (const Failure &failure) {
    latest.fault = failure.what();
  }
  try {
    const KeptDatabase kept(KeptDatabase::kRead);
    for (KeptRun &run : lastRuns(kept)) latest.ofEach[run.task] = std::move(run);
    RunFilter underWay;
    underWay.underWay = true;
    underWay.ofTasksOfToday = true;
    for (KeptRun &run : runsOf(kept, underWay)) {
      latest.running.insert(run.task);
      // Newest first: the one that has been running longest stays.
      if (run.state == RunState::kRunning) latest.ofEach[run.task] = std::move(run);
    }
    latest.isKnown = true;
  } catch (const Failure &failure) {
    latest = {};
    latest.fault = failure.what();
  }
  return latest;
}

LatestRuns latestRuns() {
  return latestRuns(TaskList(TaskList::Unreadable::kIsLeftOut));
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
