// Writing every backend's tasks out to where they take effect.
#include <gtest/gtest.h>

#include "captured_log.h"
#include "failing_calls.h"
#include "fake_backends.h"
#include "sandbox_fixture.h"
#include "tasks.h"
#include "zelosched.h"

namespace {

using support::ErrorRecord;
using support::errorRecord;
using support::FakeBackends;
using support::logged;
using Lines = std::vector<std::string>;

class TaskSyncTest : public support::SandboxTest {};

TEST_F(TaskSyncTest, BackendsThatCannotBeRegisteredAreReported) {
  FakeBackends fakes(1);
  support::failBackendInit();
  EXPECT_EQ(ZELOSchedTaskSync(), -1);
  EXPECT_EQ(logged(), Lines{"sched_task_sync.cpp:N Init backend failed. [0x0000 :N]"});
  EXPECT_EQ(fakes.calls(), Lines{});
}

TEST_F(TaskSyncTest, EveryBackendIsSynchronisedInOrder) {
  FakeBackends fakes(3);
  fakes[1].sync = 5;
  EXPECT_EQ(ZELOSchedTaskSync(), 0);
  EXPECT_EQ(fakes.calls(), (Lines{"sync 0", "sync 1", "sync 2"}));
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskSyncTest, ABackendWithoutSyncIsSkipped) {
  FakeBackends fakes(3);
  SchedBackends[1].sync = nullptr;
  EXPECT_EQ(ZELOSchedTaskSync(), 0);
  EXPECT_EQ(fakes.calls(), (Lines{"sync 0", "sync 2"}));
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskSyncTest, ABackendThatFailsIsReportedAndTheOthersFollow) {
  FakeBackends fakes(3);
  fakes[0].sync = -1;
  fakes[2].sync = -5;
  EXPECT_EQ(ZELOSchedTaskSync(), 0);
  EXPECT_EQ(fakes.calls(), (Lines{"sync 0", "sync 1", "sync 2"}));
  EXPECT_EQ(logged(),
            (Lines{"sched_task_sync.cpp:N Failed to sync for backend [0] [0x4321 fake.cpp:N]",
                   "sched_task_sync.cpp:N Failed to sync for backend [2] [0x4321 fake.cpp:N]"}));
  EXPECT_EQ(support::loggedPriorities(), (std::vector<int>{3, 3}));
  EXPECT_EQ(errorRecord(), (ErrorRecord{support::kFakeError, support::kFakeFile}));
}

TEST_F(TaskSyncTest, AFailureOfZeloscheduleIsReportedAndTheCallSucceeds) {
  support::saveTask(support::makeTask("a", "/bin/true"));
  support::failCall("QLIBCFileEnumSection", {.code = 0x0B00});
  EXPECT_EQ(ZELOSchedTaskSync(), 0);
  ASSERT_FALSE(logged().empty());
  EXPECT_EQ(logged().back(),
            "sched_task_sync.cpp:N Failed to sync for backend [0] [0x0B00 injected.cpp:N]");
}

TEST_F(TaskSyncTest, LinesOfTheCrontabThatWereLostAreWrittenAgain) {
  support::saveTask(support::makeTask("a", "/bin/true"));
  const Lines lines = support::crontabLines();
  ASSERT_EQ(lines.size(), 1U);
  support::writeFile(support::kCrontab, support::kPlainCrontab);
  EXPECT_EQ(ZELOSchedTaskSync(), 0);
  EXPECT_EQ(support::crontabLines(), lines);
  EXPECT_EQ(logged(), Lines{});
}

}  // namespace
