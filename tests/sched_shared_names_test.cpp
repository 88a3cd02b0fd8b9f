// How the names in "/tmp" become ours: when another process is faster, when the file system cannot
// exchange names, and when a call fails. (planted_paths_test has the library's operations.)
#include "sched_shared_names.h"

#include <gtest/gtest.h>
#include <signal.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <functional>
#include <string>
#include <vector>

#include "captured_log.h"
#include "failing_calls.h"
#include "sandbox_fixture.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;

constexpr char kNoTasks[] = "# The scheduler's tasks.\n";
constexpr unsigned kTries = 1000;
constexpr mode_t kWritableByAll = 0666;
constexpr uid_t kNobody = 65534;
constexpr const char *kMadeNames[] = {kTaskProgram, kLockDirectory, "/tmp/lock/lock_sched_run",
                                      "/tmp/sched_status.sqlite",
                                      "/tmp/sched_status.sqlite-journal"};

mode_t modeOf(const std::string &path) {
  struct stat info = {};
  EXPECT_EQ(lstat(path.c_str(), &info), 0) << path;
  return info.st_mode;
}

bool isOurs(const SchedSharedName &name) {
  return schedLookAt(name, nullptr) == SchedNameState::kOurs;
}

const char *whyForeign(const SchedSharedName &name) {
  const char *why = "";
  return schedLookAt(name, &why) == SchedNameState::kForeign ? why : "";
}

class SharedNamesTest : public SandboxTest {
 protected:
  void SetUp() override {
    SandboxTest::SetUp();
    forget();
  }
  void TearDown() override {
    resetFailingCalls();
    forget();
    SandboxTest::TearDown();
  }

  static void forget() {
    std::vector<std::filesystem::path> left;
    for (const auto &entry : std::filesystem::directory_iterator("/tmp")) {
      const std::string name = entry.path().filename();
      if (name.starts_with("zeloscheduler.") || name == "other") left.push_back(entry.path());
    }
    for (const char *name : kMadeNames) left.emplace_back(name);
    left.emplace_back(kStore);
    for (const std::filesystem::path &path : left) std::filesystem::remove_all(path);
  }

  // A file that others can write counts as foreign, whoever owns it.
  static void plantFile(const SchedSharedName &name, const std::string &contents = "foreign") {
    const OwnWork own;
    std::filesystem::remove_all(name.path);
    writeFile(name.path, contents, kWritableByAll);
  }
  static void plantOurs(const SchedSharedName &name, const std::string &contents) {
    const OwnWork own;
    std::filesystem::remove_all(name.path);
    writeFile(name.path, contents, name.mode);
  }
  // Acts once, before the first call of that name.
  static void beforeTheFirst(const std::string &wanted, std::function<void()> action) {
    beforeEachCall([wanted, action, isDone = false](const std::string &call) mutable {
      if (isDone || call != wanted) return;
      isDone = true;
      action();
    });
  }
  static unsigned directoriesOfOurs() {
    unsigned count = 0;
    for (const auto &entry : std::filesystem::directory_iterator("/tmp")) {
      if (entry.path().filename().string().starts_with("zeloscheduler.")) ++count;
    }
    return count;
  }
};

// ---- what is ours

