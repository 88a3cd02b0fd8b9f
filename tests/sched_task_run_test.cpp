// One run of a stored task, from the check of its minute to the row that tells how it ended.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sqlite3.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <cstring>
#include <filesystem>
#include <functional>
#include <optional>

#include "captured_log.h"
#include "failing_calls.h"
#include "fake_backends.h"
#include "fake_clock.h"
#include "fifos.h"
#include "schedule_cases.h"
#include "shared_memory.h"
#include "status_db.h"
#include "tasks.h"
#include "users.h"
#include "zelocore.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;
using Statuses = std::vector<int>;

constexpr char kLockFile[] = "/tmp/lock/lock_sched_run";
constexpr char kRanFile[] = "/tmp/run_test.ran";
constexpr char kRanCommand[] = "echo ran >> /tmp/run_test.ran";
constexpr int kInjectedCode = 0x0B00;
constexpr int kMostRetries = 20;
constexpr int kLockTries = 101;
constexpr long kLockPause = 50000;
constexpr long kMicroseconds = 1000000;
constexpr mode_t kPermissions = 07777;
const std::string kInjected = "[0x0B00 injected.cpp:N]";
const std::string kNoRecord = "[0x0000 :N]";

std::string runLine(const std::string &text) {
  return "sched_task_run.cpp:N " + text;
}

std::string lockFailed(int retry, int seconds) {
  return runLine("Lock failed (retry=" + std::to_string(retry) + "), sleep " +
                 std::to_string(seconds) + " secs.");
}

std::string conflict(long other, int retry, int seconds) {
  return runLine("Task 1 conflict with task " + std::to_string(other) + " (running), retry = " +
                 std::to_string(retry) + ", wait " + std::to_string(seconds) + " secs.");
}

// What the child saw.
SharedLines &seen() {
  static SharedLines lines(size_t{1} << 20);
  return lines;
}

void see(const std::string &what, long number) {
  seen().append(0, what + " " + std::to_string(number));
}

std::function<int(ZELO_SCHED_TASK *, int *, char *, size_t)> backendRun;

int callBackendRun(ZELO_SCHED_TASK *task, int *statusCode, char *comment, size_t capacity) {
  return backendRun(task, statusCode, comment, capacity);
}

mode_t modeOf(const char *path) {
  struct stat info {};
  return stat(path, &info) == 0 ? info.st_mode & kPermissions : 0;
}

// The lock file, whose directory there is now.
const char *inLockDirectory() {
  mkdir(kLockDirectory, 0755);
  return kLockFile;
}

// 0 when nobody holds the run lock, EWOULDBLOCK when someone does.
int tryRunLock() {
  const int descriptor = open(kLockFile, O_RDONLY | O_CLOEXEC);
  if (descriptor < 0) return errno;
  const int error = flock(descriptor, LOCK_EX | LOCK_NB) == 0 ? 0 : errno;
  close(descriptor);
  return error;
}

StatusRow runningRow(long taskId, const std::string &app, pid_t pid = getpid()) {
  return {.pid = pid, .timestamp = 1, .app = app, .taskId = taskId, .statusCode = 2};
}

class TaskRunTest : public UsersTest {
 protected:
  void SetUp() override {
    UsersTest::SetUp();
    ASSERT_EQ(ZELOSchedBackendInit(), 0);
    std::copy(std::begin(SchedBackends), std::end(SchedBackends), backends_);
    backendCount_ = cBackend;
    startAnew();
  }

  static void startAnew() {
    cleanWorld();
    seen().clear();
    std::remove(kRanFile);
  }

  void TearDown() override {
    std::copy(std::begin(backends_), std::end(backends_), SchedBackends);
    cBackend = backendCount_;
    UsersTest::TearDown();
  }

  // The counts and the log are then about what follows.
  static long save(const Task &task) {
    const long id = saveTask(task);
    resetFailingCalls();
    clearLog();
    return id;
  }

  static long saveRanTask() { return save(makeTask("task", kRanCommand)); }

  static void runToEnd(long id) {
    EXPECT_EQ(ZELOSchedTaskRun(id, 0, 0), 0);
    EXPECT_EQ(waitForChildRuns(), Statuses{0});
  }

  static bool ran() { return fileExists(kRanFile); }

  static void expectNothingRan() {
    EXPECT_FALSE(ran());
    EXPECT_EQ(recordedSystemCommands(), Lines{});
  }

  // The code of the only row.
  static int finalCode() {
    const std::vector<StatusRow> rows = statusRows();
    return rows.size() == 1 ? rows[0].statusCode : -1;
  }

  static void useBackendRun(std::function<int(ZELO_SCHED_TASK *, int *, char *, size_t)> run) {
    backendRun = std::move(run);
    SchedBackends[0].run = callBackendRun;
  }

 private:
  ZELO_SCHED_BACKEND backends_[std::size(SchedBackends)];
  uint32_t backendCount_;
};

// ---- before the fork

TEST_F(TaskRunTest, AnUnknownTaskIsReportedAndNotRun) {
  EXPECT_EQ(ZELOSchedTaskRun(7, 0, 0), -1);
  EXPECT_EQ(logged(), (Lines{"sched_task_get.cpp:N No get_by_id backend is found for task [7] ",
                             runLine("get task failed. [7] [0x2000 sched_task_get.cpp:N]")}));
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x2000, "sched_task_get.cpp"}));
  EXPECT_EQ(callCount("QLIBCProcForkChildNoWait"), 0U);
}

TEST_F(TaskRunTest, ATaskMarkedAsNotExistingIsRefused) {
  const Task task = makeTask("task", kRanCommand);
  task->State = ZELO_SCHED_STATE_NOT_EXISTED;
  const long id = save(task);
  EXPECT_EQ(ZELOSchedTaskRun(id, 0, 0), -1);
  EXPECT_EQ(logged(), Lines{runLine("task [1] does not exist. ")});
  EXPECT_EQ(loggedPriorities(), std::vector<int>{3});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x2000, "sched_task_run.cpp"}));
  EXPECT_EQ(callCount("QLIBCProcForkChildNoWait"), 0U);
}

TEST_F(TaskRunTest, ADisabledTaskIsSilentlySkippedWhenThatIsAsked) {
  const Task task = makeTask("task", kRanCommand);
  task->State = ZELO_SCHED_STATE_DISABLED;
  const long id = save(task);
  EXPECT_EQ(ZELOSchedTaskRun(id, 0, 1), 0);
  EXPECT_EQ(callCount("QLIBCProcForkChildNoWait"), 0U);
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskRunTest, ADisabledTaskIsSkippedBeforeItsMinuteIsAsked) {
  const Task task = makeTask("task", kRanCommand);
  task->State = ZELO_SCHED_STATE_DISABLED;
  const long id = save(task);
  loadTask(id);
  const unsigned toLoad = callCount("localtime");
  failCall("localtime", {.from = toLoad + 1, .times = kAlways});
  EXPECT_EQ(ZELOSchedTaskRun(id, 1, 1), 0);
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskRunTest, ADisabledTaskRunsWhenSkippingIsNotAsked) {
  for (const int skipDisabled : {0, 2}) {
    cleanWorld();
    const Task task = makeTask("task", "true");
    task->State = ZELO_SCHED_STATE_DISABLED;
    const long id = save(task);
    EXPECT_EQ(ZELOSchedTaskRun(id, 0, skipDisabled), 0);
    waitForChildRuns();
    EXPECT_EQ(finalCode(), ZELO_SCHED_STATUS_FINISHED) << skipDisabled;
  }
}

