// Processes.
#include <dlfcn.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>
#include <zelocore.h>

#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <thread>
#include <utility>

namespace {

/* The fork that fails, counted from 1 over a process and its children; 0 for none. */
int g_failing_fork = 0;
int g_forks = 0;

/* The contents of /proc/PID/status; the real ones when null, none when empty. */
const char *g_status_page = nullptr;
bool g_pipes_fail = false;
int g_interruptions = 0;

}  // namespace

#pragma GCC visibility push(default)
extern "C" pid_t fork() noexcept {
  static auto *const real = reinterpret_cast<pid_t (*)()>(dlsym(RTLD_NEXT, "fork"));
  if (++g_forks == g_failing_fork) {
    errno = EAGAIN;
    return -1;
  }
  return real();
}

extern "C" int open(const char *path, int flags, ...) {
  static auto *const real =
      reinterpret_cast<int (*)(const char *, int, ...)>(dlsym(RTLD_NEXT, "open"));
  va_list arguments;
  va_start(arguments, flags);
  const mode_t mode = (flags & O_CREAT) != 0 ? va_arg(arguments, mode_t) : 0;
  va_end(arguments);
  if (g_status_page == nullptr || std::strstr(path, "/status") == nullptr) {
    return real(path, flags, mode);
  }
  int ends[2];
  if (g_status_page[0] == '\0' || pipe(ends) != 0) {
    errno = ENOENT;
    return -1;
  }
  const ssize_t written = write(ends[1], g_status_page, std::strlen(g_status_page));
  close(ends[1]);
  return written > 0 ? ends[0] : -1;
}

extern "C" int pipe2(int *ends, int flags) noexcept {
  static auto *const real = reinterpret_cast<int (*)(int *, int)>(dlsym(RTLD_NEXT, "pipe2"));
  if (g_pipes_fail) {
    errno = EMFILE;
    return -1;
  }
  return real(ends, flags);
}

extern "C" ssize_t read(int descriptor, void *buffer, size_t size) {
  static auto *const real =
      reinterpret_cast<ssize_t (*)(int, void *, size_t)>(dlsym(RTLD_NEXT, "read"));
  if (g_interruptions > 0) {
    --g_interruptions;
    errno = EINTR;
    return -1;
  }
  return real(descriptor, buffer, size);
}
#pragma GCC visibility pop

namespace {

class IgnoredChildren {
 public:
  explicit IgnoredChildren(int flags = 0) {
    struct sigaction ignore {};
    ignore.sa_handler = flags == 0 ? SIG_IGN : SIG_DFL;
    ignore.sa_flags = flags;
    sigaction(SIGCHLD, &ignore, &before_);
  }
  ~IgnoredChildren() { sigaction(SIGCHLD, &before_, nullptr); }
  IgnoredChildren(const IgnoredChildren &) = delete;
  IgnoredChildren &operator=(const IgnoredChildren &) = delete;

 private:
  struct sigaction before_ {};
};

class ZelocoreProc : public testing::Test {
 protected:
  void SetUp() override {
    QLIBCErrSetEx(0, "", 0);
    g_forks = g_failing_fork = 0;
  }
  void TearDown() override {
    g_failing_fork = 0;
    g_status_page = nullptr;
    g_pipes_fail = false;
    g_interruptions = 0;
  }

