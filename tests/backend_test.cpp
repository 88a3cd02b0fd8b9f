// The table of backends and its registration.
//
// Registration happens once in a process, so this program never registers anything itself: every
// test that does runs in a child of its own.
#include <dlfcn.h>
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>
#include <functional>
#include <iterator>

#include "captured_log.h"
#include "refused_arguments.h"
#include "sandbox_fixture.h"
#include "tasks.h"
#include "zelocore.h"
#include "zelosched.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;
using Init = int (*)(const char *, ZELO_SCHED_BACKEND *);

struct Registered {
  int32_t id;
  const char *szName;
  const char *szInit;
  Init init;
  bool ownsIds;  // whether it offers owns_id
};

// In the order of registration.
constexpr Registered kRegistered[] = {
    {ZELO_SCHED_BACKEND_SCHEDULE, "zeloschedule", "zeloschedule_init", zeloschedule_init, false},
    {ZELO_SCHED_BACKEND_AUTOPOWER, "zeloautopower", "zeloautopower_init", zeloautopower_init, true},
};
constexpr uint32_t kCapacity = sizeof(SchedBackends) / sizeof(SchedBackends[0]);
constexpr auto kCount = static_cast<uint32_t>(std::size(kRegistered));

// What happens to an init that the library calls: it is passed on, fails, or gets another's name.
enum class Fate { kPassedOn, kFails, kOtherName };
struct Inits {
  Fate fate = Fate::kPassedOn;
  std::string victim;  // the init that it happens to
  unsigned times = 0;  // how often it happens
  Lines calls;         // "zeloschedule_init zeloschedule id -2 at 0"
};
Inits inits;

int intercepted(const char *szInit, Init real, const char *szName, ZELO_SCHED_BACKEND *pBackend) {
  if (szName != nullptr && pBackend != nullptr) {
    inits.calls.push_back(std::string(szInit) + " " + szName + " id " +
                          std::to_string(pBackend->id) + " at " +
                          std::to_string(pBackend - SchedBackends));
  }
  if (inits.victim == szInit && inits.times > 0) {
    --inits.times;
    if (inits.fate == Fate::kFails) return -1;
    if (inits.fate == Fate::kOtherName) return real("someone else's", pBackend);
  }
  return real(szName, pBackend);
}

constexpr int kEarlierError = 0x1111;
constexpr char kEarlierFile[] = "earlier.cpp";
const ErrorRecord kEarlier{kEarlierError, kEarlierFile};

void leaveEarlierError() {
  QLIBCErrSetEx(kEarlierError, kEarlierFile, 9);
}

bool isEmptyEntry(const ZELO_SCHED_BACKEND &entry) {
  static const ZELO_SCHED_BACKEND kEmpty = {};
  return std::memcmp(&entry, &kEmpty, sizeof(entry)) == 0;
}

class BackendTest : public SandboxTest {
 protected:
  // Runs the test's body where the library has not been used yet.
  static void inFreshProcess(const std::function<void()> &body) {
    std::fflush(nullptr);
    const pid_t child = fork();
    ASSERT_GE(child, 0);
    if (child == 0) {
      inits = {};
      body();
      std::fflush(nullptr);
      std::exit(testing::Test::HasFailure() ? EXIT_FAILURE : EXIT_SUCCESS);
    }
    int status = -1;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    EXPECT_EQ(status, 0) << "the test failed in its child process";
  }
};

TEST_F(BackendTest, TheTableIsEmptyBeforeTheFirstCall) {
  EXPECT_EQ(cBackend, 0U);
  for (const ZELO_SCHED_BACKEND &entry : SchedBackends) EXPECT_TRUE(isEmptyEntry(entry));
}

TEST_F(BackendTest, TheTableHoldsSixteenEntriesOfElevenWords) {
  EXPECT_EQ(kCapacity, 16U);
  EXPECT_EQ(sizeof(ZELO_SCHED_BACKEND), 11 * sizeof(void *));
}

