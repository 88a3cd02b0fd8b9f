#include "runs/history_keep.h"

#include <zelosched.h>

#include <algorithm>
#include <cstdio>
#include <tuple>

#include "runs/kept_database.h"
#include "runs/missed.h"
#include "terminal/failure.h"
#include "terminal/text.h"

namespace {

constexpr long kMostRuns = 100000;

#define RUN_KEY "timestamp, status_id, pid, task_id, app"

constexpr char kKeep[] =
    "INSERT INTO run(" RUN_KEY
    ", status_code, comment, boot)"
    " VALUES(?, ?, ?, ?, ?, ?, ?, ?)"
    " ON CONFLICT DO UPDATE SET status_code = excluded.status_code, comment = excluded.comment"
    " WHERE status_code <> excluded.status_code OR comment <> excluded.comment";
// By their number alone: a clock that is wrong for once must not take the history away.
constexpr char kDropMany[] =
    "DELETE FROM run WHERE (" RUN_KEY
    ") <"
    " (SELECT " RUN_KEY
    " FROM run ORDER BY timestamp DESC, status_id DESC, pid DESC, task_id DESC,"
    " app DESC LIMIT 1 OFFSET ?)";

#define SELECT_RUNS "SELECT " RUN_KEY ", status_code, comment, boot FROM run "
constexpr char kNewest[] = SELECT_RUNS "ORDER BY timestamp DESC, status_id DESC LIMIT ?";
constexpr char kNewestOfTask[] =
    SELECT_RUNS "WHERE task_id = ? ORDER BY timestamp DESC, status_id DESC LIMIT ?";

// Carried over as running, by this boot or an earlier one, whose processes are all gone.
bool isGone(const Run &run, bool isThisBoot) {
  return isThisBoot ? isGone(run) : run.statusCode == ZELO_SCHED_STATUS_RUNNING;
}

Run runOf(const Query &query, const std::string &thisBoot) {
  Run run;
  int column = 0;
  run.start = query.number(column++);
  run.statusId = query.number(column++);
  run.pid = query.number(column++);
  run.taskId = query.number(column++);
  run.app = query.text(column++);
  run.statusCode = static_cast<int>(query.number(column++));
  run.comment = query.text(column++);
  if (isGone(run, query.text(column) == thisBoot)) run.statusCode = ZELO_SCHED_STATUS_GONE;
  return run;
}

std::vector<Run> keptRuns(std::optional<long> taskId, long limit) {
  std::vector<Run> runs;
  const KeptDatabase kept(KeptDatabase::kRead);
  if (!kept.isThere()) return runs;
  const std::string boot = bootId();
  Query query(kept, taskId ? kNewestOfTask : kNewest);
  if (taskId) query.with(*taskId);
  query.with(limit);
  while (query.next()) runs.push_back(runOf(query, boot));
  return runs;
}

// What tells it from every other; it never changes.
auto identityOf(const Run &run) {
  return std::tie(run.start, run.statusId, run.pid, run.taskId, run.app);
}

bool isSame(const Run &a, const Run &b) {
  return identityOf(a) == identityOf(b);
}

bool isNewer(const Run &a, const Run &b) {
  return identityOf(a) > identityOf(b);
}

// Leaves one of each two that are the same. Of a run that is in both databases, the row of the
// status database comes first and has the later result. But where that database outlived a boot, a
// run that is "running" there may have the number of a process of today, and only the kept row
// knows.
std::vector<Run> withoutDoubles(const std::vector<Run> &sorted) {
  std::vector<Run> runs;
  for (const Run &run : sorted) {
    if (runs.empty() || !isSame(runs.back(), run)) {
      runs.push_back(run);
    } else if (runs.back().statusCode == ZELO_SCHED_STATUS_RUNNING) {
      runs.back().statusCode = run.statusCode;
    }
  }
  return runs;
}

// Newest first.
std::vector<Run> together(std::vector<Run> recent, const std::vector<Run> &kept, long limit) {
  recent.insert(recent.end(), kept.begin(), kept.end());
  std::stable_sort(recent.begin(), recent.end(), isNewer);
  std::vector<Run> runs = withoutDoubles(recent);
  if (runs.size() > static_cast<size_t>(limit)) runs.resize(static_cast<size_t>(limit));
  return runs;
}

void keepRuns() {
  const std::vector<Run> runs = RunDatabase().newest(std::nullopt, kMostRuns);
  const KeptDatabase kept(KeptDatabase::kChange);
  const std::string boot = bootId();
  Transaction transaction(kept);
  Query keep(kept, kKeep);
  long count = 0;
  for (const Run &run : runs) {
    keep.with(run.start).with(run.statusId).with(run.pid).with(run.taskId).with(run.app);
    count += keep.with(run.statusCode).with(run.comment).with(boot).run();
  }
  Query(kept, kDropMany).with(kMostRuns - 1).run();
  transaction.commit();
  // A timer calls this: nothing new is nothing to fill the log with.
  if (count > 0) std::printf("%s kept\n", counted(static_cast<size_t>(count), "run").c_str());
}

}  // namespace

int keepHistory() {
  return std::max(attempt(keepRuns), attempt(markMachineUp));
}

std::vector<Run> allRuns(std::optional<long> taskId, long limit) {
  return together(RunDatabase().newest(taskId, limit), keptRuns(taskId, limit), limit);
}

int collectRuns(std::optional<long> taskId, long limit, std::vector<Run> *runs) {
  std::vector<Run> recent;
  std::vector<Run> kept;
  const int results[] = {
      attempt([&] { recent = RunDatabase().newest(taskId, limit); }),
      attempt([&] { kept = keptRuns(taskId, limit); }),
  };
  *runs = together(std::move(recent), kept, limit);
  return *std::max_element(std::begin(results), std::end(results));
}

bool mayReadAllRuns() {
  return mayReadRuns() && !isKeptFromUs();
}
