// The helpers that the other tests trust.
#include <gtest/gtest.h>
#include <sqlite3.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <thread>

#include "captured_log.h"
#include "failing_calls.h"
#include "fake_clock.h"
#include "sandbox_fixture.h"
#include "status_db.h"
#include "zelocore.h"

namespace support {
namespace {

class SupportTest : public SandboxTest {};

using Lines = std::vector<std::string>;

// "%m" is no standard format, which the compiler says of every one that it sees.
void logAs(const char *format, int argument) {
  syslog(LOG_ERR, format, argument);
}

TEST_F(SupportTest, LineNumbersAreReplacedAtTheStartAndInTheErrorRecord) {
  syslog(LOG_ERR, "%s:%d get task failed. [%ld] [0x%04X %s:%d]", "unit.cpp", 12, 7L, 0x0D00,
         "other.cpp", 345);
  EXPECT_EQ(logged(), Lines{"unit.cpp:N get task failed. [7] [0x0D00 other.cpp:N]"});
  EXPECT_EQ(loggedRaw(), Lines{"unit.cpp:12 get task failed. [7] [0x0D00 other.cpp:345]"});
  EXPECT_EQ(loggedPriorities(), std::vector<int>{LOG_ERR});
}

TEST_F(SupportTest, AnErrorRecordWithoutAFileIsNormalisedToo) {
  EXPECT_EQ(normalisedLine("unit.cpp:12 x [0x0000 :0]"), "unit.cpp:N x [0x0000 :N]");
}

TEST_F(SupportTest, TimesAndIdsInALineStay) {
  EXPECT_EQ(normalisedLine("at 8:30 [12] [34:56] id=7"), "at 8:30 [12] [34:56] id=7");
}

TEST_F(SupportTest, PercentMIsTheErrnoOfTheCaller) {
  errno = EXDEV;
  logAs("%d %m", 5);
  EXPECT_EQ(errno, EXDEV);
  EXPECT_EQ(loggedRaw(), Lines{"5 Invalid cross-device link"});
}

TEST_F(SupportTest, LongLinesAreKeptWhole) {
  const std::string text(100000, 'x');
  syslog(LOG_ERR, "%s", text.c_str());
  EXPECT_EQ(loggedRaw(), Lines{text});
}

TEST_F(SupportTest, WhatAChildLogsAndCallsIsSeen) {
  failCall("fsync", {.error = EIO});
  if (fork() == 0) {
    logAs("child %d %m", fsync(-1));
    _exit(3);
  }
  const std::vector<int> statuses = waitForChildRuns();
  ASSERT_EQ(statuses.size(), 1U);
  EXPECT_EQ(WEXITSTATUS(statuses[0]), 3);
  EXPECT_EQ(loggedRaw(), Lines{"child -1 Input/output error"});
  EXPECT_EQ(callCount("fsync"), 1U);
}

TEST_F(SupportTest, AGrandchildThatWasLeftAloneIsWaitedFor) {
  if (fork() == 0) {
    if (fork() == 0) {
      usleep(1);
      syslog(LOG_INFO, "grandchild");
    }
    _exit(0);
  }
  EXPECT_EQ(waitForChildRuns().size(), 2U);
  EXPECT_EQ(loggedRaw(), Lines{"grandchild"});
}

TEST_F(SupportTest, TheClockStandsWhereItIsSet) {
  setZone("Europe/Berlin");
  setClock("2013-05-07 08:30");
  EXPECT_EQ(time(nullptr), 1367908200);
  setClock("2013-05-07 08:30:59");
  EXPECT_EQ(time(nullptr), 1367908259);
  setClock(time_t{5});
  EXPECT_EQ(time(nullptr), 5);
  realClock();
  EXPECT_GT(time(nullptr), 1367908259);
}

TEST_F(SupportTest, APlanIsAboutTheCallsThatItNames) {
  failCall("rename", {.from = 2, .times = 2, .error = EIO});
  for (const int wanted : {ENOENT, EIO, EIO, ENOENT}) {
    errno = 0;
    EXPECT_EQ(rename("/nonexistent/a", "/nonexistent/b"), -1);
    EXPECT_EQ(errno, wanted);
  }
  EXPECT_EQ(callCount("rename"), 4U);
  resetFailingCalls();
  EXPECT_EQ(callCount("rename"), 0U);
}

TEST_F(SupportTest, APlanMayBeAboutOnePathOnly) {
  failCallFor("fopen", "/etc/crontab", {.times = kAlways, .error = EACCES});
  EXPECT_EQ(fopen("/etc/crontab", "r"), nullptr);
  EXPECT_EQ(errno, EACCES);
  FILE *other = fopen("/etc/passwd", "r");
  ASSERT_NE(other, nullptr);
  fclose(other);
}

TEST_F(SupportTest, AHashKeyMustBeEqual) {
  failCallFor("QLIBCSzHashSetValue", "app", {.times = kAlways, .code = 0x0200});
  PSZHASH hash = QLIBCSzHashAlloc(1);
  EXPECT_EQ(QLIBCSzHashSetValue(&hash, "app name", "a"), 0);
  EXPECT_EQ(errorRecord(), (ErrorRecord{0, ""}));
  EXPECT_EQ(QLIBCSzHashSetValue(&hash, "app", "a"), -1);
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0200, kInjectedFile}));
  EXPECT_EQ(QLIBCErrorGetLine(), kInjectedLine);
  QLIBCSzHashFree(hash);
}

