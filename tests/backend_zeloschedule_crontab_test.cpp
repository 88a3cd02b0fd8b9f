// The lines of ordinary tasks in the system crontab, and how the crontab is replaced.
#include <dlfcn.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <filesystem>
#include <functional>

#include "captured_log.h"
#include "failing_calls.h"
#include "sandbox_fixture.h"
#include "schedule_cases.h"
#include "tasks.h"
#include "zelocore.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;

constexpr int kInjectedCode = 0x0B00;
constexpr mode_t kPermissions = 07777;
const std::string kInjected = "[0x0B00 injected.cpp:N]";
const std::string kHangUp = "/bin/kill -HUP `/bin/cat /var/run/crond.pid` > /dev/null 2>&1";
const std::string kFirstLine = "0\t0\t*\t*\t*\troot\t/tmp/zeloschedtask --run id=1\n";

std::string backendLine(const std::string &text) {
  return "backend_zeloschedule.cpp:N " + text;
}

// Temporary files of a crontab that was not completed.
Lines leftovers() {
  Lines names;
  for (const auto &entry : std::filesystem::directory_iterator("/etc")) {
    const std::string name = entry.path().filename();
    if (name.starts_with("crontab.")) names.push_back(name);
  }
  return names;
}

// Replaces the library's sort of lists.
std::function<int(ZELO_SCHED_TASK **, const char *, int)> sortList;

class CrontabTest : public SandboxTest {
 protected:
  void SetUp() override {
    SandboxTest::SetUp();
    sortList = nullptr;
    ASSERT_EQ(zeloschedule_init("zeloschedule", &backend_), 0);
    ASSERT_EQ(leftovers(), Lines{});
  }

  void TearDown() override {
    EXPECT_EQ(leftovers(), Lines{});
    SandboxTest::TearDown();
  }

  void create(const std::function<void(ZELO_SCHED_TASK *)> &change = [](ZELO_SCHED_TASK *) {
  }) const {
    const Task task = makeTask("task", "true");
    change(task.get());
    EXPECT_EQ(backend_.create(task.get()), 0);
  }

  static void forget() {
    resetFailingCalls();
    clearLog();
    QLIBCErrSetEx(0, "", 0);
  }

  ZELO_SCHED_BACKEND backend_ = {};
};

// ---- one line

TEST_F(CrontabTest, EachScheduleHasItsLine) {
  for (const ScheduleCase &each : scheduleCases()) {
    if (!isStorable(each.schedule)) continue;
    SCOPED_TRACE(each.what);
    cleanWorld();
    EXPECT_EQ(backend_.create(taskOf(each.schedule).get()), 0);
    EXPECT_EQ(crontabLines(), Lines{lineOf(each)});
  }
}

// A record is reused for one task after the other, and its texts are cleared by the first byte
// only.
TEST_F(CrontabTest, AWeekThatIsTooShortTakesNoDaysFromTheTaskBeforeIt) {
  for (const char *before : {"0000000", "1111111", "0101010"}) {
    SCOPED_TRACE(before);
    cleanWorld();
    for (const char *week : {before, "10", before}) {
      create([&](auto *task) {
        task->Type = ZELO_SCHED_TYPE_WEEKLY;
        setText(task->Week, week);
      });
    }
    const Lines lines = crontabLines();  // in the order of the records in memory
    EXPECT_EQ(std::count(lines.begin(), lines.end(),
                         "0\t0\t*\t*\t0,2,3,4,5,6\troot\t/tmp/zeloschedtask --run id=2"),
              1);
  }
}

// Otherwise a text with a line feed would become a line of its own, which cron runs as root.
TEST_F(CrontabTest, NoTextOfATaskReachesTheCrontab) {
  create([](ZELO_SCHED_TASK *task) {
    const std::string hostile = "\n* * * * * root /bin/hostile\n";
    setText(task->Name, hostile);
    setText(task->App, hostile);
    setText(task->AppName, hostile);
    setText(task->AppArgs, hostile);
    setText(task->Action, hostile);
    setText(task->Command, hostile);
    setText(task->EditForm, hostile);
    setText(task->EditDialog, hostile);
    task->Type = ZELO_SCHED_TYPE_WEEKLY;
    setText(task->Week, "\n* * *");
  });
  EXPECT_EQ(crontabLines(),
            Lines{"0\t0\t*\t*\t0,1,2,3,4,5,6\troot\t/tmp/zeloschedtask --run id=1"});
}

