#include "status_db.h"

#include <sqlite3.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <memory>
#include <stdexcept>

#include "sandbox_fixture.h"

namespace support {
namespace {

constexpr char kCreateTable[] =
    "CREATE TABLE if not exists task_status(status_id INTEGER PRIMARY KEY ASC, pid INTEGER, "
    "timestamp INTEGER, app STRING, task_id INTEGER, status_code INTEGER, comment STRING);";

struct Close {
  void operator()(sqlite3 *database) const { sqlite3_close_v2(database); }
  void operator()(sqlite3_stmt *statement) const { sqlite3_finalize(statement); }
};
using Database = std::unique_ptr<sqlite3, Close>;
using Statement = std::unique_ptr<sqlite3_stmt, Close>;

Database openDatabase(int flags) {
  sqlite3 *database = nullptr;
  const int result = sqlite3_open_v2(kStatusDatabase, &database, flags, nullptr);
  Database owner(database);
  if (result != SQLITE_OK) throw std::runtime_error(sqlite3_errmsg(database));
  return owner;
}

Statement prepare(const Database &database, const char *sql) {
  sqlite3_stmt *statement = nullptr;
  sqlite3_prepare_v2(database.get(), sql, -1, &statement, nullptr);
  return Statement(statement);
}

std::optional<std::string> textOf(const Statement &statement, int column) {
  const unsigned char *text = sqlite3_column_text(statement.get(), column);
  if (text == nullptr) return std::nullopt;
  return reinterpret_cast<const char *>(text);
}

void bindText(const Statement &statement, int index, const std::optional<std::string> &text) {
  if (text) sqlite3_bind_text(statement.get(), index, text->c_str(), -1, SQLITE_TRANSIENT);
}

}  // namespace

std::vector<StatusRow> statusRows() {
  std::vector<StatusRow> rows;
  if (!fileExists(kStatusDatabase)) return rows;
  const Database database = openDatabase(SQLITE_OPEN_READONLY);
  const Statement select = prepare(database,
                                   "SELECT status_id, pid, timestamp, app, task_id, status_code, "
                                   "comment FROM task_status ORDER BY status_id");
  if (select == nullptr) return rows;
  while (sqlite3_step(select.get()) == SQLITE_ROW) {
    StatusRow row;
    int column = 0;
    row.statusId = static_cast<long>(sqlite3_column_int64(select.get(), column++));
    row.pid = static_cast<long>(sqlite3_column_int64(select.get(), column++));
    row.timestamp = sqlite3_column_int64(select.get(), column++);
    row.app = textOf(select, column++).value_or("");
    row.taskId = static_cast<long>(sqlite3_column_int64(select.get(), column++));
    row.statusCode = sqlite3_column_int(select.get(), column++);
    row.comment = textOf(select, column++);
    rows.push_back(row);
  }
  return rows;
}

long addStatusRow(const StatusRow &row) {
  const Database database = openDatabase(SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE);
  sqlite3_step(prepare(database, kCreateTable).get());
  const Statement insert = prepare(database,
                                   "INSERT INTO task_status (status_id, pid, timestamp, app, "
                                   "task_id, status_code, comment) VALUES (?, ?, ?, ?, ?, ?, ?)");
  if (insert == nullptr) throw std::runtime_error(sqlite3_errmsg(database.get()));
  int index = 1;
  if (row.statusId != 0) sqlite3_bind_int64(insert.get(), index, row.statusId);
  sqlite3_bind_int64(insert.get(), ++index, row.pid);
  sqlite3_bind_int64(insert.get(), ++index, row.timestamp);
  bindText(insert, ++index, row.app);
  sqlite3_bind_int64(insert.get(), ++index, row.taskId);
  sqlite3_bind_int(insert.get(), ++index, row.statusCode);
  bindText(insert, ++index, row.comment);
  if (sqlite3_step(insert.get()) != SQLITE_DONE) {
    throw std::runtime_error(sqlite3_errmsg(database.get()));
  }
  return static_cast<long>(sqlite3_last_insert_rowid(database.get()));
}

std::vector<int> waitForChildRuns() {
  std::vector<int> statuses;
  for (int status = 0;;) {
    if (waitpid(-1, &status, 0) > 0) {
      statuses.push_back(status);
    } else if (errno != EINTR) {
      return statuses;
    }
  }
}

pid_t deadProcess() {
  const pid_t child = fork();
  if (child == 0) _exit(0);
  waitpid(child, nullptr, 0);
  return child;
}

}  // namespace support