TEST_F(SharedNamesTest, AFreeNameIsFreeAndWhatIsMadeUnderItIsOurs) {
  for (const SchedSharedName *name : {&kSchedStore, &kSchedTaskProgram, &kSchedLockDirectory,
                                      &kSchedLockFile, &kSchedDatabase, &kSchedJournal}) {
    const char *why = "";
    EXPECT_EQ(schedLookAt(*name, &why), SchedNameState::kFree) << name->path;
    EXPECT_TRUE(schedTakeName(*name)) << name->path;
    EXPECT_EQ(schedLookAt(*name, &why), SchedNameState::kOurs) << name->path;
    EXPECT_EQ(why, nullptr) << name->path;
    EXPECT_EQ(modeOf(name->path) & 0777U, name->mode) << name->path;
    EXPECT_EQ(S_ISDIR(modeOf(name->path)), name->isDirectory) << name->path;
    if (!name->isDirectory) {
      EXPECT_EQ(readFile(name->path), name->contents);
    }
  }
  EXPECT_EQ(directoriesOfOurs(), 0U);
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(SharedNamesTest, ItSaysWhyANameIsForeign) {
  writeFile(kLockDirectory, "");
  EXPECT_STREQ(whyForeign(kSchedLockDirectory), "is no directory");
  std::filesystem::create_directory(kStore);
  EXPECT_STREQ(whyForeign(kSchedStore), "is no regular file");
  std::filesystem::remove(kStore);
  plantFile(kSchedStore);
  EXPECT_STREQ(whyForeign(kSchedStore), "can be written by others");
  plantOurs(kSchedStore, "");
  std::filesystem::create_hard_link(kStore, "/tmp/other");
  EXPECT_STREQ(whyForeign(kSchedStore), "has a second name");
  EXPECT_EQ(schedLookAt(kSchedStore, nullptr), SchedNameState::kForeign);
  failCallFor("lstat", kTaskProgram, {.error = EACCES});
  EXPECT_STREQ(whyForeign(kSchedTaskProgram), "cannot be examined");
  struct stat info = {};
  info.st_uid = kNobody;
  EXPECT_STREQ(schedWhyForeign(kSchedStore, info), "is another user's");
}

// ---- a file system that cannot exchange

class WithoutExchangeTest : public SharedNamesTest, public testing::WithParamInterface<int> {
 protected:
  void SetUp() override {
    SharedNamesTest::SetUp();
    failCall("renameat2", {.times = kAlways, .error = GetParam()});
  }
};

TEST_P(WithoutExchangeTest, AFileTakesThePlaceOfAnother) {
  plantFile(kSchedStore);
  EXPECT_TRUE(schedTakeName(kSchedStore));
  EXPECT_TRUE(isOurs(kSchedStore));
  EXPECT_EQ(readFile(kStore), kNoTasks);
  EXPECT_EQ(logged(), Lines{});
  EXPECT_EQ(directoriesOfOurs(), 0U);
}

TEST_P(WithoutExchangeTest, AFileTakesAFreeName) {
  EXPECT_TRUE(schedTakeName(kSchedStore));
  EXPECT_EQ(readFile(kStore), kNoTasks);
}

TEST_P(WithoutExchangeTest, AnEmptyDirectoryInTheWayOfAFileIsRemoved) {
  std::filesystem::create_directory(kStore);
  EXPECT_TRUE(schedTakeName(kSchedStore));
  EXPECT_EQ(readFile(kStore), kNoTasks);
  EXPECT_EQ(logged(), Lines{});
  EXPECT_EQ(directoriesOfOurs(), 0U);
}

TEST_P(WithoutExchangeTest, ADirectoryWithSomethingInItIsMovedAway) {
  std::filesystem::create_directory(kStore);
  writeFile(std::string(kStore) + "/inside", "kept");
  EXPECT_TRUE(schedTakeName(kSchedStore));
  EXPECT_EQ(readFile(kStore), kNoTasks);
  const std::string away = movedAway(std::string(kStore) + ".away");
  EXPECT_EQ(readFile(away + "/inside"), "kept");
  EXPECT_EQ(logged(), Lines{"sched_shared_names.cpp:N " + std::string(kStore) +
                            " is not ours: it is now " + away});
}

TEST_P(WithoutExchangeTest, AFileInTheWayOfADirectoryIsMovedAway) {
  writeFile(kLockDirectory, "kept");
  EXPECT_TRUE(schedTakeName(kSchedLockDirectory));
  EXPECT_TRUE(isOurs(kSchedLockDirectory));
  EXPECT_EQ(readFile(movedAway(std::string(kLockDirectory) + ".away")), "kept");
}

TEST_P(WithoutExchangeTest, SomebodyWhoIsFasterAgainAndAgainIsLeftIt) {
  plantFile(kSchedStore);
  failCall("rename", {.times = kAlways, .error = EISDIR});
  EXPECT_FALSE(schedTakeName(kSchedStore));
  EXPECT_EQ(callCount("renameat2"), kTries);
  EXPECT_EQ(callCount("rename"), 2 * kTries);
  EXPECT_EQ(readFile(kStore), "foreign");
  EXPECT_EQ(directoriesOfOurs(), 0U);
}

INSTANTIATE_TEST_SUITE_P(EachError, WithoutExchangeTest, testing::Values(EINVAL, ENOSYS));

// ---- calls that fail

TEST_F(SharedNamesTest, WithoutADirectoryOfItsOwnNothingIsReplaced) {
  plantFile(kSchedStore);
  failCall("mkdtemp", {.error = ENOSPC});
  EXPECT_FALSE(schedTakeName(kSchedStore));
  EXPECT_EQ(errno, ENOSPC);
  EXPECT_EQ(readFile(kStore), "foreign");
  EXPECT_EQ(callCount("renameat2"), 0U);
}

TEST_F(SharedNamesTest, AFreeNameThatCannotBeTakenStaysFree) {
  for (const char *call : {"mkdtemp", "open", "write", "fchmod", "close", "renameat2"}) {
    resetFailingCalls();
    failCall(call, {.error = EIO});
    EXPECT_FALSE(schedTakeName(kSchedTaskProgram)) << call;
    EXPECT_EQ(errno, EIO) << call;
    EXPECT_FALSE(fileExists(kTaskProgram)) << call;
    EXPECT_EQ(directoriesOfOurs(), 0U) << call;
  }
  for (const char *call : {"open", "fchmod", "close"}) {
    resetFailingCalls();
    failCall(call, {.error = EIO});
    EXPECT_FALSE(schedTakeName(kSchedDatabase)) << call;
    std::filesystem::remove(kSchedDatabase.path);
  }
  for (const char *call : {"mkdir", "chmod"}) {
    resetFailingCalls();
    failCall(call, {.error = EIO});
    EXPECT_FALSE(schedTakeName(kSchedLockDirectory)) << call;
    std::filesystem::remove(kLockDirectory);
  }
}

TEST_F(SharedNamesTest, AnExchangeThatFailsLeavesWhatStandsThere) {
  plantFile(kSchedStore);
  failCall("renameat2", {.error = EIO});
  EXPECT_FALSE(schedTakeName(kSchedStore));
  EXPECT_EQ(errno, EIO);
  EXPECT_EQ(readFile(kStore), "foreign");
  EXPECT_EQ(directoriesOfOurs(), 0U);
}

TEST_F(SharedNamesTest, WhatCannotBeExaminedAfterAnExchangeIsKept) {
  plantFile(kSchedStore);
  failCallFor("lstat", "/tmp/zeloscheduler.", {.error = EIO});
  SchedMovedTo movedTo;
  EXPECT_TRUE(schedReplaceName(kSchedStore, &movedTo));
  EXPECT_EQ(readFile(movedTo), "foreign");
  EXPECT_EQ(logged(), Lines{"sched_shared_names.cpp:N " + std::string(kStore) +
                            " is gone: it is now " + movedTo});
}

// With a file size limit the kernel writes a part, and then fails.
class SizeLimitTest : public SharedNamesTest {
 protected:
  void SetUp() override {
    SharedNamesTest::SetUp();
    ASSERT_EQ(getrlimit(RLIMIT_FSIZE, &former_), 0);
    ignored_ = signal(SIGXFSZ, SIG_IGN);
  }
  void TearDown() override {
    lift();
    signal(SIGXFSZ, ignored_);
    SharedNamesTest::TearDown();
  }
  void limit() {
    rlimit limit = former_;
    limit.rlim_cur = 10;
    ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &limit), 0);
  }
  void lift() { EXPECT_EQ(setrlimit(RLIMIT_FSIZE, &former_), 0); }

 private:
  rlimit former_ = {};
  void (*ignored_)(int) = SIG_DFL;
};

