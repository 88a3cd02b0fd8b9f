// A task has its owner's rights and none of those of the process that starts it, whatever its
// command tries and whichever step of giving up rights fails.
#include <grp.h>
#include <gtest/gtest.h>
#include <linux/capability.h>
#include <linux/securebits.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>

#include "captured_log.h"
#include "failing_calls.h"
#include "status_db.h"
#include "tasks.h"
#include "users.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;

constexpr uid_t kNobody = 65534;
constexpr char kOutput[] = "/tmp/rights_test.out";
constexpr char kHelper[] = "/tmp/take_root_back";
constexpr char kRootsFile[] = "/tmp/rights_test.root";
const std::string kTo = " > /tmp/rights_test.out 2>&1";
const std::string kIds = "grep -E '^(Uid|Gid|Groups):' /proc/self/status" + kTo;

const std::string kCapabilities = "grep -E '^Cap(Inh|Prm|Eff|Amb):' /proc/self/status" + kTo;
constexpr char kNoCapabilities[] =
    "CapInh:\t0000000000000000\n"
    "CapPrm:\t0000000000000000\n"
    "CapEff:\t0000000000000000\n"
    "CapAmb:\t0000000000000000\n";

class OwnersRightsTest : public UsersTest {
 protected:
  void SetUp() override {
    UsersTest::SetUp();
    if (!otherUsersExist()) GTEST_SKIP() << "this sandbox has no user but 0";
    addOwner();
    // Groups that must not reach a command.
    const gid_t groups[] = {0, 4, 6};
    ASSERT_EQ(setgroups(std::size(groups), groups), 0);
    const std::filesystem::path self = std::filesystem::read_symlink("/proc/self/exe");
    std::filesystem::copy_file(self.parent_path() / "take_root_back", kHelper,
                               std::filesystem::copy_options::overwrite_existing);
    ASSERT_EQ(chmod(kHelper, 0755), 0);
    writeFile(kRootsFile, "root's", 0600);
    std::filesystem::remove(kOutput);
  }

  void TearDown() override {
    setgroups(0, nullptr);
    UsersTest::TearDown();
  }

  // The run's status code, or -1 when it has no row.
  static int run(uid_t owner, const std::string &command) {
    const Task task = makeTask("task", command);
    task->Owner = owner;
    const long id = saveTask(task);
    resetFailingCalls();
    return runSaved(id);
  }

  // The same, started by a process that passes on its capabilities, with these securebits.
  static int runByHander(uid_t owner, const std::string &command, int securebits) {
    const Task task = makeTask("task", command);
    task->Owner = owner;
    const long id = saveTask(task);
    resetFailingCalls();
    std::filesystem::remove(kOutput);
    fflush(nullptr);
    const pid_t caller = fork();
    if (caller == 0) {
      if (!handCapabilitiesOn() || prctl(PR_SET_SECUREBITS, securebits) != 0) _exit(2);
      _exit(ZELOSchedTaskRun(id, 0, 0) == 0 ? 0 : 1);
    }
    int status = -1;
    waitpid(caller, &status, 0);
    EXPECT_EQ(status, 0);
    waitForChildRuns();
    const std::vector<StatusRow> rows = statusRows();
    return rows.empty() ? -1 : rows.back().statusCode;
  }

  // Makes all permitted capabilities inheritable, or none.
  static bool setInheritable(bool all) {
    __user_cap_header_struct header{_LINUX_CAPABILITY_VERSION_3, 0};
    __user_cap_data_struct sets[_LINUX_CAPABILITY_U32S_3] = {};
    if (syscall(SYS_capget, &header, sets) != 0) return false;
    for (__user_cap_data_struct &set : sets) set.inheritable = all ? set.permitted : 0;
    return syscall(SYS_capset, &header, sets) == 0;
  }

  // Makes all inheritable, and a few ambient too.
  static bool handCapabilitiesOn() {
    if (!setInheritable(true)) return false;
    for (const int capability : {CAP_DAC_OVERRIDE, CAP_SETUID, CAP_NET_RAW}) {
      if (prctl(PR_CAP_AMBIENT, PR_CAP_AMBIENT_RAISE, capability, 0, 0) != 0) return false;
    }
    return true;
  }