TEST_F(TaskRunTest, WithoutTheCheckATaskRunsAtAnyMinute) {
  const Task task = makeTask("task", "true");
  task->StartYear = 9999;
  const long id = save(task);
  for (const int checkRunTime : {0, 2}) {
    EXPECT_EQ(ZELOSchedTaskRun(id, checkRunTime, 1), 0);
    waitForChildRuns();
  }
  EXPECT_EQ(statusRows().size(), 2U);
}

TEST_F(TaskRunTest, ADateThatCannotBeReadIsReported) {
  const long id = saveRanTask();
  loadTask(id);
  const unsigned toLoad = callCount("localtime");
  resetFailingCalls();
  failCall("localtime", {.from = toLoad + 1, .error = EOVERFLOW});
  EXPECT_EQ(ZELOSchedTaskRun(id, 1, 0), -1);
  EXPECT_EQ(logged(),
            (Lines{"sched_util.cpp:N localtime failed. Value too large for defined data type",
                   runLine("get date failed. [0x2A00 sched_util.cpp:N]"),
                   runLine("check run time failed. [1] [0x2A00 sched_util.cpp:N]")}));
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x2A00, "sched_util.cpp"}));
  EXPECT_EQ(callCount("QLIBCProcForkChildNoWait"), 0U);
}

TEST_F(TaskRunTest, AForkThatFailsIsReported) {
  const long id = saveRanTask();
  failCall("QLIBCProcForkChildNoWait", {.code = kInjectedCode});
  EXPECT_EQ(ZELOSchedTaskRun(id, 0, 0), -1);
  EXPECT_EQ(logged(), (Lines{runLine("Fork error! " + kInjected),
                             runLine("run task failed. [1] " + kInjected)}));
  EXPECT_EQ(errorRecord(), (ErrorRecord{kInjectedCode, kInjectedFile}));
  EXPECT_EQ(statusRows(), std::vector<StatusRow>{});
}

// ---- is now one of the task's minutes?

// Tuesday, at 08:30.
void startOn7May(ZELO_SCHED_TASK *task, int32_t type) {
  task->Type = type;
  task->StartYear = 2013;
  task->StartMonth = 5;
  task->StartDay = 7;
  task->RunHour = 8;
  task->RunMin = 30;
}

class DueTest : public TaskRunTest {
 protected:
  // Nothing is forked: the platform's answer is that of the caller's side.
  static bool isDue(long id, const std::string &now) {
    setClock(now);
    resetFailingCalls();
    failCall("QLIBCProcForkChildNoWait", {.times = kAlways, .result = 1});
    EXPECT_EQ(ZELOSchedTaskRun(id, 1, 1), 0);
    return callCount("QLIBCProcForkChildNoWait") == 1;
  }

  // What the task is that every id has.
  static void serve(Task task) {
    served() = std::move(task);
    SchedBackends[0].get_by_id = [](long, ZELO_SCHED_TASK *result) {
      *result = *served();
      return 1;
    };
  }

 private:
  static Task &served() {
    static Task task;
    return task;
  }
};

TEST_F(DueTest, EachScheduleIsDueInItsMinutes) {
  for (const ScheduleCase &each : scheduleCases()) {
    serve(taskOf(each.schedule));
    for (const Moment &moment : each.moments) {
      SCOPED_TRACE(each.what + " at " + moment.now);
      EXPECT_EQ(isDue(1, moment.now), moment.isDue);
    }
  }
}

TEST_F(DueTest, OnADayOnWhichItIsDueItIsSoInTheHoursOfItsLineAndTheirMinute) {
  for (const ScheduleCase &each : scheduleCases()) {
    const auto due = std::find_if(each.moments.begin(), each.moments.end(),
                                  [](const Moment &moment) { return moment.isDue; });
    if (due == each.moments.end()) continue;
    SCOPED_TRACE(each.what);
    serve(taskOf(each.schedule));
    const std::string day = std::string(due->now).substr(0, sizeof("2013-05-07"));
    std::vector<uint32_t> hours;
    for (uint32_t hour = 0; hour < 24; ++hour) {
      for (uint32_t minute = each.schedule.minute - 1; minute <= each.schedule.minute + 1;
           ++minute) {
        if (minute > 59) continue;
        const std::string now = day + std::to_string(hour) + ":" + std::to_string(minute);
        if (!isDue(1, now)) continue;
        EXPECT_EQ(minute, each.schedule.minute) << hour;
        hours.push_back(hour);
      }
    }
    EXPECT_EQ(hours, hoursOf(each));
  }
}

TEST_F(DueTest, ADueTaskIsRunAndAnotherIsNot) {
  const Task task = makeTask("task", kRanCommand);
  startOn7May(task.get(), ZELO_SCHED_TYPE_DAILY);
  const long id = save(task);
  setClock("2013-05-08 08:31");
  EXPECT_EQ(ZELOSchedTaskRun(id, 1, 1), 0);
  waitForChildRuns();
  EXPECT_FALSE(ran());
  setClock("2013-05-08 08:30");
  EXPECT_EQ(ZELOSchedTaskRun(id, 1, 1), 0);
  waitForChildRuns();
  EXPECT_TRUE(ran());
  EXPECT_EQ(logged(), Lines{});
}

// ---- the child and its row

TEST_F(TaskRunTest, ARunLeavesOneRowThatTellsHowItEnded) {
  setClock("2013-05-07 08:30");
  const long id = saveRanTask();
  runToEnd(id);
  const std::vector<StatusRow> rows = statusRows();
  ASSERT_EQ(rows.size(), 1U);
  EXPECT_GT(rows[0].pid, 1);
  EXPECT_NE(rows[0].pid, getpid());
  EXPECT_EQ(rows[0], (StatusRow{.statusId = 1,
                                .pid = rows[0].pid,
                                .timestamp = localTime("2013-05-07 08:30"),
                                .app = "ZELO.TOV.TaskScheduler.Script",
                                .taskId = id,
                                .statusCode = 3,
                                .comment = std::nullopt}));
  EXPECT_EQ(readFile(kRanFile), "ran\n");
  EXPECT_EQ(logged(), Lines{});
  EXPECT_EQ(recordedSystemCommands(), Lines{kRanCommand});
}

TEST_F(TaskRunTest, TheRowTellsExitCodeAndSignal) {
  struct {
    const char *command;
    int code;
    const char *comment;
  } cases[] = {{"exit 42", 7, "42"}, {"exit 255", 7, "255"}, {"kill -9 $$", 6, "9"}};
  for (const auto &each : cases) {
    SCOPED_TRACE(each.command);
    cleanWorld();
    runToEnd(save(makeTask("task", each.command)));
    const std::vector<StatusRow> rows = statusRows();
    ASSERT_EQ(rows.size(), 1U);
    EXPECT_EQ(rows[0].statusCode, each.code);
    EXPECT_EQ(rows[0].comment, each.comment);
  }
}