// ---- the whole crontab

TEST_F(CrontabTest, OnlyEnabledTasksHaveALine) {
  create();
  create([](ZELO_SCHED_TASK *task) { task->State = ZELO_SCHED_STATE_DISABLED; });
  create([](ZELO_SCHED_TASK *task) { task->State = ZELO_SCHED_STATE_NOT_EXISTED; });
  EXPECT_EQ(readFile(kCrontab), kPlainCrontab + kFirstLine);
}

TEST_F(CrontabTest, EachEnabledTaskHasOneLineBehindTheOthers) {
  constexpr int kTasks = 12;
  for (int i = 0; i < kTasks; ++i) create();
  const std::string crontab = readFile(kCrontab);
  EXPECT_TRUE(crontab.starts_with(kPlainCrontab));
  Lines lines = crontabLines();
  ASSERT_EQ(lines.size(), size_t{kTasks});
  Lines wanted;
  for (int i = 1; i <= kTasks; ++i) {
    wanted.push_back("0\t0\t*\t*\t*\troot\t/tmp/zeloschedtask --run id=" + std::to_string(i));
  }
  std::sort(lines.begin(), lines.end());
  std::sort(wanted.begin(), wanted.end());
  EXPECT_EQ(lines, wanted);
}

TEST_F(CrontabTest, EachOfManyTasksHasItsOwnTimes) {
  constexpr int kTasks = 3000;
  std::string store;
  Lines wanted;
  for (int id = 1; id <= kTasks; ++id) {
    const std::string number = std::to_string(id);
    const std::string hour = std::to_string(id % 24);
    const std::string minute = std::to_string(id % 60);
    store += "[" + number + "]\nid=" + number + "\nname=n\nrun hour=" + hour +
             "\nrun min=" + minute +
             "\napp=a\napp name=b\naction=c\ncmd=\nstate=enabled\ntype=daily\n";
    wanted.push_back(minute + "\t" + hour +
                     "\t*\t*\t*\troot\t/tmp/zeloschedtask --run id=" + number);
  }
  writeFile(support::kStore, store);
  EXPECT_EQ(backend_.sync(), 0);
  Lines lines = crontabLines();
  std::sort(lines.begin(), lines.end());
  std::sort(wanted.begin(), wanted.end());
  EXPECT_EQ(lines, wanted);
}

TEST_F(CrontabTest, AnUnknownStateIsNotThatOfTheTaskBefore) {
  create();
  const std::string first = readFile(support::kStore);
  writeFile(support::kStore,
            first +
                "[2]\nid=2\nname=n\nrun hour=1\nrun min=1\napp=a\napp name=b\naction=c\n"
                "cmd=\nstate=unheard of\ntype=daily\n");
  EXPECT_EQ(backend_.sync(), 0);
  EXPECT_EQ(readFile(kCrontab), kPlainCrontab + kFirstLine);
}

TEST_F(CrontabTest, TheListIsSortedByItsIdKeyAscending) {
  create();
  Lines calls;
  sortList = [&](ZELO_SCHED_TASK **, const char *key, int direction) {
    calls.push_back(key + (" " + std::to_string(direction)));
    return 0;
  };
  EXPECT_EQ(backend_.sync(), 0);
  EXPECT_EQ(calls, Lines{"id 1"});
}

TEST_F(CrontabTest, LinesStandInTheOrderOfTheSortedList) {
  for (int i = 0; i < 3; ++i) create();
  sortList = [](ZELO_SCHED_TASK **list, const char *, int) {
    std::vector<ZELO_SCHED_TASK *> tasks;
    for (ZELO_SCHED_TASK *task = *list; task != nullptr; task = task->next) tasks.push_back(task);
    constexpr int32_t kOrder[] = {2, 3, 1};
    for (const int32_t id : kOrder) {
      *list = *std::find_if(tasks.begin(), tasks.end(),
                            [&](const ZELO_SCHED_TASK *task) { return task->ID == id; });
      list = &(*list)->next;
    }
    *list = nullptr;
    return 0;
  };
  EXPECT_EQ(backend_.sync(), 0);
  EXPECT_EQ(crontabLines(), (Lines{"0\t0\t*\t*\t*\troot\t/tmp/zeloschedtask --run id=2",
                                   "0\t0\t*\t*\t*\troot\t/tmp/zeloschedtask --run id=3",
                                   "0\t0\t*\t*\t*\troot\t/tmp/zeloschedtask --run id=1"}));
}

