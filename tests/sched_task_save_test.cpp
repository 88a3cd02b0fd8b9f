// Saving a task: create or edit, by the id alone.
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
using support::taskOf;
using Lines = std::vector<std::string>;

constexpr int32_t kFirst = ZELO_SCHED_BACKEND_SCHEDULE;

class TaskSaveTest : public support::SandboxTest {};

TEST_F(TaskSaveTest, ATaskMustBeGiven) {
  EXPECT_EQ(ZELOSchedTaskSave(nullptr), -1);
  EXPECT_EQ(logged(), Lines{"sched_task_save.cpp:N Invaild Argument (((void *)0) != pTask)=[0]\n"});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0D00, "sched_task_save.cpp"}));
}

TEST_F(TaskSaveTest, ANewTaskIsCreated) {
  FakeBackends fakes(1);
  ZELO_SCHED_TASK task = taskOf(kFirst, -1);
  EXPECT_EQ(ZELOSchedTaskSave(&task), 0);
  EXPECT_EQ(fakes.calls(), Lines{"create 0 id -1"});
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskSaveTest, APositiveResultOfTheBackendBecomesZero) {
  FakeBackends fakes(1);
  fakes[0].create = 5;
  fakes[0].edit = 6;
  fakes[0].get_by_id = 1;
  for (const int32_t id : {-1, 7}) {
    SCOPED_TRACE(id);
    ZELO_SCHED_TASK task = taskOf(kFirst, id);
    EXPECT_EQ(ZELOSchedTaskSave(&task), 0);
  }
}

TEST_F(TaskSaveTest, AFailureOfTheCreationIsReported) {
  FakeBackends fakes(1);
  fakes[0].create = -7;
  ZELO_SCHED_TASK task = taskOf(kFirst, -1);
  EXPECT_EQ(ZELOSchedTaskSave(&task), -1);
  EXPECT_EQ(logged(), (Lines{"sched_task_create.cpp:N Failed to create for backend [0] id:[-1] "
                             "[0x4321 fake.cpp:N]",
                             "sched_task_save.cpp:N Add task failed. [0x4321 fake.cpp:N]"}));
  EXPECT_EQ(errorRecord(), (ErrorRecord{support::kFakeError, support::kFakeFile}));
}

TEST_F(TaskSaveTest, AnyOtherIdIsEdited) {
  FakeBackends fakes(1);
  fakes[0].get_by_id = 1;
  for (const int32_t id : {0, 7, -2}) {
    ZELO_SCHED_TASK task = taskOf(kFirst, id);
    EXPECT_EQ(ZELOSchedTaskSave(&task), 0);
    EXPECT_EQ(fakes.calls().back(), "edit 0 id " + std::to_string(id));
  }
}

TEST_F(TaskSaveTest, AFailureOfTheEditIsReported) {
  FakeBackends fakes(1);
  fakes[0].get_by_id = 1;
  fakes[0].edit = -7;
  ZELO_SCHED_TASK task = taskOf(kFirst, 7);
  EXPECT_EQ(ZELOSchedTaskSave(&task), -1);
  EXPECT_EQ(logged(), (Lines{"sched_task_edit.cpp:N Failed to edit for backend [0] id:[7] "
                             "[0x4321 fake.cpp:N]",
                             "sched_task_save.cpp:N Set task failed. [7] [0x4321 fake.cpp:N]"}));
}

TEST_F(TaskSaveTest, AnUnknownIdFailsInTheFirstStepOfTheEdit) {
  ZELO_SCHED_TASK task = taskOf(kFirst, 7);
  EXPECT_EQ(ZELOSchedTaskSave(&task), -1);
  EXPECT_EQ(logged(),
            (Lines{"sched_task_get.cpp:N No get_by_id backend is found for task [7] ",
                   "sched_task_edit.cpp:N get task failed. id:[7] [0x2000 sched_task_get.cpp:N]",
                   "sched_task_save.cpp:N Set task failed. [7] [0x2000 sched_task_get.cpp:N]"}));
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x2000, "sched_task_get.cpp"}));
  EXPECT_FALSE(support::hasStoredTasks());
}

TEST_F(TaskSaveTest, ASavedTaskCanBeSavedAgainUnderItsId) {
  const support::Task task = support::makeTask("first", "/bin/true");
  ASSERT_EQ(ZELOSchedTaskSave(task.get()), 0);
  EXPECT_EQ(task->ID, 1);
  support::setText(task->Name, "second");
  ASSERT_EQ(ZELOSchedTaskSave(task.get()), 0);
  EXPECT_EQ(task->ID, 1);
  EXPECT_STREQ(support::loadTask(1)->Name, "second");
  EXPECT_EQ(logged(), Lines{});
}

}  // namespace