TEST_F(SupportTest, CallsWithinTheLibrariesAreReached) {
  failCall("fopen", {.times = kAlways, .error = EMFILE});
  failCall("open", {.times = kAlways, .error = EMFILE});
  EXPECT_EQ(QLIBCFileTouch("/tmp/touched"), -1);
  EXPECT_FALSE(fileExists("/tmp/touched"));
}

TEST_F(SupportTest, AResultCanBeForced) {
  failCall("QLIBCProcAlive", {.times = kAlways, .result = 1});
  EXPECT_EQ(QLIBCProcAlive(-5), 1);
  failCall("system", {.result = 0x0900});
  EXPECT_EQ(system("exit 1"), 0x0900);
  EXPECT_EQ(system("exit 2"), 0x0200);
  EXPECT_EQ(recordedSystemCommands(), (Lines{"exit 1", "exit 2"}));
}

TEST_F(SupportTest, ArgumentsOfAProgramArePassedOn) {
  EXPECT_EQ(QLIBCExec("/bin/sh", "-c", "exit 5", nullptr), 5);
  EXPECT_EQ(recordedExecs(), Lines{"/bin/sh -c exit 5"});
}

TEST_F(SupportTest, SleepsAreRecordedInsteadOfSlept) {
  size_t last = 0;
  onSleep([&](size_t number) { last = number; });
  sleep(30);
  usleep(50000);
  std::this_thread::sleep_for(std::chrono::milliseconds(7));
  EXPECT_EQ(recordedSleeps(), (std::vector<long>{30000000, 50000, 7000}));
  EXPECT_EQ(recordedSleeps("usleep"), std::vector<long>{50000});
  EXPECT_EQ(last, 3U);
}

TEST_F(SupportTest, ChanceCanBeForced) {
  setRandValues({4, 9});
  EXPECT_EQ(rand(), 4);
  EXPECT_EQ(rand(), 9);
  EXPECT_EQ(rand(), 4);
  srand(17);
  EXPECT_EQ(lastSeed(), 17U);
  EXPECT_EQ(callCount("srand"), 1U);
}

TEST_F(SupportTest, AStreamThatFailsToCloseIsClosed) {
  writeFile("/tmp/stream", "text");
  FILE *stream = fopen("/tmp/stream", "r");
  ASSERT_NE(stream, nullptr);
  const int descriptor = fileno(stream);
  failCall("fclose", {.error = EIO});
  EXPECT_EQ(fclose(stream), EOF);
  EXPECT_EQ(errno, EIO);
  EXPECT_EQ(close(descriptor), -1);
}

TEST_F(SupportTest, AStatementFailsWithTheTextGiven) {
  sqlite3 *database = nullptr;
  ASSERT_EQ(sqlite3_open(":memory:", &database), SQLITE_OK);
  failCall("sqlite3_exec", {.text = "database is locked"});
  failCall("sqlite3_exec", {});
  char *error = nullptr;
  EXPECT_NE(sqlite3_exec(database, "SELECT 1", nullptr, nullptr, &error), SQLITE_OK);
  EXPECT_STREQ(error, "database is locked");
  sqlite3_free(error);
  EXPECT_NE(sqlite3_exec(database, "SELECT 1", nullptr, nullptr, &error), SQLITE_OK);
  EXPECT_EQ(error, nullptr);
  EXPECT_EQ(sqlite3_exec(database, "SELECT 1", nullptr, nullptr, nullptr), SQLITE_OK);
  EXPECT_EQ(sqlite3_close(database), SQLITE_OK);
}

TEST_F(SupportTest, AnAllocationFailsWithinItsScope) {
  if (!kAllocationsCanFail) GTEST_SKIP() << "the sanitizer allocates itself";
  constexpr size_t kSize = 50000;
  // Kept from the compiler, which may drop an allocation that is not used.
  void *(*volatile allocate)(size_t, size_t) = calloc;
  {
    const FailingAllocation scope("calloc", {.minSize = kSize});
    EXPECT_EQ(allocate(1, kSize), nullptr);
  }
  void *memory = allocate(1, kSize);
  EXPECT_NE(memory, nullptr);
  free(memory);
}

TEST_F(SupportTest, ACallThatIsNotInTheTableIsRefused) {
  EXPECT_THROW(failCall("no_such_call"), std::invalid_argument);
}

TEST_F(SupportTest, StatusRowsReadBack) {
  EXPECT_TRUE(statusRows().empty());
  const StatusRow row{.statusId = 1,
                      .pid = 2,
                      .timestamp = 3,
                      .app = "a'b",
                      .taskId = 4,
                      .statusCode = 5,
                      .comment = std::nullopt};
  EXPECT_EQ(addStatusRow(row), 1);
  EXPECT_EQ(statusRows(), std::vector<StatusRow>{row});
}

TEST_F(SupportTest, TheCrontabIsThePlainOne) {
  EXPECT_EQ(readFile(kCrontab), kPlainCrontab);
  EXPECT_TRUE(crontabLines().empty());
}

}  // namespace
}  // namespace support