TEST_F(TaskRunTest, TheCallerIsAnsweredWhileTheCommandRuns) {
  makeFifos();
  const long id = save(makeTask("task", kWaitingCommand));
  ASSERT_EQ(ZELOSchedTaskRun(id, 0, 0), 0);
  waitUntilStarted();
  const std::vector<StatusRow> rows = statusRows();
  letGo();
  waitForChildRuns();
  ASSERT_EQ(rows.size(), 1U);
  EXPECT_EQ(rows[0].statusCode, ZELO_SCHED_STATUS_RUNNING);
  EXPECT_EQ(finalCode(), ZELO_SCHED_STATUS_FINISHED);
}

TEST_F(TaskRunTest, ARunThatIsKilledStaysRunningInItsRowAndReadsAsGone) {
  makeFifos();
  const long id = save(makeTask("task", kWaitingCommand));
  ASSERT_EQ(ZELOSchedTaskRun(id, 0, 0), 0);
  waitUntilStarted();
  const std::vector<StatusRow> rows = statusRows();
  ASSERT_EQ(rows.size(), 1U);
  ASSERT_GT(rows[0].pid, 1);
  EXPECT_EQ(kill(static_cast<pid_t>(rows[0].pid), SIGKILL), 0);
  letGo();
  waitForChildRuns();
  EXPECT_EQ(finalCode(), ZELO_SCHED_STATUS_RUNNING);
  sqlite3 *db = ZELOSchedDBInit();
  int code = 0;
  EXPECT_EQ(ZELOSchedDBGetStatusByTaskID(db, id, nullptr, &code, nullptr, 0), 1);
  EXPECT_EQ(code, ZELO_SCHED_STATUS_GONE);
  sqlite3_close(db);
}

TEST_F(TaskRunTest, WhatTheCallerHasBufferedIsWrittenOnce) {
  const long id = saveRanTask();
  FILE *stream = fopen("/tmp/run_test.buffered", "w");
  ASSERT_NE(stream, nullptr);
  fputs("once\n", stream);
  runToEnd(id);
  fclose(stream);
  EXPECT_EQ(readFile("/tmp/run_test.buffered"), "once\n");
}

void seeExit() {
  see("exit handler", 0);
}

TEST_F(TaskRunTest, TheCallersExitHandlersDoNotRunInTheChild) {
  static const int registered = atexit(seeExit);
  ASSERT_EQ(registered, 0);
  runToEnd(saveRanTask());
  EXPECT_TRUE(ran());
  EXPECT_EQ(seen().texts(), Lines{});
}

TEST_F(TaskRunTest, EachRunSeedsTheRandomWaitsAnew) {
  setClock("2013-05-07 08:30");
  runToEnd(saveRanTask());
  const std::vector<StatusRow> rows = statusRows();
  ASSERT_EQ(rows.size(), 1U);
  EXPECT_EQ(lastSeed(), static_cast<unsigned>(rows[0].timestamp + rows[0].pid));
}

TEST_F(TaskRunTest, TheRandomWaitsAreSeededBeforeTheFirst) {
  const long id = saveRanTask();
  failCall("mkdir", {.error = EACCES});
  onSleep([](size_t) { see("seeds", callCount("srand")); });
  runToEnd(id);
  EXPECT_EQ(seen().texts(), Lines{"seeds 1"});
}

// ---- the run lock

TEST_F(TaskRunTest, ATaskThatMayOverlapRunsWithoutTouchingTheLock) {
  const Task task = makeTask("task", kRanCommand);
  task->CanRunTaskSameTime = 1;
  task->CanRunAppSameTime = 1;
  runToEnd(save(task));
  EXPECT_TRUE(ran());
  EXPECT_EQ(finalCode(), ZELO_SCHED_STATUS_FINISHED);
  EXPECT_FALSE(fileExists(kLockDirectory));
  EXPECT_EQ(callCount("flock"), 0U);
}

TEST_F(TaskRunTest, AnyOtherTaskTakesTheLockOnceAndGivesItBack) {
  for (const auto &[taskToo, appToo] : {std::pair{0, 0}, {0, 1}, {1, 0}}) {
    SCOPED_TRACE(testing::Message() << taskToo << appToo);
    cleanWorld();
    const Task task = makeTask("task", "true");
    task->CanRunTaskSameTime = taskToo;
    task->CanRunAppSameTime = appToo;
    runToEnd(save(task));
    EXPECT_EQ(finalCode(), ZELO_SCHED_STATUS_FINISHED);
    EXPECT_EQ(callCount("flock"), 2U);
    EXPECT_EQ(tryRunLock(), 0);
  }
}

TEST_F(TaskRunTest, TheLockDirectoryIsMadeForEverybodyWhateverTheMask) {
  const mode_t mask = umask(0077);
  runToEnd(saveRanTask());
  umask(mask);
  EXPECT_EQ(modeOf(kLockDirectory), 0755U);
  struct stat info {};
  ASSERT_EQ(stat(kLockFile, &info), 0);
  EXPECT_TRUE(S_ISREG(info.st_mode));
}

TEST_F(TaskRunTest, TheLockDirectoryIsTheOwnersAloneUntilItIsComplete) {
  const mode_t mask = umask(0);
  failCallFor("chmod", "/tmp/lock", {.from = 1, .times = 1, .error = EPERM});
  const long id = saveTask(makeTask("task", kRanCommand));
  setRandValues({0});
  runToEnd(id);
  umask(mask);
  EXPECT_EQ(modeOf(kLockDirectory), 0700U);
  EXPECT_EQ(logged(), Lines{lockFailed(1, 3)});
  EXPECT_TRUE(ran());
}

TEST_F(TaskRunTest, ALockDirectoryThatIsThereIsLeftAsItIs) {
  ASSERT_EQ(mkdir(kLockDirectory, 0711), 0);
  const long id = saveRanTask();
  runToEnd(id);
  EXPECT_EQ(modeOf(kLockDirectory), 0711U);
  EXPECT_EQ(callCount("mkdir"), 0U);
  EXPECT_TRUE(ran());
}

TEST_F(TaskRunTest, ALockFileThatIsThereIsNotMadeAnew) {
  writeFile(kLockFile, "kept");
  runToEnd(saveRanTask());
  EXPECT_EQ(readFile(kLockFile), "kept");
  EXPECT_EQ(modeOf(kLockFile), 0600U) << "who can read it can hold its lock";
  EXPECT_TRUE(ran());
}

TEST_F(TaskRunTest, ALockDirectoryThatCannotBeMadeIsTriedAgainLater) {
  const long id = saveRanTask();
  setRandValues({7, 19});
  failCall("mkdir", {.times = 2, .error = EACCES});
  runToEnd(id);
  EXPECT_EQ(logged(), (Lines{lockFailed(1, 24), lockFailed(2, 30)}));
  EXPECT_EQ(loggedPriorities(), (std::vector<int>{3, 3}));
  EXPECT_EQ(recordedSleeps(), (std::vector<long>{24 * kMicroseconds, 30 * kMicroseconds}));
  EXPECT_TRUE(ran());
  EXPECT_EQ(finalCode(), ZELO_SCHED_STATUS_FINISHED);
}

