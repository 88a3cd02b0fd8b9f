// Which processes are taken for a run: a command can choose its own process name.
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include "runs/processes.h"
#include "sandbox_fixture.h"

namespace support {
namespace {

constexpr uid_t kOther = 65534;

// A child process that has called `prepare` and waits; killed with the object.
template <class Prepare>
class Child {
 public:
  explicit Child(Prepare prepare) {
    int ready[2];
    EXPECT_EQ(pipe(ready), 0);
    pid_ = fork();
    if (pid_ == 0) {
      prepare();
      _exit(write(ready[1], "", 1) == 1 ? pause() : 1);
    }
    char byte = 1;
    EXPECT_EQ(read(ready[0], &byte, 1), 1);
    close(ready[0]);
    close(ready[1]);
  }
  ~Child() {
    kill(pid_, SIGKILL);
    waitpid(pid_, nullptr, 0);
  }
  Child(const Child &) = delete;
  Child &operator=(const Child &) = delete;

  pid_t pid() const { return pid_; }

 private:
  pid_t pid_;
};

TEST(ZeloschedProcessesTest, AProcessThatHasRootsSavedIdIsOfRootWhateverItsOtherIdsAre) {
  REQUIRE_OTHER_USERS();
  const Child child([] { EXPECT_EQ(setresuid(kOther, kOther, 0), 0); });
  EXPECT_TRUE(isOfRoot(child.pid()));
  EXPECT_TRUE(isOfRoot(getpid()));
}

TEST(ZeloschedProcessesTest, AProcessIsNotOfRootByItsName) {
  REQUIRE_OTHER_USERS();
  const Child child([] {
    EXPECT_EQ(setresuid(kOther, kOther, kOther), 0);
    EXPECT_EQ(prctl(PR_SET_NAME, "Uid: 0 0 0"), 0);
  });
  EXPECT_FALSE(isOfRoot(child.pid()));
}

TEST(ZeloschedProcessesTest, AChildIsOfOurProgramUntilItStartsAnother) {
  const Child forked([] {});
  EXPECT_TRUE(isOfOurProgram(forked.pid()));
  const pid_t other = fork();
  if (other == 0) {
    execl("/bin/sleep", "sleep", "600", nullptr);
    _exit(1);
  }
  while (isOfOurProgram(other)) usleep(1000);
  kill(other, SIGKILL);
  EXPECT_EQ(waitpid(other, nullptr, 0), other);
  EXPECT_FALSE(isOfOurProgram(other));
}

TEST(ZeloschedProcessesTest, AChildThatHasEndedIsOverAndStillOfRoot) {
  const pid_t child = fork();
  if (child == 0) _exit(0);
  siginfo_t end = {};
  ASSERT_EQ(waitid(P_PID, static_cast<id_t>(child), &end, WEXITED | WNOWAIT), 0);
  EXPECT_TRUE(isOver(child));
  EXPECT_TRUE(isOfRoot(child));
  EXPECT_FALSE(isOver(getpid()));
  EXPECT_EQ(waitpid(child, nullptr, 0), child);
}

TEST(ZeloschedProcessesTest, AProcessThatIsGoneIsNotOfRoot) {
  pid_t pid = 0;
  {
    const Child child([] {});
    pid = child.pid();
    EXPECT_EQ(children().count(pid), 1U);
  }
  EXPECT_FALSE(isOfRoot(pid));
  EXPECT_EQ(children().count(pid), 0U);
}

TEST(ZeloschedProcessesTest, AChildIsFoundWhateverItsNameIs) {
  const Child child([] { EXPECT_EQ(prctl(PR_SET_NAME, "a) S 1 (b"), 0); });
  EXPECT_EQ(children().count(child.pid()), 1U);
}

}  // namespace
}  // namespace support