TEST_F(CrontabTest, ANewSyncReplacesTheLines) {
  create();
  const std::string once = readFile(kCrontab);
  EXPECT_EQ(backend_.sync(), 0);
  EXPECT_EQ(backend_.sync(), 0);
  EXPECT_EQ(readFile(kCrontab), once);
}

TEST_F(CrontabTest, AnEmptyStoreRemovesEveryLineOfTasksAndKeepsTheRest) {
  writeFile(kCrontab, "first\n" + kFirstLine + "second\n" + kFirstLine + "third\n");
  EXPECT_EQ(backend_.sync(), 0);
  EXPECT_EQ(readFile(kCrontab), "first\nsecond\nthird\n");
}

TEST_F(CrontabTest, EveryLineThatMentionsTheProgramIsRemoved) {
  writeFile(kCrontab,
            "# see /tmp/zeloschedtask\n"
            "0 0 * * * root /bin/echo /tmp/zeloschedtasks\n"
            "X=/tmp/zeloschedtask\n"
            "0 0 * * * root /var/tmp/zeloschedtask\n"
            "0 0 * * * root /tmp/zelosched\n"
            "0 0 * * * root zeloschedtask --run id=1\n"
            "0 0 * * * root /TMP/ZELOSCHEDTASK\n");
  EXPECT_EQ(backend_.sync(), 0);
  EXPECT_EQ(readFile(kCrontab),
            "0 0 * * * root /tmp/zelosched\n"
            "0 0 * * * root zeloschedtask --run id=1\n"
            "0 0 * * * root /TMP/ZELOSCHEDTASK\n");
}

TEST_F(CrontabTest, OtherLinesAreKeptByteForByteInTheirOrder) {
  std::string lines = "\n\t \n#\xff\xfe\n  %\\$\r\n" + std::string(100000, 'x') + "\n\n\n";
  lines += std::string("zero \0 byte\n", 12);
  writeFile(kCrontab, lines);
  create();
  EXPECT_EQ(readFile(kCrontab), lines + kFirstLine);
}

TEST_F(CrontabTest, AMentionBehindAZeroByteIsFoundToo) {
  writeFile(kCrontab, std::string("a\0/tmp/zeloschedtask\nkept\n", 26));
  EXPECT_EQ(backend_.sync(), 0);
  EXPECT_EQ(readFile(kCrontab), "kept\n");
}

TEST_F(CrontabTest, ALastLineWithoutALineFeedIsNotJoinedToATasks) {
  writeFile(kCrontab, "0 0 * * * root true");
  create();
  EXPECT_EQ(readFile(kCrontab), "0 0 * * * root true\n" + kFirstLine);
}

TEST_F(CrontabTest, WithoutTasksALastLineStaysWithoutALineFeed) {
  writeFile(kCrontab, "0 0 * * * root true");
  EXPECT_EQ(backend_.sync(), 0);
  EXPECT_EQ(readFile(kCrontab), "0 0 * * * root true");
}

TEST_F(CrontabTest, AnEmptyCrontabGetsTheLinesAlone) {
  writeFile(kCrontab, "");
  create();
  EXPECT_EQ(readFile(kCrontab), kFirstLine);
}

TEST_F(CrontabTest, OwnerGroupAndEveryModeBitAreKept) {
  struct {
    uid_t owner;
    gid_t group;
    mode_t mode;
  } cases[] = {{0, 0, 0644}, {0, 0, 0600}, {0, 0, 0666}, {0, 0, 07755}, {65534, 4, 06640}};
  for (const auto &each : cases) {
    SCOPED_TRACE(each.mode);
    if (each.owner != 0 && !otherUsersExist()) continue;
    writeFile(kCrontab, kPlainCrontab);
    ASSERT_EQ(chown(kCrontab, each.owner, each.group), 0);
    ASSERT_EQ(chmod(kCrontab, each.mode), 0);
    EXPECT_EQ(backend_.sync(), 0);
    struct stat info {};
    ASSERT_EQ(stat(kCrontab, &info), 0);
    EXPECT_EQ(info.st_uid, each.owner);
    EXPECT_EQ(info.st_gid, each.group);
    EXPECT_EQ(info.st_mode & kPermissions, each.mode);
  }
}

