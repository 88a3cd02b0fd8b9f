// The status database: one row for every run of a task.
//
// Values are put into the statements unescaped, so an application's name can end its quotes and go
// on as SQL, within the limits of sched_db_text.cpp. The connection is the caller's: its
// authorizer, limits and hooks are not used or changed here.
#include <fcntl.h>
#include <sqlite3.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>
#include <zelocore.h>
#include <zelosched.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>

#include "sched_db_text.h"
#include "sched_db_vfs.h"
#include "sched_report.h"
#include "sched_shared_names.h"
#include "sched_text.h"

namespace {

constexpr char kDatabase[] = "/tmp/sched_status.sqlite";
constexpr char kCreateTable[] =
    "CREATE TABLE if not exists task_status(status_id INTEGER PRIMARY KEY ASC, pid INTEGER, "
    "timestamp INTEGER, app STRING, task_id INTEGER, status_code INTEGER, comment STRING);";
constexpr int kAnyStatusID = -1;
constexpr int kAlive = 1;
constexpr int kMostLockedRetries = 100;

using RowCallback = int (*)(void *context, int columns, char **values, char **names);

bool isNamed(const char *szName, const char *szExpected) {
  return szName != nullptr && strcmp(szName, szExpected) == 0;
}

// Random, so that processes that collided do not collide again.
useconds_t lockedWait() {
  constexpr int32_t kSpread = 1000000;
  constexpr int32_t kShortest = 100000;
  constexpr uint32_t kLongest = 999999;
  constexpr int kShift = 5;
  const auto shifted = static_cast<int32_t>(static_cast<uint32_t>(rand()) << kShift);
  const int32_t wait = shifted % kSpread + kShortest;
  return std::min(static_cast<uint32_t>(wait), kLongest);
}

void reportFailedStatement(const char *szSql, const char *szError) {
  SCHED_LOG("Exec sql:[%s] error: %s\n", szSql, szError);
}

int execute(sqlite3 *db, const char *szSql, RowCallback takeRow, void *context) {
  for (int retries = 0;; ++retries) {
    char *szError = nullptr;
    if (sqlite3_exec(db, szSql, takeRow, context, &szError) == SQLITE_OK) {
      return 0;
    }
    if (szError == nullptr) {
      return -1;
    }
    const bool locked = strstr(szError, kLocked) != nullptr;
    if (!locked || retries == kMostLockedRetries) {
      reportFailedStatement(szSql, szError);
      sqlite3_free(szError);
      return -1;
    }
    sqlite3_free(szError);
    usleep(lockedWait());
  }
}

// A statement that was cut could lack its WHERE clause: it is not run.
int execute(sqlite3 *db, const Statement &statement, RowCallback takeRow, void *context) {
  if (statement.wasCut()) {
    reportFailedStatement(statement.c_str(), "statement too long");
    return -1;
  }
  return execute(db, statement.c_str(), takeRow, context);
}

// For a statement with an unescaped text between apostrophes.
int execute(sqlite3 *db, const Statement &statement, const char *szText, AfterText after,
            RowCallback takeRow, void *context) {
  Refusal reason;
  if (!statement.wasCut() && isRefused(szText, after, &reason)) {
    reportFailedStatement(statement.c_str(), reason.c_str());
    return -1;
  }
  return execute(db, statement, takeRow, context);
}

constexpr mode_t kOwnersOnly = 0600;  // a reader's lock would prevent the recording of runs

const SchedSharedName &nameOf(const char *szPath) {
  return strcmp(szPath, kSchedJournal.path) == 0 ? kSchedJournal : kSchedDatabase;
}

bool holdName(const char *szPath, bool mayMake) {
  return mayMake ? schedTakeName(nameOf(szPath))
                 : schedLookAt(nameOf(szPath), nullptr) == SchedNameState::kOurs;
}

void createDatabase() {
  const mode_t mask = umask(static_cast<mode_t>(~kOwnersOnly) & 0777);
  QLIBCFileTouch(kDatabase);
  umask(mask);
  schedReserve(kSchedDatabase);
}

bool takeName(const SchedSharedName &name) {
  if (schedTakeName(name)) {
    return true;
  }
  const char *szWhy = "cannot be made";
  schedLookAt(name, &szWhy);
  BoundedText<128> text;
  text.append("%s %s", name.path, szWhy != nullptr ? szWhy : "was another user's");
  SCHED_SET_ERROR(kErrOpen);
  SCHED_LOG("Can't open database: %s\n", text.c_str());
  return false;
}

// Only a process that may write the database makes the journal: one of another user would block
// the database's owner.
bool takeNames() {
  if (schedLookAt(kSchedDatabase, nullptr) == SchedNameState::kFree) {
    createDatabase();
  }
  return takeName(kSchedDatabase) && (eaccess(kDatabase, W_OK) != 0 || takeName(kSchedJournal));
}

// Exchanges the database for an empty one, so that the name is never free. The old one and its log
// are moved into a directory that nobody else can enter: its rows can still be read there, and
// nobody can plant a journal beside it.
bool moveAside() {
  SchedMovedTo movedTo;
  if (!schedMoveAside(kSchedDatabase, &movedTo)) {
    return false;
  }
  constexpr SchedSharedName kLog = {"/tmp/sched_status.sqlite-wal", kOwnersOnly, false, ""};
  if (schedLookAt(kLog, nullptr) == SchedNameState::kOurs) {
    BoundedText<sizeof(movedTo) + sizeof("-wal")> log;
    log.append("%s-wal", movedTo);
    rename(kLog.path, log.c_str());
  }
  SCHED_LOG("%s was in WAL mode and is now %s\n", kDatabase, movedTo);
  return true;
}

int openDatabase(sqlite3 **ppHandle) {
  return openOwnFilesOnly(kDatabase, holdName, ppHandle);
}

bool isInWalMode(sqlite3 *db) {
  return sqlite3_extended_errcode(db) == kInWalMode;
}

// In WAL mode SQLite would need files whose names other users can take. A lock on the journal
// keeps a process from moving the new database of another one aside.
int openInPlaceOfWal(sqlite3 **ppHandle) {
  const int turn = open(kSchedJournal.path, O_RDWR | O_NOFOLLOW | O_CLOEXEC);
  if (turn < 0) {
    return SQLITE_CANTOPEN;
  }
  int result = SQLITE_CANTOPEN;
  if (flock(turn, LOCK_EX) == 0) {
    sqlite3_close(*ppHandle);
    result = openDatabase(ppHandle);
    if (result != SQLITE_OK && isInWalMode(*ppHandle) && moveAside()) {
      sqlite3_close(*ppHandle);
      result = openDatabase(ppHandle);
    }
  }
  close(turn);
  return result;
}

// Cheaper than emptying the journal after each transaction, and its blocks stay allocated.
void keepJournal(sqlite3 *db) {
  sqlite3_stmt *statement = nullptr;
  if (sqlite3_prepare_v2(db, "PRAGMA journal_mode=PERSIST", -1, &statement, nullptr) == SQLITE_OK) {
    sqlite3_step(statement);
  }
  sqlite3_finalize(statement);
}

// A row of the table. The time of the interface's record has only 32 bits, which end in 2038.
struct Row : ZELO_SCHED_STATUS {
  long long started;
};

// strtol would give other numbers where long has 32 bits.
long long numberOf(const char *szValue) {
  return szValue != nullptr ? strtoll(szValue, nullptr, 10) : 0;
}

long asLong(long long number) {
  return static_cast<long>(std::clamp<long long>(number, LONG_MIN, LONG_MAX));
}

void takeColumn(Row *row, const char *szColumn, const char *szValue) {
  if (isNamed(szColumn, "pid")) {
    row->pid = static_cast<int32_t>(numberOf(szValue));
  } else if (isNamed(szColumn, "status_id")) {
    row->statusID = static_cast<int32_t>(numberOf(szValue));
  } else if (isNamed(szColumn, "timestamp")) {
    row->started = numberOf(szValue);
    row->timestamp = static_cast<int32_t>(row->started);
  } else if (isNamed(szColumn, "task_id")) {
    row->taskID = asLong(numberOf(szValue));
  } else if (isNamed(szColumn, "app")) {
    copyText(row->szApp, szValue != nullptr ? szValue : "");
  } else if (isNamed(szColumn, "status_code")) {
    row->statusCode = static_cast<int32_t>(numberOf(szValue));
  } else if (isNamed(szColumn, "comment")) {
    copyText(row->szComment, szValue != nullptr ? szValue : "");
  }
}

void takeColumns(Row *row, int columns, char **values, char **names) {
  for (int i = 0; i < columns; ++i) {
    takeColumn(row, names[i], values[i]);
  }
}

int takeFirstRow(void *context, int columns, char **values, char **names) {
  auto *row = static_cast<Row *>(context);
  if (row->found == 0) {
    takeColumns(row, columns, values, names);
    row->found = 1;
  }
  return 0;
}

int takeFirstLiveRow(void *context, int columns, char **values, char **names) {
  auto *live = static_cast<ZELO_SCHED_STATUS *>(context);
  if (live->found != 0) {
    return 0;
  }
  Row row = {};
  takeColumns(&row, columns, values, names);
  if (row.pid > 0 && QLIBCProcAlive(row.pid) == kAlive) {
    live->pid = row.pid;
    live->statusID = row.statusID;
    live->taskID = row.taskID;
    live->found = 1;
  }
  return 0;
}

// A run that was killed could not record its end.
int reportedCode(const ZELO_SCHED_STATUS &row) {
  const bool gone = row.statusCode == ZELO_SCHED_STATUS_RUNNING && row.pid > 0 &&
                    QLIBCProcAlive(row.pid) != kAlive;
  return gone ? ZELO_SCHED_STATUS_GONE : row.statusCode;
}

int getStatus(sqlite3 *db, const Statement &select, long *pTimestamp, int *pStatusCode,
              char *szComment, size_t cbComment) {
  Row row = {};
  if (execute(db, select, takeFirstRow, &row) < 0) {
    return -1;
  }
  if (row.found == 0) {
    return 0;
  }
  *pStatusCode = reportedCode(row);
  if (szComment != nullptr && cbComment > 0) {
    copyText(szComment, cbComment, row.szComment);
  }
  if (pTimestamp != nullptr) {
    *pTimestamp = asLong(row.started);
  }
  return 1;
}

}  // namespace

