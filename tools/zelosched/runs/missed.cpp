#include "runs/missed.h"

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>

#include "runs/coming_runs.h"
#include "runs/history.h"
#include "runs/kept_database.h"
#include "store/store_files.h"

namespace {

constexpr int64_t kMinute = 60;  // seconds

std::optional<time_t> lastRunBetween(const TaskRecord &task, time_t after, time_t last) {
  const std::vector<LocalMinute> runs = runsBetween(task, localMinute(after), localMinute(last));
  return runs.empty() ? std::nullopt : momentOf(runs.back());
}

// Cron begins with the minute after the one in which it was started.
void noteMissed(const KeptDatabase &kept, time_t lastUp, time_t now) {
  const TaskList list;
  const time_t after = std::max(lastUp, now - kMissedRemembered);
  Query note(kept, "INSERT OR REPLACE INTO missed(task_id, app, due) VALUES(?, ?, ?)");
  for (const TaskRecord *task : list.tasks()) {
    if (!isEnabled(*task) || isPower(*task)) continue;
    const std::optional<time_t> due = lastRunBetween(*task, after, now);
    if (due) note.with(task->ID).with(std::string(task->App)).with(*due).run();
  }
}

bool hasRunAt(const TaskRecord &task, time_t due) {
  return lastRunBetween(task, due - kMinute, due).has_value();
}

bool ranSince(const TaskRecord &task, time_t due) {
  RunFilter filter;
  filter.task = task.ID;
  filter.since = due;
  const std::vector<KeptRun> runs = keptRuns(filter);
  const time_t now = time(nullptr);
  // One behind now was recorded by a clock that was wrong.
  return std::any_of(runs.begin(), runs.end(), [&](const KeptRun &run) {
    return run.start && *run.start >= due && *run.start <= now;
  });
}

}  // namespace

// No time of theirs may count as passed over until they are.
bool areTasksLost() {
  struct stat info {};
  const bool isThere = lstat(kWorkingCopy, &info) == 0 && info.st_size > 0;
  return !isThere && (access(kPersistentCopy, F_OK) == 0 || access(kLastGoodCopy, F_OK) == 0);
}

void markMachineUp() {
  if (areTasksLost()) return;
  const KeptDatabase kept(KeptDatabase::kChange);
  const std::string boot = bootId();
  const time_t now = time(nullptr);
  Transaction transaction(kept);
  Query last(kept, "SELECT boot, seen FROM up");
  const bool isKnown = last.next();
  if (isKnown && last.text(0) != boot) noteMissed(kept, last.number(1), now);
  // Noted by a clock that was wrong. What is long past stays until the task is missed again: it may
  // be now that the clock is wrong.
  Query(kept, "DELETE FROM missed WHERE due > ?").with(now).run();
  Query(kept, "DELETE FROM up").run();
  Query(kept, "INSERT INTO up(boot, seen) VALUES(?, ?)").with(boot).with(now).run();
  transaction.commit();
}

std::vector<MissedTask> missedTasks(const TaskList &list, time_t since) {
  std::vector<MissedTask> missed;
  const KeptDatabase kept(KeptDatabase::kRead);
  if (!kept.isThere()) return missed;
  Query query(kept,
              "SELECT task_id, app, due FROM missed WHERE due BETWEEN ? AND ?"
              " ORDER BY due, task_id");
  query.with(since).with(time(nullptr));
  while (query.next()) {
    const auto &tasks = list.tasks();
    const auto found = std::find_if(tasks.begin(), tasks.end(), [&](const TaskRecord *task) {
      return task->ID == query.number(0) && task->App == query.text(1);
    });
    if (found == tasks.end() || !isEnabled(**found)) continue;
    const time_t due = query.number(2);
    if (hasRunAt(**found, due) && !ranSince(**found, due)) missed.push_back({*found, due});
  }
  return missed;
}

void forgetMissed(const TaskRecord &task) {
  const KeptDatabase kept(KeptDatabase::kChange);
  Query(kept, "DELETE FROM missed WHERE task_id = ?").with(task.ID).run();
}