TEST_F(CrontabTest, TheCrontabIsReplacedAndNotWrittenInPlace) {
  struct stat before {};
  ASSERT_EQ(stat(kCrontab, &before), 0);
  std::filesystem::remove("/etc/test_crontab_link");
  ASSERT_EQ(link(kCrontab, "/etc/test_crontab_link"), 0);
  create();
  EXPECT_EQ(readFile("/etc/test_crontab_link"), kPlainCrontab);
  std::filesystem::remove("/etc/test_crontab_link");
  EXPECT_EQ(readFile(kCrontab), kPlainCrontab + kFirstLine);
}

// ---- the cron daemon

TEST_F(CrontabTest, WithoutAPidFileNobodyIsSignalled) {
  EXPECT_EQ(backend_.sync(), 0);
  EXPECT_EQ(recordedSystemCommands(), Lines{});
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(CrontabTest, WithAPidFileTheDaemonIsToldToReload) {
  int ready[2];
  ASSERT_EQ(pipe(ready), 0);
  const pid_t daemon = fork();
  if (daemon == 0) {
    signal(SIGHUP, SIG_DFL);
    close(ready[0]);
    close(ready[1]);
    for (;;) pause();
  }
  close(ready[1]);
  char byte = 0;
  EXPECT_EQ(read(ready[0], &byte, 1), 0);  // it has its signals set
  close(ready[0]);
  writeFile(kCronPidFile, std::to_string(daemon) + "\n");
  EXPECT_EQ(backend_.sync(), 0);
  EXPECT_EQ(recordedSystemCommands(), Lines{kHangUp});
  EXPECT_EQ(logged(), Lines{});
  kill(daemon, SIGKILL);  // in case it was not
  int status = 0;
  ASSERT_EQ(waitpid(daemon, &status, 0), daemon);
  EXPECT_TRUE(WIFSIGNALED(status));
  EXPECT_EQ(WTERMSIG(status), SIGHUP);
}

TEST_F(CrontabTest, TheDaemonIsToldAfterTheCrontabWasReplaced) {
  create();
  writeFile(kCronPidFile, "1\n");
  forget();
  failCall("rename", {.error = EXDEV});
  EXPECT_EQ(backend_.sync(), 1);
  EXPECT_EQ(recordedSystemCommands(), Lines{});
}

TEST_F(CrontabTest, ADaemonThatCannotBeToldIsReportedAndNoFailure) {
  create();
  writeFile(kCronPidFile, "1\n");
  for (const int result : {-1, 1, 0x0100, 9}) {
    forget();
    failCall("system", {.result = result});
    EXPECT_EQ(backend_.sync(), 0);
    EXPECT_EQ(logged(), Lines{backendLine("Failed to hup crond.")});
    EXPECT_EQ(loggedPriorities(), std::vector<int>{3});
    EXPECT_EQ(errorRecord(), (ErrorRecord{0, ""}));
  }
  EXPECT_EQ(readFile(kCrontab), kPlainCrontab + kFirstLine);
}

TEST_F(CrontabTest, APidFileOfADeadDaemonIsReportedAndNoFailure) {
  const pid_t dead = fork();
  if (dead == 0) _exit(0);
  ASSERT_EQ(waitpid(dead, nullptr, 0), dead);
  writeFile(kCronPidFile, std::to_string(dead) + "\n");
  EXPECT_EQ(backend_.sync(), 0);
  EXPECT_EQ(logged(), Lines{backendLine("Failed to hup crond.")});
}

// ---- failures

TEST_F(CrontabTest, AStoreThatCannotBeListedIsReportedAndLeavesTheCrontab) {
  create();
  writeFile(kCrontab, kPlainCrontab);
  forget();
  failCall("QLIBCFileEnumSection", {.code = kInjectedCode});
  EXPECT_EQ(backend_.sync(), -1);
  EXPECT_EQ(logged(), Lines{backendLine("get task list failed. " + kInjected)});
  EXPECT_EQ(readFile(kCrontab), kPlainCrontab);
}

TEST_F(CrontabTest, ARecordThatCannotBeAllocatedLeavesTheCrontab) {
  if (!support::kAllocationsCanFail) GTEST_SKIP() << "the sanitizer has its own allocator";
  create();
  create();
  writeFile(kCrontab, kPlainCrontab);
  forget();
  for (const unsigned failing :
       {1U, 2U}) {  // the array for all tasks, and the record that each is read into
    SCOPED_TRACE(failing);
    const support::FailingAllocation one("calloc",
                                         {.from = failing, .minSize = sizeof(ZELO_SCHED_TASK)});
    EXPECT_EQ(backend_.sync(), -1);
    EXPECT_EQ(logged(), (Lines{backendLine("malloc ZELO_SCHED_TASK failed. key:[1]"),
                               backendLine("get task list failed. [0x0200 "
                                           "backend_zeloschedule.cpp:N]")}));
    EXPECT_EQ(readFile(kCrontab), kPlainCrontab);
    forget();
  }
}

TEST_F(CrontabTest, AListThatCannotBeSortedIsReportedButNotPassedOn) {
  create();
  create();
  writeFile(kCrontab, kPlainCrontab);
  writeFile(kCronPidFile, "1\n");
  forget();
  sortList = [](ZELO_SCHED_TASK **, const char *, int) {
    QLIBCErrSetEx(0x0100, "sched_task_list_sort.cpp", 1);
    return -1;
  };
  EXPECT_EQ(backend_.sync(), 2);
  EXPECT_EQ(logged(),
            Lines{backendLine("failed to sort task list. [0x0100 sched_task_list_sort.cpp:N]")});
  EXPECT_EQ(readFile(kCrontab), kPlainCrontab);
  EXPECT_EQ(callCount("mkostemp"), 0U);
  EXPECT_EQ(recordedSystemCommands(), Lines{});
}

TEST_F(CrontabTest, AMissingCrontabIsNotMade) {
  create();
  create();
  std::filesystem::remove(kCrontab);
  writeFile(kCronPidFile, "1\n");
  forget();
  EXPECT_EQ(backend_.sync(), 2);
  EXPECT_EQ(logged(), Lines{backendLine("sync task list failed. [0x0000 :N]")});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0, ""}));
  EXPECT_FALSE(fileExists(kCrontab));
  EXPECT_EQ(recordedSystemCommands(), Lines{});
  create();
  EXPECT_FALSE(fileExists(kCrontab));
}