TEST_F(BackendTest, RegistrationFillsTheTableInItsFixedOrder) {
  inFreshProcess([] {
    EXPECT_EQ(ZELOSchedBackendInit(), 0);
    ASSERT_EQ(cBackend, kCount);
    for (uint32_t i = 0; i < kCount; ++i) {
      EXPECT_EQ(SchedBackends[i].id, kRegistered[i].id);
      EXPECT_STREQ(SchedBackends[i].szName, kRegistered[i].szName);
    }
    for (uint32_t i = kCount; i < kCapacity; ++i) EXPECT_TRUE(isEmptyEntry(SchedBackends[i]));
    EXPECT_EQ(logged(), Lines{});
    EXPECT_EQ(errorRecord(), kNoError);
  });
}

TEST_F(BackendTest, EachInitFindsTheIdInItsEntry) {
  inFreshProcess([] {
    ASSERT_EQ(ZELOSchedBackendInit(), 0);
    Lines expected;
    for (uint32_t i = 0; i < kCount; ++i) {
      expected.push_back(std::string(kRegistered[i].szInit) + " " + kRegistered[i].szName + " id " +
                         std::to_string(kRegistered[i].id) + " at " + std::to_string(i));
    }
    EXPECT_EQ(inits.calls, expected);
  });
}

TEST_F(BackendTest, ASecondCallAfterSuccessDoesNotTouchTheTable) {
  inFreshProcess([] {
    ASSERT_EQ(ZELOSchedBackendInit(), 0);
    SchedBackends[0].sync = nullptr;
    ZELO_SCHED_BACKEND before[kCapacity];
    std::memcpy(before, SchedBackends, sizeof(before));
    const size_t initsCalled = inits.calls.size();

    EXPECT_EQ(ZELOSchedBackendInit(), 0);
    EXPECT_EQ(cBackend, kCount);
    EXPECT_EQ(std::memcmp(before, SchedBackends, sizeof(before)), 0);
    EXPECT_EQ(inits.calls.size(), initsCalled);
  });
}

TEST_F(BackendTest, TheFirstExportedCallRegisters) {
  inFreshProcess([] {
    EXPECT_EQ(ZELOSchedTaskSync(), 0);
    EXPECT_EQ(cBackend, kCount);
  });
}

TEST_F(BackendTest, AFullTableIsReportedAndEmptied) {
  inFreshProcess([] {
    leaveEarlierError();
    cBackend = kCapacity;
    EXPECT_EQ(ZELOSchedBackendInit(), -1);
    EXPECT_EQ(cBackend, 0U);
    EXPECT_EQ(logged(), Lines{"backend.cpp:N Too many backends"});
    EXPECT_EQ(errorRecord(), kEarlier);
    EXPECT_EQ(inits.calls, Lines{});
  });
}

TEST_F(BackendTest, ATableWithoutRoomForTheLastBackendIsReportedAndEmptied) {
  inFreshProcess([] {
    leaveEarlierError();
    cBackend = kCapacity - kCount + 1;
    EXPECT_EQ(ZELOSchedBackendInit(), -1);
    EXPECT_EQ(cBackend, 0U);
    EXPECT_EQ(logged(), Lines{"backend.cpp:N Too many backends"});
    EXPECT_EQ(errorRecord(), kEarlier);
    EXPECT_EQ(inits.calls.size(), kCount - 1);
  });
}

TEST_F(BackendTest, TheLastBackendMayTakeTheLastEntry) {
  inFreshProcess([] {
    cBackend = kCapacity - kCount;
    EXPECT_EQ(ZELOSchedBackendInit(), 0);
    EXPECT_EQ(cBackend, kCapacity);
    EXPECT_STREQ(SchedBackends[kCapacity - 1].szName, kRegistered[kCount - 1].szName);
    EXPECT_EQ(logged(), Lines{});
  });
}

TEST_F(BackendTest, RegistrationWorksAgainAfterTheTableWasFull) {
  inFreshProcess([] {
    cBackend = kCapacity;
    ASSERT_EQ(ZELOSchedBackendInit(), -1);
    EXPECT_EQ(ZELOSchedBackendInit(), 0);
    EXPECT_EQ(cBackend, kCount);
  });
}

