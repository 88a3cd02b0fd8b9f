// The status database: a row for every run of a task.
#include <dlfcn.h>
#include <gtest/gtest.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <climits>
#include <cstdio>
#include <cstring>
#include <ctime>
#include <filesystem>
#include <functional>
#include <memory>
#include <optional>
#include <set>

#include "captured_log.h"
#include "expected_leak.h"
#include "failing_calls.h"
#include "fake_clock.h"
#include "refused_arguments.h"
#include "sandbox_fixture.h"
#include "status_db.h"
#include "tasks.h"
#include "zelosched.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;

constexpr char kCreateTable[] =
    "CREATE TABLE if not exists task_status(status_id INTEGER PRIMARY KEY ASC, pid INTEGER, "
    "timestamp INTEGER, app STRING, task_id INTEGER, status_code INTEGER, comment STRING);";
constexpr char kLocked[] = "database is locked";
constexpr size_t kMostAttempts = 101;
constexpr int kRunning = ZELO_SCHED_STATUS_RUNNING;
constexpr int kFinished = ZELO_SCHED_STATUS_FINISHED;

unsigned randInits = 0;

struct CloseDatabase {
  void operator()(sqlite3 *db) const { sqlite3_close_v2(db); }
};
using Database = std::unique_ptr<sqlite3, CloseDatabase>;

std::string failedSql(const std::string &sql, const std::string &error) {
  return "sched_task_db.cpp:N Exec sql:[" + sql + "] error: " + error + "\n";
}

// Another program, which nothing holds back.
class OtherProgram {
 public:
  OtherProgram() {
    sqlite3 *db = nullptr;
    sqlite3_open_v2(kStatusDatabase, &db, SQLITE_OPEN_READWRITE, nullptr);
    db_ = Database(db);
  }

  // The first column of each row that the statement gives.
  Lines run(const char *sql) {
    sqlite3_stmt *statement = nullptr;
    EXPECT_EQ(sqlite3_prepare_v2(db_.get(), sql, -1, &statement, nullptr), SQLITE_OK);
    Lines rows;
    int step = SQLITE_DONE;
    while ((step = sqlite3_step(statement)) == SQLITE_ROW) {
      rows.emplace_back(reinterpret_cast<const char *>(sqlite3_column_text(statement, 0)));
    }
    EXPECT_EQ(step, SQLITE_DONE);
    sqlite3_finalize(statement);
    return rows;
  }

 private:
  Database db_;
};

Lines execute(const std::string &sql) {
  return OtherProgram().run(sql.c_str());
}

// What SQLite answers to a statement, how often it is asked, and what is told of it.
struct Answer {
  const char *what;
  std::vector<FailPlan> failures;
  size_t attempts;
  const char *szTold;  // nothing when the statement succeeds, empty when it fails in silence

  bool succeeds() const { return szTold == nullptr; }
  void arrange() const {
    for (const FailPlan &failure : failures) failCall("sqlite3_exec", failure);
  }
  // Of all but the first attempt there was a wait before.
  void expectTold(const std::string &sql) const {
    EXPECT_EQ(recordedSleeps("usleep").size(), attempts - 1);
    EXPECT_EQ(recordedSleeps().size(), attempts - 1);
    const bool isLogged = !succeeds() && *szTold != '\0';
    EXPECT_EQ(logged(), isLogged ? Lines{failedSql(sql, szTold)} : Lines{});
    EXPECT_EQ(loggedPriorities(), std::vector<int>(isLogged ? 1 : 0, 3));
    EXPECT_EQ(errorRecord(), kNoError);
  }
};

// Only a lock is tried again, and that a hundred times.
const Answer kAnswers[] = {
    {"a lock that ends", {{.times = 3, .text = kLocked}}, 4, nullptr},
    {"a lock up to the last retry", {{.times = 100, .text = kLocked}}, kMostAttempts, nullptr},
    {"a lock that never ends", {{.times = kAlways, .text = kLocked}}, kMostAttempts, kLocked},
    {"the words in a longer text", {{.text = "bad luck: database is locked (5)"}}, 2, nullptr},
    {"a lock, then a full disk", {{.times = 2, .text = kLocked}, {.text = "full"}}, 3, "full"},
    {"another failure", {{.text = "database table is gone"}}, 1, "database table is gone"},
    {"a failure without a text", {{}}, 1, ""},
};

class StatusDatabaseTest : public SandboxTest {
 protected:
  void SetUp() override {
    SandboxTest::SetUp();
    db_ = Database(ZELOSchedDBInit());
    ASSERT_NE(db_, nullptr);
    resetFailingCalls();
  }

  sqlite3 *db() const { return db_.get(); }

  Database db_;
  ZELO_SCHED_STATUS status_ = {};
};

TEST_F(StatusDatabaseTest, AnArgumentThatIsMissingIsRefusedInTheOrderOfTheChecks) {
  addStatusRow({.statusCode = kRunning});
  const std::vector<StatusRow> rows = statusRows();
  resetFailingCalls();
  expectRefused(
      "sched_task_db.cpp",
      {
          {"((void *)0) != pStatus", [&] { return ZELOSchedDBIsTaskRunning(db(), 7, nullptr); }},
          {"NULL != db", [&] { return ZELOSchedDBIsTaskRunning(nullptr, 7, &status_); }},
          {"((void *)0) != pStatus", [] { return ZELOSchedDBIsTaskRunning(nullptr, 7, nullptr); }},
          {"((void *)0) != db", [] { return ZELOSchedDBIsAppRunning(nullptr, nullptr, nullptr); }},
          {"((void *)0) != szApp", [&] { return ZELOSchedDBIsAppRunning(db(), nullptr, nullptr); }},
          {"NULL != pStatus", [&] { return ZELOSchedDBIsAppRunning(db(), "app", nullptr); }},
          {"((void *)0) != db", [] { return ZELOSchedDBAddRecord(nullptr, nullptr, nullptr); }},
          {"NULL != pTask", [&] { return ZELOSchedDBAddRecord(db(), nullptr, nullptr); }},
          {"((void *)0) != db", [] { return ZELOSchedDBSetStatus(nullptr, -1, 0, 3, nullptr); }},
          {"SCHED_STATUS_CODE_NONE != orgStatusCode || -1 != iStatusID",
           [&] { return ZELOSchedDBSetStatus(db(), -1, 0, kFinished, nullptr); }},
          {"((void *)0) != db",
           [] { return ZELOSchedDBGetStatusByStatusID(nullptr, 1, nullptr, nullptr, 0); }},
          {"NULL != pStatusCode",
           [&] { return ZELOSchedDBGetStatusByStatusID(db(), 1, nullptr, nullptr, 0); }},
          {"((void *)0) != db",
           [] { return ZELOSchedDBGetStatusByTaskID(nullptr, 1, nullptr, nullptr, nullptr, 0); }},
          {"NULL != pStatusCode",
           [&] { return ZELOSchedDBGetStatusByTaskID(db(), 1, nullptr, nullptr, nullptr, 0); }},
      });
  EXPECT_EQ(callCount("sqlite3_exec"), 0U);
  EXPECT_EQ(statusRows(), rows);
}

class DBInitTest : public SandboxTest {};

// ---- opening

TEST_F(DBInitTest, AMissingDatabaseIsCreatedBeforeItIsOpened) {
  const Database db(ZELOSchedDBInit());
  EXPECT_NE(db, nullptr);
  EXPECT_EQ(callCount("QLIBCFileTouch"), 1U);
  EXPECT_TRUE(fileExists(kStatusDatabase));
  EXPECT_EQ(statusRows(), std::vector<StatusRow>{});
  EXPECT_EQ(logged(), Lines{});
  EXPECT_EQ(errorRecord(), kNoError);
}

TEST_F(DBInitTest, AnExistingDatabaseKeepsItsRowsAndIsNotTouched) {
  addStatusRow({.pid = 1, .timestamp = 5, .app = "app", .taskId = 7, .statusCode = kFinished});
  const std::vector<StatusRow> rows = statusRows();
  const Database db(ZELOSchedDBInit());
  EXPECT_NE(db, nullptr);
  EXPECT_EQ(callCount("QLIBCFileTouch"), 0U);
  EXPECT_EQ(statusRows(), rows);
}

TEST_F(DBInitTest, TheTableHasItsColumns) {
  const Database db(ZELOSchedDBInit());
  EXPECT_EQ(execute("SELECT name || ' ' || type FROM pragma_table_info('task_status')"),
            (Lines{"status_id INTEGER", "pid INTEGER", "timestamp INTEGER", "app STRING",
                   "task_id INTEGER", "status_code INTEGER", "comment STRING"}));
}

