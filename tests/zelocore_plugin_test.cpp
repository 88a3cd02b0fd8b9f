// Plugins. Their directory is fixed, so the tests run inside of scripts/sandbox only.
#include <dlfcn.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <signal.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>
#include <zelocore.h>

#include <cerrno>
#include <cstdarg>
#include <cstdlib>
#include <fstream>
#include <functional>
#include <sstream>
#include <string>

namespace {

std::function<int()> g_on_poll;
int g_poll_timeout = 0;
int g_pidfd_error = 0;
int g_fcntl_error = 0;
std::function<void()> g_on_waitid;
time_t g_seconds_ahead = 0;

}  // namespace

#pragma GCC visibility push(default)
extern "C" {

int poll(pollfd *events, nfds_t count, int timeout) {
  static auto *const real =
      reinterpret_cast<int (*)(pollfd *, nfds_t, int)>(dlsym(RTLD_NEXT, "poll"));
  g_poll_timeout = timeout;
  return g_on_poll ? g_on_poll() : real(events, count, timeout);
}

int pidfd_open(pid_t pid, unsigned flags) {
  static auto *const real =
      reinterpret_cast<int (*)(pid_t, unsigned)>(dlsym(RTLD_NEXT, "pidfd_open"));
  if (g_pidfd_error != 0) {
    errno = g_pidfd_error;
    return -1;
  }
  return real(pid, flags);
}

int fcntl(int fd, int command, ...) {
  static auto *const real = reinterpret_cast<int (*)(int, int, ...)>(dlsym(RTLD_NEXT, "fcntl"));
  va_list arguments;
  va_start(arguments, command);
  void *argument = va_arg(arguments, void *);
  va_end(arguments);
  if (command == F_DUPFD_CLOEXEC && g_fcntl_error != 0) {
    errno = g_fcntl_error;
    return -1;
  }
  return real(fd, command, argument);
}

int waitid(idtype_t type, id_t id, siginfo_t *info, int options) {
  static auto *const real =
      reinterpret_cast<int (*)(idtype_t, id_t, siginfo_t *, int)>(dlsym(RTLD_NEXT, "waitid"));
  if (g_on_waitid) {
    g_on_waitid();
  }
  return real(type, id, info, options);
}

int clock_gettime(clockid_t clock, timespec *time) noexcept {
  static auto *const real =
      reinterpret_cast<int (*)(clockid_t, timespec *)>(dlsym(RTLD_NEXT, "clock_gettime"));
  const int result = real(clock, time);
  time->tv_sec += g_seconds_ahead;
  return result;
}
}
#pragma GCC visibility pop

namespace {

constexpr char kDirectory[] = "/usr/zelo/libexec/plugins/zelo_test.d";

class ZelocorePlugin : public testing::Test {
 protected:
  void SetUp() override {
    if (getenv("ZELO_SANDBOX") == nullptr) {
      GTEST_SKIP() << "needs scripts/sandbox";
    }
    char name[] = "/tmp/zelo-plugin-XXXXXX";
    ASSERT_NE(mkdtemp(name), nullptr);
    ASSERT_EQ(chmod(name, 0755), 0);
    scratch_ = name;
    Run(std::string("rm -rf ") + kDirectory);
    Run(std::string("mkdir -p ") + kDirectory);
    QLIBCErrSetEx(0, "", 0);
  }
  void TearDown() override {
    g_on_poll = nullptr;
    g_on_waitid = nullptr;
    g_pidfd_error = g_fcntl_error = 0;
    g_seconds_ahead = 0;
    if (words_[0] != nullptr) {
      EXPECT_EQ(QLIBPluginExit(words_), 0);
    }
    if (!scratch_.empty()) {
      Run(std::string("rm -rf ") + scratch_ + " " + kDirectory);
    }
  }

  static void Run(const std::string &command) { ASSERT_EQ(system(command.c_str()), 0) << command; }
  std::string Path(const std::string &name) const { return std::string(kDirectory) + "/" + name; }
  void Install(const std::string &name, const std::string &script, mode_t mode = 0755) {
    std::ofstream(Path(name)) << "#!/bin/sh\n" << script << "\n";
    ASSERT_EQ(chmod(Path(name).c_str(), mode), 0);
  }
  /* A plugin that records its name. */
  void InstallNoter(const std::string &name, mode_t mode = 0755) {
    Install(name, "echo " + name + " >> " + Log(), mode);
  }
  std::string Log() const { return scratch_ + "/log"; }
  std::string Noted() const {
    std::ifstream file(Log());
    std::ostringstream text;
    text << file.rdbuf();
    return text.str();
  }
  void Init() { ASSERT_EQ(QLIBPluginInit("zelo_test", "task_edit", words_), 0); }

