#include "check/run_findings.h"

#include <unistd.h>

#include <algorithm>
#include <map>

#include "runs/coming_runs.h"
#include "runs/history.h"
#include "runs/history_keep.h"
#include "runs/missed.h"
#include "runs/result_text.h"
#include "runs/runs.h"
#include "runs/task_notes.h"
#include "runs/time_units.h"
#include "terminal/text.h"

namespace {

constexpr char kFailedRun[] = "failed-run";
constexpr char kGaveUp[] = "gave-up";
constexpr char kMissedRun[] = "missed-run";

using Tasks = std::map<int64_t, const TaskRecord *>;

std::string momentInWords(int64_t moment) {
  return minuteText(localMinute(moment));
}

struct MissedWhile {
  const char *machine;
  const char *inWords;
};

MissedWhile whileMissed(MachineThen machine) {
  switch (machine) {
    case MachineThen::kOff:
      return {"off", ", as the machine was off"};
    case MachineThen::kOn:
      return {"on", ", though the machine was on"};
    case MachineThen::kMaybeOn:
      break;
  }
  return {"", ""};
}

class RunCheck {
 public:
  explicit RunCheck(const TaskList &list) : list_(list) {
    for (const TaskRecord *task : list.tasks()) tasks_[task->ID] = task;
  }

  Findings make() {
    const KeptDatabase kept(KeptDatabase::kRead);
    const Snapshot snapshot(kept);
    judgeLastRuns(kept);
    judgeMissed(kept);
    judgeRunning(kept);
    return std::move(findings_);
  }

 private:
  Finding &add(Severity severity, const char *kind, const TaskRecord &task, const std::string &text,
               const std::string &remedy = "") {
    findings_.push_back({severity, kind, titleOf(task) + " " + text, remedy, task.ID, task.Name});
    return findings_.back();
  }

  // Null for a removed or a disabled task, of which a failed last run is not reported.
  const TaskRecord *enabledTask(int64_t id) const {
    const auto found = tasks_.find(id);
    return found != tasks_.end() && isEnabled(*found->second) ? found->second : nullptr;
  }

  void judgeLastRuns(const KeptDatabase &kept) {
    bool isWell = true;
    for (const KeptRun &run : lastRuns(kept, LastRun::kEnded)) {
      const TaskRecord *const task = enabledTask(run.task);
      if (task == nullptr || !isBad(run)) continue;
      const int64_t moment = run.start ? *run.start : run.queued.value_or(run.end.value_or(0));
      const bool isKnown = isAcknowledged(kept, run);
      isWell = false;
      const std::string id = std::to_string(task->ID);
      add(isKnown ? Severity::kOk : Severity::kWarning,
          run.outcome == Outcome::kGaveUp ? kGaveUp : kFailedRun, *task,
          resultInWords(run) + " at " + momentInWords(moment) + (isKnown ? " (acknowledged)" : ""),
          isKnown || run.outputBytes == 0 ? "" : "'zelosched log " + id + "' shows what it printed")
          .run = run;
    }
    if (isWell) findings_.push_back({Severity::kOk, kFailedRun, "no task's last run failed"});
  }

  void judgeMissed(const KeptDatabase &kept) {
    bool isWell = true;
    for (const MissedTask &missed : missedTasks(kept, list_, 0)) {
      const TaskRecord &task = *missed.task;
      if (missed.times > 0) {
        isWell = false;
        const std::string id = std::to_string(task.ID);
        const std::string times =
            missed.times > 1 ? ", the last of " + std::to_string(missed.times) + " times," : "";
        const MissedWhile then = whileMissed(missed.machine);
        Finding &finding = add(
            Severity::kWarning, kMissedRun, task,
            "was due at " + momentInWords(missed.due) + times + " and did not run" + then.inWords,
            "'zelosched run " + id + "' runs it now, 'zelosched status --acknowledge " + id +
                "' takes note of it");
        finding.due = missed.due;
        finding.machine = then.machine;
      }
      if (missed.planned > 0) {
        add(Severity::kOk, "planned-off", task,
            "was due " +
                std::string(missed.planned == 1 ? "once"
                                                : std::to_string(missed.planned) + " times") +
                " while the machine was off by its power times");
      }
    }
    if (isWell) findings_.push_back({Severity::kOk, kMissedRun, "no run was missed"});
  }

  // Longer than a day, or than five times the median of the task's last runs.
  static bool isLong(const KeptDatabase &kept, const KeptRun &run, double seconds) {
    constexpr int64_t kRunsCompared = 10;
    constexpr double kTimesAsLong = 5;
    if (seconds > kDay) return true;
    RunFilter filter;
    filter.task = run.task;
    filter.limit = 2 * kRunsCompared;  // some of them may not have run
    std::vector<double> durations;
    for (const KeptRun &before : runsOf(kept, filter)) {
      if (before.state == RunState::kEnded && before.duration) {
        durations.push_back(*before.duration);
      }
      if (durations.size() == kRunsCompared) break;
    }
    if (durations.size() < 2 || seconds < kMinute) return false;  // too few, or too short
    const auto middle = durations.begin() + static_cast<ptrdiff_t>(durations.size() / 2);
    std::nth_element(durations.begin(), middle, durations.end());
    return seconds > kTimesAsLong * *middle;
  }

  void judgeRunning(const KeptDatabase &kept) {
    RunFilter filter;
    filter.underWay = true;
    const std::map<int64_t, TaskNote> notes = taskNotes(kept);
    const auto now = static_cast<int64_t>(time(nullptr));
    bool isAny = false;
    for (const KeptRun &run : runsOf(kept, filter)) {
      isAny = true;
      const auto note = notes.find(run.task);
      const bool isRemoved = note == notes.end() || run.generation != note->second.generation;
      const std::string id = std::to_string(run.task);
      const int64_t since = run.start ? *run.start : run.queued.value_or(now);
      const bool isTooLong =
          run.state == RunState::kRunning && isLong(kept, run, static_cast<double>(now - since));
      const auto found = tasks_.find(run.task);
      const std::string title = isRemoved || found == tasks_.end()
                                    ? "the removed task " + id + " (" + run.taskName + ")"
                                    : titleOf(*found->second);
      const std::string text =
          title +
          (run.state == RunState::kWaiting ? " waits for its turn since " : " is running since ") +
          momentInWords(since) + (isTooLong ? ", which is unusually long" : "");
      const std::string remedy = "'zelosched log --follow " + id +
                                 "' shows what it prints, 'zelosched stop " + id + "' ends it";
      findings_.push_back({isTooLong ? Severity::kWarning : Severity::kOk,
                           isTooLong ? "long-run" : "running", text,
                           isTooLong && !isRemoved ? remedy : "", run.task, run.taskName, run});
    }
    if (!isAny) findings_.push_back({Severity::kOk, "running", "no task is running"});
  }

  const TaskList &list_;
  Tasks tasks_;
  Findings findings_;
};

}  // namespace

Findings checkRuns(const TaskList &list) {
  if (!mayReadAllRuns() || geteuid() != 0) {
    return {
        {Severity::kUnknown, "runs", "which runs failed, were missed or go on, only root may see"}};
  }
  sweepRuns(list);
  return RunCheck(list).make();
}

bool isAboutPastRun(const Finding &finding) {
  const std::string_view kind = finding.kind;
  return kind == kFailedRun || kind == kGaveUp || kind == kMissedRun;
}