TEST_F(DBInitTest, TheRandomGeneratorIsSeededForTheWaits) {
  const unsigned before = randInits;
  const Database db(ZELOSchedDBInit());
  EXPECT_EQ(randInits, before + 1);
}

TEST_F(DBInitTest, AFileThatCannotBeCreatedBeforehandIsLeftToTheOpening) {
  failCall("QLIBCFileTouch");
  const Database db(ZELOSchedDBInit());
  EXPECT_NE(db, nullptr);
}

TEST_F(DBInitTest, ADatabaseThatCannotBeOpenedIsReported) {
  failCall("sqlite3_open");
  EXPECT_EQ(ZELOSchedDBInit(), nullptr);
  EXPECT_EQ(logged(),
            Lines{"sched_task_db.cpp:N Can't open database: unable to open database file\n"});
  EXPECT_EQ(loggedPriorities(), std::vector<int>{3});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0900, "sched_task_db.cpp"}));
  EXPECT_EQ(callCount("sqlite3_exec"), 0U);
}

TEST_F(DBInitTest, ATableThatCannotBeCreatedGivesNoHandleAndLeavesOneOpen) {
  for (const Answer &answer : kAnswers) {
    SCOPED_TRACE(answer.what);
    cleanWorld();
    std::optional<ExpectedLeak> handleLeftOpen;
    if (!answer.succeeds()) handleLeftOpen.emplace();
    answer.arrange();
    const Database db(ZELOSchedDBInit());
    EXPECT_EQ(db != nullptr, answer.succeeds());
    EXPECT_EQ(callCount("sqlite3_close"), 0U);
    if (!answer.succeeds()) {
      EXPECT_EQ(callCount("sqlite3_exec"), answer.attempts);
    }
    answer.expectTold(kCreateTable);
    EXPECT_EQ(statusRows(), std::vector<StatusRow>{});
  }
}

TEST_F(DBInitTest, AFileThatIsNoDatabaseIsReported) {
  const ExpectedLeak handleLeftOpen;
  writeFile(kStatusDatabase, std::string(4096, 'x'));
  EXPECT_EQ(ZELOSchedDBInit(), nullptr);
  EXPECT_EQ(logged(), Lines{failedSql(kCreateTable, "file is not a database")});
}

// ---- the statements

// A statement, and the call that executes it.
struct Asked {
  std::string sql;
  std::function<int()> call;
  unsigned nth = 1;  // of the statements of that call
};

class StatementTest : public StatusDatabaseTest {
 protected:
  // Where the statement fails, the log shows it, and no code is set.
  static void expectAsked(const Asked &asked) {
    SCOPED_TRACE(asked.sql);
    clearLog();
    resetFailingCalls();
    failCall("sqlite3_exec", {.from = asked.nth, .text = "no"});
    EXPECT_EQ(asked.call(), -1);
    EXPECT_EQ(logged(), Lines{failedSql(asked.sql, "no")});
    EXPECT_EQ(loggedPriorities(), std::vector<int>{3});
    EXPECT_EQ(errorRecord(), kNoError);
  }
};

TEST_F(StatementTest, EachCallExecutesItsOwn) {
  constexpr time_t kNow = 1367915400;
  setClock(kNow);
  int code = 0;
  ZELO_SCHED_TASK task = {};
  task.ID = 7;
  setText(task.App, "some app");
  const std::string pid = std::to_string(getpid());
  const auto add = [&] { return ZELOSchedDBAddRecord(db(), &task, nullptr); };
  const auto set = [this](int id, int oldCode, const char *szComment) {
    return [=, this] { return ZELOSchedDBSetStatus(db(), id, oldCode, kFinished, szComment); };
  };
  const Asked statements[] = {
      {"SELECT pid,status_id,task_id from task_status WHERE task_id=7 AND status_code=2;",
       [&] { return ZELOSchedDBIsTaskRunning(db(), 7, &status_); }},
      {"SELECT pid,status_id,task_id from task_status WHERE app='some app' AND status_code=2;",
       [&] { return ZELOSchedDBIsAppRunning(db(), "some app", &status_); }},
      {"INSERT INTO task_status (app, pid, timestamp, task_id, status_code) VALUES ('some app', " +
           pid + ", 1367915400, 7, 2);",
       add},
      {"SELECT status_id from task_status WHERE app='some app' AND task_id=7 AND "
       "timestamp=1367915400 AND status_code=2 AND pid=" +
           pid + ";",
       add, 2},
      {"SELECT pid,status_code,comment from task_status WHERE status_id=9",
       [&] { return ZELOSchedDBGetStatusByStatusID(db(), 9, &code, nullptr, 0); }},
      {"SELECT pid,timestamp,status_code,comment from task_status WHERE task_id=7 "
       "ORDER BY timestamp DESC",
       [&] { return ZELOSchedDBGetStatusByTaskID(db(), 7, nullptr, &code, nullptr, 0); }},
      // Setting a status names only what was asked for.
      {"UPDATE task_status SET status_code=3 WHERE status_id=9", set(9, 0, nullptr)},
      {"UPDATE task_status SET status_code=3 WHERE status_id=9", set(9, 0, "")},
      {"UPDATE task_status SET status_code=3, comment='15' WHERE status_id=9", set(9, 0, "15")},
      {"UPDATE task_status SET status_code=3 WHERE status_id=9 AND status_code=2",
       set(9, 2, nullptr)},
      {"UPDATE task_status SET status_code=3, comment='15' WHERE status_id=9 AND status_code=2",
       set(9, 2, "15")},
      {"UPDATE task_status SET status_code=3 WHERE status_code=2", set(-1, 2, nullptr)},
      {"UPDATE task_status SET status_code=3, comment='15' WHERE status_code=2", set(-1, 2, "15")},
  };
  for (const Asked &asked : statements) expectAsked(asked);
}

TEST_F(StatementTest, ATaskIdIsNotCutToThirtyTwoBits) {
  if (sizeof(long) == sizeof(int32_t)) GTEST_SKIP() << "no id has more than 32 bits here";
  const auto id = static_cast<long>(4294967303);
  expectAsked(
      {"SELECT pid,status_id,task_id from task_status WHERE task_id=4294967303 AND status_code=2;",
       [&] { return ZELOSchedDBIsTaskRunning(db(), id, &status_); }});
}

// ---- the retry

class LockedDatabaseTest : public StatusDatabaseTest {
 protected:
  int set() { return ZELOSchedDBSetStatus(db(), 9, 0, kFinished, nullptr); }
  const std::string sql_ = "UPDATE task_status SET status_code=3 WHERE status_id=9";
};

TEST_F(LockedDatabaseTest, OnlyALockIsTriedAgainAndThatAHundredTimes) {
  for (const Answer &answer : kAnswers) {
    SCOPED_TRACE(answer.what);
    clearLog();
    resetFailingCalls();
    answer.arrange();
    EXPECT_EQ(set(), answer.succeeds() ? 0 : -1);
    EXPECT_EQ(callCount("sqlite3_exec"), answer.attempts);
    answer.expectTold(sql_);
  }
}

TEST_F(LockedDatabaseTest, TheWaitComesFromARandomNumberShiftedByFiveBits) {
  struct Wait {
    int random;
    long microseconds;
  };
  constexpr Wait kWaits[] = {
      {0, 100000},           // the shortest
      {1, 100032},           //
      {100000, 300000},      // 3200000 leaves 200000
      {28124, 999968},       // the last below the bound
      {28125, 999999},       // 1000000, cut
      {31249, 999999},       // 1099968, cut
      {31250, 100000},       // 1000000 leaves 0
      {0x03FFFFFF, 583616},  // 2147483616, the largest that is positive
      {0x04000000, 999999},  // -2147483648 leaves -383648, which is huge without a sign
      {0x07FFFFFF, 99968},   // -32
      {0x7FFFFFFF, 99968},   // the same five bits higher
      {0x08000000, 100000},  // nothing is left in 32 bits
  };
  for (const Wait &wait : kWaits) {
    SCOPED_TRACE(wait.random);
    resetFailingCalls();
    failCall("sqlite3_exec", {.text = kLocked});
    setRandValues({wait.random});
    EXPECT_EQ(set(), 0);
    EXPECT_EQ(recordedSleeps(), std::vector<long>{wait.microseconds});
  }
}

TEST_F(LockedDatabaseTest, EachWaitHasARandomNumberOfItsOwn) {
  failCall("sqlite3_exec", {.times = 3, .text = kLocked});
  setRandValues({1, 2, 3});
  EXPECT_EQ(set(), 0);
  EXPECT_EQ(recordedSleeps(), (std::vector<long>{100032, 100064, 100096}));
}

// Holds the database for itself until it lets it go.
class Holder : public OtherProgram {
 public:
  Holder() { run("BEGIN EXCLUSIVE"); }
  void letGo() { run("COMMIT"); }
};

