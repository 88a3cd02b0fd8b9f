// A task to be shown in an editor: a stored one, or the default for a new one.
#include <gtest/gtest.h>

#include "captured_log.h"
#include "fake_backends.h"
#include "sandbox_fixture.h"
#include "tasks.h"
#include "zelosched.h"

namespace {

using support::ErrorRecord;
using support::errorRecord;
using support::FakeBackends;
using support::logged;
using support::taskOf;
using Lines = std::vector<std::string>;

constexpr int32_t kFirst = ZELO_SCHED_BACKEND_SCHEDULE;
constexpr int32_t kSecond = ZELO_SCHED_BACKEND_AUTOPOWER;

class TaskLoadTest : public support::SandboxTest {};

TEST_F(TaskLoadTest, AnIdBelowThatOfANewTaskIsRefused) {
  FakeBackends fakes(1);
  ZELO_SCHED_TASK task = taskOf(kFirst, 0);
  for (const long id : {-2L, -1000L, static_cast<long>(-5'000'000'000)}) {
    SCOPED_TRACE(id);
    support::clearLog();
    EXPECT_EQ(ZELOSchedTaskLoad(id, &task), -1);
    EXPECT_EQ(logged(), Lines{"sched_task_load.cpp:N Invaild Argument (-1 <= id)=[0]\n"});
    EXPECT_EQ(errorRecord(), (ErrorRecord{0x0D00, "sched_task_load.cpp"}));
  }
  EXPECT_EQ(fakes.calls(), Lines{});
}

TEST_F(TaskLoadTest, ARecordMustBeGiven) {
  EXPECT_EQ(ZELOSchedTaskLoad(7, nullptr), -1);
  EXPECT_EQ(logged(), Lines{"sched_task_load.cpp:N Invaild Argument (NULL != pTask)=[0]\n"});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0D00, "sched_task_load.cpp"}));
}

TEST_F(TaskLoadTest, TheIdIsCheckedBeforeTheRecord) {
  EXPECT_EQ(ZELOSchedTaskLoad(-2, nullptr), -1);
  EXPECT_EQ(logged(), Lines{"sched_task_load.cpp:N Invaild Argument (-1 <= id)=[0]\n"});
}

TEST_F(TaskLoadTest, ANewTaskIsTheDefaultOfTheRecordsBackend) {
  FakeBackends fakes(2);
  fakes[1].get_default = 5;
  ZELO_SCHED_TASK task = taskOf(kSecond, 3);
  EXPECT_EQ(ZELOSchedTaskLoad(-1, &task), 0);
  EXPECT_EQ(fakes.calls(), Lines{"get_default 1 id 3"});
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskLoadTest, ADefaultThatCannotBeHadIsReported) {
  FakeBackends fakes(1);
  fakes[0].get_default = -7;
  ZELO_SCHED_TASK task = taskOf(kFirst, -1);
  EXPECT_EQ(ZELOSchedTaskLoad(-1, &task), -1);
  EXPECT_EQ(logged(),
            (Lines{"sched_task_get.cpp:N Failed to get_default for backend [0] id:[-1] "
                   "[0x4321 fake.cpp:N]",
                   "sched_task_load.cpp:N get default task failed. [0x4321 fake.cpp:N]"}));
  EXPECT_EQ(errorRecord(), (ErrorRecord{support::kFakeError, support::kFakeFile}));
}

TEST_F(TaskLoadTest, AnUnknownBackendHasNoDefault) {
  ZELO_SCHED_TASK task = taskOf(-9, -1);
  EXPECT_EQ(ZELOSchedTaskLoad(-1, &task), -1);
  EXPECT_EQ(
      logged(),
      (Lines{"sched_task_get.cpp:N No get_default backend (-9) is found for task [-1] ",
             "sched_task_load.cpp:N get default task failed. [0x2000 sched_task_get.cpp:N]"}));
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x2000, "sched_task_get.cpp"}));
}

TEST_F(TaskLoadTest, AnyOtherIdIsReadFromTheBackends) {
  FakeBackends fakes(1);
  fakes[0].get_by_id = 1;
  ZELO_SCHED_TASK task = taskOf(kSecond, -1);
  EXPECT_EQ(ZELOSchedTaskLoad(0, &task), 0);
  EXPECT_EQ(fakes.calls(), (Lines{"owns_id 0 id 0", "get_by_id 0 id 0"}));
  EXPECT_STREQ(task.Name, "stored by 0");
  EXPECT_EQ(task.Backend, kFirst);
}

TEST_F(TaskLoadTest, ATaskThatIsNotThereIsReported) {
  ZELO_SCHED_TASK task = {};
  EXPECT_EQ(ZELOSchedTaskLoad(7, &task), -1);
  EXPECT_EQ(logged(),
            (Lines{"sched_task_get.cpp:N No get_by_id backend is found for task [7] ",
                   "sched_task_load.cpp:N get task failed. [7] [0x2000 sched_task_get.cpp:N]"}));
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x2000, "sched_task_get.cpp"}));
}

TEST_F(TaskLoadTest, AStoredTaskIsLoaded) {
  const long id = support::saveTask(support::makeTask("backup", "/bin/true"));
  ZELO_SCHED_TASK task = {};
  EXPECT_EQ(ZELOSchedTaskLoad(id, &task), 0);
  EXPECT_STREQ(task.Name, "backup");
  EXPECT_EQ(logged(), Lines{});
}

}  // namespace
