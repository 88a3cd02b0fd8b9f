// The environment of a task's command, whatever its caller has open, ignores or exports.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <linux/keyctl.h>
#include <sched.h>
#include <sys/file.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <functional>
#include <iterator>
#include <map>
#include <sstream>

#include "captured_log.h"
#include "failing_calls.h"
#include "fifos.h"
#include "shared_memory.h"
#include "status_db.h"
#include "tasks.h"
#include "users.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;

// The kernel's values; its header does not compile as C++ everywhere.
constexpr int kWhoProcess = 1;
constexpr int kDiskClassShift = 13;
constexpr long kIdleDiskClass = 3;
constexpr long kIdleDiskPriority = kIdleDiskClass << kDiskClassShift;

constexpr char kOutput[] = "/tmp/run_environment_test.out";
constexpr char kHome[] = "/tmp/run_environment_test.home";
constexpr char kCallersLock[] = "/tmp/run_environment_test.lock";
constexpr char kNoContext[] =
    "sched_task_run.cpp:N Failed to set user context. uid:[0] [0x2A00 sched_run_environment.cpp:N]";
const std::string kTo = "exec > /tmp/run_environment_test.out 2>&1; ";

// Opens nothing itself, unlike a listing of /proc/PID/fd.
const std::string kListDescriptors =
    kTo +
    "i=0; while [ $i -lt 300 ]; do if [ -e /proc/$$/fd/$i ]; then echo $i; fi; "
    "i=$((i + 1)); done";
// Gathered first: the shell redirects itself for as long as it runs a program.
const std::string kListLinks =
    "for i in 0 1 2; do links=\"$links $(readlink /proc/$$/fd/$i)\"; done; "
    "echo \"$links\" > /tmp/run_environment_test.out";
constexpr char kAllNothing[] = " /dev/null /dev/null /dev/null\n";
const std::string kListEnvironment = kTo + "tr '\\0' '\\n' < /proc/$$/environ";

// Makes it descriptors 1 and 2.
void lendOutput(int descriptor) {
  for (const int output : {1, 2}) dup2(descriptor, output);
}

class RunEnvironmentTest : public UsersTest {
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

