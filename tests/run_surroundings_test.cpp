// What a task's command finds around it, whatever its caller has open, ignores or exports.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/file.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <map>
#include <sstream>

#include "captured_log.h"
#include "failing_calls.h"
#include "fifos.h"
#include "status_db.h"
#include "tasks.h"
#include "users.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;

constexpr char kOutput[] = "/tmp/surroundings_test.out";
constexpr char kHome[] = "/tmp/surroundings_test.home";
constexpr char kCallersLock[] = "/tmp/surroundings_test.lock";
constexpr char kNoContext[] =
    "sched_task_run.cpp:N Failed to set user context. uid:[0] [0x2A00 sched_surroundings.cpp:N]";
const std::string kTo = "exec > /tmp/surroundings_test.out 2>&1; ";

// Opens nothing itself, unlike a listing of /proc/PID/fd.
const std::string kListDescriptors =
    kTo +
    "i=0; while [ $i -lt 300 ]; do if [ -e /proc/$$/fd/$i ]; then echo $i; fi; "
    "i=$((i + 1)); done";
// Gathered first: the shell redirects itself for as long as it runs a program.
const std::string kListLinks =
    "for i in 0 1 2; do links=\"$links $(readlink /proc/$$/fd/$i)\"; done; "
    "echo \"$links\" > /tmp/surroundings_test.out";
const std::string kListEnvironment = kTo + "tr '\\0' '\\n' < /proc/$$/environ";

class SurroundingsTest : public UsersTest {
 protected:
  void SetUp() override {
    UsersTest::SetUp();
    std::filesystem::remove(kOutput);
    std::filesystem::remove_all(kHome);
    for (char **entry = environ; *entry != nullptr; ++entry) environment_.emplace_back(*entry);
  }

  void TearDown() override {
    clearenv();
    for (const std::string &entry : environment_) {
      const size_t end = entry.find('=');
      setenv(entry.substr(0, end).c_str(), entry.c_str() + end + 1, 1);
    }
    UsersTest::TearDown();
  }

  static long save(uid_t owner, const std::string &command) {
    const Task task = makeTask("task", command);
    task->Owner = owner;
    const long id = saveTask(task);
    resetFailingCalls();
    return id;
  }

  // What the command printed.
  static std::string outputOf(long id) {
    EXPECT_EQ(ZELOSchedTaskRun(id, 0, 0), 0);
    waitForChildRuns();
    return readFile(kOutput);
  }

  static std::string outputOf(uid_t owner, const std::string &command) {
    return outputOf(save(owner, command));
  }

  static void expectNothingRuns(long id, const Lines &wanted) {
    clearLog();
    EXPECT_EQ(outputOf(id), "");
    EXPECT_EQ(recordedSystemCommands(), Lines{});
    EXPECT_EQ(logged(), wanted);
  }

  static Lines sortedLines(const std::string &text) {
    Lines lines = linesOf(text);
    std::sort(lines.begin(), lines.end());
    return lines;
  }

 private:
  Lines environment_;
};

// ---- descriptors

TEST_F(SurroundingsTest, TheCommandHasTheThreeStandardDescriptorsOnly) {
  std::vector<int> opened;
  for (int i = 0; i < 100; ++i) opened.push_back(open("/etc/passwd", O_RDONLY));
  int sockets[2];
  ASSERT_EQ(socketpair(AF_UNIX, SOCK_STREAM, 0, sockets), 0);
  int pipes[2];
  ASSERT_EQ(pipe(pipes), 0);
  opened.insert(opened.end(), {sockets[0], sockets[1], pipes[0], pipes[1]});
  ASSERT_GE(dup2(sockets[0], 250), 0);
  opened.push_back(250);
  EXPECT_EQ(outputOf(0, kListDescriptors), "0\n1\n2\n");
  for (const int descriptor : opened) close(descriptor);
}

TEST_F(SurroundingsTest, ASocketOfTheCallerIsClosedWhileTheCommandRuns) {
  makeFifos();
  const long id = save(0, kWaitingCommand);
  int sockets[2];
  ASSERT_EQ(socketpair(AF_UNIX, SOCK_STREAM, 0, sockets), 0);
  ASSERT_EQ(ZELOSchedTaskRun(id, 0, 0), 0);
  waitUntilStarted();
  close(sockets[1]);
  char byte = 0;
  // The other end is gone only when nobody has it open any more.
  EXPECT_EQ(recv(sockets[0], &byte, 1, MSG_DONTWAIT), 0);
  letGo();
  waitForChildRuns();
  close(sockets[0]);
}

