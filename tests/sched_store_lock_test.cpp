// The lock that serialises changes: failures of the lock file, and which process is reported as its
// holder. (backend_zeloschedule_store_test has changes, change_turns_test many at once.)
#include "sched_store_lock.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <string>
#include <vector>

#include "captured_log.h"
#include "failing_calls.h"
#include "sandbox_fixture.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;

constexpr char kLock[] = "/run/zeloscheduler.lock";

pid_t heldBy() {
  return schedLockHolder(kLock);
}

class StoreLockTest : public SandboxTest {
 protected:
  void SetUp() override {
    SandboxTest::SetUp();
    std::filesystem::remove_all(kLock);
  }
  void TearDown() override {
    resetFailingCalls();
    std::filesystem::remove_all(kLock);
    SandboxTest::TearDown();
  }

  static void removeItBeforeTheFirst(const std::string &wanted) {
    beforeEachCall([wanted, isDone = false](const std::string &call) mutable {
      if (isDone || call != wanted) return;
      isDone = true;
      std::filesystem::remove(kLock);
    });
  }
  static void expectNotHeld(const std::string &why) {
    const StoreLock lock;
    EXPECT_FALSE(lock.isHeld());
    EXPECT_EQ(errorRecord(), (ErrorRecord{0x0400, "sched_store_lock.cpp"}));
    EXPECT_EQ(logged(),
              Lines{"sched_store_lock.cpp:N Lock [" + std::string(kLock) + "] failed. " + why});
  }
};

TEST_F(StoreLockTest, WhoeverHoldsItIsToldUntilHeGivesItUp) {
  EXPECT_EQ(heldBy(), 0);
  EXPECT_FALSE(fileExists(kLock));
  {
    const StoreLock lock;
    EXPECT_TRUE(lock.isHeld());
    EXPECT_EQ(heldBy(), getpid());
    struct stat info = {};
    ASSERT_EQ(stat(kLock, &info), 0);
    EXPECT_EQ(info.st_mode & 0777U, 0600U);
  }
  EXPECT_EQ(heldBy(), 0);
  EXPECT_EQ(logged(), Lines{});
}

// A lock belongs to the open file description, which a child shares; /proc/locks has the process
// that took it.
TEST_F(StoreLockTest, TheHolderIsToldWhoeverLockedItAndWhateverTheFileSays) {
  writeFile(kLock, "4711\n");
  const int file = open(kLock, O_RDWR | O_CLOEXEC);
  const pid_t other = fork();
  if (other == 0) {
    _exit(flock(file, LOCK_EX) == 0 ? 0 : 1);
  }
  siginfo_t end = {};
  ASSERT_EQ(waitid(P_PID, static_cast<id_t>(other), &end, WEXITED | WNOWAIT), 0);
  ASSERT_EQ(end.si_status, 0);
  EXPECT_EQ(heldBy(), other);
  EXPECT_EQ(waitpid(other, nullptr, 0), other);
  EXPECT_EQ(heldBy(), kSchedUnknownHolder);  // that process is gone, the lock is not
  close(file);
  EXPECT_EQ(heldBy(), 0);
}

TEST_F(StoreLockTest, WhereTheKernelsListCannotBeReadTheHolderIsNotKnown) {
  const int file = open(kLock, O_RDWR | O_CREAT | O_CLOEXEC, 0600);
  ASSERT_EQ(flock(file, LOCK_EX), 0);
  failCallFor("fopen", "/proc/locks", {.times = kAlways, .error = ENOENT});
  EXPECT_EQ(heldBy(), kSchedUnknownHolder);
  expectNotHeld("Another process holds it.");
  close(file);
}

TEST_F(StoreLockTest, WhatIsNoLockFileIsHeldByNobody) {
  std::filesystem::create_symlink("/etc/passwd", kLock);
  EXPECT_EQ(heldBy(), 0);
  expectNotHeld("Too many levels of symbolic links");
}

TEST_F(StoreLockTest, ALockThatCannotBeTakenIsNotHeld) {
  failCall("flock", {.error = ENOLCK});
  expectNotHeld("No locks available");
  EXPECT_EQ(recordedSleeps(), std::vector<long>{});
}

TEST_F(StoreLockTest, ALockFileThatCannotBeOpenedIsNotHeld) {
  failCallFor("open", kLock, {.error = EMFILE});
  expectNotHeld("Too many open files");
  EXPECT_EQ(callCount("flock"), 0U);
}

TEST_F(StoreLockTest, AFileThatWasRemovedAndCannotBeOpenedAgainIsNotHeld) {
  failCallFor("open", kLock, {.from = 2, .error = ENFILE});
  removeItBeforeTheFirst("flock");
  expectNotHeld("Too many open files in system");
}

TEST_F(StoreLockTest, AFileThatWasRemovedIsMadeAndLockedAnew) {
  removeItBeforeTheFirst("flock");
  const StoreLock lock;
  EXPECT_TRUE(lock.isHeld());
  EXPECT_EQ(recordedSleeps(), std::vector<long>{5000});
  EXPECT_EQ(heldBy(), getpid());
}

TEST_F(StoreLockTest, AFileThatCannotBeExaminedIsLockedAnew) {
  for (const unsigned from : {1U, 2U}) {
    resetFailingCalls();
    failCall("statx", {.from = from, .error = EIO});
    const StoreLock lock;
    EXPECT_TRUE(lock.isHeld());
    EXPECT_EQ(callCount("flock"), 2U);
  }
}

TEST_F(StoreLockTest, ASignalDoesNotEndTheWait) {
  failCall("flock", {.times = 2, .error = EINTR});
  const StoreLock lock;
  EXPECT_TRUE(lock.isHeld());
  EXPECT_EQ(recordedSleeps(), (std::vector<long>{5000, 5000}));
}

TEST_F(StoreLockTest, AfterThirtySecondsTheHolderIsToldAndNothingIsHeld) {
  const StoreLock first;
  ASSERT_TRUE(first.isHeld());
  const StoreLock second;
  EXPECT_FALSE(second.isHeld());
  EXPECT_EQ(recordedSleeps(), std::vector<long>(6000, 5000));
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0400, "sched_store_lock.cpp"}));
  EXPECT_EQ(logged(), Lines{"sched_store_lock.cpp:N Lock [" + std::string(kLock) +
                            "] failed. Process " + std::to_string(getpid()) + " holds it."});
}

}  // namespace
}  // namespace support
