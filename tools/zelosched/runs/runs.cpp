#include "runs/runs.h"

#include <sqlite3.h>
#include <sys/stat.h>
#include <unistd.h>
#include <zelocore.h>
#include <zelosched.h>

#include <cerrno>
#include <cstdint>
#include <cstring>

#include "runs/kept_database.h"
#include "terminal/failure.h"
#include "terminal/text.h"

namespace {

constexpr char kDatabase[] = "/tmp/sched_status.sqlite";

constexpr char kColumns[] =
    "SELECT status_id, pid, timestamp, app, task_id, status_code, comment FROM task_status ";

struct Finalize {
  void operator()(sqlite3_stmt *statement) const { sqlite3_finalize(statement); }
};
using Statement = std::unique_ptr<sqlite3_stmt, Finalize>;

std::string textOf(sqlite3_stmt *statement, int column) {
  const unsigned char *text = sqlite3_column_text(statement, column);
  const auto size = static_cast<size_t>(sqlite3_column_bytes(statement, column));
  return text == nullptr ? "" : std::string(reinterpret_cast<const char *>(text), size);
}

Run runOf(sqlite3_stmt *statement) {
  Run run;
  int column = 0;
  run.statusId = sqlite3_column_int64(statement, column++);
  run.pid = sqlite3_column_int64(statement, column++);
  run.start = sqlite3_column_int64(statement, column++);
  run.app = textOf(statement, column++);
  run.taskId = sqlite3_column_int64(statement, column++);
  run.statusCode = sqlite3_column_int(statement, column++);
  run.comment = textOf(statement, column++);
  if (isGone(run)) run.statusCode = ZELO_SCHED_STATUS_GONE;
  return run;
}

Failure cannotRead(const char *why) {
  return Failure(std::string("cannot read ") + kDatabase + ": " + why);
}

}  // namespace

bool isGone(const Run &run) {
  constexpr int kAlive = 1;
  const bool isProcess = run.pid > 0 && run.pid <= INT32_MAX;
  return run.statusCode == ZELO_SCHED_STATUS_RUNNING &&
         (!isProcess || QLIBCProcAlive(static_cast<pid_t>(run.pid)) != kAlive);
}

std::string runDatabaseName() {
  struct stat info {};
  if (lstat(kDatabase, &info) != 0) return "";
  return bootId() + " " + std::to_string(info.st_dev) + ":" + std::to_string(info.st_ino);
}

bool mayReadRuns() {
  return access(kDatabase, R_OK | W_OK) == 0 || errno != EACCES;
}

RunDatabase::RunDatabase(int patience) {
  struct stat info {};
  if (lstat(kDatabase, &info) != 0) {
    if (errno == ENOENT) return;
    throw cannotRead(std::strerror(errno));
  }
  // A link that leads nowhere is not "no run so far": none can be recorded.
  if (!S_ISREG(info.st_mode)) throw cannotRead("it is no regular file");
  if (!mayReadRuns()) throw cannotRead("that takes root's rights");
  forgetError();
  db_.reset(ZELOSchedDBInit());
  if (db_ == nullptr) throw failedTo(std::string("read ") + kDatabase);
  sqlite3_busy_timeout(db_.get(), patience);
}

std::vector<Run> RunDatabase::select(const char *rest, const std::vector<int64_t> &values) const {
  std::vector<Run> runs;
  if (db_ == nullptr) return runs;
  sqlite3_stmt *prepared = nullptr;
  const std::string sql = std::string(kColumns) + rest;
  if (sqlite3_prepare_v2(db_.get(), sql.c_str(), -1, &prepared, nullptr) != SQLITE_OK) {
    throw cannotRead(sqlite3_errmsg(db_.get()));
  }
  const Statement statement(prepared);
  for (size_t i = 0; i < values.size(); ++i) {
    sqlite3_bind_int64(statement.get(), static_cast<int>(i + 1), values[i]);
  }
  int result;
  while ((result = sqlite3_step(statement.get())) == SQLITE_ROW) {
    runs.push_back(runOf(statement.get()));
  }
  if (result != SQLITE_DONE) throw cannotRead(sqlite3_errmsg(db_.get()));
  return runs;
}

std::vector<Run> RunDatabase::newest(std::optional<int64_t> taskId, int64_t limit) const {
  if (taskId) {
    return select("WHERE task_id = ? ORDER BY timestamp DESC, status_id DESC LIMIT ?",
                  {*taskId, limit});
  }
  return select("ORDER BY timestamp DESC, status_id DESC LIMIT ?", {limit});
}

std::map<int64_t, Run> RunDatabase::latestOfEach() const {
  std::map<int64_t, Run> latest;
  for (const Run &run : select("ORDER BY timestamp, status_id", {})) latest[run.taskId] = run;
  return latest;
}

std::vector<Run> RunDatabase::running() const {
  std::vector<Run> runs =
      select("WHERE status_code = ? ORDER BY timestamp, status_id", {ZELO_SCHED_STATUS_RUNNING});
  std::erase_if(runs, [](const Run &run) { return run.statusCode != ZELO_SCHED_STATUS_RUNNING; });
  return runs;
}

int64_t RunDatabase::lastStatusId() const {
  const std::vector<Run> last = select("ORDER BY status_id DESC LIMIT 1", {});
  return last.empty() ? 0 : last.front().statusId;
}

std::optional<Run> RunDatabase::runOfProcess(int64_t pid, int64_t statusId) const {
  const std::vector<Run> found =
      select("WHERE pid = ? AND status_id > ? ORDER BY status_id DESC", {pid, statusId});
  if (found.empty()) return std::nullopt;
  return found.front();
}

std::vector<Run> RunDatabase::after(int64_t statusId) const {
  return select("WHERE status_id > ? ORDER BY status_id", {statusId});
}

std::optional<Run> RunDatabase::runOfId(int64_t statusId) const {
  const std::vector<Run> found = select("WHERE status_id = ?", {statusId});
  if (found.empty()) return std::nullopt;
  return found.front();
}

std::optional<Run> RunDatabase::inTheWayOf(std::optional<int64_t> taskId,
                                           std::optional<std::string> app, int64_t pid) const {
  for (const Run &run : running()) {
    const bool isInTheWay = (taskId && run.taskId == *taskId) || (app && run.app == *app);
    if (isInTheWay && run.pid != pid) return run;
  }
  return std::nullopt;
}

void RunDatabase::Close::operator()(sqlite3 *db) const {
  sqlite3_close(db);
}