TEST_F(CrontabTest, ACrontabThatCannotBeOpenedSetsNoCode) {
  create();
  forget();
  failCallFor("fopen", kCrontab, {.error = EACCES});
  failCallFor("open", kCrontab, {.error = EACCES});
  EXPECT_EQ(backend_.sync(), 1);
  EXPECT_EQ(logged(), Lines{backendLine("sync task list failed. [0x0000 :N]")});
  EXPECT_EQ(callCount("mkostemp"), 0U);
}

TEST_F(CrontabTest, ACrontabThatIsADirectoryIsRefused) {
  create();
  std::filesystem::remove(kCrontab);
  std::filesystem::create_directory(kCrontab);
  forget();
  EXPECT_EQ(backend_.sync(), 1);
  EXPECT_EQ(logged(),
            Lines{backendLine("sync task list failed. [0x0900 backend_zeloschedule.cpp:N]")});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0900, "backend_zeloschedule.cpp"}));
  EXPECT_TRUE(std::filesystem::is_directory(kCrontab));
  EXPECT_EQ(callCount("mkostemp"), 0U);
}

// Without a store, the crontab's is the only fstat.
TEST_F(CrontabTest, AnFstatThatFailsIsReported) {
  failCall("fstat", {.error = EIO});
  EXPECT_EQ(backend_.sync(), 0);
  EXPECT_EQ(logged(),
            Lines{backendLine("sync task list failed. [0x2700 backend_zeloschedule.cpp:N]")});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x2700, "backend_zeloschedule.cpp"}));
  EXPECT_EQ(readFile(kCrontab), kPlainCrontab);
  EXPECT_EQ(callCount("mkostemp"), 0U);
}

// In the order in which they are called.
struct CallCase {
  const char *call;
  const char *key;
  int code;
};

const CallCase kCalls[] = {
    {"mkostemp", "/etc/crontab.", 0x0900},
    {"fdopen", "w", 0x0900},
    {"getline", "", 0x0B00},
    {"fwrite", "", 0x0B00},
    {"fflush", "", 0x0B00},
    {"fsync", "", 0x0B00},
    {"fchown", "", 0x0B00},
    {"fchmod", "", 0x0B00},
    {"fclose", "", 0x0B00},
    {"rename", "/etc/crontab", 0x2800},
};