// Of runs that start together after a boot, all but one do.
TEST_F(TaskRunTest, ARunThatLosesTheRaceForTheLockDirectoryComesBackAndFindsIt) {
  const long id = saveRanTask();
  setRandValues({0});
  failCallFor("mkdir", kLockDirectory, {.error = EEXIST});
  onSleep([](size_t) { std::filesystem::create_directory(kLockDirectory); });
  runToEnd(id);
  EXPECT_EQ(logged(), Lines{lockFailed(1, 3)});
  EXPECT_EQ(recordedSleeps(), std::vector<long>{3 * kMicroseconds});
  EXPECT_TRUE(ran());
  EXPECT_EQ(finalCode(), ZELO_SCHED_STATUS_FINISHED);
}

TEST_F(TaskRunTest, WaitsGoFrom3To30SecondsInStepsOf3) {
  const long id = saveRanTask();
  setRandValues({0, 1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 2147483647});
  failCall("mkdir", {.times = 12, .error = EACCES});
  runToEnd(id);
  std::vector<long> wanted;
  for (const long seconds : {3, 6, 9, 12, 15, 18, 21, 24, 27, 30, 3, 24}) {
    wanted.push_back(seconds * kMicroseconds);
  }
  EXPECT_EQ(recordedSleeps("sleep"), wanted);
}

TEST_F(TaskRunTest, ARunGivesUpAfterTwentyRetriesOfTheLockAndLeavesNoRow) {
  const long id = saveRanTask();
  setRandValues({0});
  failCall("mkdir", {.times = kAlways, .error = EACCES});
  runToEnd(id);
  Lines wanted;
  for (int retry = 1; retry <= kMostRetries; ++retry) {
    wanted.push_back(lockFailed(retry, 3));
  }
  EXPECT_EQ(logged(), wanted);
  EXPECT_EQ(recordedSleeps("sleep").size(), size_t{kMostRetries});
  EXPECT_EQ(callCount("mkdir"), kMostRetries + 1U);
  EXPECT_FALSE(fileExists(kStatusDatabase));
  expectNothingRan();
}

TEST_F(TaskRunTest, WhateverStandsInTheWayOfTheLockIsMovedAway) {
  const std::pair<const char *, std::function<void()>> obstacles[] = {
      {"a file where the directory is to be", [] { writeFile(kLockDirectory, ""); }},
      {"a directory", [] { std::filesystem::create_directories(kLockFile); }},
      {"a link to something that is not there",
       [] { std::filesystem::create_symlink("/tmp/run_test.victim", inLockDirectory()); }},
      {"a link to a file",
       [] { std::filesystem::create_symlink("/etc/passwd", inLockDirectory()); }},
      {"a FIFO", [] { EXPECT_EQ(mkfifo(inLockDirectory(), 0644), 0); }},
      {"a file with a second name",
       [] {
         writeFile(kLockFile, "", 0600);
         EXPECT_EQ(link(kLockFile, "/tmp/lock/other"), 0);
       }},
      {"a file that others can write", [] { writeFile(kLockFile, "", 0666); }},
  };
  for (const auto &[what, make] : obstacles) {
    SCOPED_TRACE(what);
    cleanWorld();
    const long id = saveRanTask();
    make();
    runToEnd(id);
    EXPECT_EQ(recordedSleeps(), std::vector<long>{});
    EXPECT_FALSE(fileExists("/tmp/run_test.victim"));
    EXPECT_TRUE(ran());
    struct stat info = {};
    EXPECT_EQ(lstat(kLockFile, &info), 0);
    EXPECT_EQ(info.st_mode, static_cast<mode_t>(S_IFREG | 0600));
    EXPECT_EQ(info.st_nlink, 1U);
  }
}

TEST_F(TaskRunTest, ALockThatCannotBeTakenFromSomebodyEndsTheRunWithoutARow) {
  for (const char *path : {kLockDirectory, kLockFile}) {
    SCOPED_TRACE(path);
    cleanWorld();
    const long id = saveRanTask();
    if (path == std::string(kLockFile)) mkdir(kLockDirectory, 0755);
    EXPECT_EQ(symlink("/tmp/run_test.victim", path), 0);
    failCall("renameat2", {.times = kAlways, .error = EIO});
    runToEnd(id);
    EXPECT_EQ(logged().size(), size_t{kMostRetries});
    EXPECT_FALSE(fileExists(kStatusDatabase));
    expectNothingRan();
  }
}

// Whoever owns the file can hold its lock for ever, and whoever owns the directory can change
// files.
TEST_F(TaskRunTest, ALockOfSomebodyElseIsNotWaitedFor) {
  REQUIRE_OTHER_USERS();
  for (const char *path : {kLockFile, kLockDirectory}) {
    SCOPED_TRACE(path);
    cleanWorld();
    const long id = saveRanTask();
    ASSERT_EQ(mkdir(kLockDirectory, 0755), 0);
    writeFile(kLockFile, "", 0600);
    ASSERT_EQ(lchown(path, 65534, 65534), 0);
    const int descriptor = open(kLockFile, O_RDONLY | O_CLOEXEC);
    ASSERT_EQ(flock(descriptor, LOCK_EX), 0);
    runToEnd(id);
    close(descriptor);
    EXPECT_EQ(recordedSleeps(), std::vector<long>{});
    EXPECT_NE(movedAway(path), "");
    EXPECT_TRUE(ran());
  }
}

TEST_F(TaskRunTest, ALinkOfSomebodyElseToADirectoryIsNotFollowed) {
  REQUIRE_OTHER_USERS();
  const std::string target = "/tmp/run_test.directory";
  std::filesystem::remove_all(target);
  ASSERT_EQ(mkdir(target.c_str(), 0755), 0);
  ASSERT_EQ(symlink(target.c_str(), kLockDirectory), 0);
  ASSERT_EQ(lchown(kLockDirectory, 65534, 65534), 0);
  runToEnd(saveRanTask());
  EXPECT_TRUE(std::filesystem::is_empty(target));
  EXPECT_TRUE(std::filesystem::is_symlink(movedAway(kLockDirectory)));
  EXPECT_TRUE(ran());
  std::filesystem::remove_all(target);
}

TEST_F(TaskRunTest, ALockFileThatCannotBeMadeFailsTheAttemptAtOnce) {
  const long id = saveRanTask();
  failCallFor("open", kLockFile, {.error = EACCES});
  runToEnd(id);
  EXPECT_EQ(recordedSleeps("usleep"), std::vector<long>{});
  EXPECT_EQ(logged().size(), 1U);
  EXPECT_TRUE(ran());
}

TEST_F(TaskRunTest, ALockFileThatCannotBeOpenedIsTried101Times) {
  const long id = saveRanTask();
  setRandValues({0});
  failCallFor("open", kLockFile, {.from = 2, .times = kLockTries, .error = EACCES});
  onSleep([](size_t) { see("code", QLIBCErrGet()); });
  runToEnd(id);
  EXPECT_EQ(recordedSleeps("usleep"), std::vector<long>(kLockTries, kLockPause));
  EXPECT_EQ(logged(), Lines{lockFailed(1, 3)});
  Lines codes(kLockTries, "code 0");
  codes.push_back("code " + std::to_string(0x0400));
  EXPECT_EQ(seen().texts(), codes);
  EXPECT_TRUE(ran());
}