TEST_F(SurroundingsTest, ALockOfTheCallerIsNotKeptByTheCommand) {
  makeFifos();
  const long id = save(0, kWaitingCommand);
  writeFile(kCallersLock, "");
  const int held = open(kCallersLock, O_RDONLY);
  ASSERT_EQ(flock(held, LOCK_EX), 0);
  ASSERT_EQ(ZELOSchedTaskRun(id, 0, 0), 0);
  waitUntilStarted();
  close(held);
  const int again = open(kCallersLock, O_RDONLY);
  EXPECT_EQ(flock(again, LOCK_EX | LOCK_NB), 0);
  letGo();
  waitForChildRuns();
  close(again);
}

TEST_F(SurroundingsTest, ARunLockThatTheCallerHoldsDoesNotReachTheCommand) {
  const long id = save(0, kListDescriptors);
  writeFile("/tmp/lock/lock_sched_run", "");
  pfLock = fopen("/tmp/lock/lock_sched_run", "r");
  ASSERT_NE(pfLock, nullptr);
  for (const int overlap : {0, 1}) {
    SCOPED_TRACE(overlap);
    const Task task = loadTask(id);
    task->CanRunTaskSameTime = overlap;
    saveTask(task);
    EXPECT_EQ(outputOf(id), "0\n1\n2\n");
  }
  fclose(pfLock);
  pfLock = nullptr;
}

TEST_F(SurroundingsTest, ACallerWithoutStandardDescriptorsLeavesThemToNothing) {
  const long id = save(0, "echo lost; echo lost >&2; " + kListLinks);
  fflush(nullptr);
  const pid_t caller = fork();
  if (caller == 0) {
    for (const int descriptor : {0, 1, 2}) close(descriptor);
    _exit(ZELOSchedTaskRun(id, 0, 0) == 0 ? 0 : 1);
  }
  waitForChildRuns();
  EXPECT_EQ(readFile(kOutput), " /dev/null /dev/null /dev/null\n");
  const std::vector<StatusRow> rows = statusRows();
  ASSERT_EQ(rows.size(), 1U);
  EXPECT_EQ(rows[0].statusCode, ZELO_SCHED_STATUS_FINISHED);
}

TEST_F(SurroundingsTest, ACallerWithoutStandardInputOnlyKeepsTheOthers) {
  const long id = save(0, kListLinks);
  fflush(nullptr);
  const pid_t caller = fork();
  if (caller == 0) {
    const int output = open("/tmp/surroundings_test.stdout", O_WRONLY | O_CREAT, 0644);
    dup2(output, 1);
    dup2(output, 2);
    close(0);
    _exit(ZELOSchedTaskRun(id, 0, 0) == 0 ? 0 : 1);
  }
  waitForChildRuns();
  EXPECT_EQ(readFile(kOutput),
            " /dev/null /tmp/surroundings_test.stdout /tmp/surroundings_test.stdout\n");
}

// ---- session and signals

TEST_F(SurroundingsTest, TheRunIsASessionOfItsOwn) {
  const std::string line = outputOf(0, kTo + "read -r line < /proc/$$/stat; echo \"$line\"");
  std::istringstream fields(line.substr(std::min(line.find(") "), line.size())));
  std::string end;
  std::string state;
  long parent = 0;
  long group = 0;
  long session = 0;
  fields >> end >> state >> parent >> group >> session;
  const std::vector<StatusRow> rows = statusRows();
  ASSERT_EQ(rows.size(), 1U);
  EXPECT_EQ(session, rows[0].pid);
  EXPECT_EQ(group, rows[0].pid);
  EXPECT_NE(session, getsid(0));
}

// Signals that a caller may have ignored, as a daemon does, and all signals blocked, for as long as
// this lives.
class DeafToSignals {
 public:
  DeafToSignals() {
    for (const int number : kIgnored) {
      struct sigaction ignore {};
      ignore.sa_handler = SIG_IGN;
      sigaction(number, &ignore, &before_[number]);
    }
    sigset_t all;
    sigfillset(&all);
    sigprocmask(SIG_SETMASK, &all, &mask_);
  }
  ~DeafToSignals() {
    sigprocmask(SIG_SETMASK, &mask_, nullptr);
    for (const auto &[number, action] : before_) sigaction(number, &action, nullptr);
  }
  DeafToSignals(const DeafToSignals &) = delete;
  DeafToSignals &operator=(const DeafToSignals &) = delete;

