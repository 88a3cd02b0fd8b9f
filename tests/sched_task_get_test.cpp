// Reading one task by its id, whichever backend holds it, and a backend's default task.
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

constexpr long kId = 7;
constexpr int32_t kFirst = ZELO_SCHED_BACKEND_SCHEDULE;
constexpr int32_t kSecond = ZELO_SCHED_BACKEND_AUTOPOWER;
const ErrorRecord kBackendsError{support::kFakeError, support::kFakeFile};

class TaskGetByIdTest : public support::SandboxTest {
 protected:
  ZELO_SCHED_TASK task_ = {};
};
class TaskGetDefaultTest : public support::SandboxTest {};

TEST_F(TaskGetByIdTest, ARecordMustBeGiven) {
  FakeBackends fakes(1);
  EXPECT_EQ(ZELOSchedTaskGetByID(kId, nullptr), -1);
  EXPECT_EQ(logged(), Lines{"sched_task_get.cpp:N Invaild Argument (((void *)0) != pTask)=[0]\n"});
  EXPECT_EQ(support::loggedPriorities(), std::vector<int>{3});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0D00, "sched_task_get.cpp"}));
  EXPECT_EQ(fakes.calls(), Lines{});
}

TEST_F(TaskGetByIdTest, BackendsThatCannotBeRegisteredAreReported) {
  FakeBackends fakes(1);
  support::failBackendInit();
  EXPECT_EQ(ZELOSchedTaskGetByID(kId, &task_), -1);
  EXPECT_EQ(logged(), Lines{"sched_task_get.cpp:N Init backend failed. [0x0000 :N]"});
  EXPECT_EQ(fakes.calls(), Lines{});
}

TEST_F(TaskGetByIdTest, BackendsAreAskedInOrderUntilOneHasTheTask) {
  FakeBackends fakes(3);
  fakes[1].get_by_id = 1;
  EXPECT_EQ(ZELOSchedTaskGetByID(kId, &task_), 0);
  EXPECT_EQ(fakes.calls(),
            (Lines{"owns_id 0 id 7", "get_by_id 0 id 7", "owns_id 1 id 7", "get_by_id 1 id 7"}));
  EXPECT_EQ(task_.Backend, SchedBackends[1].id);
  EXPECT_STREQ(task_.Name, "stored by 1");
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskGetByIdTest, ABackendThatCannotOwnTheIdIsSkipped) {
  FakeBackends fakes(2);
  fakes[0].owns_id = 0;
  fakes[0].get_by_id = 1;
  fakes[1].get_by_id = 1;
  EXPECT_EQ(ZELOSchedTaskGetByID(kId, &task_), 0);
  EXPECT_EQ(fakes.calls(), (Lines{"owns_id 0 id 7", "owns_id 1 id 7", "get_by_id 1 id 7"}));
}

TEST_F(TaskGetByIdTest, AnyAnswerOfOwnsIdButZeroMeansAsk) {
  for (const int answer : {1, 2, -1}) {
    SCOPED_TRACE(answer);
    FakeBackends fakes(1);
    fakes[0].owns_id = answer;
    fakes[0].get_by_id = 1;
    EXPECT_EQ(ZELOSchedTaskGetByID(kId, &task_), 0);
  }
}

TEST_F(TaskGetByIdTest, ABackendWithoutOwnsIdIsAskedForEveryId) {
  FakeBackends fakes(1);
  SchedBackends[0].owns_id = nullptr;
  fakes[0].get_by_id = 1;
  for (const long id : {0L, 1L, 60000000L, 99999999L}) {
    EXPECT_EQ(ZELOSchedTaskGetByID(id, &task_), 0);
  }
  EXPECT_EQ(fakes.calls(), (Lines{"get_by_id 0 id 0", "get_by_id 0 id 1", "get_by_id 0 id 60000000",
                                  "get_by_id 0 id 99999999"}));
}