TEST_F(TaskRunTest, ALockFileThatOpensAtTheLastTryIsEnough) {
  const long id = saveRanTask();
  failCallFor("open", kLockFile, {.from = 2, .times = kLockTries - 1, .error = EACCES});
  runToEnd(id);
  EXPECT_EQ(recordedSleeps(), std::vector<long>(kLockTries - 1, kLockPause));
  EXPECT_EQ(logged(), Lines{});
  EXPECT_TRUE(ran());
}

TEST_F(TaskRunTest, ALockThatIsRefusedIsTried101TimesWithoutAPause) {
  const long id = saveRanTask();
  setRandValues({0});
  // Each try is a lock and, since it failed, a release.
  failCall("flock", {.times = 2 * kLockTries, .error = ENOLCK});
  onSleep([](size_t) { see("code", QLIBCErrGet()); });
  runToEnd(id);
  EXPECT_EQ(recordedSleeps(), std::vector<long>{3 * kMicroseconds});
  EXPECT_EQ(callCount("flock"), 2U * kLockTries + 2);
  EXPECT_EQ(logged(), Lines{lockFailed(1, 3)});
  EXPECT_EQ(seen().texts(), Lines{"code " + std::to_string(0x0400)});
  EXPECT_TRUE(ran());
}

TEST_F(TaskRunTest, ALockThatTheCallerHoldsCountsAsHeld) {
  const long id = saveRanTask();
  writeFile(kLockFile, "");
  pfLock = fopen(kLockFile, "r");
  ASSERT_NE(pfLock, nullptr);
  resetFailingCalls();
  failCallFor("open", kLockFile, {.times = kAlways, .error = EACCES});
  runToEnd(id);
  EXPECT_EQ(callCount("flock"), 1U);  // the release
  EXPECT_EQ(logged(), Lines{});
  EXPECT_TRUE(ran());
  ASSERT_NE(pfLock, nullptr);
  fclose(pfLock);
  pfLock = nullptr;
}

// It wants the lock to itself: one that is shared with others is not enough.
TEST_F(TaskRunTest, ARunWaitsWhileAnotherProcessHoldsTheLock) {
  for (const int kind : {LOCK_EX, LOCK_SH}) {
    SCOPED_TRACE(kind);
    cleanWorld();
    std::remove(kRanFile);
    const long id = saveRanTask();
    writeFile(kLockFile, "");
    const int held = open(kLockFile, O_RDONLY | O_CLOEXEC);
    ASSERT_EQ(flock(held, kind), 0);
    ASSERT_EQ(ZELOSchedTaskRun(id, 0, 0), 0);
    // The kernel marks who waits for a lock by an arrow.
    while (readFile("/proc/locks").find("->") == std::string::npos && !ran()) sched_yield();
    EXPECT_EQ(statusRows(), std::vector<StatusRow>{});
    EXPECT_FALSE(ran());
    close(held);
    waitForChildRuns();
    EXPECT_EQ(finalCode(), ZELO_SCHED_STATUS_FINISHED);
    EXPECT_EQ(recordedSleeps(), std::vector<long>{});
  }
}

// A look-up that fails without a code of its own shows the record that the release left.
// Or two runs could find that the other is not there yet.
TEST_F(TaskRunTest, TheLockIsHeldFromTheLookForConflictsUntilTheRowIsIn) {
  for (const char *statement : {"from task_status WHERE task_id=", "INSERT INTO task_status"}) {
    SCOPED_TRACE(statement);
    cleanWorld();
    seen().clear();
    const long id = saveRanTask();
    failCallFor("sqlite3_exec", statement, {.text = "database is locked"});
    onSleep([](size_t) { see("locked", tryRunLock()); });
    runToEnd(id);
    EXPECT_EQ(seen().texts(), Lines{"locked " + std::to_string(EWOULDBLOCK)});
  }
}

TEST_F(TaskRunTest, ALockThatCannotBeReleasedLeavesItsCodeAndTheRunGoesOn) {
  const std::pair<const char *, FailPlan> releases[] = {{"flock", {.from = 2, .error = EINVAL}},
                                                        {"fclose", {.error = EIO}}};
  for (const auto &[call, plan] : releases) {
    SCOPED_TRACE(call);
    cleanWorld();
    const long id = saveRanTask();
    writeFile(kLockFile, "");
    failCall(call, plan);
    failCall("ZELOUserGetByUID");
    useBackendRun([](ZELO_SCHED_TASK *, int *, char *, size_t) { return 0; });
    runToEnd(id);
    EXPECT_EQ(
        logged(),
        Lines{"sched_run_environment.cpp:N Get uid [0] failed. [0x0500 sched_task_run.cpp:N]"});
  }
}

// ---- conflicts

TEST_F(TaskRunTest, ALiveRunOfTheSameTaskIsWaitedFor) {
  const long id = saveRanTask();
  addStatusRow(runningRow(id, "other"));
  setRandValues({2, 5});
  onSleep([](size_t sleeps) {
    if (sleeps < 2) return;
    sqlite3 *db = ZELOSchedDBInit();
    ZELOSchedDBSetStatus(db, -1, ZELO_SCHED_STATUS_RUNNING, ZELO_SCHED_STATUS_FINISHED, nullptr);
    sqlite3_close(db);
  });
  runToEnd(id);
  EXPECT_EQ(logged(), (Lines{conflict(1, 1, 9), conflict(1, 2, 18)}));
  EXPECT_EQ(loggedPriorities(), (std::vector<int>{3, 3}));
  EXPECT_EQ(recordedSleeps(), (std::vector<long>{9 * kMicroseconds, 18 * kMicroseconds}));
  const std::vector<StatusRow> rows = statusRows();
  ASSERT_EQ(rows.size(), 2U);
  EXPECT_EQ(rows[1].statusCode, ZELO_SCHED_STATUS_FINISHED);
  EXPECT_TRUE(ran());
}

TEST_F(TaskRunTest, ATaskWaitsForItselfAndThenForItsApplicationUnlessItMayOverlap) {
  const std::string app = makeTask("task", "")->App;
  const StatusRow itself = runningRow(1, "other");
  const StatusRow ofItsApp = runningRow(99, app);
  StatusRow finished = runningRow(1, app);
  finished.statusCode = ZELO_SCHED_STATUS_FINISHED;
  struct {
    const char *what;
    int32_t mayOverlapItself;
    int32_t mayOverlapItsApp;
    std::vector<StatusRow> rows;
    std::optional<long> other;  // the task that it waits for
  } cases[] = {
      {"the application only", 1, 0, {ofItsApp}, 99},
      {"the task before the application", 0, 0, {ofItsApp, itself}, 1},
      {"the application where the task does not run", 0, 0, {ofItsApp}, 99},
      {"neither", 1, 1, {runningRow(1, app)}, {}},
      {"what does not run or is another's",
       0,
       0,
       {runningRow(1, app, deadProcess()), finished, runningRow(99, "other")},
       {}},
  };
  for (const auto &each : cases) {
    SCOPED_TRACE(each.what);
    startAnew();
    const Task task = makeTask("task", kRanCommand);
    task->CanRunTaskSameTime = each.mayOverlapItself;
    task->CanRunAppSameTime = each.mayOverlapItsApp;
    const long id = save(task);
    for (const StatusRow &row : each.rows) addStatusRow(row);
    setRandValues({0});
    runToEnd(id);
    if (!each.other) {
      EXPECT_TRUE(ran());
      EXPECT_EQ(logged(), Lines{});
      EXPECT_EQ(statusRows().size(), each.rows.size() + 1);
    } else {
      ASSERT_EQ(logged().size(), size_t{kMostRetries});
      EXPECT_EQ(logged()[0], conflict(*each.other, 1, 3));
      expectNothingRan();
    }
  }
}