TEST_F(SizeLimitTest, TheProgramsTextIsWrittenInAsManyPartsAsItTakes) {
  unsigned writes = 0;
  beforeEachCall([&](const std::string &call) {
    if (call == "write" && ++writes == 2) lift();
  });
  limit();
  const bool isTaken = schedTakeName(kSchedTaskProgram);
  lift();
  EXPECT_TRUE(isTaken);
  EXPECT_EQ(writes, 2U);
  EXPECT_EQ(readFile(kTaskProgram), kSchedTaskProgram.contents);
}

TEST_F(SizeLimitTest, AProgramOfWhichOnlyAPartCouldBeWrittenIsNotPutThere) {
  limit();
  const bool isTaken = schedTakeName(kSchedTaskProgram);
  const int reason = errno;
  lift();
  EXPECT_FALSE(isTaken);
  EXPECT_EQ(reason, EFBIG);
  EXPECT_FALSE(fileExists(kTaskProgram));
  EXPECT_EQ(directoriesOfOurs(), 0U);
}

TEST_F(SharedNamesTest, AWriteThatASignalInterruptsIsDoneAgain) {
  failCall("write", {.times = 3, .error = EINTR});
  EXPECT_TRUE(schedTakeName(kSchedTaskProgram));
  EXPECT_EQ(callCount("write"), 4U);
  EXPECT_EQ(readFile(kTaskProgram), kSchedTaskProgram.contents);
}