  void *words_[3] = {};
  std::string scratch_;
};

TEST_F(ZelocorePlugin, WithoutADirectoryThereAreNoPlugins) {
  Run(std::string("rmdir ") + kDirectory);
  Init();
  EXPECT_EQ(QLIBPluginAction(QLIBPLUGIN_PRE, words_), 0);
  Run("rmdir /usr/zelo/libexec/plugins");
  EXPECT_EQ(QLIBPluginAction(QLIBPLUGIN_PRE, words_), 0);
}

TEST_F(ZelocorePlugin, EachIsRunInNameOrder) {
  for (const char *name : {"b", "10", "a", "2"}) {
    InstallNoter(name);
  }
  Init();
  EXPECT_EQ(QLIBPluginAction(QLIBPLUGIN_PRE, words_), 0);
  EXPECT_EQ(Noted(), "10\n2\na\nb\n");
}

TEST_F(ZelocorePlugin, ActionAndStageAreArguments) {
  Install("a", "echo \"$#:$1:$2\" >> " + Log());
  Init();
  EXPECT_EQ(QLIBPluginAction(QLIBPLUGIN_PRE, words_), 0);
  EXPECT_EQ(QLIBPluginAction(QLIBPLUGIN_POST, words_), 0);
  EXPECT_EQ(Noted(), "2:task_edit:pre\n2:task_edit:post\n");
}

TEST_F(ZelocorePlugin, TheHookArgumentsAreTheEnvironment) {
  Install("a", "env > " + Log());
  ASSERT_EQ(setenv("CALLERS_SECRET", "x", 1), 0);
  Init();
  EXPECT_EQ(QLIBPluginSetArg(words_, "ORG_NAME", "old"), 0);
  EXPECT_EQ(QLIBPluginSetArg(words_, "ORG_NAME", "a b=\"c\""), 0);
  EXPECT_EQ(QLIBPluginSetArg(words_, "NEW_WEEK", ""), 0);
  EXPECT_EQ(QLIBPluginSetArgByInt(words_, "RESULT", -1), 0);
  EXPECT_EQ(QLIBPluginAction(QLIBPLUGIN_POST, words_), 0);
  const std::string noted = Noted();
  EXPECT_NE(noted.find("NEW_WEEK=\n"), std::string::npos) << noted;
  EXPECT_NE(noted.find("ORG_NAME=a b=\"c\"\n"), std::string::npos) << noted;
  EXPECT_NE(noted.find("RESULT=-1\n"), std::string::npos) << noted;
  EXPECT_NE(noted.find("PATH=/usr/sbin:/usr/bin:/sbin:/bin\n"), std::string::npos) << noted;
  EXPECT_EQ(noted.find("CALLERS_SECRET"), std::string::npos) << noted;
}

TEST_F(ZelocorePlugin, WhatOthersCouldHaveWrittenIsNotRun) {
  InstallNoter("writable-by-group", 0775);
  InstallNoter("writable-by-all", 0757);
  InstallNoter("not-executable", 0644);
  InstallNoter(".hidden");
  InstallNoter("somebodys");
  const bool has_other_users = chown(Path("somebodys").c_str(), 65534, 0) == 0;
  if (!has_other_users) {
    ASSERT_EQ(unlink(Path("somebodys").c_str()), 0);
  }
  ASSERT_EQ(mkdir(Path("directory").c_str(), 0755), 0);
  InstallNoter("target", 0644);
  ASSERT_EQ(symlink("/bin/false", Path("link").c_str()), 0);
  InstallNoter("good");
  Init();
  EXPECT_EQ(QLIBPluginAction(QLIBPLUGIN_PRE, words_), 0);
  EXPECT_EQ(Noted(), "good\n");
}

TEST_F(ZelocorePlugin, ADirectoryThatOthersMayWriteIsRefused) {
  InstallNoter("a");
  ASSERT_EQ(chmod(kDirectory, 0777), 0);
  Init();
  EXPECT_EQ(QLIBPluginAction(QLIBPLUGIN_PRE, words_), -1);
  EXPECT_EQ(QLIBCErrGet(), QLIBC_ERR_OPEN);
  EXPECT_EQ(Noted(), "");
}

TEST_F(ZelocorePlugin, AFileInPlaceOfTheDirectoryIsRefused) {
  Run(std::string("rmdir ") + kDirectory + " && touch " + kDirectory);
  Init();
  EXPECT_EQ(QLIBPluginAction(QLIBPLUGIN_PRE, words_), -1);
  EXPECT_EQ(QLIBCErrGet(), QLIBC_ERR_OPEN);
}

TEST_F(ZelocorePlugin, AFailureIsTheVerdictButTheOthersAreRun) {
  InstallNoter("a");
  Install("b", "exit 3");
  Install("c", "kill -TERM $$");
  std::ofstream(Path("d")) << "no program at all";
  ASSERT_EQ(chmod(Path("d").c_str(), 0755), 0);
  InstallNoter("e");
  Init();
  EXPECT_EQ(QLIBPluginAction(QLIBPLUGIN_PRE, words_), -1);
  EXPECT_EQ(QLIBCErrGet(), QLIBC_ERR_SYSTEM);
  EXPECT_EQ(Noted(), "a\ne\n");
}

TEST_F(ZelocorePlugin, StandardInputAndOutputLeadNowhere) {
  Install("a",
          "in=$(readlink /proc/$$/fd/0); out=$(readlink /proc/$$/fd/1)\n"
          "test -e /proc/$$/fd/77 && exit 1\n"
          "echo $in $out $(pwd) >> " +
              Log());
  ASSERT_EQ(dup2(2, 77), 77);
  Init();
  EXPECT_EQ(QLIBPluginAction(QLIBPLUGIN_PRE, words_), 0);
  close(77);
  EXPECT_EQ(Noted(), "/dev/null /dev/null /\n");
}

TEST_F(ZelocorePlugin, AHangingOneIsEndedWithAllThatItStarted) {
  const std::string fifo = scratch_ + "/fifo";
  ASSERT_EQ(mkfifo(fifo.c_str(), 0600), 0);
  Install("a", "exec 9> " + fifo + "; sleep 1000 & echo started >&9; wait");
  InstallNoter("b");
  int reading = -1;
  g_on_poll = [&] {
    if (reading >= 0) {
      return 1;
    }
    /* Time is up as soon as the plugin is known to run. */
    char word[16];
    reading = open(fifo.c_str(), O_RDONLY | O_CLOEXEC);
    EXPECT_GT(read(reading, word, sizeof word), 0);
    return 0;
  };
  Init();
  EXPECT_EQ(QLIBPluginAction(QLIBPLUGIN_PRE, words_), -1);
  char rest;
  EXPECT_EQ(read(reading, &rest, 1), 0) << "the end comes once nobody holds the other end";
  close(reading);
  EXPECT_EQ(Noted(), "b\n");
}

TEST_F(ZelocorePlugin, APluginHasThirtySeconds) {
  Install("a", "exit 0");
  Init();
  EXPECT_EQ(QLIBPluginAction(QLIBPLUGIN_PRE, words_), 0);
  EXPECT_GT(g_poll_timeout, 20000);
  EXPECT_LE(g_poll_timeout, 30000);
}

TEST_F(ZelocorePlugin, AnInterruptedWaitGoesOn) {
  Install("a", "exit 0");
  int calls = 0;
  g_on_poll = [&] {
    errno = EINTR;
    return ++calls < 3 ? -1 : 1;
  };
  Init();
  EXPECT_EQ(QLIBPluginAction(QLIBPLUGIN_PRE, words_), 0);
  EXPECT_EQ(calls, 3);
}

TEST_F(ZelocorePlugin, PluginsRunWithoutADescriptorToWaitOn) {
  InstallNoter("a");
  Install("b", "exit 1");
  g_pidfd_error = EMFILE;
  Init();
  EXPECT_EQ(QLIBPluginAction(QLIBPLUGIN_PRE, words_), -1);
  EXPECT_EQ(Noted(), "a\n");
}

TEST_F(ZelocorePlugin, AHangingOneIsEndedWithoutADescriptorToWaitOnToo) {
  const std::string fifo = scratch_ + "/fifo";
  ASSERT_EQ(mkfifo(fifo.c_str(), 0600), 0);
  Install("a", "exec 9> " + fifo + "; sleep 1000 & echo started >&9; wait");
  g_pidfd_error = EMFILE;
  int reading = -1;
  g_on_waitid = [&] {
    if (reading < 0) {
      char word[16];
      reading = open(fifo.c_str(), O_RDONLY | O_CLOEXEC);
      EXPECT_GT(read(reading, word, sizeof word), 0);
      constexpr time_t kTimeIsUp = 31;
      g_seconds_ahead = kTimeIsUp;
    }
  };
  Init();
  EXPECT_EQ(QLIBPluginAction(QLIBPLUGIN_PRE, words_), -1);
  char rest;
  EXPECT_EQ(read(reading, &rest, 1), 0) << "the end comes once nobody holds the other end";
  close(reading);
}

TEST_F(ZelocorePlugin, ADirectoryThatCannotBeListedRunsNothing) {
  InstallNoter("a");
  Init();
  g_fcntl_error = EMFILE;
  EXPECT_EQ(QLIBPluginAction(QLIBPLUGIN_PRE, words_), -1);
  EXPECT_EQ(QLIBCErrGet(), QLIBC_ERR_OPEN);
  g_fcntl_error = 0;
  EXPECT_EQ(Noted(), "");
}

TEST_F(ZelocorePlugin, TheVerdictIsKnownToACallerThatIgnoresItsChildren) {
  InstallNoter("a");
  auto *const handler = signal(SIGCHLD, SIG_IGN);
  Init();
  const int good = QLIBPluginAction(QLIBPLUGIN_PRE, words_);
  Install("b", "exit 1");
  const int bad = QLIBPluginAction(QLIBPLUGIN_PRE, words_);
  signal(SIGCHLD, handler);
  EXPECT_EQ(good, 0);
  EXPECT_EQ(bad, -1);
}

TEST_F(ZelocorePlugin, AContextLivesFromInitToExit) {
  EXPECT_EQ(QLIBPluginAction(QLIBPLUGIN_PRE, words_), -1);
  EXPECT_EQ(QLIBCErrGet(), QLIBC_ERR_BAD_PARAMETER);
  Init();
  EXPECT_NE(words_[0], nullptr);
  EXPECT_EQ(QLIBPluginExit(words_), 0);
  for (const void *word : words_) {
    EXPECT_EQ(word, nullptr);
  }
  EXPECT_EQ(QLIBPluginExit(words_), -1);
  EXPECT_EQ(QLIBPluginSetArg(words_, "A", "b"), -1);
  EXPECT_EQ(QLIBPluginSetArgByInt(words_, "A", 1), -1);
}

TEST_F(ZelocorePlugin, WordsThatNobodyInitialisedAreRefused) {
  int stray = 0;
  void *words[3] = {&stray, &stray, &stray};
  EXPECT_EQ(QLIBPluginAction(QLIBPLUGIN_PRE, words), -1);
  EXPECT_EQ(QLIBPluginExit(words), -1);
  EXPECT_EQ(QLIBPluginExit(nullptr), -1);
  EXPECT_EQ(QLIBCErrGet(), QLIBC_ERR_BAD_PARAMETER);
}

TEST_F(ZelocorePlugin, BadArgumentsAreRefusedAndLeaveTheFirstWordZero) {
  EXPECT_EQ(QLIBPluginInit("zelo_test", "task_edit", nullptr), -1);
  for (const char *name : {static_cast<const char *>(nullptr), "", "../x", "a/b", "."}) {
    words_[0] = this;
    EXPECT_EQ(QLIBPluginInit(name, "task_edit", words_), -1);
    EXPECT_EQ(QLIBCErrGet(), QLIBC_ERR_BAD_PARAMETER);
    EXPECT_EQ(words_[0], nullptr);
  }
  EXPECT_EQ(QLIBPluginInit("zelo_test", nullptr, words_), -1);
  EXPECT_EQ(QLIBPluginInit("zelo_test", "", words_), -1);
  Init();
  for (const char *key :
       {static_cast<const char *>(nullptr), "", "A=B", "1A", "A B", "PATH", "LD_PRELOAD"}) {
    EXPECT_EQ(QLIBPluginSetArg(words_, key, "x"), -1);
  }
  EXPECT_EQ(QLIBPluginSetArg(words_, "A", nullptr), -1);
  EXPECT_EQ(QLIBPluginAction(0, words_), -1);
  EXPECT_EQ(QLIBPluginAction(6, words_), -1);
}

}  // namespace