TEST_F(TaskRunTest, TheTwentyFirstConflictEndsTheRunWithoutARow) {
  const long id = saveRanTask();
  addStatusRow(runningRow(id, "other"));
  setRandValues({0, 9});
  runToEnd(id);
  Lines wanted;
  for (int retry = 1; retry <= kMostRetries; ++retry) {
    wanted.push_back(conflict(1, retry, retry % 2 == 1 ? 3 : 30));
  }
  EXPECT_EQ(logged(), wanted);
  EXPECT_EQ(recordedSleeps().size(), size_t{kMostRetries});
  EXPECT_EQ(statusRows().size(), 1U);
  EXPECT_EQ(callCount("flock"), 2U * (kMostRetries + 1));
  expectNothingRan();
}

TEST_F(TaskRunTest, LockFailuresAndConflictsAreCountedTogether) {
  const long id = saveRanTask();
  addStatusRow(runningRow(id, "other"));
  failCall("mkdir", {.times = 5, .error = EACCES});
  setRandValues({0});
  runToEnd(id);
  const Lines lines = logged();
  ASSERT_EQ(lines.size(), size_t{kMostRetries});
  EXPECT_EQ(lines[4], lockFailed(5, 3));
  EXPECT_EQ(lines[5], conflict(1, 6, 3));
  EXPECT_EQ(lines[19], conflict(1, 20, 3));
  expectNothingRan();
}

TEST_F(TaskRunTest, TheLockIsFreeAndTheConnectionOpenWhileAConflictIsWaitedFor) {
  const long id = saveRanTask();
  addStatusRow(runningRow(id, "other"));
  onSleep([](size_t sleeps) {
    if (sleeps > 1) return;
    see("held", pfLock != nullptr);
    see("locked", tryRunLock());
    see("closed", callCount("sqlite3_close"));
  });
  runToEnd(id);
  EXPECT_EQ(seen().texts(), (Lines{"held 0", "locked 0", "closed 0"}));
}

// ---- the status database

TEST_F(TaskRunTest, ADatabaseThatCannotBeOpenedEndsTheRun) {
  const long id = saveRanTask();
  failCall("sqlite3_open");
  runToEnd(id);
  EXPECT_EQ(logged(),
            (Lines{"sched_task_db.cpp:N Can't open database: unable to open database file\n",
                   runLine("Init sqlite failed. [0x0900 sched_task_db.cpp:N]")}));
  EXPECT_EQ(callCount("flock"), 2U);
  expectNothingRan();
}

struct StatementCase {
  const char *statement;
  const char *message;
};

TEST_F(TaskRunTest, AStatementThatFailsEndsTheRunWithoutARow) {
  const StatementCase cases[] = {
      {"from task_status WHERE task_id=", "Check task running status failed. id:[1]"},
      {"from task_status WHERE app='ZELO.TOV.TaskScheduler.Script' AND status_code=2",
       "Check app running status failed. app:[ZELO.TOV.TaskScheduler.Script]"},
      {"INSERT INTO task_status", "Add status record failed. id:[1]"},
  };
  for (const StatementCase &each : cases) {
    SCOPED_TRACE(each.statement);
    cleanWorld();
    const Task task = makeTask("task", kRanCommand);
    task->CanRunAppSameTime = 0;
    const long id = save(task);
    failCallFor("sqlite3_exec", each.statement, {.text = "disk I/O error"});
    runToEnd(id);
    const Lines lines = logged();
    ASSERT_EQ(lines.size(), 2U);
    EXPECT_TRUE(lines[0].starts_with("sched_task_db.cpp:N Exec sql:[") &&
                lines[0].find(each.statement) != std::string::npos &&
                lines[0].ends_with("] error: disk I/O error\n"))
        << lines[0];
    EXPECT_EQ(lines[1], runLine(each.message + kNoRecord));
    EXPECT_EQ(statusRows(), std::vector<StatusRow>{});
    EXPECT_EQ(callCount("flock"), 2U);
    EXPECT_EQ(callCount("sqlite3_close"), callCount("sqlite3_open"));
    expectNothingRan();
  }
}

TEST_F(TaskRunTest, ADatabaseThatCannotBeOpenedAgainLeavesTheRowRunning) {
  const long id = saveRanTask();
  failCall("sqlite3_open", {.from = 2});
  runToEnd(id);
  EXPECT_EQ(logged(),
            (Lines{"sched_task_db.cpp:N Can't open database: unable to open database file\n",
                   runLine("Init sqlite failed. [0x0900 sched_task_db.cpp:N]")}));
  EXPECT_TRUE(ran());
  EXPECT_EQ(finalCode(), ZELO_SCHED_STATUS_RUNNING);
}

TEST_F(TaskRunTest, AnEndThatCannotBeWrittenIsReported) {
  const long id = save(makeTask("task", "exit 3"));
  failCallFor("sqlite3_exec", "UPDATE", {.text = "disk I/O error"});
  runToEnd(id);
  EXPECT_EQ(logged(), (Lines{"sched_task_db.cpp:N Exec sql:[UPDATE task_status SET status_code=7, "
                             "comment='3' WHERE status_id=1 AND status_code=2] error: disk I/O "
                             "error\n",
                             runLine("Update status record failed. id:[1]" + kNoRecord)}));
  EXPECT_EQ(finalCode(), ZELO_SCHED_STATUS_RUNNING);
  EXPECT_EQ(callCount("sqlite3_close"), callCount("sqlite3_open"));
}

TEST_F(TaskRunTest, ARowThatIsNoLongerRunningIsNotOverwritten) {
  const long id = saveRanTask();
  useBackendRun([](ZELO_SCHED_TASK *, int *statusCode, char *, size_t) {
    sqlite3 *db = ZELOSchedDBInit();
    ZELOSchedDBSetStatus(db, 1, 0, 5, nullptr);
    sqlite3_close(db);
    *statusCode = 3;
    return 0;
  });
  runToEnd(id);
  EXPECT_EQ(finalCode(), 5);
}

TEST_F(TaskRunTest, OnlyTheRowOfTheRunIsUpdated) {
  const long id = saveRanTask();
  addStatusRow(runningRow(id, "other", deadProcess()));
  runToEnd(id);
  const std::vector<StatusRow> rows = statusRows();
  ASSERT_EQ(rows.size(), 2U);
  EXPECT_EQ(rows[0].statusCode, ZELO_SCHED_STATUS_RUNNING);
  EXPECT_EQ(rows[1].statusCode, ZELO_SCHED_STATUS_FINISHED);
}

// ---- the backend

