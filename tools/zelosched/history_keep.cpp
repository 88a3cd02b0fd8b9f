#include "history_keep.h"

#include <zelocore.h>
#include <zelosched.h>

#include <algorithm>
#include <cstdio>
#include <ctime>
#include <tuple>

#include "command.h"
#include "kept_database.h"
#include "missed.h"
#include "text.h"

namespace {

constexpr long kMostRuns = 100000;
constexpr long kLongest = 366L * 24 * 60 * 60;  // seconds
constexpr int kAlive = 1;

constexpr char kKeep[] =
    "INSERT INTO run(timestamp, status_id, pid, task_id, app, status_code, comment, boot)"
    " VALUES(?, ?, ?, ?, ?, ?, ?, ?)"
    " ON CONFLICT DO UPDATE SET status_code = excluded.status_code, comment = excluded.comment"
    " WHERE status_code <> excluded.status_code OR comment <> excluded.comment";
constexpr char kDropOld[] = "DELETE FROM run WHERE timestamp < ?";
constexpr char kDropMany[] =
    "DELETE FROM run WHERE timestamp <"
    " (SELECT timestamp FROM run ORDER BY timestamp DESC LIMIT 1 OFFSET ?)";

#define SELECT_RUNS \
  "SELECT timestamp, status_id, pid, task_id, app, status_code, comment, boot FROM run "
constexpr char kNewest[] = SELECT_RUNS "ORDER BY timestamp DESC, status_id DESC LIMIT ?";
constexpr char kNewestOfTask[] =
    SELECT_RUNS "WHERE task_id = ? ORDER BY timestamp DESC, status_id DESC LIMIT ?";

// Carried over as running, by this boot or an earlier one, whose processes are all gone.
bool isGone(const Run &run, bool isThisBoot) {
  if (run.statusCode != ZELO_SCHED_STATUS_RUNNING) return false;
  return !isThisBoot || QLIBCProcAlive(static_cast<pid_t>(run.pid)) != kAlive;
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

auto identityOf(const Run &run) {
  return std::tie(run.start, run.statusId, run.pid, run.taskId, run.app);
}

bool isSame(const Run &a, const Run &b) {
  return identityOf(a) == identityOf(b);
}

bool isNewer(const Run &a, const Run &b) {
  return identityOf(a) > identityOf(b);
}

}  // namespace

int keepHistory() {
  markMachineUp();
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
  Query(kept, kDropOld).with(time(nullptr) - kLongest).run();
  Query(kept, kDropMany).with(kMostRuns - 1).run();
  transaction.commit();
  // A timer calls this: nothing new is nothing to fill the log with.
  if (count > 0) std::printf("%s kept\n", counted(static_cast<size_t>(count), "run").c_str());
  return kDone;
}

std::vector<Run> allRuns(std::optional<long> taskId, long limit) {
  std::vector<Run> runs = RunDatabase().newest(taskId, limit);
  const std::vector<Run> kept = keptRuns(taskId, limit);
  runs.insert(runs.end(), kept.begin(), kept.end());
  // Of a run that is in both, the row of the status database is the later one, and comes first.
  std::stable_sort(runs.begin(), runs.end(), isNewer);
  runs.erase(std::unique(runs.begin(), runs.end(), isSame), runs.end());
  if (runs.size() > static_cast<size_t>(limit)) runs.resize(static_cast<size_t>(limit));
  return runs;
}

bool mayReadAllRuns() {
  return mayReadRuns() && !isKeptFromUs();
}