  static int runSaved(long id) {
    EXPECT_EQ(ZELOSchedTaskRun(id, 0, 0), 0);
    waitForChildRuns();
    const std::vector<StatusRow> rows = statusRows();
    return rows.empty() ? -1 : rows.back().statusCode;
  }
};

TEST_F(OwnersRightsTest, EveryIdOfTheCommandIsTheOwners) {
  EXPECT_EQ(run(kOwner, kIds), ZELO_SCHED_STATUS_FINISHED);
  EXPECT_EQ(readFile(kOutput),
            "Uid:\t4242\t4242\t4242\t4242\n"
            "Gid:\t4343\t4343\t4343\t4343\n"
            "Groups:\t4343 4444 \n");
}

TEST_F(OwnersRightsTest, AnOwnerOfTheLargestNumberHasHisRights) {
  constexpr uid_t kLargest = 4294967294U;
  addUser("zelolargest", kLargest, kLargest, "/nonexistent");
  EXPECT_EQ(run(kLargest, kIds), ZELO_SCHED_STATUS_FINISHED);
  EXPECT_EQ(readFile(kOutput),
            "Uid:\t4294967294\t4294967294\t4294967294\t4294967294\n"
            "Gid:\t4294967294\t4294967294\t4294967294\t4294967294\n"
            "Groups:\t4294967294 \n");
}

TEST_F(OwnersRightsTest, NobodysTaskHasNoneOfRootsIdsAndGroups) {
  EXPECT_EQ(run(kNobody, kIds), ZELO_SCHED_STATUS_FINISHED);
  EXPECT_EQ(readFile(kOutput),
            "Uid:\t65534\t65534\t65534\t65534\n"
            "Gid:\t65534\t65534\t65534\t65534\n"
            "Groups:\t65534 \n");
}

TEST_F(OwnersRightsTest, TheCommandHasNoCapabilities) {
  EXPECT_EQ(run(kOwner, kCapabilities), ZELO_SCHED_STATUS_FINISHED);
  EXPECT_EQ(readFile(kOutput), kNoCapabilities);
}

// NOROOT and the locks are what a container's manager may set.
constexpr int kSecurebits[] = {
    0,
    SECBIT_KEEP_CAPS,
    SECBIT_NO_SETUID_FIXUP,
    SECBIT_KEEP_CAPS | SECBIT_NO_SETUID_FIXUP,
    SECBIT_NO_SETUID_FIXUP | SECBIT_NO_SETUID_FIXUP_LOCKED,
    SECBIT_NOROOT | SECBIT_NO_SETUID_FIXUP | SECURE_ALL_LOCKS,
};

TEST_F(OwnersRightsTest, CapabilitiesThatTheCallerHandsOnDoNotReachTheCommand) {
  for (const int securebits : kSecurebits) {
    SCOPED_TRACE(securebits);
    EXPECT_EQ(runByHander(kOwner, kCapabilities, securebits), ZELO_SCHED_STATUS_FINISHED);
    EXPECT_EQ(readFile(kOutput), kNoCapabilities);
    EXPECT_EQ(runByHander(kOwner, kIds, securebits), ZELO_SCHED_STATUS_FINISHED);
    EXPECT_EQ(readFile(kOutput),
              "Uid:\t4242\t4242\t4242\t4242\n"
              "Gid:\t4343\t4343\t4343\t4343\n"
              "Groups:\t4343 4444 \n");
    EXPECT_EQ(runByHander(kOwner, kHelper + kTo, securebits), ZELO_SCHED_STATUS_FINISHED);
    EXPECT_EQ(readFile(kOutput), "");
  }
}

TEST_F(OwnersRightsTest, RootsTaskIsHandedNoCapabilitiesEither) {
  EXPECT_EQ(runByHander(0, "grep -E '^Cap(Inh|Amb):' /proc/self/status" + kTo, 0),
            ZELO_SCHED_STATUS_FINISHED);
  EXPECT_EQ(readFile(kOutput), "CapInh:\t0000000000000000\nCapAmb:\t0000000000000000\n");
}