TEST_F(TaskRunTest, TheLockIsFreeAndTheDatabaseClosedWhileTheTaskRuns) {
  const long id = saveRanTask();
  useBackendRun([](ZELO_SCHED_TASK *, int *, char *, size_t) {
    see("held", pfLock != nullptr);
    see("locked", tryRunLock());
    see("open", callCount("sqlite3_open") - callCount("sqlite3_close"));
    see("rows", static_cast<long>(statusRows().size()));
    see("code", statusRows().at(0).statusCode);
    see("pid", statusRows().at(0).pid == getpid());
    return 0;
  });
  runToEnd(id);
  EXPECT_EQ(seen().texts(), (Lines{"held 0", "locked 0", "open 0", "rows 1", "code 2", "pid 1"}));
}

TEST_F(TaskRunTest, TheBackendGetsTheTaskACodeOfZeroAndAnEmptyComment) {
  const long id = saveRanTask();
  useBackendRun([](ZELO_SCHED_TASK *task, int *statusCode, char *comment, size_t capacity) {
    see(task->Command, task->ID);
    see("code", *statusCode);
    see("capacity", static_cast<long>(capacity));
    see("zeroes", std::count(comment, comment + capacity, '\0'));
    *statusCode = 6;
    memset(comment, 'x', capacity);
    comment[capacity - 1] = '\0';
    return 0;
  });
  runToEnd(id);
  EXPECT_EQ(seen().texts(),
            (Lines{std::string(kRanCommand) + " 1", "code 0", "capacity 1024", "zeroes 1024"}));
  const std::vector<StatusRow> rows = statusRows();
  ASSERT_EQ(rows.size(), 1U);
  EXPECT_EQ(rows[0].statusCode, 6);
  EXPECT_EQ(rows[0].comment, std::string(1023, 'x'));
}

TEST_F(TaskRunTest, ABackendThatFailsLeavesTheRowRunningAndItReadsAsGone) {
  const long id = saveRanTask();
  useBackendRun([](ZELO_SCHED_TASK *, int *statusCode, char *, size_t) {
    *statusCode = 3;
    QLIBCErrSetEx(kInjectedCode, kInjectedFile, kInjectedLine);
    return -1;
  });
  runToEnd(id);
  EXPECT_EQ(logged(), Lines{runLine("Failed to run for backend [0] id:[1] " + kInjected)});
  EXPECT_EQ(finalCode(), ZELO_SCHED_STATUS_RUNNING);
  sqlite3 *db = ZELOSchedDBInit();
  int code = 0;
  EXPECT_EQ(ZELOSchedDBGetStatusByStatusID(db, 1, &code, nullptr, 0), 1);
  EXPECT_EQ(code, ZELO_SCHED_STATUS_GONE);
  sqlite3_close(db);
}

TEST_F(TaskRunTest, WithoutABackendNothingRunsAndTheCodeStaysZero) {
  const long id = saveRanTask();
  SchedBackends[0].run = nullptr;
  runToEnd(id);
  EXPECT_EQ(logged(), Lines{runLine("No run backend (-2) is found for task [1] ")});
  EXPECT_EQ(finalCode(), ZELO_SCHED_STATUS_NONE);
  expectNothingRan();
}

TEST_F(TaskRunTest, TheFirstEntryOfTheIdThatCanRunIsTaken) {
  const long id = saveRanTask();
  cBackend = 3;
  for (const uint32_t index : {1U, 2U}) {
    SchedBackends[index] = SchedBackends[0];
    SchedBackends[index].run = callBackendRun;
  }
  SchedBackends[0].run = nullptr;
  SchedBackends[2].run = [](ZELO_SCHED_TASK *, int *, char *, size_t) { return -1; };
  backendRun = [](ZELO_SCHED_TASK *, int *statusCode, char *, size_t) {
    *statusCode = 3;
    return 0;
  };
  runToEnd(id);
  EXPECT_EQ(logged(), Lines{});
  EXPECT_EQ(finalCode(), ZELO_SCHED_STATUS_FINISHED);
}

TEST_F(TaskRunTest, TheMessageOfAFailedBackendNamesItsEntry) {
  const long id = saveRanTask();
  cBackend = 2;
  SchedBackends[1] = SchedBackends[0];
  SchedBackends[0].run = nullptr;
  SchedBackends[1].run = [](ZELO_SCHED_TASK *, int *, char *, size_t) { return -2; };
  runToEnd(id);
  EXPECT_EQ(logged(), Lines{runLine("Failed to run for backend [1] id:[1] " + kNoRecord)});
}

// ---- the owner's context

class UserContextTest : public TaskRunTest {
 protected:
  void SetUp() override {
    TaskRunTest::SetUp();
    addOwner();
  }

  static long saveOwnedTask() {
    const Task task = makeTask("task", kRanCommand);
    task->Owner = kOwner;
    return save(task);
  }
};

TEST_F(UserContextTest, RootsTaskStartedByRootMakesNoSwitch) {
  runToEnd(saveRanTask());
  EXPECT_TRUE(ran());
  for (const char *call : {"seteuid", "setegid", "initgroups"}) {
    EXPECT_EQ(callCount(call), 0U) << call;
  }
}

TEST_F(UserContextTest, TheBackendRunsWithTheOwnersEffectiveIdsAndGroups) {
  REQUIRE_OTHER_USERS();
  const long id = saveOwnedTask();
  useBackendRun([](ZELO_SCHED_TASK *, int *statusCode, char *, size_t) {
    see("euid", geteuid());
    see("egid", getegid());
    see("uid", getuid());
    gid_t groups[64];
    const int count = getgroups(std::size(groups), groups);
    std::sort(groups, groups + count);
    for (int i = 0; i < count; ++i) see("group", groups[i]);
    *statusCode = 3;
    return 0;
  });
  runToEnd(id);
  EXPECT_EQ(seen().texts(), (Lines{"euid 4242", "egid 4343", "uid 0", "group 4343", "group 4444"}));
  EXPECT_EQ(logged(), Lines{});
  EXPECT_EQ(finalCode(), ZELO_SCHED_STATUS_FINISHED);
  // There and back.
  EXPECT_EQ(callCount("seteuid"), 4U);
  EXPECT_EQ(callCount("setegid"), 2U);
  EXPECT_EQ(callCount("initgroups"), 2U);
}

TEST_F(UserContextTest, TheStatusIsWrittenWithTheCallersRights) {
  REQUIRE_OTHER_USERS();
  const long id = saveOwnedTask();
  addStatusRow({.pid = 1, .timestamp = 1, .app = "other", .taskId = 99, .statusCode = 3});
  ASSERT_EQ(chmod(kStatusDatabase, 0600), 0);
  runToEnd(id);
  const std::vector<StatusRow> rows = statusRows();
  ASSERT_EQ(rows.size(), 2U);
  EXPECT_EQ(rows[1].statusCode, ZELO_SCHED_STATUS_FINISHED);
}

TEST_F(UserContextTest, AnUnknownOwnerIsReportedAndNothingRuns) {
  const Task task = makeTask("task", kRanCommand);
  task->Owner = 54321;
  runToEnd(save(task));
  EXPECT_EQ(logged(),
            (Lines{runLine("Get uid [54321] failed. [0x2000 user.cpp:N]"),
                   runLine("Failed to set user context. uid:[54321] [0x2000 user.cpp:N]")}));
  EXPECT_EQ(finalCode(), ZELO_SCHED_STATUS_RUNNING);
  expectNothingRan();
}