TEST_F(BackendTest, AnInitThatFailsIsNamedAndLeavesTheTableEmpty) {
  for (const Registered &registered : kRegistered) {
    SCOPED_TRACE(registered.szInit);
    clearLog();
    inFreshProcess([&] {
      leaveEarlierError();
      inits = {Fate::kFails, registered.szInit, 1, {}};
      EXPECT_EQ(ZELOSchedBackendInit(), -1);
      EXPECT_EQ(cBackend, 0U);
      EXPECT_EQ(logged(), Lines{"backend.cpp:N Backend init failed on backends " +
                                std::string(registered.szInit) + "."});
      EXPECT_EQ(errorRecord(), kEarlier);
    });
  }
}

TEST_F(BackendTest, AfterAnInitThatFailedTheNextCallRegistersFromTheStart) {
  for (const Registered &registered : kRegistered) {
    SCOPED_TRACE(registered.szInit);
    inFreshProcess([&] {
      inits = {Fate::kFails, registered.szInit, 2, {}};
      ASSERT_EQ(ZELOSchedBackendInit(), -1);
      ASSERT_EQ(ZELOSchedBackendInit(), -1);
      inits.calls.clear();
      EXPECT_EQ(ZELOSchedBackendInit(), 0);
      EXPECT_EQ(cBackend, kCount);
      EXPECT_EQ(inits.calls.size(), kCount);
    });
  }
}

TEST_F(BackendTest, AnInitThatRejectsItsNameLeavesTheTableEmptyAndIsTriedAgain) {
  for (const Registered &registered : kRegistered) {
    SCOPED_TRACE(registered.szInit);
    clearLog();
    inFreshProcess([&] {
      const std::string name = registered.szName;
      inits = {Fate::kOtherName, registered.szInit, 1, {}};
      EXPECT_EQ(ZELOSchedBackendInit(), -1);
      EXPECT_EQ(cBackend, 0U);
      EXPECT_EQ(logged(), (Lines{"backend_" + name + ".cpp:N backend name is mismatch for " + name +
                                     "!! [someone else's]",
                                 "backend.cpp:N Backend init failed on backends " +
                                     std::string(registered.szInit) + "."}));
      EXPECT_EQ(errorRecord(), kNoError);
      EXPECT_EQ(ZELOSchedBackendInit(), 0);
      EXPECT_EQ(cBackend, kCount);
    });
  }
}

TEST_F(BackendTest, FailuresOfRegistrationAreLoggedAtPriorityError) {
  constexpr int kPriorityError = 3;
  inFreshProcess([] {
    cBackend = kCapacity;
    ZELOSchedBackendInit();
    inits = {Fate::kFails, kRegistered[0].szInit, 1, {}};
    ZELOSchedBackendInit();
  });
  EXPECT_EQ(loggedPriorities(), (std::vector<int>{kPriorityError, kPriorityError}));
}

// ---- what an init promises

class BackendInitTest : public BackendTest, public testing::WithParamInterface<Registered> {
 protected:
  BackendInitTest() { std::memset(&entry_, 0, sizeof(entry_)); }  // its padding too

  const std::string name_ = GetParam().szName;
  ZELO_SCHED_BACKEND entry_;
};

TEST_P(BackendInitTest, NeedsANameAndThenAnEntry) {
  const Init init = GetParam().init;
  expectRefused("backend_" + name_ + ".cpp",
                {{"((void *)0) != szName", [&] { return init(nullptr, &entry_); }},
                 {"((void *)0) != szName", [&] { return init(nullptr, nullptr); }},
                 {"NULL != pBackend", [&] { return init(GetParam().szName, nullptr); }}});
  EXPECT_TRUE(isEmptyEntry(entry_));
}