// Otherwise a set-uid program that the command starts would keep root's capabilities after changing
// to its user. Securebits that restrict stay set.
TEST_F(OwnersRightsTest, AChangeOfUsersTakesCapabilitiesAgain) {
  const auto run = SchedBackends[0].run;
  SchedBackends[0].run = [](ZELO_SCHED_TASK *, int *pStatusCode, char *, size_t) {
    *pStatusCode = ZELO_SCHED_STATUS_FINISHED;
    const std::string status = readFile("/proc/self/status");
    const size_t effective = status.find("CapEff:");
    writeFile(kOutput, std::to_string(prctl(PR_GET_SECUREBITS)) + " " +
                           status.substr(effective, status.find('\n', effective) - effective));
    return 0;
  };
  EXPECT_EQ(runByHander(kOwner, "true", SECBIT_NO_SETUID_FIXUP | SECBIT_NO_CAP_AMBIENT_RAISE),
            ZELO_SCHED_STATUS_FINISHED);
  SchedBackends[0].run = run;
  EXPECT_EQ(readFile(kOutput),
            std::to_string(SECBIT_NO_CAP_AMBIENT_RAISE) + " CapEff:\t0000000000000000");
}

TEST_F(OwnersRightsTest, CapabilitiesThatCannotBeGivenUpRunNothing) {
  const std::pair<const char *, std::string> calls[] = {
      {"prctl", std::to_string(PR_CAP_AMBIENT)}, {"capget", ""}, {"capset", ""}};
  for (const auto &[call, key] : calls) {
    SCOPED_TRACE(call);
    cleanWorld();
    const Task task = makeTask("task", "true" + kTo);
    task->Owner = kOwner;
    const long id = saveTask(task);
    ASSERT_TRUE(setInheritable(true));
    clearLog();
    resetFailingCalls();
    failCallFor(call, key, {.times = kAlways, .error = EPERM});
    EXPECT_EQ(runSaved(id), -1);
    resetFailingCalls();
    EXPECT_FALSE(fileExists(kOutput));
    EXPECT_EQ(logged(), Lines{"sched_leave_caller.cpp:N Failed to give up capabilities. Operation "
                              "not permitted"});
  }
  EXPECT_TRUE(setInheritable(false));
}

// Older kernels have no ambient capabilities, and say so.
TEST_F(OwnersRightsTest, AKernelWithoutAmbientCapabilitiesKeepsNothingFromRunning) {
  const Task task = makeTask("task", kCapabilities);
  task->Owner = kOwner;
  const long id = saveTask(task);
  resetFailingCalls();
  failCallFor("prctl", std::to_string(PR_CAP_AMBIENT), {.times = kAlways, .error = EINVAL});
  EXPECT_EQ(runSaved(id), ZELO_SCHED_STATUS_FINISHED);
  EXPECT_EQ(readFile(kOutput), kNoCapabilities);
}

TEST_F(OwnersRightsTest, NoWayLeadsBackToRoot) {
  EXPECT_EQ(run(kOwner, kHelper + kTo), ZELO_SCHED_STATUS_FINISHED);
  EXPECT_EQ(readFile(kOutput), "");
}

// With -p a shell does not set its effective ids to the real ones.
TEST_F(OwnersRightsTest, NoShellBringsRootBack) {
  for (const char *shell : {"/bin/sh", "/bin/sh -p", "/bin/bash", "/bin/bash -p"}) {
    SCOPED_TRACE(shell);
    EXPECT_EQ(run(kOwner, shell + (" -c " + std::string(kHelper)) + kTo),
              ZELO_SCHED_STATUS_FINISHED);
    EXPECT_EQ(readFile(kOutput), "");
  }
}

TEST_F(OwnersRightsTest, RootsFilesCannotBeReadOrChanged) {
  EXPECT_EQ(run(kOwner,
                "cat /tmp/rights_test.root && exit 1; "
                "echo x > /tmp/rights_test.root && exit 2; "
                "rm -f /tmp/rights_test.root && exit 3; exit 0"),
            ZELO_SCHED_STATUS_FINISHED);
  EXPECT_EQ(readFile(kRootsFile), "root's");
}

// Its real or saved ids are still root's.
TEST_F(OwnersRightsTest, TheProcessThatRunsTheTaskCannotBeLookedInto) {
  EXPECT_EQ(run(kOwner,
                "cat /proc/$PPID/environ && exit 1; ls /proc/$PPID/fd/ && exit 2; "
                "head -c 1 /proc/$PPID/mem && exit 3; exit 0"),
            ZELO_SCHED_STATUS_FINISHED);
}