TEST_F(UserContextTest, AUserLookUpThatFailsMakesNoSwitch) {
  const long id = saveOwnedTask();
  failCallFor("ZELOUserGetByUID", std::to_string(kOwner), {.code = kInjectedCode});
  runToEnd(id);
  EXPECT_EQ(logged(), (Lines{runLine("Get uid [4242] failed. " + kInjected),
                             runLine("Failed to set user context. uid:[4242] " + kInjected)}));
  EXPECT_EQ(callCount("seteuid"), 0U);
  expectNothingRan();
}

// The rights are given up by then; what is missing is only where to start.
TEST_F(UserContextTest, ALookUpForTheEnvironmentThatFailsLeavesThemBare) {
  REQUIRE_OTHER_USERS();
  Task task = makeTask("task", "env > /tmp/bare; pwd >> /tmp/bare");
  task->Owner = kOwner;
  const long id = save(task);
  failCallFor("ZELOUserGetByUID", std::to_string(kOwner), {.from = 2, .code = kInjectedCode});
  runToEnd(id);
  EXPECT_EQ(logged(), Lines{"sched_run_environment.cpp:N Get uid [4242] failed. " + kInjected});
  EXPECT_EQ(finalCode(), ZELO_SCHED_STATUS_FINISHED);
  const std::string bare = readFile("/tmp/bare");
  EXPECT_NE(bare.find("HOME=/\n"), std::string::npos) << bare;
  EXPECT_NE(bare.find("SHELL=/bin/sh\n"), std::string::npos) << bare;
  EXPECT_EQ(bare.find("USER="), std::string::npos) << bare;
  EXPECT_TRUE(bare.ends_with("\n/\n")) << bare;
}

TEST_F(TaskRunTest, ATaskOfTheCallersOwnUserRunsWithoutAUserRecord) {
  const long id = saveRanTask();
  failCall("ZELOUserGetByUID", {.times = kAlways, .code = kInjectedCode});
  runToEnd(id);
  EXPECT_TRUE(ran());
  EXPECT_EQ(finalCode(), ZELO_SCHED_STATUS_FINISHED);
}

TEST_F(TaskRunTest, BackendsThatCannotBeRegisteredInTheChildEndTheRun) {
  const long id = saveRanTask();
  failBackendInit(2);
  runToEnd(id);
  failBackendInit(0);
  EXPECT_EQ(logged(), Lines{runLine("Init backend failed. [0x0000 :N]")});
  EXPECT_EQ(finalCode(), ZELO_SCHED_STATUS_RUNNING);
  expectNothingRan();
}

struct SwitchCase {
  const char *call;
  const char *key;
  const char *message;
};

const SwitchCase kSwitchSteps[] = {
    {"seteuid", "0", "Failed to change to ROOT. "},
    {"setegid", "4343", "Failed to set egid: [4343] "},
    {"initgroups", kOwnerName, "Failed to initgroups: [4242] "},
    {"seteuid", "4242", "Failed to set euid: [4242] "},
};

TEST_F(UserContextTest, EachStepThatFailsIsReportedAndNothingRuns) {
  REQUIRE_OTHER_USERS();
  for (const SwitchCase &step : kSwitchSteps) {
    SCOPED_TRACE(step.message);
    cleanWorld();
    const long id = saveOwnedTask();
    failCallFor(step.call, step.key, {.error = EAGAIN});
    runToEnd(id);
    EXPECT_EQ(
        logged(),
        (Lines{runLine(step.message + std::string("Resource temporarily unavailable")),
               runLine("Failed to set user context. uid:[4242] [0x2A00 sched_task_run.cpp:N]")}));
    // The other steps are taken all the same.
    EXPECT_EQ(callCount("seteuid"), 2U);
    EXPECT_EQ(callCount("setegid"), 1U);
    EXPECT_EQ(callCount("initgroups"), 1U);
    EXPECT_EQ(finalCode(), ZELO_SCHED_STATUS_RUNNING);
    expectNothingRan();
  }
}

TEST_F(UserContextTest, AllStepsAreTakenInTheirOrder) {
  const long id = saveOwnedTask();
  Lines wanted;
  for (const SwitchCase &step : kSwitchSteps) {
    failCallFor(step.call, step.key, {.error = EPERM});
    wanted.push_back(runLine(step.message + std::string("Operation not permitted")));
  }
  wanted.push_back(runLine("Failed to set user context. uid:[4242] [0x2A00 sched_task_run.cpp:N]"));
  runToEnd(id);
  EXPECT_EQ(logged(), wanted);
  EXPECT_EQ(loggedPriorities(), std::vector<int>(5, 3));
  expectNothingRan();
}

TEST_F(UserContextTest, AWayBackThatFailsLeavesTheRowRunning) {
  REQUIRE_OTHER_USERS();
  const long id = saveOwnedTask();
  failCallFor("seteuid", "0", {.from = 3, .error = EAGAIN});
  runToEnd(id);
  EXPECT_EQ(logged(),
            (Lines{runLine("Failed to set euid: [0] Resource temporarily unavailable"),
                   runLine("Failed to set user context. uid:[0] [0x2A00 sched_task_run.cpp:N]")}));
  EXPECT_TRUE(ran());
  EXPECT_EQ(finalCode(), ZELO_SCHED_STATUS_RUNNING);
}

TEST_F(UserContextTest, RootIsRegainedBeforeTheGroupsAreChangedBack) {
  REQUIRE_OTHER_USERS();
  const long id = saveOwnedTask();
  failCallFor("seteuid", "0", {.from = 2, .error = EAGAIN});
  runToEnd(id);
  // Without root, the groups cannot be changed either.
  EXPECT_EQ(logged(),
            (Lines{runLine("Failed to change to ROOT. Resource temporarily unavailable"),
                   runLine("Failed to initgroups: [0] Operation not permitted"),
                   runLine("Failed to set user context. uid:[0] [0x2A00 sched_task_run.cpp:N]")}));
}

TEST_F(UserContextTest, ABackendThatFailsIsFollowedByTheWayBack) {
  REQUIRE_OTHER_USERS();
  const long id = saveOwnedTask();
  useBackendRun([](ZELO_SCHED_TASK *, int *, char *, size_t) { return -1; });
  runToEnd(id);
  EXPECT_EQ(logged(), Lines{runLine("Failed to run for backend [0] id:[1] " + kNoRecord)});
  EXPECT_EQ(callCount("seteuid"), 4U);
  EXPECT_EQ(finalCode(), ZELO_SCHED_STATUS_RUNNING);
}

// An old kernel, or a filter on system calls.
TEST_F(TaskRunTest, WithoutTheCallForAllTheDescriptorsAreClosedOneByOne) {
  const long id = save(makeTask("task", "ls /proc/self/fd > /tmp/run_test.ran"));
  const int open[] = {dup(0), dup(0), dup(0)};
  failCall("close_range", {.times = kAlways, .error = ENOSYS});
  runToEnd(id);
  for (const int descriptor : open) close(descriptor);
  EXPECT_EQ(logged(), Lines{});
  // 3 is the directory that ls reads.
  EXPECT_EQ(readFile(kRanFile), "0\n1\n2\n3\n");
}

}  // namespace
}  // namespace support
