// zelosched metrics
#include <unistd.h>

#include <cstdio>
#include <ctime>
#include <map>

#include "check/health.h"
#include "commands/command.h"
#include "commands/options.h"
#include "runs/coming_runs.h"
#include "runs/history.h"
#include "runs/history_keep.h"
#include "runs/missed.h"
#include "store/place_file.h"
#include "store/task_list.h"
#include "terminal/failure.h"
#include "terminal/metrics_text.h"

namespace {

constexpr Option kMetricsOptions[] = {{"output", Option::kValue, 'o'}};
constexpr mode_t kMetricsMode = 0644;  // the collector does not run as root

MetricsText::Labels labelsOf(const TaskRecord &task) {
  return {{"task_id", std::to_string(task.ID)}, {"task", task.Name}, {"app", task.App}};
}

void addTasks(const TaskList &list, MetricsText *text) {
  std::map<std::string, int64_t> ofState{{"enabled", 0}, {"disabled", 0}};
  for (const TaskRecord *task : list.tasks()) {
    if (!isPower(*task)) ++ofState[stateName(*task)];
  }
  text->begin("zelosched_tasks", "Stored tasks by state.");
  for (const auto &[state, count] : ofState) {
    text->add({{"state", state}}, static_cast<double>(count));
  }
}

void addNextRuns(const TaskList &list, MetricsText *text) {
  text->begin("zelosched_task_next_run_timestamp_seconds", "When an enabled task runs next.");
  const LocalMinute now = localMinute(time(nullptr));
  for (const TaskRecord *task : list.tasks()) {
    if (isPower(*task)) continue;
    const std::optional<LocalMinute> next = nextRun(*task, now);
    const std::optional<time_t> moment = next ? momentOf(*next) : std::nullopt;
    if (moment) text->add(labelsOf(*task), static_cast<double>(*moment));
  }
}

using LastRuns = std::map<const TaskRecord *, KeptRun>;

LastRuns lastRunsOf(const KeptDatabase &kept, const TaskList &list) {
  std::map<int64_t, const TaskRecord *> tasks;
  for (const TaskRecord *task : list.tasks()) tasks[task->ID] = task;
  LastRuns runs;
  for (KeptRun &run : lastRuns(kept)) {
    const auto task = tasks.find(run.task);
    if (task != tasks.end()) runs[task->second] = std::move(run);
  }
  return runs;
}

void addAcknowledged(const KeptDatabase &kept, const LastRuns &runs, MetricsText *text) {
  text->begin("zelosched_task_failure_acknowledged",
              "1 when somebody has taken note of the failure of the last run.");
  for (const auto &[task, run] : runs) {
    if (isBad(run) && isAcknowledged(kept, run)) text->add(labelsOf(*task), 1);
  }
}

void addLastRuns(const LastRuns &runs, MetricsText *text) {
  text->begin("zelosched_task_last_run_start_timestamp_seconds",
              "When the last run of a task started.");
  for (const auto &[task, run] : runs) {
    if (run.start) text->add(labelsOf(*task), static_cast<double>(*run.start));
  }
  text->begin("zelosched_task_last_run_duration_seconds", "How long the last run took.");
  for (const auto &[task, run] : runs) {
    if (run.duration) text->add(labelsOf(*task), *run.duration);
  }
  text->begin("zelosched_task_last_run_exit_code", "Exit code of the last run's command.");
  for (const auto &[task, run] : runs) {
    if (run.exitCode) text->add(labelsOf(*task), *run.exitCode);
  }
  text->begin("zelosched_task_last_run_outcome",
              "1 for what became of the last run, or for its state while it goes on.");
  for (const auto &[task, run] : runs) {
    MetricsText::Labels labels = labelsOf(*task);
    labels.emplace_back("outcome",
                        run.state == RunState::kEnded ? nameOf(run.outcome) : nameOf(run.state));
    text->add(labels, 1);
  }
}

void addSuccesses(const KeptDatabase &kept, const TaskList &list, MetricsText *text) {
  text->begin("zelosched_task_last_success_timestamp_seconds", "When a task last finished well.");
  const std::map<int64_t, int64_t> successes = lastSuccesses(kept);
  for (const TaskRecord *task : list.tasks()) {
    const auto success = successes.find(task->ID);
    if (success == successes.end()) continue;
    text->add(labelsOf(*task), static_cast<double>(success->second));
  }
}

void addMissed(const KeptDatabase &kept, const TaskList &list, MetricsText *text) {
  text->begin(
      "zelosched_task_missed_runs",
      "Times at which a task was due and did not run, since it last ran or that was acknowledged.");
  for (const MissedTask &missed : missedTasks(kept, list, 0)) {
    if (missed.times > 0) text->add(labelsOf(*missed.task), static_cast<double>(missed.times));
  }
}

void addOutcomes(const KeptDatabase &kept, MetricsText *text) {
  text->begin("zelosched_runs", "Runs in the history by what became of them.");
  for (const auto &[outcome, count] : countByOutcome(kept)) {
    text->add({{"outcome", nameOf(outcome)}}, static_cast<double>(count));
  }
}

void addRuns(const TaskList &list, MetricsText *text) {
  sweepRuns(list);
  const KeptDatabase kept(KeptDatabase::kRead);
  const Snapshot snapshot(kept);
  const LastRuns runs = lastRunsOf(kept, list);
  addLastRuns(runs, text);
  addAcknowledged(kept, runs, text);
  addSuccesses(kept, list, text);
  addMissed(kept, list, text);
  addOutcomes(kept, text);
}

void addHealth(MetricsText *text) {
  const Findings findings = examineHealth();
  text->begin("zelosched_health", "1 for what zelosched status says of the whole.");
  for (const Severity severity :
       {Severity::kOk, Severity::kUnknown, Severity::kWarning, Severity::kCritical}) {
    text->add({{"state", nameOf(severity)}}, worstOf(findings) == severity ? 1 : 0);
  }
  std::map<std::pair<std::string, std::string>, int64_t> problems;
  for (const Finding &finding : findings) {
    if (finding.severity != Severity::kOk) ++problems[{nameOf(finding.severity), finding.kind}];
  }
  text->begin("zelosched_problems", "What zelosched status finds, by severity and kind.");
  for (const auto &[key, count] : problems) {
    text->add({{"severity", key.first}, {"kind", key.second}}, static_cast<double>(count));
  }
}

// What cannot be read is left out, and becomes a problem of the health.
std::string allMetrics() {
  MetricsText text;
  const auto tasks = [&] {
    const TaskList list;
    addTasks(list, &text);
    addNextRuns(list, &text);
    addRuns(list, &text);
  };
  try {
    tasks();
  } catch (const Failure &failure) {
    complain(failure.what());
  }
  addHealth(&text);
  return text.whole();
}

int runMetrics(int argc, char **argv) {
  const Arguments arguments(argc, argv, kMetricsOptions);
  arguments.requireNoOperands();
  arguments.requireNoCommand();
  if (geteuid() != 0) throw Failure("reading the runs takes root's rights");
  const std::optional<std::string> path = arguments.value("output");
  if (path && path->empty()) throw UsageError("'--output' takes the name of a file");
  const std::string text = allMetrics();
  if (!path) {
    std::fwrite(text.data(), 1, text.size(), stdout);
  } else {
    placeFile(*path, text, kMetricsMode);
  }
  return kDone;
}

}  // namespace

const Command kMetricsCommand = {
    "metrics", "[--output FILE]", "print what a monitoring system collects",
    "Prints as OpenMetrics text: tasks by their state, of each task the start, duration, exit\n"
    "code and outcome of its last run, when it last finished well, its next run and the runs\n"
    "that it missed, the runs of the history by their outcome, and what 'zelosched status'\n"
    "finds.\n"
    "\n"
    "  -o, --output FILE              into the file, which is replaced as a whole\n",
    runMetrics};