TEST_F(CrontabTest, EachCallThatFailsLeavesTheOldCrontabAndReturnsTheNumberOfTasks) {
  create();
  create();
  writeFile(kCrontab, kPlainCrontab);
  writeFile(kCronPidFile, "1\n");
  for (const CallCase &each : kCalls) {
    SCOPED_TRACE(each.call);
    forget();
    failCallFor(each.call, each.key, {.error = EIO});
    EXPECT_EQ(backend_.sync(), 2);
    char record[32];
    snprintf(record, sizeof(record), "[0x%04X ", static_cast<unsigned>(each.code));
    EXPECT_EQ(logged(), Lines{backendLine("sync task list failed. " + std::string(record) +
                                          "backend_zeloschedule.cpp:N]")});
    EXPECT_EQ(loggedPriorities(), std::vector<int>{3});
    EXPECT_EQ(errorRecord(), (ErrorRecord{each.code, "backend_zeloschedule.cpp"}));
    EXPECT_EQ(readFile(kCrontab), kPlainCrontab);
    EXPECT_EQ(leftovers(), Lines{});
    EXPECT_EQ(recordedSystemCommands(), Lines{});
  }
}

// The guard closes the stream too, so that calls of fclose are not compared.
TEST_F(CrontabTest, AfterACallThatFailsNoneOfTheLaterIsMade) {
  create();
  for (auto each = std::begin(kCalls); each != std::end(kCalls); ++each) {
    SCOPED_TRACE(each->call);
    forget();
    failCallFor(each->call, each->key, {.error = EIO});
    EXPECT_EQ(backend_.sync(), 1);
    EXPECT_GE(callCount(each->call), 1U);
    for (auto later = each + 1; later != std::end(kCalls); ++later) {
      if (later->call == std::string("fclose")) continue;
      EXPECT_EQ(callCount(later->call), 0U) << later->call;
    }
  }
}

TEST_F(CrontabTest, AWholeSyncMakesEachCallOnce) {
  create();
  forget();
  EXPECT_EQ(backend_.sync(), 0);
  for (const char *call : {"mkostemp", "fflush", "fchown", "fchmod", "rename"}) {
    EXPECT_EQ(callCount(call), 1U) << call;
  }
  EXPECT_EQ(callCount("fsync"), 2U);  // the file and, after the rename, its directory
}

TEST_F(CrontabTest, ADirectoryThatCannotBeSyncedAfterTheRenameIsReported) {
  create();
  forget();
  writeFile(support::kCronPidFile, std::to_string(getpid()) + "\n");
  signal(SIGHUP, SIG_IGN);
  failCall("fsync", {.from = 2, .error = EIO});
  EXPECT_EQ(backend_.sync(), 1);
  EXPECT_EQ(logged(),
            Lines{backendLine("sync task list failed. [0x0B00 backend_zeloschedule.cpp:N]")});
  EXPECT_EQ(support::recordedSystemCommands().size(), 1U) << "cron was not told of the new one";
  signal(SIGHUP, SIG_DFL);
}

// ---- the program that the lines start

TEST_F(CrontabTest, ALineIsWrittenOnlyWhileTheNameOfItsProgramIsRoots) {
  std::filesystem::remove(support::kTaskProgram);
  create();
  struct stat info = {};
  ASSERT_EQ(lstat(support::kTaskProgram, &info), 0);
  EXPECT_EQ(info.st_uid, 0U);
  EXPECT_EQ(info.st_mode, static_cast<mode_t>(S_IFREG | 0755));
  EXPECT_EQ(crontabLines().size(), 1U);
}

TEST_F(CrontabTest, WhatSomebodyElsePutUnderTheNameOfTheProgramIsMovedAway) {
  REQUIRE_OTHER_USERS();
  constexpr char kHostile[] = "#!/bin/sh\ntouch /tmp/hostile.ran\n";
  std::filesystem::remove(support::kTaskProgram);
  writeFile(support::kTaskProgram, kHostile, 0755);
  ASSERT_EQ(chown(support::kTaskProgram, 65534, 65534), 0);
  create();
  EXPECT_EQ(readFile(support::movedAway(support::kTaskProgram)), kHostile);
  EXPECT_NE(readFile(support::kTaskProgram).find("not installed"), std::string::npos);
  EXPECT_EQ(crontabLines().size(), 1U);
}