TEST_P(BackendInitTest, TakesItsOwnNameOnlyAndSetsNoCode) {
  for (const std::string &other : {std::string("someone's"), std::string(), "Z" + name_.substr(1),
                                   "ZELO" + name_.substr(4), name_ + " "}) {
    SCOPED_TRACE(other);
    clearLog();
    EXPECT_EQ(GetParam().init(other.c_str(), &entry_), -1);
    EXPECT_EQ(logged(), Lines{"backend_" + name_ + ".cpp:N backend name is mismatch for " + name_ +
                              "!! [" + other + "]"});
    EXPECT_EQ(errorRecord(), kNoError);
    EXPECT_TRUE(isEmptyEntry(entry_));
  }
}

TEST_P(BackendInitTest, StoresTheNamePointerLeavesTheIdAndSetsEverySlot) {
  constexpr int32_t kSomeId = 77;
  entry_.id = kSomeId;
  entry_.owns_id = [](long) { return 0; };
  const auto before = entry_.owns_id;
  EXPECT_EQ(GetParam().init(name_.c_str(), &entry_), 0);
  EXPECT_EQ(entry_.szName, name_.c_str());
  EXPECT_EQ(entry_.id, kSomeId);
  EXPECT_EQ(logged(), Lines{});
  EXPECT_NE(entry_.sync, nullptr);
  EXPECT_NE(entry_.create, nullptr);
  EXPECT_NE(entry_.edit, nullptr);
  EXPECT_NE(entry_.remove, nullptr);
  EXPECT_NE(entry_.get_default, nullptr);
  EXPECT_NE(entry_.owns_id, before);
  EXPECT_EQ(entry_.owns_id != nullptr, GetParam().ownsIds);
  EXPECT_NE(entry_.get_by_id, nullptr);
  EXPECT_NE(entry_.run, nullptr);
  EXPECT_NE(entry_.list_get, nullptr);
}

INSTANTIATE_TEST_SUITE_P(EachBackend, BackendInitTest, testing::ValuesIn(kRegistered),
                         [](const testing::TestParamInfo<Registered> &backend) {
                           return std::string(backend.param.szName);
                         });

// ---- every exported call that reaches a backend

struct Call {
  const char *szName;
  std::function<bool()> fails;  // makes the call; whether its result was that of a failure
  Lines lines;                  // what follows the failed registration in the log
};

std::ostream &operator<<(std::ostream &out, const Call &call) {
  return out << call.szName;
}

ZELO_SCHED_TASK *someTask(int32_t id) {
  static ZELO_SCHED_TASK task;
  task = {};
  task.Backend = ZELO_SCHED_BACKEND_SCHEDULE;
  task.ID = id;
  return &task;
}

constexpr long kSomeTaskId = 7;

