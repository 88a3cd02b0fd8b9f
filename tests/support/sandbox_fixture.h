// The fixture of every test that touches the library's files. Each test starts in a clean world:
// no store, status database, run lock, plugins or cron daemon; kPlainCrontab in /etc/crontab; the
// real clock in UTC; nothing logged, no call failing, no error recorded. When a test fails, what
// was logged is printed.
//
//   class ListTest : public support::SandboxTest {};
//   TEST_F(ListTest, AnEmptyStoreListsNothing) { ... }
//
//   std::string readFile(path);              "" when it cannot be read
//   void writeFile(path, text, mode = 0644); makes the directories that are missing
//   bool fileExists(path);
//   std::vector<std::string> linesOf(text);  without their line feeds
//   std::vector<std::string> crontabLines(); those that kPlainCrontab does not have
//   ErrorRecord errorRecord();               code and file of the record
//   REQUIRE_OTHER_USERS();                   skips the test where only user 0 exists
#pragma once

#include <gtest/gtest.h>
#include <sys/types.h>

#include <string>
#include <vector>

namespace support {

inline constexpr char kCrontab[] = "/etc/crontab";
inline constexpr char kStore[] = "/tmp/scheduled_tasks";
inline constexpr char kPersistentStore[] = "/usr/zelo/etc/scheduled_tasks";
inline constexpr char kLastGoodStore[] = "/usr/zelo/etc/scheduled_tasks.last-good";
inline constexpr char kPowerSchedule[] = "/usr/zelo/etc/power_sched.conf";
inline constexpr char kTaskProgram[] = "/tmp/zeloschedtask";
inline constexpr char kStatusDatabase[] = "/tmp/sched_status.sqlite";
inline constexpr char kLockDirectory[] = "/tmp/lock";
inline constexpr char kCronPidFile[] = "/var/run/crond.pid";
inline constexpr char kPluginDirectory[] = "/usr/zelo/libexec/plugins";

inline constexpr char kPlainCrontab[] =
    "# /etc/crontab: system-wide crontab\n"
    "SHELL=/bin/sh\n"
    "PATH=/usr/local/sbin:/usr/local/bin:/sbin:/bin:/usr/sbin:/usr/bin\n"
    "\n"
    "17 *\t* * *\troot\tcd / && run-parts --report /etc/cron.hourly\n";

inline constexpr mode_t kPlainFileMode = 0644;

struct ErrorRecord {
  int code;
  std::string file;
  bool operator==(const ErrorRecord &) const = default;
};

inline const ErrorRecord kNoError{0, ""};

std::ostream &operator<<(std::ostream &out, const ErrorRecord &record);

std::string readFile(const std::string &path);
void writeFile(const std::string &path, const std::string &text, mode_t mode = kPlainFileMode);
bool fileExists(const std::string &path);
std::vector<std::string> linesOf(const std::string &text);
std::vector<std::string> crontabLines();
ErrorRecord errorRecord();
bool otherUsersExist();
// Whether the store has a task. Its name is taken by whoever looks for one.
bool hasStoredTasks();
// Where a thing that stood under a name of ours was moved; "" when there is none.
std::string movedAway(const std::string &path);
void cleanWorld();

class SandboxTest : public testing::Test {
 protected:
  void SetUp() override;
  void TearDown() override;
};

}  // namespace support

#define REQUIRE_OTHER_USERS() \
  if (!support::otherUsersExist()) GTEST_SKIP() << "this sandbox has no user but 0"