  // What the command printed, when the run is started by a process that has called `prepare`.
  static std::string outputAfter(const std::function<void()> &prepare, long id) {
    fflush(nullptr);
    const pid_t caller = fork();
    if (caller == 0) {
      prepare();
      _exit(ZELOSchedTaskRun(id, 0, 0) == 0 ? 0 : 1);
    }
    int status = -1;
    waitpid(caller, &status, 0);
    EXPECT_EQ(status, 0);
    waitForChildRuns();
    return readFile(kOutput);
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

TEST_F(RunEnvironmentTest, TheCommandHasTheThreeStandardDescriptorsOnly) {
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

TEST_F(RunEnvironmentTest, ASocketOfTheCallerIsClosedWhileTheCommandRuns) {
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

TEST_F(RunEnvironmentTest, ALockOfTheCallerIsNotKeptByTheCommand) {
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

TEST_F(RunEnvironmentTest, ARunLockThatTheCallerHoldsDoesNotReachTheCommand) {
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

TEST_F(RunEnvironmentTest, ACallerWithoutStandardDescriptorsLeavesThemToNothing) {
  const long id = save(0, "echo lost; echo lost >&2; " + kListLinks);
  const std::string links = outputAfter(
      [] {
        for (const int descriptor : {0, 1, 2}) close(descriptor);
      },
      id);
  EXPECT_EQ(links, kAllNothing);
  const std::vector<StatusRow> rows = statusRows();
  ASSERT_EQ(rows.size(), 1U);
  EXPECT_EQ(rows[0].statusCode, ZELO_SCHED_STATUS_FINISHED);
}

TEST_F(RunEnvironmentTest, ACallerWithoutStandardInputOnlyKeepsTheOthers) {
  const std::string links = outputAfter(
      [] {
        const int output = open("/tmp/run_environment_test.stdout", O_WRONLY | O_CREAT, 0644);
        lendOutput(output);
        close(0);
      },
      save(0, kListLinks));
  EXPECT_EQ(links,
            " /dev/null /tmp/run_environment_test.stdout /tmp/run_environment_test.stdout\n");
}

// As in a shell's loop that reads its input line by line.
TEST_F(RunEnvironmentTest, ARunLeavesItsCallersInputAlone) {
  const long id = save(0, kTo + "cat; echo end");
  int input[2];
  ASSERT_EQ(pipe(input), 0);
  ASSERT_EQ(write(input[1], "next\n", 5), 5);
  close(input[1]);
  EXPECT_EQ(outputAfter([&] { dup2(input[0], 0); }, id), "end\n");
  char left[8] = "";
  EXPECT_EQ(read(input[0], left, sizeof left), 5);
  EXPECT_STREQ(left, "next\n");
  close(input[0]);
}

TEST_F(RunEnvironmentTest, APipeOfTheCallersGetsWhatTheCommandPrints) {
  const long id = save(0, "echo said; echo complained >&2");
  int output[2];
  ASSERT_EQ(pipe(output), 0);
  outputAfter([&] { lendOutput(output[1]); }, id);
  close(output[1]);
  std::string printed(64, '\0');
  printed.resize(static_cast<size_t>(std::max<ssize_t>(read(output[0], printed.data(), 64), 0)));
  EXPECT_EQ(printed, "said\ncomplained\n");
  close(output[0]);
}

TEST_F(RunEnvironmentTest, AFileOfTheCallersGetsWhatTheCommandPrints) {
  outputAfter(
      [] {
        lendOutput(open("/tmp/run_environment_test.stdout", O_WRONLY | O_CREAT | O_TRUNC, 0644));
      },
      save(0, "echo said; echo complained >&2"));
  EXPECT_EQ(readFile("/tmp/run_environment_test.stdout"), "said\ncomplained\n");
}

TEST_F(RunEnvironmentTest, OneOutputOfTheTwoIsReplacedAlone) {
  const auto lend = [](int kept) {
    lendOutput(open("/dev/zero", O_RDWR));
    dup2(open("/tmp/run_environment_test.stdout", O_WRONLY | O_CREAT, 0644), kept);
  };
  const long id = save(0, kListLinks);
  EXPECT_EQ(outputAfter([&] { lend(1); }, id),
            " /dev/null /tmp/run_environment_test.stdout /dev/null\n");
  EXPECT_EQ(outputAfter([&] { lend(2); }, id),
            " /dev/null /dev/null /tmp/run_environment_test.stdout\n");
}

// Descriptors that can be read as well, or are more than a place to write to.
TEST_F(RunEnvironmentTest, NoOtherOutputOfTheCallersReachesTheCommand) {
  const long id = save(0, "echo lost; echo lost >&2; " + kListLinks);
  ASSERT_EQ(mkfifo("/tmp/run_environment_test.fifo", 0600), 0);
  const std::pair<const char *, std::function<int()>> kinds[] = {
      {"a socket",
       [] {
         int ends[2];
         return socketpair(AF_UNIX, SOCK_STREAM, 0, ends) == 0 ? ends[0] : -1;
       }},
      {"the reading end of a pipe",
       [] {
         int ends[2];
         return pipe(ends) == 0 ? ends[0] : -1;
       }},
      {"a pipe open both ways", [] { return open("/tmp/run_environment_test.fifo", O_RDWR); }},
      {"a file open both ways",
       [] { return open("/tmp/run_environment_test.both", O_RDWR | O_CREAT, 0600); }},
      {"a file open for reading", [] { return open("/etc/passwd", O_RDONLY); }},
      {"a file that is only named", [] { return open("/etc/passwd", O_PATH); }},
      {"a directory", [] { return open("/etc", O_RDONLY); }},
      {"a device open for writing", [] { return open("/dev/zero", O_WRONLY); }},
  };
  for (const auto &[kind, make] : kinds) {
    SCOPED_TRACE(kind);
    std::filesystem::remove(kOutput);
    EXPECT_EQ(outputAfter([lend = make] { lendOutput(lend()); }, id), kAllNothing);
  }
  std::filesystem::remove("/tmp/run_environment_test.fifo");
}

TEST_F(RunEnvironmentTest, AnOutputThatIsToBeClosedOnAnExecDoesNotReachTheCommand) {
  const std::string links = outputAfter(
      [] {
        lendOutput(open("/tmp/run_environment_test.stdout", O_WRONLY | O_CREAT, 0644));
        fcntl(1, F_SETFD, FD_CLOEXEC);
        fcntl(2, F_SETFD, FD_CLOEXEC);
      },
      save(0, kListLinks));
  EXPECT_EQ(links, kAllNothing);
}

TEST_F(RunEnvironmentTest, ARunLockOnAStandardDescriptorMakesRoom) {
  const long id = save(0, kListLinks);
  const Task task = loadTask(id);
  task->CanRunTaskSameTime = 0;
  saveTask(task);
  writeFile("/tmp/lock/lock_sched_run", "");
  const std::string links = outputAfter(
      [] {
        close(0);
        pfLock = fopen("/tmp/lock/lock_sched_run", "r");
      },
      id);
  EXPECT_EQ(links.substr(0, links.find(' ', 1)), " /dev/null");
}

TEST_F(RunEnvironmentTest, ARunLockThatCannotMakeRoomRunsNothing) {
  const long id = save(0, kListLinks);
  const Task task = loadTask(id);
  task->CanRunTaskSameTime = 0;
  saveTask(task);
  writeFile("/tmp/lock/lock_sched_run", "");
  for (const char *call : {"fcntl", "fdopen"}) {
    SCOPED_TRACE(call);
    clearLog();
    const std::string links = outputAfter(
        [&] {
          close(0);
          pfLock = fopen("/tmp/lock/lock_sched_run", "r");
          failCall(call, {.error = EMFILE});
        },
        id);
    EXPECT_EQ(links, "");
    EXPECT_EQ(logged(), Lines{"sched_leave_caller.cpp:N Failed to replace standard descriptors. "
                              "Too many open files"});
    resetFailingCalls();
  }
}

TEST_F(RunEnvironmentTest, StandardDescriptorsThatCannotBeReplacedRunNothing) {
  const long id = save(0, kListEnvironment);
  failCallFor("open", "/dev/null", {.error = ENOENT});
  expectNothingRuns(id, (Lines{"sched_leave_caller.cpp:N Failed to replace standard descriptors. "
                               "No such file or directory"}));
  resetFailingCalls();
  failCall("dup2", {.error = EBUSY});
  expectNothingRuns(id, (Lines{"sched_leave_caller.cpp:N Failed to replace standard descriptors. "
                               "Device or resource busy"}));
}

// ---- session

TEST_F(RunEnvironmentTest, TheRunIsASessionOfItsOwn) {
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

// As a platform's fork may have done.
TEST_F(RunEnvironmentTest, ASessionThatHasBegunAlreadyIsTheRuns) {
  const long id = save(0, kTo + "echo ran");
  support::beforeEachCall([](const std::string &call) {
    if (call == "setsid") syscall(SYS_setsid);
  });
  EXPECT_EQ(outputOf(id), "ran\n");
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(RunEnvironmentTest, WithoutASessionOfItsOwnNothingIsRun) {
  const long id = save(0, kListEnvironment);
  failCall("setsid", {.error = EPERM});
  expectNothingRuns(id, (Lines{"sched_leave_caller.cpp:N Failed to begin a session. Operation not "
                               "permitted"}));
}

// ---- keys

constexpr char kKey[] = "run_environment_test";

// Replaces the backend's run of the command: the rights are the owner's by then, and an exec would
// change neither keys nor scheduling.
class ForCommand {
 public:
  explicit ForCommand(int (*run)(ZELO_SCHED_TASK *, int *, char *, size_t))
      : former_(SchedBackends[0].run) {
    SchedBackends[0].run = run;
  }
  ~ForCommand() { SchedBackends[0].run = former_; }
  ForCommand(const ForCommand &) = delete;
  ForCommand &operator=(const ForCommand &) = delete;

 private:
  decltype(SchedBackends[0].run) former_;
};

std::string findKey() {
  char found[32] = "";
  const long key = syscall(SYS_keyctl, KEYCTL_SEARCH, KEY_SPEC_SESSION_KEYRING, "user", kKey, 0L);
  if (key < 0 || syscall(SYS_keyctl, KEYCTL_READ, key, found, sizeof found - 1) < 0) return "none";
  return found;
}

// A kernel without keyrings keeps the caller from having any.
TEST_F(RunEnvironmentTest, NoKeyOfTheCallersSessionReachesTheCommand) {
  const long id = save(0, "true");
  const ForCommand search([](ZELO_SCHED_TASK *, int *, char *, size_t) {
    writeFile(kOutput, findKey());
    return 0;
  });
  const std::string found = outputAfter(
      [] {
        const bool hasKeyrings =
            syscall(SYS_keyctl, KEYCTL_JOIN_SESSION_KEYRING, nullptr) >= 0 &&
            syscall(SYS_add_key, "user", kKey, "secret", 6L, KEY_SPEC_SESSION_KEYRING) >= 0;
        if (hasKeyrings && findKey() != "secret") _exit(2);
      },
      id);
  EXPECT_EQ(found, "none");
  EXPECT_EQ(statusRows().size(), 1U);
}

TEST_F(RunEnvironmentTest, AKernelWithoutKeyringsKeepsNothingFromRunning) {
  const long id = save(0, kTo + "echo ran");
  for (const int error : {ENOSYS, EPERM}) {
    resetFailingCalls();
    std::filesystem::remove(kOutput);
    failCall("keyctl", {.times = kAlways, .error = error});
    EXPECT_EQ(outputOf(id), "ran\n");
    EXPECT_EQ(callCount("keyctl"), 1U);
  }
}

TEST_F(RunEnvironmentTest, WithoutASessionKeyringOfItsOwnNothingIsRun) {
  const long id = save(0, kListEnvironment);
  failCall("keyctl", {.times = kAlways, .error = EDQUOT});
  expectNothingRuns(id, (Lines{"sched_leave_caller.cpp:N Failed to begin a session keyring. Disk "
                               "quota exceeded"}));
}

// ---- scheduling

// Fields of /proc/PID/stat behind the name.
constexpr size_t kNice = 16;
constexpr size_t kPolicy = 38;

TEST_F(RunEnvironmentTest, PriorityAndSchedulingAreTheUsualOnesWhateverTheCallersAre) {
  const long id = save(0, kTo +
                              "read -r line < /proc/$$/stat; echo \"$line\"; "
                              "read -r score < /proc/$$/oom_score_adj; echo $score");
  // A user namespace's root may not raise its priority.
  int *const nice = static_cast<int *>(sharedMemory(sizeof(int)));
  const std::string output = outputAfter(
      [&] {
        std::ofstream("/proc/self/oom_score_adj") << "300";
        const sched_param none{};
        sched_setscheduler(0, SCHED_BATCH, &none);
        setpriority(PRIO_PROCESS, 0, 10);
        const bool canRaise = setpriority(PRIO_PROCESS, 0, 9) == 0;
        *nice = canRaise ? 0 : 10;
        setpriority(PRIO_PROCESS, 0, 10);
      },
      id);
  const Lines lines = linesOf(output);
  ASSERT_EQ(lines.size(), 2U) << output;
  std::istringstream fields(lines[0].substr(lines[0].rfind(") ") + 2));
  const Lines stat{std::istream_iterator<std::string>(fields), {}};
  ASSERT_GT(stat.size(), kPolicy);
  EXPECT_EQ(stat[kNice], std::to_string(*nice));
  EXPECT_EQ(stat[kPolicy], std::to_string(SCHED_OTHER));
  EXPECT_EQ(lines[1], "0");
}

TEST_F(RunEnvironmentTest, TheDiskPriorityIsTheUsualOneWhateverTheCallersIs) {
  const long id = save(0, "true");
  const ForCommand look([](ZELO_SCHED_TASK *, int *, char *, size_t) {
    writeFile(kOutput, std::to_string(syscall(SYS_ioprio_get, kWhoProcess, 0L) >> kDiskClassShift));
    return 0;
  });
  const std::string ioClass =
      outputAfter([] { syscall(SYS_ioprio_set, kWhoProcess, 0L, kIdleDiskPriority); }, id);
  EXPECT_NE(ioClass, std::to_string(kIdleDiskClass));
}

// A kernel without /proc, say.
TEST_F(RunEnvironmentTest, AScoreThatCannotBeWrittenKeepsNothingFromRunning) {
  const long id = save(0, kTo + "echo ran");
  failCallFor("open", "/proc/self/oom_score_adj", {.times = kAlways, .error = ENOENT});
  EXPECT_EQ(outputOf(id), "ran\n");
  EXPECT_EQ(logged(), Lines{});
}

// So that sudo and the like work in a command.
TEST_F(RunEnvironmentTest, ACommandMayStillGainRightsAndOutlivesTheCallersDeathSignal) {
  const long id = save(0, "true");
  const ForCommand look([](ZELO_SCHED_TASK *, int *, char *, size_t) {
    int signal = -1;
    prctl(PR_GET_PDEATHSIG, &signal);
    writeFile(kOutput, std::to_string(prctl(PR_GET_NO_NEW_PRIVS, 0L, 0L, 0L, 0L)) + " " +
                           std::to_string(signal));
    return 0;
  });
  EXPECT_EQ(outputAfter([] { prctl(PR_SET_PDEATHSIG, SIGKILL); }, id), "0 0");
}

// ---- signals

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
TEST_F(RunEnvironmentTest, SignalsThatTheCallerIgnoresOrBlocksReachTheCommand) {
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

// A shell may reset the mask by itself; not every command is one.
TEST_F(RunEnvironmentTest, SignalsThatTheCallerIgnoresOrBlocksReachTheRun) {
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

TEST_F(RunEnvironmentTest, TheEnvironmentIsTheOwnersAndNothingOfTheCallersButLocaleAndZone) {
  REQUIRE_OTHER_USERS();
  addOwner("/tmp/run_environment_test.home", "/bin/bash");
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
            (Lines{"HOME=/tmp/run_environment_test.home", "LANG=de_DE.UTF-8", "LANGUAGE=de:en",
                   "LC_ALL=C.UTF-8", "LC_MESSAGES=C", "LC_TIME=C", "LOGNAME=zeloowner",
                   "PATH=/usr/local/sbin:/usr/local/bin:/usr/sbin:/usr/bin:/sbin:/bin",
                   "SHELL=/bin/bash", "TZ=Europe/Berlin", "USER=zeloowner"}));
}

TEST_F(RunEnvironmentTest, RootsTaskGetsRootsEnvironmentToo) {
  const long id = save(0, kListEnvironment);
  clearenv();
  putenv(const_cast<char *>("SECRET=password"));
  EXPECT_EQ(sortedLines(outputOf(id)),
            (Lines{"HOME=/root", "LOGNAME=root",
                   "PATH=/usr/local/sbin:/usr/local/bin:/usr/sbin:/usr/bin:/sbin:/bin",
                   "SHELL=/bin/bash", "USER=root"}));
}

TEST_F(RunEnvironmentTest, AnOwnerWithoutAShellGetsTheStandardOne) {
  REQUIRE_OTHER_USERS();
  addOwner("/nonexistent", "");
  const Lines lines = sortedLines(outputOf(kOwner, kListEnvironment));
  EXPECT_NE(std::find(lines.begin(), lines.end(), "SHELL=/bin/sh"), lines.end());
}

TEST_F(RunEnvironmentTest, TheCallersEnvironmentStaysAsItIs) {
  const long id = save(0, "true");
  setenv("SECRET", "password", 1);
  outputOf(id);
  EXPECT_STREQ(getenv("SECRET"), "password");
}

TEST_F(RunEnvironmentTest, AVariableThatCannotBeAllocatedRunsNothing) {
  if (!kAllocationsCanFail) GTEST_SKIP() << "the sanitizer allocates itself";
  const std::string zone(100000, 'x');
  const long id = save(0, kListEnvironment);
  setenv("LANG", zone.c_str(), 1);
  const FailingAllocation malloc("malloc", {.times = kAlways, .minSize = zone.size()});
  const FailingAllocation realloc("realloc", {.times = kAlways, .minSize = zone.size()});
  expectNothingRuns(id, (Lines{"sched_run_environment.cpp:N Failed to set environment: [0] Cannot "
                               "allocate memory",
                               kNoContext}));
}

TEST_F(RunEnvironmentTest, WithoutADirectoryToBeInNothingIsRun) {
  const long id = save(0, kListEnvironment);
  failCall("chdir", {.times = kAlways, .error = EIO});
  expectNothingRuns(id, (Lines{"sched_run_environment.cpp:N Failed to change directory: [0] "
                               "Input/output error",
                               kNoContext}));
}

TEST_F(RunEnvironmentTest, ACallersDescriptorsThatCannotBeClosedRunNothing) {
  const long id = save(0, kListEnvironment);
  failCall("close_range", {.times = kAlways, .error = ENOSYS});
  failCall("sysconf", {.times = kAlways, .error = EINVAL});
  expectNothingRuns(id, (Lines{"sched_leave_caller.cpp:N Failed to close descriptors. "
                               "Invalid argument"}));
}

// ---- directory and mask

TEST_F(RunEnvironmentTest, TheCommandStartsInTheOwnersHome) {
  REQUIRE_OTHER_USERS();
  addOwner(kHome);
  std::filesystem::create_directory(kHome);
  EXPECT_EQ(outputOf(kOwner, kTo + "readlink /proc/$$/cwd"), std::string(kHome) + "\n");
}

TEST_F(RunEnvironmentTest, WithoutAHomeTheCommandStartsInTheRootDirectory) {
  REQUIRE_OTHER_USERS();
  addOwner(kHome);
  EXPECT_EQ(outputOf(kOwner, kTo + "readlink /proc/$$/cwd"), "/\n");
}

TEST_F(RunEnvironmentTest, AHomeThatTheOwnerMayNotEnterIsNotEntered) {
  REQUIRE_OTHER_USERS();
  addOwner(kHome);
  std::filesystem::create_directory(kHome);
  ASSERT_EQ(chmod(kHome, 0700), 0);
  EXPECT_EQ(outputOf(kOwner, kTo + "readlink /proc/$$/cwd"), "/\n");
}

TEST_F(RunEnvironmentTest, TheFileModeMaskIs022WhateverTheCallersIs) {
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