const Call kCalls[] = {
    {"Alloc",
     [] { return ZELOSchedTaskAlloc() == nullptr; },
     {"sched_task_get.cpp:N Init backend failed. [0x1111 earlier.cpp:N]",
      "sched_task_alloc.cpp:N Init task to default failed. [0x1111 earlier.cpp:N]"}},
    {"GetDefault",
     [] { return ZELOSchedTaskGetDefault(someTask(-1)) == -1; },
     {"sched_task_get.cpp:N Init backend failed. [0x1111 earlier.cpp:N]"}},
    {"GetByID",
     [] { return ZELOSchedTaskGetByID(kSomeTaskId, someTask(-1)) == -1; },
     {"sched_task_get.cpp:N Init backend failed. [0x1111 earlier.cpp:N]"}},
    {"LoadNew",
     [] { return ZELOSchedTaskLoad(-1, someTask(-1)) == -1; },
     {"sched_task_get.cpp:N Init backend failed. [0x1111 earlier.cpp:N]",
      "sched_task_load.cpp:N get default task failed. [0x1111 earlier.cpp:N]"}},
    {"LoadStored",
     [] { return ZELOSchedTaskLoad(kSomeTaskId, someTask(-1)) == -1; },
     {"sched_task_get.cpp:N Init backend failed. [0x1111 earlier.cpp:N]",
      "sched_task_load.cpp:N get task failed. [7] [0x1111 earlier.cpp:N]"}},
    {"Create",
     [] { return ZELOSchedTaskCreate(someTask(-1)) == -1; },
     {"sched_task_create.cpp:N Init backend failed. [0x1111 earlier.cpp:N]"}},
    {"Edit",
     [] { return ZELOSchedTaskEdit(someTask(kSomeTaskId)) == -1; },
     {"sched_task_get.cpp:N Init backend failed. [0x1111 earlier.cpp:N]",
      "sched_task_edit.cpp:N get task failed. id:[7] [0x1111 earlier.cpp:N]"}},
    {"SaveNew",
     [] { return ZELOSchedTaskSave(someTask(-1)) == -1; },
     {"sched_task_create.cpp:N Init backend failed. [0x1111 earlier.cpp:N]",
      "sched_task_save.cpp:N Add task failed. [0x1111 earlier.cpp:N]"}},
    {"SaveStored",
     [] { return ZELOSchedTaskSave(someTask(kSomeTaskId)) == -1; },
     {"sched_task_get.cpp:N Init backend failed. [0x1111 earlier.cpp:N]",
      "sched_task_edit.cpp:N get task failed. id:[7] [0x1111 earlier.cpp:N]",
      "sched_task_save.cpp:N Set task failed. [7] [0x1111 earlier.cpp:N]"}},
    {"Remove",
     [] { return ZELOSchedTaskRemove(kSomeTaskId) == -1; },
     {"sched_task_get.cpp:N Init backend failed. [0x1111 earlier.cpp:N]",
      "sched_task_remove.cpp:N get task failed. id:[7] [0x1111 earlier.cpp:N]"}},
    {"ListGet",
     [] {
       ZELO_SCHED_TASK *list = someTask(-1);
       return ZELOSchedTaskListGet(&list, nullptr) == -1 && list == someTask(-1);
     },
     {"sched_task_list_get.cpp:N Init backend failed. [0x1111 earlier.cpp:N]"}},
    {"Sync",
     [] { return ZELOSchedTaskSync() == -1; },
     {"sched_task_sync.cpp:N Init backend failed. [0x1111 earlier.cpp:N]"}},
};

class BackendCallTest : public BackendTest, public testing::WithParamInterface<Call> {};

TEST_P(BackendCallTest, StopsWhenTheBackendsCannotBeRegistered) {
  inFreshProcess([] {
    leaveEarlierError();
    inits = {Fate::kFails, kRegistered[0].szInit, 1, {}};
    EXPECT_TRUE(GetParam().fails());
    Lines expected = {"backend.cpp:N Backend init failed on backends " +
                      std::string(kRegistered[0].szInit) + "."};
    expected.insert(expected.end(), GetParam().lines.begin(), GetParam().lines.end());
    EXPECT_EQ(logged(), expected);
    EXPECT_EQ(errorRecord(), kEarlier);
    EXPECT_EQ(cBackend, 0U);
  });
}

INSTANTIATE_TEST_SUITE_P(EveryCall, BackendCallTest, testing::ValuesIn(kCalls),
                         [](const testing::TestParamInfo<Call> &call) {
                           return std::string(call.param.szName);
                         });

}  // namespace
}  // namespace support

// Interposes the library's own, for calls of the registry too.
extern "C" __attribute__((visibility("default"))) int zeloschedule_init(
    const char *szName, ZELO_SCHED_BACKEND *pBackend) {
  static const auto real = reinterpret_cast<support::Init>(dlsym(RTLD_NEXT, "zeloschedule_init"));
  return support::intercepted("zeloschedule_init", real, szName, pBackend);
}

extern "C" __attribute__((visibility("default"))) int zeloautopower_init(
    const char *szName, ZELO_SCHED_BACKEND *pBackend) {
  static const auto real = reinterpret_cast<support::Init>(dlsym(RTLD_NEXT, "zeloautopower_init"));
  return support::intercepted("zeloautopower_init", real, szName, pBackend);
}