TEST_F(CrontabTest, TheProgramThatIsThereStays) {
  writeFile(support::kTaskProgram, "the real one", 0755);
  create();
  EXPECT_EQ(readFile(support::kTaskProgram), "the real one");
}

TEST_F(CrontabTest, WithoutTheNameOfTheProgramNoLineStands) {
  create();
  for (const char *call : {"mkdtemp", "renameat2"}) {
    SCOPED_TRACE(call);
    support::resetFailingCalls();
    EXPECT_EQ(backend_.sync(), 0);
    EXPECT_EQ(crontabLines().size(), 1U);
    std::filesystem::remove(support::kTaskProgram);
    forget();
    failCall(call, {.times = support::kAlways, .error = EACCES});
    EXPECT_EQ(backend_.sync(), 1);
    EXPECT_EQ(logged(),
              Lines{backendLine("sync task list failed. [0x0900 backend_zeloschedule.cpp:N]")});
    EXPECT_EQ(readFile(kCrontab), kPlainCrontab);
  }
}

TEST_F(CrontabTest, TheStandInOfTheProgramOnlySaysThatItIsNotInstalled) {
  std::filesystem::remove(support::kTaskProgram);
  create();
  EXPECT_EQ(system(("/bin/sh -n " + std::string(support::kTaskProgram)).c_str()), 0);
  EXPECT_EQ(readFile(support::kTaskProgram),
            readFile(ZELO_SOURCE_DIR "/packaging/zeloschedtask.stand-in"));
}

TEST_F(CrontabTest, ALineOfATaskThatCannotBeWrittenAbandonsTheRewrite) {
  create();
  writeFile(kCrontab, "");
  forget();
  failCall("fwrite", {.error = ENOSPC});
  EXPECT_EQ(backend_.sync(), 1);
  EXPECT_EQ(logged(),
            Lines{backendLine("sync task list failed. [0x0B00 backend_zeloschedule.cpp:N]")});
  EXPECT_EQ(readFile(kCrontab), "");
}

TEST_F(CrontabTest, ATemporaryFileThatCannotBecomeAStreamLeavesNoDescriptor) {
  create();
  forget();
  const auto descriptors = [] {
    const std::filesystem::directory_iterator open("/proc/self/fd");
    return std::distance(begin(open), end(open));
  };
  const auto before = descriptors();
  failCallFor("fdopen", "w", {.error = ENOMEM});
  EXPECT_EQ(backend_.sync(), 1);
  EXPECT_EQ(descriptors(), before);
}

TEST_F(CrontabTest, ACrontabThatCannotBeReplacedDoesNotFailAChange) {
  const Task task = makeTask("task", "true");
  failCallFor("mkostemp", "/etc/crontab.", {.times = kAlways, .error = EROFS});
  EXPECT_EQ(backend_.create(task.get()), 0);
  EXPECT_EQ(backend_.edit(task.get()), 0);
  EXPECT_EQ(backend_.remove(task->ID), 1);
  const std::string failed =
      backendLine("sync task list failed. [0x0900 backend_zeloschedule.cpp:N]");
  EXPECT_EQ(logged(), Lines(3, failed));
  EXPECT_EQ(readFile(kCrontab), kPlainCrontab);
}

TEST_F(CrontabTest, TheNextChangeWritesTheCrontabWhole) {
  failCallFor("mkostemp", "/etc/crontab.", {.error = EROFS});
  create();
  EXPECT_EQ(crontabLines(), Lines{});
  create();
  EXPECT_EQ(crontabLines().size(), 2U);
}

TEST_F(CrontabTest, TheExportedSyncWritesTheCrontabToo) {
  create();
  writeFile(kCrontab, kPlainCrontab);
  EXPECT_EQ(ZELOSchedTaskSync(), 0);
  EXPECT_EQ(readFile(kCrontab), kPlainCrontab + kFirstLine);
}

}  // namespace
}  // namespace support

// The test program exports it, so that the library calls this one.
int ZELOSchedTaskListSort(ZELO_SCHED_TASK **pTaskList, const char *szKey, int direction) {
  if (support::sortList) return support::sortList(pTaskList, szKey, direction);
  static const auto next =
      reinterpret_cast<decltype(&ZELOSchedTaskListSort)>(dlsym(RTLD_NEXT, "ZELOSchedTaskListSort"));
  return next(pTaskList, szKey, direction);
}
