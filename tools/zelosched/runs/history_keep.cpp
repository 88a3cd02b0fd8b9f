#include "runs/history_keep.h"

#include <sys/stat.h>
#include <unistd.h>
#include <zelosched.h>

#include <algorithm>
#include <cstdio>
#include <ctime>

#include "runs/history.h"
#include "runs/missed.h"
#include "runs/notices.h"
#include "runs/output_file.h"
#include "runs/runs.h"
#include "runs/status_row.h"
#include "runs/task_notes.h"
#include "store/owner.h"
#include "store/store_copy.h"
#include "store/store_files.h"
#include "store/task_list.h"
#include "store/task_program.h"
#include "terminal/failure.h"
#include "terminal/text.h"

namespace {

class Sweep {
 public:
  Sweep(const RunDatabase &status, const TaskList &list) : status_(status), list_(list) {}

  // In one transaction. Returns how many rows of the history it added or changed.
  int64_t run(const KeptDatabase &kept);
  const std::vector<int64_t> &runsWithoutKeeper() const { return withoutKeeper_; }

 private:
  void takeOver(const KeptDatabase &kept);
  void takeOver(const KeptDatabase &kept, const Run &row);
  void lookAfter(const KeptDatabase &kept, KeptRun run);
  std::optional<Run> rowOf(const KeptRun &run) const;
  bool isOverByItsRow(const KeptRun &run) const;
  void endByRow(KeptRun *run) const;
  const TaskRecord *taskOf(const KeptRun &run) const;
  void describe(KeptRun *run) const;
  void save(const KeptDatabase &kept, KeptRun *run);