sqlite3 *ZELOSchedDBInit(void) {
  ZELOSchedRandInit();
  if (!takeNames()) {
    return nullptr;
  }
  sqlite3 *db = nullptr;
  int result = openDatabase(&db);
  if (result != SQLITE_OK && isInWalMode(db)) {
    result = openInPlaceOfWal(&db);
  }
  if (result != SQLITE_OK) {
    SCHED_SET_ERROR(kErrOpen);
    SCHED_LOG("Can't open database: %s\n", sqlite3_errmsg(db));
    sqlite3_close(db);
    return nullptr;
  }
  if (execute(db, kCreateTable, nullptr, nullptr) < 0) {
    return nullptr;  // the interface leaves the handle open
  }
  keepJournal(db);
  return db;
}

int ZELOSchedDBIsTaskRunning(sqlite3 *db, long id, ZELO_SCHED_STATUS *pStatus) {
  SCHED_CHECK_ARG(pStatus != nullptr, "((void *)0) != pStatus", -1);
  SCHED_CHECK_ARG(db != nullptr, "NULL != db", -1);
  Statement select;
  select.append(
      "SELECT pid,status_id,task_id from task_status WHERE task_id=%ld AND status_code=%d;", id,
      ZELO_SCHED_STATUS_RUNNING);
  return execute(db, select, takeFirstLiveRow, pStatus);
}