 private:
  static constexpr int kIgnored[] = {SIGHUP,  SIGINT,  SIGQUIT, SIGPIPE,
                                     SIGTERM, SIGCHLD, SIGUSR1, SIGSYS};
  std::map<int, struct sigaction> before_;
  sigset_t mask_;
};

// Read without starting a program: a shell blocks every signal while it does that.
TEST_F(SurroundingsTest, SignalsThatTheCallerIgnoresOrBlocksReachTheCommand) {
  const long id = save(0, kTo +
                              "while read -r key value; do "
                              "case $key in SigBlk: | SigIgn:) echo $value ;; esac; "
                              "done < /proc/$$/status");
  std::string output;
  {
    const DeafToSignals caller;
    output = outputOf(id);
  }
  std::istringstream masks(output);
  uint64_t blocked = UINT64_MAX;
  uint64_t ignored = UINT64_MAX;
  masks >> std::hex >> blocked >> ignored;
  // 32 and 33 are the C library's, which ignores them in every command that it starts.
  constexpr uint64_t kLibrarysOwn = uint64_t{0b11} << 31;
  EXPECT_EQ(blocked, 0U);
  EXPECT_EQ(ignored & ~kLibrarysOwn, 0U);
  const std::vector<StatusRow> rows = statusRows();
  ASSERT_EQ(rows.size(), 1U);
  EXPECT_EQ(rows[0].statusCode, ZELO_SCHED_STATUS_FINISHED);
}

// A shell may take the mask back by itself; not every command is one.
TEST_F(SurroundingsTest, SignalsThatTheCallerIgnoresOrBlocksReachTheRun) {
  const long id = save(0, "true");
  const auto run = SchedBackends[0].run;
  SchedBackends[0].run = [](ZELO_SCHED_TASK *, int *, char *, size_t) {
    writeFile(kOutput, readFile("/proc/self/status"));
    return 0;
  };
  std::string status;
  {
    const DeafToSignals caller;
    status = outputOf(id);
  }
  SchedBackends[0].run = run;
  EXPECT_NE(status.find("SigBlk:\t0000000000000000\n"), std::string::npos) << status;
  EXPECT_NE(status.find("SigIgn:\t0000000000000000\n"), std::string::npos) << status;
}

// ---- environment

TEST_F(SurroundingsTest, TheEnvironmentIsTheOwnersAndNothingOfTheCallersButLocaleAndZone) {
  REQUIRE_OTHER_USERS();
  addOwner("/tmp/surroundings_test.home", "/bin/bash");
  const long id = save(kOwner, kListEnvironment);
  clearenv();
  for (const char *entry : {"LD_PRELOAD=/tmp/evil.so",
                            "LD_LIBRARY_PATH=/tmp",
                            "BASH_ENV=/tmp/evil",
                            "ENV=/tmp/evil",
                            "IFS=/",
                            "SHELLOPTS=xtrace",
                            "PS4=$(touch /tmp/evil)",
                            "PATH=/tmp/evil",
                            "HOME=/root",
                            "USER=root",
                            "LOGNAME=root",
                            "SHELL=/tmp/evil",
                            "MAIL=/var/mail/root",
                            "PWD=/root",
                            "GCONV_PATH=/tmp",
                            "TERMINFO=/tmp",
                            "SECRET=password",
                            "BASH_FUNC_ls%%=() { evil; }",
                            "TZDIR=/tmp",
                            "LOCPATH=/tmp",
                            "NLSPATH=/tmp",
                            "LC_EVIL=x",
                            "LANGUAGES=x",
                            "TZ=Europe/Berlin",
                            "LANG=de_DE.UTF-8",
                            "LANGUAGE=de:en",
                            "LC_ALL=C.UTF-8",
                            "LC_TIME=C",
                            "LC_MESSAGES=C"}) {
    putenv(const_cast<char *>(entry));
  }
  const std::string output = outputOf(id);
  EXPECT_EQ(sortedLines(output),
            (Lines{"HOME=/tmp/surroundings_test.home", "LANG=de_DE.UTF-8", "LANGUAGE=de:en",
                   "LC_ALL=C.UTF-8", "LC_MESSAGES=C", "LC_TIME=C", "LOGNAME=zeloowner",
                   "PATH=/usr/local/sbin:/usr/local/bin:/usr/sbin:/usr/bin:/sbin:/bin",
                   "SHELL=/bin/bash", "TZ=Europe/Berlin", "USER=zeloowner"}));
}