TEST_F(TaskGetByIdTest, ABackendWithoutGetByIdIsPassedOver) {
  FakeBackends fakes(2);
  SchedBackends[0].get_by_id = nullptr;
  fakes[1].get_by_id = 1;
  EXPECT_EQ(ZELOSchedTaskGetByID(kId, &task_), 0);
  EXPECT_EQ(fakes.calls(), (Lines{"owns_id 0 id 7", "owns_id 1 id 7", "get_by_id 1 id 7"}));
}

TEST_F(TaskGetByIdTest, AnAnswerOtherThanFoundGoesOnToTheNextBackend) {
  for (const int answer : {0, 2, 100}) {
    SCOPED_TRACE(answer);
    FakeBackends fakes(2);
    fakes[0].get_by_id = answer;
    fakes[1].get_by_id = 1;
    EXPECT_EQ(ZELOSchedTaskGetByID(kId, &task_), 0);
    EXPECT_STREQ(task_.Name, "stored by 1");
  }
}

TEST_F(TaskGetByIdTest, ABackendThatFailsEndsTheSearch) {
  FakeBackends fakes(3);
  fakes[1].get_by_id = -5;
  fakes[2].get_by_id = 1;
  EXPECT_EQ(ZELOSchedTaskGetByID(kId, &task_), -1);
  EXPECT_EQ(logged(), Lines{"sched_task_get.cpp:N Failed to get_by_id for backend [1] id:[7] "
                            "[0x4321 fake.cpp:N]"});
  EXPECT_EQ(errorRecord(), kBackendsError);
  EXPECT_EQ(fakes.calls().back(), "get_by_id 1 id 7");
}

TEST_F(TaskGetByIdTest, AnIdThatNobodyHoldsIsNotFound) {
  FakeBackends fakes(2);
  EXPECT_EQ(ZELOSchedTaskGetByID(kId, &task_), -1);
  EXPECT_EQ(logged(), Lines{"sched_task_get.cpp:N No get_by_id backend is found for task [7] "});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x2000, "sched_task_get.cpp"}));
  EXPECT_EQ(fakes.calls().size(), 4U);
}

TEST_F(TaskGetByIdTest, TheWholeIdReachesTheBackends) {
  if (sizeof(long) == sizeof(int32_t)) GTEST_SKIP() << "no id has more than 32 bits here";
  constexpr auto kWide = static_cast<long>(0x1'0000'0007);
  FakeBackends fakes(1);
  EXPECT_EQ(ZELOSchedTaskGetByID(kWide, &task_), -1);
  EXPECT_EQ(fakes.calls(), (Lines{"owns_id 0 id 4294967303", "get_by_id 0 id 4294967303"}));
  EXPECT_EQ(logged(),
            Lines{"sched_task_get.cpp:N No get_by_id backend is found for task [4294967303] "});
}

TEST_F(TaskGetByIdTest, AnIdThatNoRegisteredBackendHoldsIsNotFound) {
  support::saveTask(support::makeTask("other", "/bin/true"));
  EXPECT_EQ(ZELOSchedTaskGetByID(kId, &task_), -1);
  EXPECT_EQ(logged(), Lines{"sched_task_get.cpp:N No get_by_id backend is found for task [7] "});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x2000, "sched_task_get.cpp"}));
}

TEST_F(TaskGetByIdTest, AStoredTaskComesBackWithItsBackend) {
  const long id = support::saveTask(support::makeTask("backup", "/bin/true"));
  EXPECT_EQ(ZELOSchedTaskGetByID(id, &task_), 0);
  EXPECT_EQ(task_.ID, id);
  EXPECT_EQ(task_.Backend, ZELO_SCHED_BACKEND_SCHEDULE);
  EXPECT_STREQ(task_.Name, "backup");
  EXPECT_STREQ(task_.Command, "/bin/true");
  EXPECT_EQ(logged(), Lines{});
}

// ---- default tasks

TEST_F(TaskGetDefaultTest, ARecordMustBeGiven) {
  EXPECT_EQ(ZELOSchedTaskGetDefault(nullptr), -1);
  EXPECT_EQ(logged(), Lines{"sched_task_get.cpp:N Invaild Argument (((void *)0) != pTask)=[0]\n"});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0D00, "sched_task_get.cpp"}));
}