int ZELOSchedDBIsAppRunning(sqlite3 *db, const char *szApp, ZELO_SCHED_STATUS *pStatus) {
  SCHED_CHECK_ARG(db != nullptr, "((void *)0) != db", -1);
  SCHED_CHECK_ARG(szApp != nullptr, "((void *)0) != szApp", -1);
  SCHED_CHECK_ARG(pStatus != nullptr, "NULL != pStatus", -1);
  Statement select;
  select.append("SELECT pid,status_id,task_id from task_status WHERE app='%s' AND status_code=%d;",
                szApp, ZELO_SCHED_STATUS_RUNNING);
  return execute(db, select, szApp, AfterText::kCondition, takeFirstLiveRow, pStatus);
}

int ZELOSchedDBAddRecord(sqlite3 *db, const ZELO_SCHED_TASK *pTask, int *pStatusID) {
  SCHED_CHECK_ARG(db != nullptr, "((void *)0) != db", -1);
  SCHED_CHECK_ARG(pTask != nullptr, "NULL != pTask", -1);
  const int pid = getpid();
  const long long now = time(nullptr);
  const long taskID = pTask->ID;
  Statement insert;
  insert.append(
      "INSERT INTO task_status (app, pid, timestamp, task_id, status_code) "
      "VALUES ('%s', %d, %lld, %ld, %d);",
      pTask->App, pid, now, taskID, ZELO_SCHED_STATUS_RUNNING);
  if (execute(db, insert, pTask->App, AfterText::kNothing, nullptr, nullptr) < 0) {
    return -1;
  }
  Statement select;
  select.append(
      "SELECT status_id from task_status WHERE app='%s' AND task_id=%ld AND timestamp=%lld "
      "AND status_code=%d AND pid=%d;",
      pTask->App, taskID, now, ZELO_SCHED_STATUS_RUNNING, pid);
  Row row = {};
  if (execute(db, select, takeFirstRow, &row) < 0) {
    return -1;
  }
  if (row.found == 0) {
    SCHED_SET_ERROR(kErrIo);
    return -1;
  }
  if (pStatusID != nullptr) {
    *pStatusID = row.statusID;
  }
  return 0;
}