  const RunDatabase &status_;
  const TaskList &list_;
  std::string boot_ = bootId();
  Settings settings_ = settingsOrComplaints();
  int64_t changed_ = 0;
  std::vector<int64_t> withoutKeeper_;
};

// The run in the history whose keeper has not read the row yet, which it does at the end.
std::vector<KeptRun> underWayOf(const KeptDatabase &kept, const Run &row, const std::string &boot) {
  RunFilter filter;
  filter.underWay = true;
  std::vector<KeptRun> found = runsOf(kept, filter);
  std::erase_if(found, [&](const KeptRun &run) {
    return run.statusId || run.process.pid != row.pid || run.task != row.taskId || run.boot != boot;
  });
  return found;
}

bool isProcessAlive(const KeptRun &run) {
  if (run.process.born != 0) return isAlive(run.process);
  // Only the pid is known.
  return run.process.pid > 0 && run.process.pid <= INT32_MAX &&
         isAlive(processNamed(run.process.pid));
}

// The column of the status database has a numeric affinity: a name 007 is 7 there.
bool isSameApp(const std::string &app, const std::string &recorded) {
  if (app == recorded) return true;
  char *end = nullptr;
  const double number = std::strtod(app.c_str(), &end);
  char *endOfRecorded = nullptr;
  const double numberRecorded = std::strtod(recorded.c_str(), &endOfRecorded);
  return !app.empty() && *end == '\0' && !recorded.empty() && *endOfRecorded == '\0' &&
         std::abs(number - numberRecorded) <= 0;
}

const TaskRecord *Sweep::taskOf(const KeptRun &run) const {
  const auto &tasks = list_.tasks();
  const auto found = std::find_if(tasks.begin(), tasks.end(), [&](const TaskRecord *task) {
    return task->ID == run.task && isSameApp(task->App, run.app);
  });
  return found == tasks.end() ? nullptr : *found;
}

void Sweep::describe(KeptRun *run) const {
  const TaskRecord *const task = taskOf(*run);
  if (task == nullptr) return;
  run->taskName = task->Name;
  run->app = task->App;
  run->owner = userName(task->Owner);
}

void Sweep::save(const KeptDatabase &kept, KeptRun *run) {
  saveRun(kept, run);
  ++changed_;
}

void Sweep::takeOver(const KeptDatabase &kept, const Run &row) {
  if (isKnown(kept, row)) return;
  std::vector<KeptRun> underWay = underWayOf(kept, row, boot_);
  if (!underWay.empty()) {
    KeptRun &run = underWay.front();
    if (isAlive(run.keeper)) return;  // it writes the row at the end
    run.start = row.start;
    run.statusId = row.statusId;
    run.state = RunState::kRunning;  // until lookAfter() has looked at it
    save(kept, &run);
    return;
  }
  KeptRun run;
  run.task = row.taskId;
  run.app = row.app;
  run.boot = boot_;
  run.trigger = Trigger::kOther;
  takeStatus(row, &run);
  describe(&run);
  if (run.state == RunState::kRunning) run.process = processOf(row);
  // Of runs that other programs have started, only lost ones are reported.
  run.isTold = run.outcome != Outcome::kLost && run.state == RunState::kEnded;
  save(kept, &run);
}

void Sweep::takeOver(const KeptDatabase &kept) {
  const std::string name = runDatabaseName();
  Query last(kept, "SELECT status_id FROM swept WHERE file = ?");
  last.with(name);
  int64_t done = last.next() ? last.number(0) : 0;
  if (status_.lastStatusId() < done) done = 0;  // it has been emptied
  for (const Run &row : status_.after(done)) {
    takeOver(kept, row);
    done = row.statusId;
  }
  Query(kept, "DELETE FROM swept WHERE file <> ?").with(name).run();
  Query(kept,
        "INSERT INTO swept(file, status_id) VALUES(?1, ?2)"
        " ON CONFLICT DO UPDATE SET status_id = ?2 WHERE status_id <> ?2")
      .with(name)
      .with(done)
      .run();
}

// The row of the run in the status database.
std::optional<Run> Sweep::rowOf(const KeptRun &run) const {
  std::optional<Run> row =
      run.statusId ? status_.runOfId(*run.statusId) : status_.runOfProcess(run.process.pid, 0);
  if (!row || row->pid != run.process.pid || row->taskId != run.task) return std::nullopt;
  // Before its row was read, `start` is when its keeper saw it begin.
  const bool isItsTime =
      run.statusId ? row->start == run.start : run.queued && row->start >= *run.queued;
  return isItsTime ? row : std::nullopt;
}

// The run's process writes its row last of all.
bool Sweep::isOverByItsRow(const KeptRun &run) const {
  const std::optional<Run> row = rowOf(run);
  return row && row->statusCode != ZELO_SCHED_STATUS_RUNNING;
}

// For a run whose process and keeper are gone: its row gives the outcome.
void Sweep::endByRow(KeptRun *run) const {
  if (const std::optional<Run> row = rowOf(*run)) {
    takeStatus(*row, run);
  } else {
    run->outcome = run->stopAsked && !run->start ? Outcome::kCancelled : Outcome::kLost;
  }
  if (run->state != RunState::kEnded) run->outcome = Outcome::kLost;
  run->state = RunState::kEnded;
  const TaskRecord *const task = taskOf(*run);
  judgeEnd(task == nullptr ? "" : task->Command, run->stopAsked.has_value(), run);
}

void Sweep::lookAfter(const KeptDatabase &kept, KeptRun run) {
  const bool isOfThisBoot = run.boot == boot_;
  if (isOfThisBoot && isAlive(run.keeper)) return;
  if (isOfThisBoot && isProcessAlive(run)) {
    if (run.keeper.pid != 0) {
      withoutKeeper_.push_back(run.run);
      return;
    }
    if (!isOverByItsRow(run)) return;
  }
  if (isOfThisBoot) {
    endByRow(&run);
  } else {
    run.outcome = Outcome::kLost;
    run.state = RunState::kEnded;
  }
  if (run.trigger == Trigger::kOther && !run.isTold) run.isTold = run.outcome != Outcome::kLost;
  // What its keeper had read before it was killed.
  OutputFile printed = OutputFile::open(run.process);
  run.outputBytes = std::max(run.outputBytes, printed.total());
  save(kept, &run);
  if (printed.isOpen()) saveOutput(kept, run, printed.contents(), settings_);
  printed.remove();
}

// Whether the list has every stored task: the library leaves out those that it cannot read.
bool isWhole(const TaskList &list) {
  const auto ordinary = std::count_if(list.tasks().begin(), list.tasks().end(),
                                      [](const TaskRecord *task) { return !isPower(*task); });
  const std::optional<int> stored = countSections(kWorkingCopy);
  return stored && *stored == ordinary;
}

int64_t Sweep::run(const KeptDatabase &kept) {
  Transaction transaction(kept);
  if (!areTasksLost()) noteTasks(kept, list_, isWhole(list_));
  takeOver(kept);
  RunFilter filter;
  filter.underWay = true;
  for (KeptRun &run : runsOf(kept, filter)) lookAfter(kept, std::move(run));
  transaction.commit();
  return changed_;
}

int64_t sweep(const TaskList &list) {
  const RunDatabase status;
  if (status.lastStatusId() == 0 && !KeptDatabase(KeptDatabase::kRead).isThere()) return 0;
  const KeptDatabase kept(KeptDatabase::kChange);
  Sweep sweep(status, list);
  const int64_t changed = sweep.run(kept);
  for (const int64_t run : sweep.runsWithoutKeeper()) {
    startDetached(installedTaskProgram(), {"--keep", "run=" + std::to_string(run)});
  }
  return changed;
}

// Prints nothing when nothing was kept, as the timer would fill the log with it.
void sweepAndSay() {
  const int64_t count = sweep(TaskList(TaskList::Unreadable::kIsLeftOut));
  if (count > 0) std::printf("%s kept\n", counted(static_cast<size_t>(count), "run").c_str());
}

// Marks the runs as told before that is done: a notice may be lost, but is not sent twice.
std::vector<KeptRun> takeUntold(const KeptDatabase &kept) {
  Transaction transaction(kept);
  Query query(kept, "SELECT run FROM run WHERE told = 0 AND state = 2");
  std::vector<KeptRun> untold;
  while (query.next()) {
    RunFilter filter;
    filter.run = query.number(0);
    for (KeptRun &run : runsOf(kept, filter)) untold.push_back(std::move(run));
  }
  Query note(kept, "UPDATE run SET told = 1 WHERE run = ?");
  for (const KeptRun &run : untold) note.with(run.run).run();
  transaction.commit();
  return untold;
}

// Each missed time is taken once, also when there is no program to notify.
std::vector<RunRecord> takeUntoldMissed(const KeptDatabase &kept, const TaskList &list) {
  std::vector<RunRecord> untold;
  const std::map<int64_t, TaskNote> notes = taskNotes(kept);
  Transaction transaction(kept);
  for (const MissedTask &missed : missedTasks(kept, list, 0)) {
    const auto note = notes.find(missed.task->ID);
    if (missed.times == 0 || note == notes.end()) continue;
    if (!noteTold(kept, "missed", note->second.generation, missed.due)) continue;
    RunRecord record;
    record.task = missed.task->ID;
    record.taskName = missed.task->Name;
    record.app = missed.task->App;
    record.owner = userName(missed.task->Owner);
    record.trigger = Trigger::kSchedule;
    record.due = missed.due;
    untold.push_back(std::move(record));
  }
  transaction.commit();
  return untold;
}

void tellOfMissedRuns() {
  const TaskList list(TaskList::Unreadable::kIsLeftOut);
  std::vector<RunRecord> untold;
  {
    const KeptDatabase kept(KeptDatabase::kRead);
    if (!kept.isThere()) return;
    untold = takeUntoldMissed(kept, list);
  }
  for (const RunRecord &record : untold) tellOfMissed(record);
}

void forgetUntold() {
  const KeptDatabase kept(KeptDatabase::kRead);
  if (!kept.isThere()) return;
  takeUntold(kept);
  takeUntoldMissed(kept, TaskList(TaskList::Unreadable::kIsLeftOut));
}

// The unit of the sweep restricts what an administrator's programs need, such as a mailer.
void haveRunsToldOf() {
  // A program that is added later is not notified of earlier runs.
  if (!isAnybodyToBeTold()) {
    forgetUntold();
    return;
  }
  if (isUnit()) {
    startDetached(ownProgram(), {"history", "--tell"});
  } else {
    tellOfRuns();
  }
}

void dropOld() {
  const KeptDatabase kept(KeptDatabase::kChange);
  Transaction transaction(kept);
  SettingsFaults faults;
  dropOldRuns(kept, readSettings(&faults));
  transaction.commit();
}

}  // namespace

void tellOfRuns() {
  std::vector<KeptRun> untold;
  std::vector<Output> outputs;
  {
    const KeptDatabase kept(KeptDatabase::kRead);
    if (!kept.isThere()) return;
    untold = takeUntold(kept);
    for (const KeptRun &run : untold) {
      outputs.push_back(outputOf(kept, run.run).value_or(Output()));
    }
  }
  for (size_t i = 0; i < untold.size(); ++i) tellOfEnd(untold[i], outputs[i], false);
  tellOfMissedRuns();
}

void sweepRuns() {
  sweep(TaskList(TaskList::Unreadable::kIsLeftOut));
}

void sweepRuns(const TaskList &list) {
  sweep(list);
}

int keepHistory() {
  const int swept = attempt(sweepAndSay);
  const int noted = attempt([] { markMachineUp(false); });
  if (swept != kDone || noted != kDone) return std::max(swept, noted);
  return std::max(attempt(dropOld), attempt(haveRunsToldOf));
}

bool mayReadAllRuns() {
  return mayReadRuns() && !isKeptFromUs();
}
