// Recording a run and its end, compared with the same statements given to SQLite.
#include <sqlite3.h>
#include <unistd.h>
#include <zelosched.h>

#include <cstdio>
#include <cstdlib>
#include <ctime>

#include "support/row.h"
#include "support/stored_tasks.h"

namespace {

constexpr char kDatabase[] = "/tmp/sched_status.sqlite";

sqlite3 *db;
const ZELO_SCHED_TASK *task;

void orDieInSql(int result) {
  orDie(result == SQLITE_OK, sqlite3_errmsg(db));
}

// Both sides begin with an empty table and the library's own connection.
void openEmpty() {
  sqlite3_close(db);
  unlink(kDatabase);
  db = ZELOSchedDBInit();
  orDie(db != nullptr, "ZELOSchedDBInit");
}

void empty() {
  orDieInSql(sqlite3_exec(db, "DELETE FROM task_status", nullptr, nullptr, nullptr));
}

void record() {
  int statusID = 0;
  orDie(ZELOSchedDBAddRecord(db, task, &statusID) == 0 &&
            ZELOSchedDBSetStatus(db, statusID, ZELO_SCHED_STATUS_RUNNING,
                                 ZELO_SCHED_STATUS_FINISHED, "") == 0,
        "recording a run");
  orDie(sqlite3_changes(db) == 1, "ZELOSchedDBSetStatus");
}

int takeNumber(void *number, int, char **values, char **) {
  *static_cast<int *>(number) = atoi(values[0]);
  return 0;
}

void recordInSql() {
  char statement[2048];
  const long now = time(nullptr);
  const int pid = getpid();
  int statusID = 0;
  snprintf(statement, sizeof(statement),
           "INSERT INTO task_status (app, pid, timestamp, task_id, status_code) "
           "VALUES ('%s', %d, %ld, %ld, %d);",
           task->App, pid, now, static_cast<long>(task->ID), ZELO_SCHED_STATUS_RUNNING);
  orDieInSql(sqlite3_exec(db, statement, nullptr, nullptr, nullptr));
  snprintf(statement, sizeof(statement),
           "SELECT status_id from task_status WHERE app='%s' AND task_id=%ld AND timestamp=%ld "
           "AND status_code=%d AND pid=%d;",
           task->App, static_cast<long>(task->ID), now, ZELO_SCHED_STATUS_RUNNING, pid);
  orDieInSql(sqlite3_exec(db, statement, takeNumber, &statusID, nullptr));
  snprintf(statement, sizeof(statement),
           "UPDATE task_status SET status_code=%d WHERE status_id=%d AND status_code=%d",
           ZELO_SCHED_STATUS_FINISHED, statusID, ZELO_SCHED_STATUS_RUNNING);
  orDieInSql(sqlite3_exec(db, statement, nullptr, nullptr, nullptr));
  orDie(sqlite3_changes(db) == 1, "the statements");
}

}  // namespace

void makeRows() {
  fillStore(0);
  task = newTask(1).release();  // never freed
  Row("ZELOSchedDBAddRecord, ZELOSchedDBSetStatus", Work{record, openEmpty, empty})
      .atMost(1.1, "the same statements, sqlite3_exec", Work{recordInSql, openEmpty, empty});
}