TEST_F(LockedDatabaseTest, AStatementWaitsUntilAnotherConnectionHasLetGo) {
  constexpr size_t kWaits = 3;
  addStatusRow({.statusId = 9, .statusCode = kRunning});
  Holder holder;
  onSleep([&](size_t sleeps) {
    if (sleeps == kWaits) holder.letGo();
  });
  EXPECT_EQ(set(), 0);
  EXPECT_EQ(recordedSleeps().size(), kWaits);
  EXPECT_EQ(statusRows()[0].statusCode, kFinished);
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(LockedDatabaseTest, EveryStatementWaitsForALock) {
  addStatusRow({.statusId = 9, .timestamp = 1, .app = "app", .taskId = 7, .statusCode = kFinished});
  ZELO_SCHED_TASK task = {};
  int code = 0;
  const std::function<int()> calls[] = {
      [&] { return ZELOSchedDBIsTaskRunning(db(), 7, &status_); },
      [&] { return ZELOSchedDBIsAppRunning(db(), "app", &status_); },
      [&] { return ZELOSchedDBAddRecord(db(), &task, nullptr); },
      [&] { return ZELOSchedDBSetStatus(db(), 9, 0, kFinished, nullptr); },
      [&] { return ZELOSchedDBGetStatusByStatusID(db(), 9, &code, nullptr, 0) - 1; },
      [&] { return ZELOSchedDBGetStatusByTaskID(db(), 7, nullptr, &code, nullptr, 0) - 1; },
  };
  for (const auto &call : calls) {
    SCOPED_TRACE(&call - calls);
    resetFailingCalls();
    Holder holder;
    onSleep([&](size_t) { holder.letGo(); });
    EXPECT_EQ(call(), 0);
    EXPECT_EQ(recordedSleeps().size(), 1U);
  }
}

TEST_F(LockedDatabaseTest, ReadingBackTheKeyWaitsForALockToo) {
  ZELO_SCHED_TASK task = {};
  int id = 0;
  failCallFor("sqlite3_exec", "SELECT status_id", {.times = 2, .text = kLocked});
  EXPECT_EQ(ZELOSchedDBAddRecord(db(), &task, &id), 0);
  EXPECT_EQ(id, 1);
  EXPECT_EQ(recordedSleeps().size(), 2U);
  EXPECT_EQ(statusRows().size(), 1U);
}

TEST_F(LockedDatabaseTest, ALockThatIsNeverLetGoIsReported) {
  Holder holder;
  EXPECT_EQ(set(), -1);
  EXPECT_EQ(logged(), Lines{failedSql(sql_, kLocked)});
}

// ---- the running checks

class RunningTest : public StatusDatabaseTest {
 protected:
  // Both checks, for task 7 and application "app".
  void expectFound(int found) {
    for (const bool byTask : {true, false}) {
      SCOPED_TRACE(byTask ? "by task" : "by application");
      status_ = {};
      EXPECT_EQ(byTask ? ZELOSchedDBIsTaskRunning(db(), 7, &status_)
                       : ZELOSchedDBIsAppRunning(db(), "app", &status_),
                0);
      EXPECT_EQ(status_.found, found);
    }
    EXPECT_EQ(logged(), Lines{});
  }
};

TEST_F(RunningTest, ALiveRunIsFoundWithItsNumbers) {
  addStatusRow({.pid = getpid(), .timestamp = 5, .app = "app", .taskId = 8, .statusCode = 2});
  const long id =
      addStatusRow({.pid = getpid(), .timestamp = 6, .app = "other", .taskId = 7, .statusCode = 2});
  EXPECT_EQ(ZELOSchedDBIsTaskRunning(db(), 7, &status_), 0);
  EXPECT_EQ(status_.found, 1);
  EXPECT_EQ(status_.pid, getpid());
  EXPECT_EQ(status_.statusID, id);
  EXPECT_EQ(status_.taskID, 7);
  // What was not asked for stays as the caller left it.
  EXPECT_EQ(status_.timestamp, 0);
  EXPECT_STREQ(status_.szApp, "");
  EXPECT_EQ(status_.statusCode, 0);
}

// Its text is part of the statement as it is.
TEST_F(RunningTest, AnyTaskOfTheApplicationIsFoundAndItsNameMayGoOnAsACondition) {
  const long id = addStatusRow(
      {.pid = getpid(), .timestamp = 5, .app = "app", .taskId = 1234, .statusCode = kRunning});
  for (const char *szApp :
       {"app", "x' OR app='app", "x' or 'a'='a", "a'||'p'||'p", "' OR pid>1 Or '",
        "x' OR\n\ttask_id IS NOT NULL AND NOT pid<>pid AND app='app"}) {
    SCOPED_TRACE(szApp);
    status_ = {};
    EXPECT_EQ(ZELOSchedDBIsAppRunning(db(), szApp, &status_), 0);
    EXPECT_EQ(status_.found, 1);
    EXPECT_EQ(status_.pid, getpid());
    EXPECT_EQ(status_.statusID, id);
    EXPECT_EQ(status_.taskID, 1234);
  }
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(RunningTest, ARunOfNoTaskIsFoundWithTheNumberZero) {
  addStatusRow({.pid = getpid(), .app = "app", .taskId = 8, .statusCode = kRunning});
  EXPECT_EQ(sqlite3_exec(db(), "UPDATE task_status SET task_id=NULL", nullptr, nullptr, nullptr),
            SQLITE_OK);
  status_.taskID = 8;
  EXPECT_EQ(ZELOSchedDBIsAppRunning(db(), "app", &status_), 0);
  EXPECT_EQ(status_.found, 1);
  EXPECT_EQ(status_.taskID, 0);
}

// What the database holds, and which of the rows is found.
struct Known {
  const char *what;
  std::vector<StatusRow> rows;
  std::optional<size_t> found;
};

StatusRow run(pid_t pid, int code = kRunning, const char *app = "app", long task = 7) {
  return {.pid = pid, .app = app, .taskId = task, .statusCode = code};
}

TEST_F(RunningTest, TheFirstRunWhoseProcessLivesIsFoundAndNoRowIsChanged) {
  const pid_t live = getpid();
  const pid_t dead = deadProcess();
  const Known states[] = {
      {"no row", {}, {}},
      {"of another task and application", {run(live, kRunning, "App", 8)}, {}},
      {"ended", {run(live, 0), run(live, 1), run(live, 3), run(live, 4)}, {}},
      {"ended badly", {run(live, 5), run(live, 6), run(live, 7)}, {}},
      {"died", {run(dead)}, {}},
      {"lives", {run(live)}, 0},
      {"lives behind one that died", {run(dead), run(live), run(dead)}, 1},
      {"two that live", {run(live), run(live)}, 0},
  };
  for (const Known &state : states) {
    SCOPED_TRACE(state.what);
    execute("DELETE FROM task_status");
    std::vector<long> ids;
    for (const StatusRow &row : state.rows) ids.push_back(addStatusRow(row));
    const std::vector<StatusRow> rows = statusRows();
    expectFound(state.found ? 1 : 0);
    EXPECT_EQ(status_.statusID, state.found ? ids[*state.found] : 0);
    EXPECT_EQ(status_.pid, state.found ? live : 0);
    EXPECT_EQ(statusRows(), rows);
  }
}

TEST_F(RunningTest, NoProcessIsAskedForBehindTheFirst) {
  for (int i = 0; i < 2; ++i) addStatusRow(run(getpid()));
  expectFound(1);
  EXPECT_EQ(callCount("QLIBCProcAlive"), 2U);  // once in each of the two checks
}

TEST_F(RunningTest, AProcessIdThatIsNoneDoesNotCount) {
  for (const pid_t pid : {0, -1}) addStatusRow(run(pid));
  failCall("QLIBCProcAlive", {.times = kAlways, .result = 1});
  expectFound(0);
  EXPECT_EQ(callCount("QLIBCProcAlive"), 0U);
}

// ---- adding

class AddRecordTest : public StatusDatabaseTest {
 protected:
  AddRecordTest() {
    task_.ID = 7;
    setText(task_.App, "app");
  }
  ZELO_SCHED_TASK task_ = {};
};

// Where long has 32 bits, the caller gets the last time that it can say.
TEST_F(AddRecordTest, ARunBefore1970AndAfter2038HasItsTime) {
  for (const int64_t start : {int64_t{-86400}, int64_t{2147483648}, int64_t{4294967297}}) {
    setClock(static_cast<time_t>(start));
    task_.ID += 1;
    EXPECT_EQ(ZELOSchedDBAddRecord(db(), &task_, nullptr), 0);
    EXPECT_EQ(statusRows().back().timestamp, start);
    long told = 0;
    int code = 0;
    EXPECT_EQ(ZELOSchedDBGetStatusByTaskID(db(), task_.ID, &told, &code, nullptr, 0), 1);
    EXPECT_EQ(told, std::min<int64_t>(start, LONG_MAX));
  }
}

TEST_F(AddRecordTest, TheRowSaysThatThisProcessStartedTheTaskNow) {
  constexpr time_t kNow = 1367915400;
  setClock(kNow);
  int id = 0;
  EXPECT_EQ(ZELOSchedDBAddRecord(db(), &task_, &id), 0);
  EXPECT_EQ(statusRows(), (std::vector<StatusRow>{{.statusId = id,
                                                   .pid = getpid(),
                                                   .timestamp = kNow,
                                                   .app = "app",
                                                   .taskId = 7,
                                                   .statusCode = kRunning,
                                                   .comment = std::nullopt}}));
  EXPECT_EQ(ZELOSchedDBIsTaskRunning(db(), 7, &status_), 0);
  EXPECT_EQ(status_.found, 1);
  EXPECT_EQ(status_.statusID, id);
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(AddRecordTest, EachRunHasAKeyOfItsOwnWhichNeedNotBeAskedFor) {
  setClock(1367915400);
  for (const int wanted : {1, 2}) {
    int id = 0;
    ASSERT_EQ(ZELOSchedDBAddRecord(db(), &task_, &id), 0);
    EXPECT_EQ(id, wanted);
    ++task_.ID;
  }
  EXPECT_EQ(ZELOSchedDBAddRecord(db(), &task_, nullptr), 0);
  EXPECT_EQ(statusRows().size(), 3U);
}

TEST_F(AddRecordTest, ARowThatIsNotInsertedOrNotReadBackIsAFailure) {
  struct {
    const char *key;
    FailPlan plan;
    unsigned executions;
    ErrorRecord record;
  } failures[] = {
      {"INSERT", {.text = "disk full"}, 1, kNoError},
      {"SELECT", {.text = "disk full"}, 2, kNoError},
      {"INSERT", {.result = SQLITE_OK}, 2, {0x0B00, "sched_task_db.cpp"}},
  };
  for (const auto &failure : failures) {
    SCOPED_TRACE(std::string(failure.key) + (failure.plan.text != nullptr ? " fails" : " is lost"));
    execute("DELETE FROM task_status");
    clearLog();
    resetFailingCalls();
    int id = 77;
    failCallFor("sqlite3_exec", failure.key, failure.plan);
    EXPECT_EQ(ZELOSchedDBAddRecord(db(), &task_, &id), -1);
    EXPECT_EQ(id, 77);
    EXPECT_EQ(callCount("sqlite3_exec"), failure.executions);
    EXPECT_EQ(logged().size(), failure.plan.text != nullptr ? 1U : 0U);
    EXPECT_EQ(errorRecord(), failure.record);
  }
}

TEST_F(AddRecordTest, AnApostropheThatIsDoubledIsOneOfTheName) {
  setText(task_.App, "it''s, ''app''");
  EXPECT_EQ(ZELOSchedDBAddRecord(db(), &task_, nullptr), 0);
  EXPECT_EQ(statusRows()[0].app, "it's, 'app'");
  EXPECT_EQ(ZELOSchedDBIsAppRunning(db(), task_.App, &status_), 0);
  EXPECT_EQ(status_.found, 1);
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(AddRecordTest, SixteenProcessesThatAddAtOnceLoseNoRow) {
  constexpr int kProcesses = 16;
  constexpr int kRowsEach = 4;
  int start[2];
  ASSERT_EQ(pipe(start), 0);
  for (int process = 0; process < kProcesses; ++process) {
    const pid_t child = fork();
    ASSERT_GE(child, 0);
    if (child != 0) continue;
    // The retry's own waits are what keeps the processes apart.
    realSleep(true);
    close(start[1]);
    char byte = 0;
    bool added = read(start[0], &byte, 1) == 0;
    const Database db(ZELOSchedDBInit());
    srand(static_cast<unsigned>(getpid()));
    ZELO_SCHED_TASK task = {};
    setText(task.App, "app");
    for (int row = 0; row < kRowsEach; ++row) {
      task.ID = process * kRowsEach + row;
      added = ZELOSchedDBAddRecord(db.get(), &task, nullptr) == 0 && added;
    }
    _exit(added ? EXIT_SUCCESS : EXIT_FAILURE);
  }
  close(start[0]);
  close(start[1]);
  EXPECT_EQ(waitForChildRuns(), std::vector<int>(kProcesses, 0));

  std::set<long> tasks;
  for (const StatusRow &row : statusRows()) tasks.insert(row.taskId);
  EXPECT_EQ(statusRows().size(), size_t{kProcesses * kRowsEach});
  EXPECT_EQ(tasks.size(), size_t{kProcesses * kRowsEach});
  EXPECT_EQ(logged(), Lines{});
}

// ---- setting

class SetStatusTest : public StatusDatabaseTest {
 protected:
  static Lines codesAndComments() {
    Lines all;
    for (const StatusRow &row : statusRows()) {
      all.push_back(std::to_string(row.statusCode) + " " + row.comment.value_or("none"));
    }
    return all;
  }
};

TEST_F(SetStatusTest, TheRowsThatAreMeantAreSetAndNoOther) {
  struct Change {
    std::vector<StatusRow> rows;
    int id;
    int oldCode;
    int newCode;
    const char *szComment;
    Lines then;
  };
  const StatusRow fourth = {.statusId = 4, .statusCode = kRunning};
  const StatusRow fifth = {.statusId = 5, .statusCode = kRunning};
  const StatusRow told = {.statusId = 4, .statusCode = kRunning, .comment = "old"};
  const std::vector<StatusRow> four = {
      {.statusCode = 3}, {.statusCode = 2}, {.statusCode = 3}, {.statusCode = 7}};
  const Change changes[] = {
      {{fourth, fifth}, 5, 0, 3, "done", {"2 none", "3 done"}},  // one, whatever its code
      {{fourth}, 4, 7, 3, nullptr, {"2 none"}},                  // only with the old code
      {{fourth}, 4, 2, 3, nullptr, {"3 none"}},
      {four, -1, 3, 6, "9", {"6 9", "2 none", "6 9", "7 none"}},  // all with the old code
      {{told}, 4, 0, 3, "", {"3 old"}},                           // the comment stays
      {{told}, 4, 0, 4, nullptr, {"4 old"}},
      {{fourth}, 99, 0, 3, nullptr, {"2 none"}},  // none is no failure
  };
  for (const Change &change : changes) {
    SCOPED_TRACE(&change - changes);
    execute("DELETE FROM task_status");
    for (const StatusRow &row : change.rows) addStatusRow(row);
    EXPECT_EQ(
        ZELOSchedDBSetStatus(db(), change.id, change.oldCode, change.newCode, change.szComment), 0);
    EXPECT_EQ(codesAndComments(), change.then);
  }
  EXPECT_EQ(logged(), Lines{});
}

// ---- reading

class GetStatusTest : public StatusDatabaseTest {
 protected:
  static constexpr long kTask = 7;
  static constexpr int kUntouched = 77;

  int byStatusId(int id) {
    return ZELOSchedDBGetStatusByStatusID(db(), id, &code_, comment_, sizeof(comment_));
  }
  int byTaskId(long id) {
    return ZELOSchedDBGetStatusByTaskID(db(), id, &timestamp_, &code_, comment_, sizeof(comment_));
  }
  // A single row of task 7, read by both getters.
  void expectCode(int code) {
    const int id = static_cast<int>(statusRows().at(0).statusId);
    EXPECT_EQ(byStatusId(id), 1);
    EXPECT_EQ(code_, code);
    code_ = kUntouched;
    EXPECT_EQ(byTaskId(kTask), 1);
    EXPECT_EQ(code_, code);
    EXPECT_EQ(logged(), Lines{});
  }

  int code_ = kUntouched;
  long timestamp_ = kUntouched;
  char comment_[64] = "untouched";
};

TEST_F(GetStatusTest, WithoutARowOrATableNothingIsWritten) {
  for (const int result : {0, -1}) {
    EXPECT_EQ(logged(), Lines{});
    EXPECT_EQ(byStatusId(1), result);
    EXPECT_EQ(byTaskId(kTask), result);
    EXPECT_EQ(code_, kUntouched);
    EXPECT_EQ(timestamp_, kUntouched);
    EXPECT_STREQ(comment_, "untouched");
    EXPECT_EQ(errorRecord(), kNoError);
    if (result == 0) execute("DROP TABLE task_status");
  }
  EXPECT_EQ(logged().size(), 2U);
  EXPECT_EQ(logged()[0],
            failedSql("SELECT pid,status_code,comment from task_status WHERE status_id=1",
                      "no such table: task_status"));
}

TEST_F(GetStatusTest, CodeTimeAndCommentAreRead) {
  const long id = addStatusRow({.pid = 1,
                                .timestamp = 1367915400,
                                .app = "app",
                                .taskId = kTask,
                                .statusCode = 7,
                                .comment = "15"});
  EXPECT_EQ(byStatusId(static_cast<int>(id)), 1);
  EXPECT_EQ(code_, 7);
  EXPECT_STREQ(comment_, "15");
  std::memset(comment_, 'x', sizeof(comment_));
  EXPECT_EQ(byTaskId(kTask), 1);
  EXPECT_EQ(code_, 7);
  EXPECT_EQ(timestamp_, 1367915400);
  EXPECT_STREQ(comment_, "15");
}

TEST_F(GetStatusTest, EverythingButTheCodeIsOptional) {
  addStatusRow({.taskId = kTask, .statusCode = kFinished, .comment = "0"});
  EXPECT_EQ(ZELOSchedDBGetStatusByStatusID(db(), 1, &code_, nullptr, 0), 1);
  EXPECT_EQ(code_, kFinished);
  code_ = kUntouched;
  EXPECT_EQ(ZELOSchedDBGetStatusByTaskID(db(), kTask, nullptr, &code_, nullptr, 0), 1);
  EXPECT_EQ(code_, kFinished);
}

TEST_F(GetStatusTest, OfATaskTheNewestRowCounts) {
  addStatusRow({.timestamp = 200, .taskId = kTask, .statusCode = 3, .comment = "newest"});
  addStatusRow({.timestamp = 100, .taskId = kTask, .statusCode = 4, .comment = "older"});
  addStatusRow({.timestamp = 300, .taskId = kTask + 1, .statusCode = 5, .comment = "other"});
  EXPECT_EQ(byTaskId(kTask), 1);
  EXPECT_EQ(code_, 3);
  EXPECT_EQ(timestamp_, 200);
  EXPECT_STREQ(comment_, "newest");
}

TEST_F(GetStatusTest, ACommentIsReadAsFarAsThereIsRoom) {
  constexpr size_t kRoom = 4096;
  struct {
    const char *what;
    std::optional<std::string> stored;
    size_t capacity;
    std::string read;
  } comments[] = {
      {"none", {}, sizeof(comment_), std::string(1, '\0')},
      {"cut to the capacity", "abcdef", 4, std::string("abc\0", 4)},
      {"no room", "abc", 0, ""},
      {"the most that is read", std::string(3000, 'c'), kRoom, std::string(1023, 'c') + '\0'},
      {"no format", "%s%n%d", sizeof(comment_), std::string("%s%n%d\0", 7)},
  };
  for (const auto &comment : comments) {
    SCOPED_TRACE(comment.what);
    execute("DELETE FROM task_status");
    addStatusRow({.taskId = kTask, .statusCode = kFinished, .comment = comment.stored});
    expectCode(kFinished);
    std::string buffer(kRoom, 'x');
    const std::string wanted = comment.read + buffer.substr(comment.read.size());
    EXPECT_EQ(ZELOSchedDBGetStatusByStatusID(db(), 1, &code_, buffer.data(), comment.capacity), 1);
    EXPECT_EQ(buffer, wanted);
    buffer.assign(kRoom, 'x');
    EXPECT_EQ(
        ZELOSchedDBGetStatusByTaskID(db(), kTask, nullptr, &code_, buffer.data(), comment.capacity),
        1);
    EXPECT_EQ(buffer, wanted);
  }
}

TEST_F(GetStatusTest, OnlyARunningRunWhoseProcessHasDiedReadsAsGoneAndItsRowStays) {
  const pid_t dead = deadProcess();
  struct Read {
    pid_t pid;
    int stored;
    int code;
  };
  const Read reads[] = {{dead, kRunning, ZELO_SCHED_STATUS_GONE},
                        {getpid(), kRunning, kRunning},
                        {dead, 3, 3},
                        {dead, 4, 4},
                        {dead, 5, 5},
                        {dead, 6, 6},
                        {dead, 7, 7}};
  for (const Read &read : reads) {
    SCOPED_TRACE(read.stored);
    execute("DELETE FROM task_status");
    addStatusRow({.pid = read.pid, .taskId = kTask, .statusCode = read.stored});
    const std::vector<StatusRow> rows = statusRows();
    expectCode(read.code);
    EXPECT_EQ(statusRows(), rows);
  }
}

TEST_F(GetStatusTest, ARunWithoutAProcessIdReadsAsRunning) {
  addStatusRow({.pid = 0, .taskId = kTask, .statusCode = kRunning});
  expectCode(kRunning);
  EXPECT_EQ(callCount("QLIBCProcAlive"), 0U);
}

TEST_F(GetStatusTest, OnlyTheAnswerOneMeansAlive) {
  addStatusRow(run(getpid()));
  for (const int answer : {0, -1, 2}) {
    SCOPED_TRACE(answer);
    resetFailingCalls();
    failCall("QLIBCProcAlive", {.times = kAlways, .result = answer});
    expectCode(ZELO_SCHED_STATUS_GONE);
    EXPECT_EQ(ZELOSchedDBIsTaskRunning(db(), kTask, &status_), 0);
    EXPECT_EQ(ZELOSchedDBIsAppRunning(db(), "app", &status_), 0);
    EXPECT_EQ(status_.found, 0);
    EXPECT_EQ(logged(), Lines{});
  }
}

// ---- texts that are no application's name

struct Injection {
  const char *szName;
  const char *szApp;    // ends the quotes of "WHERE app='%s' ..."
  const char *szError;  // what SQLite says
};

std::ostream &operator<<(std::ostream &out, const Injection &injection) {
  return out << injection.szName;
}

const Injection kInjections[] = {
    {"Apostrophe", "it's", "near \"s\": syntax error"},
    {"ApostropheAtTheEnd", "x'", "unrecognized token: \"'x'' AND status_code=2;\""},
    {"ApostropheAndSpace", "x' ", "unrecognized token: \"' AND status_code=2;\""},
    {"Delete", "x'; DELETE FROM task_status; --", "not authorized"},
    {"DropTable", "x'; DROP TABLE task_status; --", "not authorized"},
    {"Attach", "x'; ATTACH '/tmp/attached.sqlite' AS a; --", "not authorized"},
    {"Vacuum", "x'; VACUUM INTO '/tmp/attached.sqlite'; --", "not authorized"},
    {"Pragma", "x'; PRAGMA user_version=7; --", "not authorized"},
    {"SchemaPragma", "x'; PRAGMA writable_schema=1; --", "not authorized"},
    {"Schema", "x'; UPDATE sqlite_master SET sql=''; --", "not authorized"},
    {"NewTemporaryTable", "x'; CREATE TEMP TABLE task_status(a); --", "not authorized"},
    {"Trigger",
     "x'; CREATE TRIGGER t AFTER INSERT ON task_status BEGIN UPDATE task_status SET pid=1; END; --",
     "not authorized"},
    {"SecondStatement", "x'; SELECT pid,status_id,task_id FROM task_status; --", "not authorized"},
    {"SecondTable", "x' UNION SELECT secret,1,1 FROM vault; --", "near \"UNION\": syntax error"},
    {"Subselect", "x' || (SELECT secret FROM vault) || '", "not authorized"},
    {"Union", "x' UNION ALL SELECT 1,1,1 FROM task_status a, task_status b WHERE app='",
     "near \"UNION\": syntax error"},
    {"Query", "x' OR select", "not authorized"},
    {"QueryInMixedCase", "x' OR\nsElEcT", "not authorized"},
    {"QueryBehindALetterThatIsNone", "x' OR \xef\xbb\xbfselect",
     "near \"\xef\xbb\xbfselect\": syntax error"},
    {"Rows", "x' OR VALUES", "not authorized"},
    {"CommonTable", "x' OR WITH a AS", "not authorized"},
    {"SecondRow", "x',0,0,0,0),('evil',1,4102444800,1,2);--", "not authorized"},
    {"SecondRowWithoutAComment", "x',0,0,0,0),('evil", "not authorized"},
    {"OtherColumns", "x', status_id=1, pid=1, app='y", "not authorized"},
    {"Transaction", "x'; BEGIN EXCLUSIVE; --", "not authorized"},
    {"Function", "x' || load_extension('/tmp/evil.so') || '",
     "near \"load_extension\": syntax error"},
    {"FunctionInQuotes", "x' || \"zeroblob\"(1000000000) || '", "not authorized"},
    {"FunctionInBrackets", "x' || [zeroblob](1000000000) || '", "not authorized"},
    {"FunctionInBackticks", "x' || `zeroblob`(1000000000) || '", "not authorized"},
    {"ConditionInParentheses", "x' OR (pid) OR '", "not authorized"},
    {"Pattern", "x' OR app LIKE '%a%a%a%a%a", "near \"LIKE\": syntax error"},
    {"JsonPath", "x' OR app->>'$", "not authorized"},
    {"TableInAList", "x' OR pid IN vault OR '", "near \"IN\": syntax error"},
    {"OtherOrder", "x' OR 1 ORDER BY app||app, '", "near \"ORDER\": syntax error"},
    {"Limit", "x' OR 1 LIMIT 1 OFFSET '", "near \"LIMIT\": syntax error"},
    {"Collation", "x' COLLATE evil OR '", "near \"COLLATE\": syntax error"},
    {"SecondTableOfAnUpdate", "x' FROM task_status a, task_status b WHERE '",
     "near \"FROM\": syntax error"},
    {"LineComment", "x' -- ", "not authorized"},
    {"BlockComment", "x' /* ' */ OR '", "not authorized"},
    {"CommentWithinAWord", "x' OR SEL/**/ECT", "near \"SEL\": syntax error"},
    {"BlobLiteral", "x' OR app=x'00", "near \"x\": syntax error"},
    {"Parameter", "x' OR app=?1 OR '", "not authorized"},
    {"NamedParameter", "x' OR app=:a OR '", "not authorized"},
    {"CollapsedRows", "x'; UPDATE OR REPLACE task_status SET status_id=1; --", "not authorized"},
};

class InjectionTest : public StatusDatabaseTest, public testing::WithParamInterface<Injection> {
 protected:
  void SetUp() override {
    StatusDatabaseTest::SetUp();
    std::remove(kAttached);
    for (const int code : {2, 3, 7}) {
      addStatusRow({.pid = 1, .timestamp = 5, .app = "app", .taskId = 7, .statusCode = code});
    }
    execute("CREATE TABLE vault(secret)");
    execute("INSERT INTO vault VALUES('kept')");
    rows_ = statusRows();
    resetFailingCalls();
  }

  // A statement that writes stops at what follows the text's apostrophe, whatever it is.
  static void expectLogged(const std::string &sqlBegin) {
    ASSERT_EQ(logged().size(), 1U);
    const std::string line = logged()[0];
    EXPECT_TRUE(line.starts_with("sched_task_db.cpp:N Exec sql:[" + sqlBegin)) << line;
    EXPECT_TRUE(line.ends_with("] error: not authorized\n") || line.ends_with(": syntax error\n") ||
                line.find("] error: unrecognized token: ") != std::string::npos)
        << line;
  }

  void expectNothingHarmed() const {
    EXPECT_EQ(statusRows(), rows_);
    EXPECT_EQ(execute("SELECT name FROM sqlite_master"), (Lines{"task_status", "vault"}));
    EXPECT_EQ(execute("SELECT secret FROM vault"), Lines{"kept"});
    EXPECT_EQ(execute("PRAGMA user_version"), Lines{"0"});
    EXPECT_FALSE(fileExists(kAttached));
    EXPECT_NE(sqlite3_get_autocommit(db()), 0);
  }

  static constexpr char kAttached[] = "/tmp/attached.sqlite";
  std::vector<StatusRow> rows_;
};

TEST_P(InjectionTest, FailsInTheApplicationCheckAndIsLogged) {
  EXPECT_EQ(ZELOSchedDBIsAppRunning(db(), GetParam().szApp, &status_), -1);
  EXPECT_EQ(logged(), Lines{failedSql(
                          std::string("SELECT pid,status_id,task_id from task_status WHERE app='") +
                              GetParam().szApp + "' AND status_code=2;",
                          GetParam().szError)});
  EXPECT_EQ(status_.found, 0);
  expectNothingHarmed();
}

TEST_P(InjectionTest, FailsWhenARowIsAddedAndIsLogged) {
  ZELO_SCHED_TASK task = {};
  setText(task.App, GetParam().szApp);
  EXPECT_EQ(ZELOSchedDBAddRecord(db(), &task, nullptr), -1);
  expectLogged("INSERT INTO task_status (app, pid, timestamp, task_id, status_code) VALUES ('" +
               std::string(task.App));
  expectNothingHarmed();
}

TEST_P(InjectionTest, FailsInACommentAndIsLogged) {
  const std::string comment = GetParam().szApp;
  EXPECT_EQ(ZELOSchedDBSetStatus(db(), 1, 0, kFinished, comment.c_str()), -1);
  expectLogged("UPDATE task_status SET status_code=3, comment='" + comment);
  expectNothingHarmed();
}

// SQLite quotes what it does not understand, and for these words a statement is tried again, for
// more than a minute and with the run lock held.
TEST_F(StatusDatabaseTest, NoTextPassesForALockedDatabase) {
  for (const char *app : {"database is locked'", "x' 'database is locked", "'database is locked",
                          "x' 'database is locked'"}) {
    SCOPED_TRACE(app);
    clearSleeps();
    ZELO_SCHED_STATUS status = {};
    EXPECT_EQ(ZELOSchedDBIsAppRunning(db(), app, &status), -1);
    const Task task = makeTask("task", "");
    setText(task->App, app);
    EXPECT_EQ(ZELOSchedDBAddRecord(db(), task.get(), nullptr), -1);
    EXPECT_EQ(ZELOSchedDBSetStatus(db(), 1, 2, 3, app), -1);
    EXPECT_EQ(recordedSleeps(), std::vector<long>{});
  }
  ZELO_SCHED_STATUS status = {};
  EXPECT_EQ(ZELOSchedDBIsAppRunning(db(), "database is locked", &status), 0);
}

// SQLite trusts what lies beside a database: a planted journal would be rolled back.
TEST_F(StatusDatabaseTest, FilesOfTheDatabaseThatAreNotOursAreMovedAwayOrGiveNoHandle) {
  struct Plant {
    const char *szReason;
    void (*put)(const std::string &path);
  };
  const Plant plants[] = {
      {"is no regular file",
       [](const std::string &path) { std::filesystem::create_symlink("/tmp/elsewhere", path); }},
      {"is no regular file",
       [](const std::string &path) { std::filesystem::create_directory(path); }},
      {"has a second name",
       [](const std::string &path) {
         writeFile("/tmp/second_name", "");
         std::filesystem::create_hard_link("/tmp/second_name", path);
       }},
      {"can be written by others", [](const std::string &path) { writeFile(path, "", 0620); }},
  };
  for (const char *suffix : {"", "-journal"}) {
    for (const Plant &plant : plants) {
      SCOPED_TRACE(std::string(suffix) + " " + plant.szReason);
      cleanWorld();
      const std::string path = kStatusDatabase + std::string(suffix);
      std::filesystem::remove(path);
      plant.put(path);
      failCall("renameat2", {.error = EIO});
      EXPECT_EQ(ZELOSchedDBInit(), nullptr);
      EXPECT_EQ(logged(), Lines{"sched_task_db.cpp:N Can't open database: " + path + " " +
                                plant.szReason + "\n"});
      EXPECT_EQ(errorRecord(), (ErrorRecord{0x0900, "sched_task_db.cpp"}));
      EXPECT_FALSE(fileExists("/tmp/elsewhere"));
      const Database moved(ZELOSchedDBInit());
      EXPECT_NE(moved, nullptr);
      EXPECT_EQ(ZELOSchedDBAddRecord(moved.get(), makeTask("task", "").get(), nullptr), 0);
      EXPECT_FALSE(fileExists("/tmp/elsewhere"));
      std::filesystem::remove(path);
      std::filesystem::remove("/tmp/second_name");
    }
  }
}

TEST_F(StatusDatabaseTest, AFileOfAnotherUserIsNamedInTheLog) {
  REQUIRE_OTHER_USERS();
  constexpr uid_t kNobody = 65534;
  for (const char *suffix : {"", "-journal"}) {
    cleanWorld();
    const std::string path = kStatusDatabase + std::string(suffix);
    writeFile(path, "");
    ASSERT_EQ(chown(path.c_str(), kNobody, kNobody), 0);
    failCall("renameat2", {.error = EIO});
    EXPECT_EQ(ZELOSchedDBInit(), nullptr);
    EXPECT_EQ(logged(),
              Lines{"sched_task_db.cpp:N Can't open database: " + path + " is another user's\n"});
    std::filesystem::remove(path);
  }
}

TEST_F(StatusDatabaseTest, TheNameOfTheJournalStaysTaken) {
  struct stat info = {};
  ASSERT_EQ(lstat("/tmp/sched_status.sqlite-journal", &info), 0);
  EXPECT_EQ(info.st_uid, geteuid());
  EXPECT_EQ(info.st_mode & 0777U, 0600U);
  EXPECT_EQ(ZELOSchedDBAddRecord(db(), makeTask("task", "").get(), nullptr), 0);
  EXPECT_EQ(lstat("/tmp/sched_status.sqlite-journal", &info), 0);
}

TEST_F(StatusDatabaseTest, OthersCannotOpenADatabaseThatWasMadeHere) {
  struct stat info = {};
  ASSERT_EQ(stat(kStatusDatabase, &info), 0);
  EXPECT_EQ(info.st_mode & 0777U, 0600U);
}

TEST_F(StatusDatabaseTest, ACheckThatWouldGoOnForEverIsEnded) {
  for (int i = 0; i < 100; ++i) addStatusRow({.pid = 1, .app = "app", .taskId = 7});
  const std::string doubled =
      "a AS (SELECT 1), b AS (SELECT * FROM a, a), c AS (SELECT * FROM b, b)";
  const std::string apps[] = {
      "x' OR (SELECT count(*) FROM task_status a, task_status b, task_status c, task_status d, "
      "task_status e)='",
      "x' OR (WITH " + doubled + " SELECT * FROM c)='",
      "x' OR (WITH RECURSIVE c(n) AS (VALUES(1) UNION ALL SELECT n+1 FROM c) SELECT n FROM c)='",
      "x' OR group_concat(app)='",
      "x' OR app GLOB '*a*a*a*a*a*a*a*a*b",
  };
  for (const std::string &app : apps) {
    SCOPED_TRACE(app);
    clearLog();
    resetFailingCalls();
    EXPECT_EQ(ZELOSchedDBIsAppRunning(db(), app.c_str(), &status_), -1);
    ASSERT_EQ(logged().size(), 1U);
    EXPECT_EQ(callCount("sqlite3_exec"), 0U) << "SQLite has seen it";
  }
}

// As long as a statement may be, and the most that a row may cost.
TEST_F(StatusDatabaseTest, AConditionOfManyTermsIsRefused) {
  std::string app = "x'";
  for (int i = 0; i < 500; ++i) app += "||app";
  EXPECT_EQ(ZELOSchedDBIsAppRunning(db(), (app + "||'").c_str(), &status_), -1);
  ASSERT_EQ(logged().size(), 1U);
  EXPECT_TRUE(logged()[0].ends_with("] error: not authorized\n")) << logged()[0];
}

TEST_F(StatusDatabaseTest, NoConditionCostsMoreThanAFewHundredStepsARow) {
  constexpr unsigned kRows = 50;
  constexpr unsigned kMostStepsOfARow = 300;
  constexpr unsigned kStepsToPrepare = 1000;
  for (unsigned i = 0; i < kRows; ++i) addStatusRow({.pid = 1, .app = "app", .taskId = 7});
  for (const char *term : {"||app", " or app", " or app='x'", "=app", " or status_id=1",
                           " is not null or pid", "<app or not app"}) {
    SCOPED_TRACE(term);
    // The longest of its kind that is not refused.
    std::string app = "x'";
    const auto isTaken = [&] {
      return ZELOSchedDBIsAppRunning(db(), (app + term + " or '").c_str(), &status_) == 0;
    };
    while (isTaken()) app += term;
    ASSERT_GT(app.size(), 50U);
    app += " or '";
    unsigned steps = 0;
    sqlite3_progress_handler(
        db(), 1, [](void *count) { return ++*static_cast<unsigned *>(count) == 0 ? 1 : 0; },
        &steps);
    EXPECT_EQ(ZELOSchedDBIsAppRunning(db(), app.c_str(), &status_), 0);
    sqlite3_progress_handler(db(), 0, nullptr, nullptr);
    EXPECT_LT(steps, kRows * kMostStepsOfARow + kStepsToPrepare);
  }
}

// Whatever a text is, a check changes nothing, adding adds the row of this run or none, and setting
// sets the code and the comment of the row that was named.
TEST_F(StatusDatabaseTest, TextsMadeOfTheWordsOfSqlDoWhatTheirStatementIsForOrNothing) {
  constexpr int kTexts = 3000;
  constexpr time_t kNow = 1367915400;
  constexpr const char *kPieces[] = {
      "'",      "'",     "''",   "'",      " ",       "x",       "app",         "pid",       ",",
      "(",      ")",     "1",    "2",      ";",       "--",      "/*",          "*/",        "\"",
      "[",      "]",     "`",    " or ",   " and ",   "not ",    "=",           "||",        "<",
      "SELECT", "WITH ", "null", "VALUES", " FROM ",  " WHERE ", "task_status", "status_id", "=9",
      "\n",     "\\",    "\xff", "?",      " UNION ", " SET ",   " ORDER BY ",  "rowid",     "%"};
  setClock(kNow);
  addStatusRow({.pid = 1, .timestamp = 5, .app = "x", .taskId = 8, .statusCode = kRunning});
  addStatusRow({.pid = 1, .timestamp = 6, .app = "app", .taskId = 9, .statusCode = kRunning});
  unsigned state = 1;
  const auto next = [&state](size_t bound) {
    constexpr unsigned kFactor = 1664525;
    constexpr unsigned kStep = 1013904223;
    state = state * kFactor + kStep;
    return (state >> 16U) % bound;
  };
  int added = 0;
  for (int i = 0; i < kTexts; ++i) {
    std::string text = "x";
    for (size_t pieces = 1 + next(9); pieces > 0; --pieces)
      text += kPieces[next(std::size(kPieces))];
    SCOPED_TRACE(text);
    std::vector<StatusRow> rows = statusRows();
    ZELOSchedDBIsAppRunning(db(), text.c_str(), &status_);
    ASSERT_EQ(statusRows(), rows);

    ZELO_SCHED_TASK task = {};
    task.ID = 7;
    setText(task.App, text);
    int id = 0;
    if (ZELOSchedDBAddRecord(db(), &task, &id) == 0) {
      ++added;
      StatusRow row = statusRows().back();
      row.app.clear();
      EXPECT_EQ(row, (StatusRow{id, getpid(), kNow, "", 7, kRunning, std::nullopt}));
      execute("DELETE FROM task_status WHERE status_id=" + std::to_string(id));
    }
    ASSERT_EQ(statusRows(), rows);

    ZELOSchedDBSetStatus(db(), 2, kRunning, kRunning, text.c_str());
    rows[1].comment = statusRows()[1].comment;
    ASSERT_EQ(statusRows(), rows);
  }
  EXPECT_GT(added, kTexts / 10);
}

// What one statement may do, another kind may not: a check must not end the runs that it looks for.
class PurposeTest : public StatusDatabaseTest {
 protected:
  void SetUp() override {
    StatusDatabaseTest::SetUp();
    addStatusRow({.pid = 1, .timestamp = 5, .app = "app", .taskId = 7, .statusCode = 2});
    rows_ = statusRows();
  }

  std::vector<StatusRow> rows_;
};

TEST_F(PurposeTest, AnApplicationCheckCanNeitherUpdateNorInsert) {
  for (const char *szApp : {"x'; UPDATE task_status SET status_code=3; --",
                            "x'; INSERT INTO task_status(pid) VALUES(1); --"}) {
    SCOPED_TRACE(szApp);
    EXPECT_EQ(ZELOSchedDBIsAppRunning(db(), szApp, &status_), -1);
    EXPECT_EQ(statusRows(), rows_);
  }
}

TEST_F(PurposeTest, AnAddedRecordCannotChangeOtherRuns) {
  for (const char *szApp :
       {"x',1,1,1,2); UPDATE task_status SET status_code=3; --",
        "x',1,1,1,2); INSERT OR REPLACE INTO task_status(status_id,pid) VALUES(1,9); --",
        "x',1,1,1,2); REPLACE INTO task_status(status_id,app,status_code) "
        "SELECT status_id,'x',3 FROM task_status; --",
        "x',0,0,0,0),('evil',1,4102444800,1,2);--"}) {
    SCOPED_TRACE(szApp);
    clearLog();
    ZELO_SCHED_TASK task = {};
    setText(task.App, szApp);
    EXPECT_EQ(ZELOSchedDBAddRecord(db(), &task, nullptr), -1);
    EXPECT_EQ(statusRows(), rows_);
    ASSERT_EQ(logged().size(), 1U);
    EXPECT_TRUE(logged()[0].ends_with("] error: not authorized\n")) << logged()[0];
  }
}

// A statement that is compiled anew because the schema has changed under it is still the first.
TEST_F(PurposeTest, ARecordIsAddedAlsoAfterAnotherProcessChangedTheSchema) {
  execute("CREATE TABLE other(a)");
  EXPECT_EQ(ZELOSchedDBAddRecord(db(), makeTask("task", "").get(), nullptr), 0);
  EXPECT_EQ(statusRows().size(), rows_.size() + 1);
}

INSTANTIATE_TEST_SUITE_P(Sql, InjectionTest, testing::ValuesIn(kInjections),
                         [](const testing::TestParamInfo<Injection> &injection) {
                           return std::string(injection.param.szName);
                         });

// A connection has one of each, which cannot be asked for and put back.
class CallersConnectionTest : public StatusDatabaseTest {
 protected:
  struct Calls {
    unsigned authorizer = 0;
    unsigned progress = 0;
    unsigned commit = 0;
    unsigned rollback = 0;
    unsigned update = 0;
    unsigned trace = 0;
    bool operator==(const Calls &) const = default;
  };

  void SetUp() override {
    StatusDatabaseTest::SetUp();
    const auto count = [](void *number) { return ++*static_cast<unsigned *>(number) == 0 ? 1 : 0; };
    sqlite3_set_authorizer(
        db(),
        [](void *number, int, const char *, const char *, const char *, const char *) {
          ++*static_cast<unsigned *>(number);
          return SQLITE_OK;
        },
        &calls_.authorizer);
    sqlite3_progress_handler(db(), 1, count, &calls_.progress);
    sqlite3_commit_hook(db(), count, &calls_.commit);
    sqlite3_rollback_hook(
        db(), [](void *number) { ++*static_cast<unsigned *>(number); }, &calls_.rollback);
    sqlite3_update_hook(
        db(),
        [](void *number, int, const char *, const char *, sqlite3_int64) {
          ++*static_cast<unsigned *>(number);
        },
        &calls_.update);
    sqlite3_trace_v2(
        db(), SQLITE_TRACE_STMT,
        [](unsigned, void *number, void *, void *) {
          ++*static_cast<unsigned *>(number);
          return 0;
        },
        &calls_.trace);
  }

  void callEach() {
    int code = 0;
    EXPECT_EQ(ZELOSchedDBAddRecord(db(), makeTask("task", "").get(), nullptr), 0);
    EXPECT_EQ(ZELOSchedDBIsTaskRunning(db(), 7, &status_), 0);
    EXPECT_EQ(ZELOSchedDBIsAppRunning(db(), "x' OR app='y", &status_), 0);
    EXPECT_EQ(ZELOSchedDBIsAppRunning(db(), "x' OR (SELECT 1)='", &status_), -1);
    EXPECT_EQ(ZELOSchedDBSetStatus(db(), 1, 0, kFinished, "it's"), -1);
    EXPECT_EQ(ZELOSchedDBSetStatus(db(), 1, 0, kFinished, "9"), 0);
    EXPECT_EQ(ZELOSchedDBGetStatusByStatusID(db(), 1, &code, nullptr, 0), 1);
    EXPECT_EQ(ZELOSchedDBGetStatusByTaskID(db(), 77, nullptr, &code, nullptr, 0), 0);
  }

  Calls calls_;
};

TEST_F(CallersConnectionTest, ItsAuthorizerAndHooksStandAfterEachCall) {
  callEach();
  calls_ = {};
  EXPECT_EQ(
      sqlite3_exec(db(), "UPDATE task_status SET pid=1; BEGIN; DELETE FROM task_status; ROLLBACK",
                   nullptr, nullptr, nullptr),
      SQLITE_OK);
  EXPECT_GT(calls_.authorizer, 0U);
  EXPECT_GT(calls_.progress, 0U);
  EXPECT_EQ(calls_.commit, 1U);
  EXPECT_EQ(calls_.rollback, 1U);
  EXPECT_GE(calls_.update, 1U);
  EXPECT_EQ(calls_.trace, 4U);
}

TEST_F(CallersConnectionTest, ItsLimitsStandAfterEachCall) {
  const auto limits = [this](int add) {
    std::vector<int> values;
    for (int id = SQLITE_LIMIT_LENGTH; id <= SQLITE_LIMIT_WORKER_THREADS; ++id) {
      const int value = sqlite3_limit(db(), id, -1);
      if (add != 0) sqlite3_limit(db(), id, value + add);
      values.push_back(sqlite3_limit(db(), id, -1));
    }
    return values;
  };
  const std::vector<int> before = limits(-1);
  callEach();
  EXPECT_EQ(limits(0), before);
}

TEST_F(CallersConnectionTest, ItsTransactionStaysOpenAndCanTakeAllBack) {
  EXPECT_EQ(sqlite3_exec(db(), "BEGIN", nullptr, nullptr, nullptr), SQLITE_OK);
  callEach();
  EXPECT_EQ(sqlite3_get_autocommit(db()), 0);
  EXPECT_EQ(sqlite3_exec(db(), "ROLLBACK", nullptr, nullptr, nullptr), SQLITE_OK);
  EXPECT_EQ(statusRows(), std::vector<StatusRow>{});
}

TEST_F(StatusDatabaseTest, TheCallersOwnStatementsAreNotRestricted) {
  addStatusRow({.statusCode = kRunning});
  ASSERT_EQ(ZELOSchedDBIsTaskRunning(db(), 7, &status_), 0);
  EXPECT_EQ(sqlite3_exec(db(), "DELETE FROM task_status", nullptr, nullptr, nullptr), SQLITE_OK);
  EXPECT_EQ(statusRows(), std::vector<StatusRow>{});
}

// ---- statements that do not fit

constexpr size_t kLongestStatement = 4095;

class LongStatementTest : public StatusDatabaseTest {};

TEST_F(LongStatementTest, AStatementThatJustFitsRuns) {
  const std::string frame = "UPDATE task_status SET status_code=3, comment='' WHERE status_id=1";
  const std::string comment(kLongestStatement - frame.size(), 'c');
  addStatusRow({.statusCode = kRunning});
  EXPECT_EQ(ZELOSchedDBSetStatus(db(), 1, 0, kFinished, comment.c_str()), 0);
  EXPECT_EQ(statusRows()[0].comment, comment);
}

// Wherever the cut falls - within the comment, the WHERE clause, or the number in it - the
// statement would do something else than it was asked for.
TEST_F(LongStatementTest, AStatementThatDoesNotFitNeverRuns) {
  const std::string frame =
      "UPDATE task_status SET status_code=3, comment='' WHERE status_id=1234 AND status_code=2";
  addStatusRow({.statusId = 1, .statusCode = kRunning});
  addStatusRow({.statusId = 1234, .statusCode = kRunning});
  const std::vector<StatusRow> rows = statusRows();
  for (size_t excess = 1; excess <= frame.size() + 2; ++excess) {
    SCOPED_TRACE(excess);
    resetFailingCalls();
    const std::string comment(kLongestStatement - frame.size() + excess, 'c');
    ASSERT_EQ(ZELOSchedDBSetStatus(db(), 1234, kRunning, kFinished, comment.c_str()), -1);
    ASSERT_EQ(callCount("sqlite3_exec"), 0U);
    ASSERT_EQ(statusRows(), rows);
  }
}

TEST_F(LongStatementTest, AStatementThatDoesNotFitIsReported) {
  const std::string text(5000, 'c');
  const std::pair<std::string, std::function<int()>> calls[] = {
      {"UPDATE task_status SET status_code=3, comment='",
       [&] { return ZELOSchedDBSetStatus(db(), 1, 0, kFinished, text.c_str()); }},
      {"SELECT pid,status_id,task_id from task_status WHERE app='",
       [&] { return ZELOSchedDBIsAppRunning(db(), text.c_str(), &status_); }},
  };
  for (const auto &[begin, call] : calls) {
    clearLog();
    EXPECT_EQ(call(), -1);
    EXPECT_EQ(logged(), Lines{failedSql(begin + text.substr(0, kLongestStatement - begin.size()),
                                        "statement too long")});
    EXPECT_EQ(callCount("sqlite3_exec"), 0U);
    EXPECT_EQ(errorRecord(), kNoError);
  }
}

TEST_F(LongStatementTest, TheLongestApplicationOfATaskFits) {
  ZELO_SCHED_TASK task = {};
  const std::string app(sizeof(task.App) - 1, 'a');
  setText(task.App, app);
  int id = 0;
  EXPECT_EQ(ZELOSchedDBAddRecord(db(), &task, &id), 0);
  EXPECT_EQ(statusRows()[0].app, app);
  EXPECT_EQ(logged(), Lines{});
}

}  // namespace
}  // namespace support

// Before the library's own, for the library's calls too.
extern "C" __attribute__((visibility("default"))) void ZELOSchedRandInit(void) {
  ++support::randInits;
  static const auto real = reinterpret_cast<void (*)()>(dlsym(RTLD_NEXT, "ZELOSchedRandInit"));
  real();
}
