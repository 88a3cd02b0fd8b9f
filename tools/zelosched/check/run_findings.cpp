#include "check/run_findings.h"

#include "runs/coming_runs.h"
#include "runs/history_keep.h"
#include "runs/missed.h"
#include "runs/runs.h"

Findings checkRunsInProgress(const TaskList &list) {
  if (!mayReadRuns()) {
    return {{Severity::kUnknown, "running", "whether a task is running, only root may see"}};
  }
  Findings findings;
  for (const Run &run : RunDatabase().running()) {
    std::string title = "task " + std::to_string(run.taskId);
    for (const ZELO_SCHED_TASK *task : list.tasks()) {
      if (task->ID == run.taskId) title = titleOf(*task);
    }
    findings.push_back({Severity::kOk, "running",
                        title + " is running since " + minuteText(localMinute(run.start)) +
                            " as process " + std::to_string(run.pid),
                        run.taskId});
  }
  if (findings.empty()) findings.push_back({Severity::kOk, "running", "no task is running"});
  return findings;
}

Findings checkMissedRuns(const TaskList &list) {
  if (!mayReadAllRuns()) {
    return {{Severity::kUnknown, "missed-run", "whether a run was missed, only root may see"}};
  }
  Findings findings;
  for (const MissedTask &missed : missedTasks(list, time(nullptr) - kMissedRemembered)) {
    findings.push_back({Severity::kWarning, "missed-run",
                        titleOf(*missed.task) + " was due at " +
                            minuteText(localMinute(missed.due)) +
                            ", when the machine was off: 'zelosched run " +
                            std::to_string(missed.task->ID) + "' runs it now",
                        missed.task->ID, missed.task->Name});
  }
  if (findings.empty()) findings.push_back({Severity::kOk, "missed-run", "no run was missed"});
  return findings;
}