TEST_F(SharedNamesTest, AWriteOfNothingIsAFailure) {
  failCall("write", {.result = 0});
  EXPECT_FALSE(schedTakeName(kSchedTaskProgram));
  EXPECT_FALSE(fileExists(kTaskProgram));
}

// ---- somebody who is faster

TEST_F(SharedNamesTest, WhatAnotherProcessOfOursHasTakenMeanwhileIsPutBack) {
  plantFile(kSchedStore);
  beforeTheFirst("renameat2", [] { plantOurs(kSchedStore, "in use"); });
  EXPECT_TRUE(schedTakeName(kSchedStore));
  EXPECT_EQ(readFile(kStore), "in use");
  EXPECT_EQ(logged(), Lines{});
  EXPECT_EQ(directoriesOfOurs(), 0U);
  std::filesystem::remove(kStore);
  beforeTheFirst("renameat2", [] { plantOurs(kSchedStore, "in use"); });
  EXPECT_TRUE(schedTakeName(kSchedStore));
  EXPECT_EQ(readFile(kStore), "in use");
}

TEST_F(SharedNamesTest, AReplacementTakesThePlaceOfWhatIsOursToo) {
  plantOurs(kSchedStore, "ours");
  SchedMovedTo movedTo;
  EXPECT_TRUE(schedReplaceName(kSchedStore, &movedTo));
  EXPECT_STREQ(movedTo, "");
  EXPECT_EQ(readFile(kStore), kNoTasks);
  EXPECT_TRUE(schedReplaceName(kSchedStore, nullptr));
  EXPECT_EQ(directoriesOfOurs(), 0U);
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(SharedNamesTest, WhatIsMovedAsideIsKeptAlsoWhenItIsOurs) {
  SchedMovedTo movedTo;
  EXPECT_TRUE(schedMoveAside(kSchedDatabase, &movedTo));
  EXPECT_STREQ(movedTo, "");
  plantOurs(kSchedDatabase, "rows");
  EXPECT_TRUE(schedMoveAside(kSchedDatabase, &movedTo));
  EXPECT_EQ(readFile(movedTo), "rows");
  EXPECT_EQ(readFile(kSchedDatabase.path), "");
  EXPECT_EQ(logged(), Lines{});
  plantFile(kSchedDatabase);
  EXPECT_TRUE(schedMoveAside(kSchedDatabase, &movedTo));
  EXPECT_EQ(readFile(movedTo), "foreign");
  EXPECT_EQ(logged(), Lines{"sched_shared_names.cpp:N " + std::string(kSchedDatabase.path) +
                            " can be written by others: it is now " + movedTo});
}

TEST_F(SharedNamesTest, AnEmptyDirectoryThatWasExchangedIsRemoved) {
  std::filesystem::create_directory(kStore);
  EXPECT_TRUE(schedTakeName(kSchedStore));
  EXPECT_EQ(directoriesOfOurs(), 0U);
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(SharedNamesTest, ANameThatBecomesFreeMeanwhileIsTaken) {
  plantFile(kSchedStore);
  beforeTheFirst("renameat2", [] { std::filesystem::remove(kStore); });
  EXPECT_TRUE(schedTakeName(kSchedStore));
  EXPECT_EQ(readFile(kStore), kNoTasks);
}

// The file is gone when it is to be exchanged, and there again when the name is to be taken.
TEST_F(SharedNamesTest, ANameThatIsNowFreeAndNowTakenIsTriedForAWhile) {
  for (const unsigned rounds : {3U, 2 * kTries}) {
    resetFailingCalls();
    plantFile(kSchedStore);
    unsigned calls = 0;
    beforeEachCall([&](const std::string &call) {
      if (call != "renameat2" || calls >= 2 * rounds) return;
      if (calls++ % 2 == 0) {
        std::filesystem::remove(kStore);
      } else {
        plantFile(kSchedStore, "again");
      }
    });
    EXPECT_EQ(schedTakeName(kSchedStore), rounds < kTries);
    EXPECT_EQ(callCount("renameat2"), rounds < kTries ? 2 * rounds + 1 : 2 * kTries);
    EXPECT_EQ(readFile(kStore), rounds < kTries ? kNoTasks : "again");
  }
}

TEST_F(SharedNamesTest, AFreeNameThatAnotherProcessOfOursTakesFirstIsOurs) {
  beforeTheFirst("open", [] { plantOurs(kSchedDatabase, "rows"); });
  EXPECT_TRUE(schedTakeName(kSchedDatabase));
  EXPECT_EQ(readFile(kSchedDatabase.path), "rows");
}

TEST_F(SharedNamesTest, AFreeNameThatSomebodyElseTakesFirstIsTakenFromHim) {
  beforeTheFirst("open", [] { plantFile(kSchedDatabase); });
  EXPECT_TRUE(schedTakeName(kSchedDatabase));
  EXPECT_EQ(readFile(kSchedDatabase.path), "");
  EXPECT_EQ(readFile(movedAway(kSchedDatabase.path)), "foreign");
}

TEST_F(SharedNamesTest, AFreeNameThatIsAlwaysTakenFirstAndGivenUpAgainIsTriedForAWhile) {
  failCall("open", {.times = kAlways, .error = EEXIST});
  EXPECT_FALSE(schedTakeName(kSchedDatabase));
  EXPECT_EQ(callCount("open"), kTries);
}

// ---- made anew where nothing is expected

TEST_F(SharedNamesTest, WhatIsInTheWayOfANewFileIsRemoved) {
  EXPECT_TRUE(schedMakeAnew(kSchedDatabase));
  plantOurs(kSchedDatabase, "left over");
  EXPECT_TRUE(schedMakeAnew(kSchedDatabase));
  EXPECT_EQ(readFile(kSchedDatabase.path), "");
  EXPECT_EQ(callCount("renameat2"), 0U);
}

TEST_F(SharedNamesTest, ADirectoryInTheWayOfANewFileIsMovedAway) {
  std::filesystem::create_directories(std::string(kSchedDatabase.path) + "/inside");
  EXPECT_TRUE(schedMakeAnew(kSchedDatabase));
  EXPECT_TRUE(isOurs(kSchedDatabase));
  EXPECT_TRUE(fileExists(movedAway(kSchedDatabase.path) + "/inside"));
}

TEST_F(SharedNamesTest, ANewFileThatCannotBeMadeIsNotThere) {
  failCall("open", {.error = EIO});
  EXPECT_FALSE(schedMakeAnew(kSchedDatabase));
  EXPECT_FALSE(fileExists(kSchedDatabase.path));
}

TEST_F(SharedNamesTest, SomebodyWhoIsAlwaysThereBeforeTheNewFileIsReplaced) {
  unsigned times = 0;
  beforeEachCall([&](const std::string &call) {
    if (call == "open" && !fileExists(kSchedDatabase.path)) {
      plantFile(kSchedDatabase);
      ++times;
    }
  });
  EXPECT_TRUE(schedMakeAnew(kSchedDatabase));
  EXPECT_EQ(times, 10U);
  EXPECT_TRUE(isOurs(kSchedDatabase));
  EXPECT_EQ(readFile(kSchedDatabase.path), "");
}

// ---- all names

TEST_F(SharedNamesTest, RootTakesAllNamesButTheStores) {
  schedTakeNames();
  for (const char *name : kMadeNames) EXPECT_TRUE(fileExists(name)) << name;
  EXPECT_FALSE(fileExists(kStore));
}

TEST_F(SharedNamesTest, OthersTakeNoNameThatTheyDoNotNeedAndReplaceNone) {
  REQUIRE_OTHER_USERS();
  plantFile(kSchedStore);
  plantFile(kSchedDatabase);
  ASSERT_EQ(seteuid(kNobody), 0);
  schedTakeNames();
  SchedMovedTo movedTo;
  EXPECT_FALSE(schedTakeName(kSchedStore));
  EXPECT_FALSE(schedReplaceName(kSchedStore, &movedTo));
  EXPECT_FALSE(schedMakeAnew(kSchedDatabase));
  ASSERT_EQ(seteuid(0), 0);
  EXPECT_FALSE(fileExists(kTaskProgram));
  EXPECT_FALSE(fileExists(kLockDirectory));
  EXPECT_EQ(readFile(kStore), "foreign");
  EXPECT_EQ(readFile(kSchedDatabase.path), "foreign");
}

}  // namespace
}  // namespace support