TEST_F(TaskGetDefaultTest, BackendsThatCannotBeRegisteredAreReported) {
  FakeBackends fakes(1);
  ZELO_SCHED_TASK task = taskOf(kFirst, -1);
  support::failBackendInit();
  EXPECT_EQ(ZELOSchedTaskGetDefault(&task), -1);
  EXPECT_EQ(logged(), Lines{"sched_task_get.cpp:N Init backend failed. [0x0000 :N]"});
  EXPECT_EQ(fakes.calls(), Lines{});
}

TEST_F(TaskGetDefaultTest, TheBackendOfTheRecordIsAskedAndItsResultGiven) {
  FakeBackends fakes(3);
  fakes[1].get_default = 5;
  ZELO_SCHED_TASK task = taskOf(kSecond, -1);
  EXPECT_EQ(ZELOSchedTaskGetDefault(&task), 5);
  EXPECT_EQ(fakes.calls(), Lines{"get_default 1 id -1"});
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskGetDefaultTest, OfTwoBackendsWithTheIdTheFirstIsAsked) {
  FakeBackends fakes(3);
  SchedBackends[2].id = kSecond;
  ZELO_SCHED_TASK task = taskOf(kSecond, -1);
  EXPECT_EQ(ZELOSchedTaskGetDefault(&task), 0);
  EXPECT_EQ(fakes.calls(), Lines{"get_default 1 id -1"});
}

TEST_F(TaskGetDefaultTest, AnEntryWithAnEmptySlotIsPassedOverForALaterOneWithItsId) {
  FakeBackends fakes(3);
  SchedBackends[1].get_default = nullptr;
  SchedBackends[2].id = kSecond;
  ZELO_SCHED_TASK task = taskOf(kSecond, -1);
  EXPECT_EQ(ZELOSchedTaskGetDefault(&task), 0);
  EXPECT_EQ(fakes.calls(), Lines{"get_default 2 id -1"});
}

TEST_F(TaskGetDefaultTest, AFailureOfTheBackendIsReportedAndItsResultGiven) {
  FakeBackends fakes(2);
  fakes[1].get_default = -7;
  ZELO_SCHED_TASK task = taskOf(kSecond, 12);
  EXPECT_EQ(ZELOSchedTaskGetDefault(&task), -7);
  EXPECT_EQ(logged(), Lines{"sched_task_get.cpp:N Failed to get_default for backend [1] id:[12] "
                            "[0x4321 fake.cpp:N]"});
  EXPECT_EQ(errorRecord(), kBackendsError);
}

TEST_F(TaskGetDefaultTest, ABackendThatIsNotThereIsNotFound) {
  ZELO_SCHED_TASK task = taskOf(-9, 12);
  EXPECT_EQ(ZELOSchedTaskGetDefault(&task), -1);
  EXPECT_EQ(logged(),
            Lines{"sched_task_get.cpp:N No get_default backend (-9) is found for task [12] "});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x2000, "sched_task_get.cpp"}));
}

TEST_F(TaskGetDefaultTest, ABackendThatDoesNotOfferDefaultsIsNotFound) {
  FakeBackends fakes(1);
  SchedBackends[0].get_default = nullptr;
  ZELO_SCHED_TASK task = taskOf(kFirst, -1);
  EXPECT_EQ(ZELOSchedTaskGetDefault(&task), -1);
  EXPECT_EQ(logged(),
            Lines{"sched_task_get.cpp:N No get_default backend (-2) is found for task [-1] "});
}

TEST_F(TaskGetDefaultTest, AnEntryBeyondTheCountIsNotInUse) {
  FakeBackends fakes(1);
  ZELO_SCHED_TASK task = taskOf(kSecond, -1);
  EXPECT_EQ(ZELOSchedTaskGetDefault(&task), -1);
  EXPECT_EQ(fakes.calls(), Lines{});
}

}  // namespace