int ZELOSchedDBSetStatus(sqlite3 *db, int iStatusID, int orgStatusCode, int newStatusCode,
                         const char *szComment) {
  SCHED_CHECK_ARG(db != nullptr, "((void *)0) != db", -1);
  SCHED_CHECK_ARG(orgStatusCode != ZELO_SCHED_STATUS_NONE || iStatusID != kAnyStatusID,
                  "SCHED_STATUS_CODE_NONE != orgStatusCode || -1 != iStatusID", -1);
  const bool hasComment = szComment != nullptr && szComment[0] != '\0';
  Statement update;
  update.append("UPDATE task_status SET status_code=%d", newStatusCode);
  if (hasComment) {
    update.append(", comment='%s'", szComment);
  }
  if (iStatusID == kAnyStatusID) {
    update.append(" WHERE status_code=%d", orgStatusCode);
  } else {
    update.append(" WHERE status_id=%d", iStatusID);
    if (orgStatusCode != ZELO_SCHED_STATUS_NONE) {
      update.append(" AND status_code=%d", orgStatusCode);
    }
  }
  return execute(db, update, hasComment ? szComment : "", AfterText::kNothing, nullptr, nullptr);
}

int ZELOSchedDBGetStatusByStatusID(sqlite3 *db, int iStatusID, int *pStatusCode, char *szComment,
                                   size_t cbComment) {
  SCHED_CHECK_ARG(db != nullptr, "((void *)0) != db", -1);
  SCHED_CHECK_ARG(pStatusCode != nullptr, "NULL != pStatusCode", -1);
  Statement select;
  select.append("SELECT pid,status_code,comment from task_status WHERE status_id=%d", iStatusID);
  return getStatus(db, select, nullptr, pStatusCode, szComment, cbComment);
}

int ZELOSchedDBGetStatusByTaskID(sqlite3 *db, long id, long *pTimestamp, int *pStatusCode,
                                 char *szComment, size_t cbComment) {
  SCHED_CHECK_ARG(db != nullptr, "((void *)0) != db", -1);
  SCHED_CHECK_ARG(pStatusCode != nullptr, "NULL != pStatusCode", -1);
  Statement select;
  select.append(
      "SELECT pid,timestamp,status_code,comment from task_status WHERE task_id=%ld "
      "ORDER BY timestamp DESC",
      id);
  return getStatus(db, select, pTimestamp, pStatusCode, szComment, cbComment);
}