TEST_F(SurroundingsTest, RootsTaskGetsRootsEnvironmentToo) {
  const long id = save(0, kListEnvironment);
  clearenv();
  putenv(const_cast<char *>("SECRET=password"));
  EXPECT_EQ(sortedLines(outputOf(id)),
            (Lines{"HOME=/root", "LOGNAME=root",
                   "PATH=/usr/local/sbin:/usr/local/bin:/usr/sbin:/usr/bin:/sbin:/bin",
                   "SHELL=/bin/bash", "USER=root"}));
}

TEST_F(SurroundingsTest, AnOwnerWithoutAShellGetsTheStandardOne) {
  REQUIRE_OTHER_USERS();
  addOwner("/nonexistent", "");
  const Lines lines = sortedLines(outputOf(kOwner, kListEnvironment));
  EXPECT_NE(std::find(lines.begin(), lines.end(), "SHELL=/bin/sh"), lines.end());
}

TEST_F(SurroundingsTest, TheCallersEnvironmentStaysAsItIs) {
  const long id = save(0, "true");
  setenv("SECRET", "password", 1);
  outputOf(id);
  EXPECT_STREQ(getenv("SECRET"), "password");
}

TEST_F(SurroundingsTest, AVariableThatCannotBeAllocatedRunsNothing) {
  if (!kAllocationsCanFail) GTEST_SKIP() << "the sanitizer allocates itself";
  const std::string zone(100000, 'x');
  const long id = save(0, kListEnvironment);
  setenv("LANG", zone.c_str(), 1);
  const FailingAllocation malloc("malloc", {.times = kAlways, .minSize = zone.size()});
  const FailingAllocation realloc("realloc", {.times = kAlways, .minSize = zone.size()});
  expectNothingRuns(id, (Lines{"sched_surroundings.cpp:N Failed to set environment: [0] Cannot "
                               "allocate memory",
                               kNoContext}));
}

TEST_F(SurroundingsTest, WithoutADirectoryToBeInNothingIsRun) {
  const long id = save(0, kListEnvironment);
  failCall("chdir", {.times = kAlways, .error = EIO});
  expectNothingRuns(id, (Lines{"sched_surroundings.cpp:N Failed to change directory: [0] "
                               "Input/output error",
                               kNoContext}));
}

TEST_F(SurroundingsTest, ACallersDescriptorsThatCannotBeClosedRunNothing) {
  const long id = save(0, kListEnvironment);
  failCall("close_range", {.times = kAlways, .error = ENOSYS});
  failCall("sysconf", {.times = kAlways, .error = EINVAL});
  expectNothingRuns(id, (Lines{"sched_surroundings.cpp:N Failed to close descriptors. "
                               "Invalid argument"}));
}

// ---- directory and mask

TEST_F(SurroundingsTest, TheCommandStartsInTheOwnersHome) {
  REQUIRE_OTHER_USERS();
  addOwner(kHome);
  std::filesystem::create_directory(kHome);
  EXPECT_EQ(outputOf(kOwner, kTo + "readlink /proc/$$/cwd"), std::string(kHome) + "\n");
}

TEST_F(SurroundingsTest, WithoutAHomeTheCommandStartsInTheRootDirectory) {
  REQUIRE_OTHER_USERS();
  addOwner(kHome);
  EXPECT_EQ(outputOf(kOwner, kTo + "readlink /proc/$$/cwd"), "/\n");
}

TEST_F(SurroundingsTest, AHomeThatTheOwnerMayNotEnterIsNotEntered) {
  REQUIRE_OTHER_USERS();
  addOwner(kHome);
  std::filesystem::create_directory(kHome);
  ASSERT_EQ(chmod(kHome, 0700), 0);
  EXPECT_EQ(outputOf(kOwner, kTo + "readlink /proc/$$/cwd"), "/\n");
}

TEST_F(SurroundingsTest, TheFileModeMaskIs022WhateverTheCallersIs) {
  const long id = save(0, kTo + "umask");
  for (const mode_t callers : {0U, 077U}) {
    const mode_t mask = umask(callers);
    const std::string output = outputOf(id);
    umask(mask);
    EXPECT_EQ(output, "0022\n");
  }
}

}  // namespace
}  // namespace support