  static int Shell(const char *script) { return QLIBCExec("/bin/sh", "-c", script, nullptr); }
  static bool HasChildren() {
    siginfo_t info{};
    return waitid(P_ALL, 0, &info, WEXITED | WNOHANG | WNOWAIT) == 0 || errno != ECHILD;
  }
};

/* In a process of its own, whose exit status is the verdict. */
template <typename Body>
int InChild(Body body) {
  const pid_t pid = fork();
  if (pid == 0) {
    _exit(body());
  }
  int status = 0;
  EXPECT_EQ(waitpid(pid, &status, 0), pid);
  return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

TEST_F(ZelocoreProc, TheExitStatusIsTheResult) {
  EXPECT_EQ(QLIBCExec("/bin/true", nullptr), 0);
  EXPECT_EQ(Shell("exit 7"), 7);
  EXPECT_EQ(Shell("exit 255"), 255);
  EXPECT_EQ(QLIBCErrGet(), 0x2A00);
  EXPECT_FALSE(HasChildren());
}

TEST_F(ZelocoreProc, ASignalIsToldAsAShellTellsIt) {
  EXPECT_EQ(Shell("kill -KILL $$"), 128 + SIGKILL);
}

TEST_F(ZelocoreProc, ArgumentsArriveAsTheyAre) {
  EXPECT_EQ(QLIBCExec("/bin/sh", "-c", "test \"$1\" = \"a b\" && test \"$2\" = \"\" && test $# = 2",
                      "name", "a b", "", nullptr),
            0);
}

template <size_t... kEach>
int ExecWith(std::index_sequence<kEach...>) {
  return QLIBCExec("/bin/true", (static_cast<void>(kEach), "x")..., static_cast<char *>(nullptr));
}

TEST_F(ZelocoreProc, AListThatIsTooLongToHaveAnEndIsRefused) {
  constexpr size_t kMost = 256; /* with the program */
  EXPECT_EQ(ExecWith(std::make_index_sequence<kMost - 1>()), 0);
  EXPECT_EQ(ExecWith(std::make_index_sequence<kMost>()), -1);
  EXPECT_EQ(QLIBCErrGet(), QLIBC_ERR_BAD_PARAMETER);
}

TEST_F(ZelocoreProc, AProgramThatCannotBeStartedFails) {
  for (const char *program : {"/nonexistent/program", "/etc/passwd", "/", "true"}) {
    QLIBCErrSetEx(0, "", 0);
    EXPECT_EQ(QLIBCExec(program, nullptr), -1) << program;
    EXPECT_EQ(QLIBCErrGet(), QLIBC_ERR_SYSTEM) << program;
  }
  EXPECT_EQ(QLIBCExec(nullptr, nullptr), -1);
  EXPECT_EQ(QLIBCErrGet(), QLIBC_ERR_BAD_PARAMETER);
  EXPECT_FALSE(HasChildren());
}

TEST_F(ZelocoreProc, TheStatusIsKnownToACallerThatIgnoresItsChildren) {
  {
    const IgnoredChildren scope;
    EXPECT_EQ(Shell("exit 7"), 7);
    struct sigaction now {};
    sigaction(SIGCHLD, nullptr, &now);
    EXPECT_EQ(now.sa_handler, SIG_IGN);
  }
  const IgnoredChildren scope(SA_NOCLDWAIT);
  EXPECT_EQ(Shell("exit 8"), 8);
}

TEST_F(ZelocoreProc, AHandlerThatReapsDoesNotTakeTheStatus) {
  struct sigaction reap {};
  struct sigaction before {};
  reap.sa_handler = [](int) {
    const int error = errno;
    while (waitpid(-1, nullptr, WNOHANG) > 0) {
    }
    errno = error;
  };
  sigaction(SIGCHLD, &reap, &before);
  const int result = Shell("exit 9");
  sigaction(SIGCHLD, &before, nullptr);
  EXPECT_EQ(result, 9);
}

TEST_F(ZelocoreProc, TheProgramStartsWithDefaultSignals) {
  sigset_t set;
  sigset_t before;
  sigfillset(&set);
  sigprocmask(SIG_SETMASK, &set, &before);
  auto *const handler = signal(SIGHUP, SIG_IGN);
  const int blocked = Shell("grep -q '^SigBlk:.0*$' /proc/self/status");
  /* Of the 31 standard signals: the C library uses the two above itself. */
  const int ignored = Shell("grep -q '^SigIgn:.*[08]0000000$' /proc/self/status");
  signal(SIGHUP, handler);
  sigset_t after;
  sigprocmask(SIG_SETMASK, &before, &after);
  EXPECT_EQ(blocked, 0);
  EXPECT_EQ(ignored, 0);
  EXPECT_TRUE(sigismember(&after, SIGUSR1)) << "the caller's mask is its own";
}

/* The child writes its process id into a pipe, and exits. */
int ForkAndHear(pid_t *child, int *code = nullptr) {
  int ends[2];
  if (pipe(ends) != 0) {
    return -2;
  }
  std::fflush(nullptr); /* or the child would write it once more */
  const int result = QLIBCProcForkChildNoWait();
  if (result == 0) {
    const pid_t self = getpid();
    const ssize_t written = write(ends[1], &self, sizeof self);
    std::exit(written == sizeof self ? 0 : 1);
  }
  if (code != nullptr) {
    *code = QLIBCErrGet();
  }
  close(ends[1]);
  *child = 0;
  const ssize_t size = read(ends[0], child, sizeof *child);
  close(ends[0]);
  return size < 0 ? -2 : result;
}

TEST_F(ZelocoreProc, AForkedChildIsNobodysToWaitFor) {
  pid_t child = 0;
  EXPECT_EQ(ForkAndHear(&child), 1);
  EXPECT_GT(child, 0);
  EXPECT_NE(child, getpid());
  EXPECT_FALSE(HasChildren());
}

TEST_F(ZelocoreProc, ForkingWorksForACallerThatIgnoresItsChildren) {
  const IgnoredChildren scope;
  pid_t child = 0;
  EXPECT_EQ(ForkAndHear(&child), 1);
  EXPECT_GT(child, 0);
}

TEST_F(ZelocoreProc, EitherForkThatFailsIsReported) {
  for (const int failing : {1, 2}) {
    g_forks = 0;
    g_failing_fork = failing;
    QLIBCErrSetEx(0, "", 0);
    pid_t child = 0;
    int code = 0;
    EXPECT_EQ(ForkAndHear(&child, &code), -1) << failing;
    EXPECT_EQ(code, QLIBC_ERR_SYSTEM);
    EXPECT_EQ(child, 0);
    EXPECT_FALSE(HasChildren());
  }
}

TEST_F(ZelocoreProc, ASecondForkThatFailsIsReportedThoughChildrenAreIgnored) {
  const IgnoredChildren scope;
  g_failing_fork = 2;
  pid_t child = 0;
  EXPECT_EQ(ForkAndHear(&child), -1);
}

TEST_F(ZelocoreProc, WithoutAPipeNothingIsForked) {
  g_pipes_fail = true;
  pid_t child = 0;
  int code = 0;
  EXPECT_EQ(QLIBCProcForkChildNoWait(), -1);
  EXPECT_EQ(QLIBCErrGet(), QLIBC_ERR_SYSTEM);
  EXPECT_EQ(g_forks, 0);
  g_pipes_fail = false;
  EXPECT_EQ(ForkAndHear(&child, &code), 1);
}

TEST_F(ZelocoreProc, AnInterruptedForkGoesOn) {
  g_interruptions = 2;
  const int result = QLIBCProcForkChildNoWait();
  if (result == 0) {
    _exit(0);
  }
  EXPECT_EQ(result, 1);
  EXPECT_EQ(g_interruptions, 0);
}

TEST_F(ZelocoreProc, TheChildHasNoneOfThePipe) {
  EXPECT_EQ(InChild([] {
              const int before = dup(0);
              close(before);
              int report[2];
              if (pipe(report) != 0) {
                return 1;
              }
              if (QLIBCProcForkChildNoWait() == 0) {
                const int next = dup(0);
                const ssize_t written = write(report[1], &next, sizeof next);
                _exit(written > 0 ? 0 : 1);
              }
              int next = -1;
              if (read(report[0], &next, sizeof next) != sizeof next) {
                return 2;
              }
              return next == report[1] + 1 ? 0 : 3;
            }),
            0);
}

TEST_F(ZelocoreProc, ProcessesThatLiveAreAlive) {
  EXPECT_EQ(QLIBCProcAlive(getpid()), 1);
  EXPECT_EQ(QLIBCProcAlive(getppid() > 0 ? getppid() : 1), 1);
  EXPECT_EQ(QLIBCProcAlive(1), 1);
}

TEST_F(ZelocoreProc, NumbersOfNoProcessAreNotAlive) {
  EXPECT_EQ(QLIBCProcAlive(0), 0);
  EXPECT_EQ(QLIBCProcAlive(-1), 0);
  EXPECT_EQ(QLIBCProcAlive(-getpid()), 0);
  EXPECT_EQ(QLIBCProcAlive(0x7fffffff), 0);
}

TEST_F(ZelocoreProc, AZombieIsNotAlive) {
  const pid_t pid = fork();
  if (pid == 0) {
    _exit(0);
  }
  siginfo_t info{};
  ASSERT_EQ(waitid(P_PID, static_cast<id_t>(pid), &info, WEXITED | WNOWAIT), 0);
  EXPECT_EQ(QLIBCProcAlive(pid), 0);
  ASSERT_EQ(waitpid(pid, nullptr, 0), pid);
  EXPECT_EQ(QLIBCProcAlive(pid), 0);
}

TEST_F(ZelocoreProc, AThreadIsNoProcess) {
  std::thread([] { EXPECT_EQ(QLIBCProcAlive(gettid()), 0); }).join();
}

/* A process that can be signalled is taken for alive where nothing else is known. */
TEST_F(ZelocoreProc, WithoutAStatusPageSignalsDecide) {
  for (const char *page : {"", "Name:\tshell\n", "Name:\tshell\nState:\tZ (zombie)\n"}) {
    g_status_page = page;
    EXPECT_EQ(QLIBCProcAlive(getpid()), 1) << page;
    EXPECT_EQ(QLIBCProcAlive(0x7fffffff), 0) << page;
  }
  g_status_page = "Name:\tshell\nState:\tZ (zombie)\nTgid:\t1\n";
  EXPECT_EQ(QLIBCProcAlive(getpid()), 0);
}

TEST_F(ZelocoreProc, SomebodyElsesProcessIsAlive) {
  constexpr int kCannot = 77;
  const pid_t parent = getpid();
  const int verdict = InChild([parent] {
    if (geteuid() != 0 || setresuid(65534, 65534, 65534) != 0) {
      return kCannot;
    }
    return QLIBCProcAlive(parent) == 1 ? 0 : 1;
  });
  if (verdict == kCannot) {
    GTEST_SKIP() << "needs root to become somebody else";
  }
  EXPECT_EQ(verdict, 0);
}

}  // namespace