TEST_F(OwnersRightsTest, AFileThatTheCommandMakesIsTheOwners) {
  EXPECT_EQ(run(kOwner, "true" + kTo), ZELO_SCHED_STATUS_FINISHED);
  struct stat info {};
  ASSERT_EQ(stat(kOutput, &info), 0);
  EXPECT_EQ(info.st_uid, kOwner);
  EXPECT_EQ(info.st_gid, kOwnerGroup);
}

TEST_F(OwnersRightsTest, RootsOwnTaskIsRoots) {
  EXPECT_EQ(run(0, "grep -E '^[UG]id:' /proc/self/status" + kTo), ZELO_SCHED_STATUS_FINISHED);
  EXPECT_EQ(readFile(kOutput), "Uid:\t0\t0\t0\t0\nGid:\t0\t0\t0\t0\n");
}

TEST_F(OwnersRightsTest, TheCallersOwnIdsStayWhatTheyWere) {
  run(kOwner, "true");
  uid_t uids[3];
  gid_t gids[3];
  ASSERT_EQ(getresuid(&uids[0], &uids[1], &uids[2]), 0);
  ASSERT_EQ(getresgid(&gids[0], &gids[1], &gids[2]), 0);
  for (const int i : {0, 1, 2}) {
    EXPECT_EQ(uids[i], 0U);
    EXPECT_EQ(gids[i], 0U);
  }
  EXPECT_EQ(getgroups(0, nullptr), 3);
}

// ---- a step that fails

struct Step {
  const char *call;
  const char *key;
};

class FailedStepTest : public OwnersRightsTest, public testing::WithParamInterface<Step> {};

// EAGAIN is what a limit on the owner's processes gives.
TEST_P(FailedStepTest, NothingIsRun) {
  const Task task = makeTask("task", "true" + kTo);
  task->Owner = kOwner;
  const long id = saveTask(task);
  for (const int error : {EPERM, EAGAIN}) {
    resetFailingCalls();
    clearLog();
    failCallFor(GetParam().call, GetParam().key, {.error = error});
    EXPECT_EQ(runSaved(id), ZELO_SCHED_STATUS_RUNNING);
    EXPECT_EQ(recordedSystemCommands(), Lines{});
    EXPECT_FALSE(fileExists(kOutput));
    EXPECT_FALSE(logged().empty());
  }
}

INSTANTIATE_TEST_SUITE_P(EachStep, FailedStepTest,
                         testing::Values(Step{"seteuid", "0"}, Step{"setegid", "4343"},
                                         Step{"initgroups", kOwnerName}, Step{"seteuid", "4242"},
                                         Step{"setresgid", ""}, Step{"setresuid", ""},
                                         Step{"clearenv", ""}, Step{"putenv", "HOME="}),
                         [](const testing::TestParamInfo<Step> &step) {
                           std::string name = std::string(step.param.call) + step.param.key;
                           std::erase(name, '=');
                           return name;
                         });

TEST_F(OwnersRightsTest, RealIdsThatCannotBeSetAreReported) {
  for (const char *call : {"setresgid", "setresuid"}) {
    SCOPED_TRACE(call);
    cleanWorld();
    const Task task = makeTask("task", "true");
    task->Owner = kOwner;
    const long id = saveTask(task);
    clearLog();
    failCall(call, {.error = EAGAIN});
    EXPECT_EQ(runSaved(id), ZELO_SCHED_STATUS_RUNNING);
    EXPECT_EQ(logged(), (Lines{"sched_run_environment.cpp:N Failed to set real ids: [4242:4343] "
                               "Resource temporarily unavailable",
                               "sched_task_run.cpp:N Failed to run for backend [0] id:[1] [0x2A00 "
                               "sched_run_environment.cpp:N]"}));
  }
}

TEST_F(OwnersRightsTest, RealIdsThatCannotBeRestoredAreReportedAndTheRunIsRecorded) {
  for (const char *call : {"setresgid", "setresuid"}) {
    SCOPED_TRACE(call);
    cleanWorld();
    const Task task = makeTask("task", "true");
    task->Owner = kOwner;
    const long id = saveTask(task);
    clearLog();
    failCall(call, {.from = 2, .error = EAGAIN});
    EXPECT_EQ(runSaved(id), ZELO_SCHED_STATUS_FINISHED);
    EXPECT_EQ(logged(),
              Lines{"sched_run_environment.cpp:N Failed to restore real ids: [0:0] Resource "
                    "temporarily unavailable"});
  }
}

}  // namespace
}  // namespace support
