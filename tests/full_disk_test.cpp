// A full file system under the store: what was acknowledged stays, what fails says so, nothing is
// left behind, and with room it goes on.
#include <gtest/gtest.h>
#include <sys/mount.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <filesystem>

#include "captured_log.h"
#include "failing_calls.h"
#include "sandbox_fixture.h"
#include "tasks.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;

constexpr char kPersistentDirectory[] = "/usr/zelo/etc";
constexpr char kSmall[] = "size=64k,mode=1777";
constexpr char kLarge[] = "size=4m,mode=1777";
constexpr int kMoreThanFit = 200;

class SmallFileSystem {
 public:
  explicit SmallFileSystem(const char *path) : path_(path) {
    if (mount("small", path, "tmpfs", 0, kSmall) != 0) {
      ADD_FAILURE() << "cannot mount over " << path << ": " << strerror(errno);
    }
  }
  ~SmallFileSystem() { umount2(path_, MNT_DETACH); }
  SmallFileSystem(const SmallFileSystem &) = delete;
  SmallFileSystem &operator=(const SmallFileSystem &) = delete;

  void grow() const { EXPECT_EQ(mount("small", path_, "tmpfs", MS_REMOUNT, kLarge), 0); }

 private:
  const char *path_;
};

Lines filesIn(const char *directory) {
  Lines names;
  for (const auto &entry : std::filesystem::directory_iterator(directory)) {
    names.push_back(entry.path().filename());
  }
  std::sort(names.begin(), names.end());
  return names;
}

std::string withoutProcess(std::string line) {
  const std::string process = "." + std::to_string(getpid());
  for (size_t at = line.find(process); at != std::string::npos; at = line.find(process)) {
    line.replace(at, process.size(), ".PID");
  }
  return line;
}

class FullDiskTest : public SandboxTest {
 protected:
  static Task smallTask(int number) {
    const std::string name = "task " + std::to_string(number);
    return makeTask(name + std::string(400, '.'), "echo " + name);
  }

  // How many were stored before the first one failed.
  static int createUntilItFails() {
    for (int stored = 0; stored < kMoreThanFit; ++stored) {
      const Task task = smallTask(stored + 1);
      clearLog();
      if (ZELOSchedTaskSave(task.get()) != 0) {
        EXPECT_EQ(task->ID, ZELO_SCHED_ID_NEW);
        return stored;
      }
      EXPECT_EQ(logged(), Lines{});
    }
    ADD_FAILURE() << "the file system is not full";
    return kMoreThanFit;
  }

  static void expectStored(int count) {
    ZELO_SCHED_TASK *head = nullptr;
    EXPECT_EQ(ZELOSchedTaskListGet(&head, nullptr), count);
    const TaskList list(head);
    for (int id = 1; id <= count; ++id) {
      const Task wanted = smallTask(id);
      const Task stored = loadTask(id);
      EXPECT_STREQ(stored->Name, wanted->Name);
      EXPECT_STREQ(stored->Command, wanted->Command);
    }
    EXPECT_EQ(crontabLines().size(), static_cast<size_t>(count));
  }

  // The first line says which step failed, the others who was told.
  static void expectReported(int stored, const Lines &steps) {
    const Lines lines = logged();
    ASSERT_EQ(lines.size(), 4U);
    const std::string first = withoutProcess(lines[0]);
    EXPECT_TRUE(std::any_of(steps.begin(), steps.end(), [&](const std::string &step) {
      return first.starts_with(step);
    })) << first;
    const std::string record = lines[0].substr(lines[0].rfind('['));
    EXPECT_EQ(lines[1], "backend_zeloschedule.cpp:N set task failed. [" +
                            std::to_string(stored + 1) + "] " + record);
    EXPECT_TRUE(lines[2].starts_with("sched_task_create.cpp:N Failed to create for backend [0] "))
        << lines[2];
    EXPECT_TRUE(lines[3].starts_with("sched_task_save.cpp:N Add task failed. ")) << lines[3];
    EXPECT_TRUE(lines[3].ends_with(record)) << lines[3];
  }
};

TEST_F(FullDiskTest, AFullWorkingCopyLosesNothingAndGoesOnWithRoom) {
  const SmallFileSystem disk("/tmp");
  const int stored = createUntilItFails();
  ASSERT_GT(stored, 5);
  expectReported(stored,
                 {"backend_zeloschedule.cpp:N Add section [" + std::to_string(stored + 1) +
                      "] to [/tmp/scheduled_tasks.tmp.PID] failed. [0x0B00 replace_file.cpp:N]",
                  "backend_zeloschedule.cpp:N Copy sched conf failed. [/tmp/scheduled_tasks] -> "
                  "[/tmp/scheduled_tasks.tmp.PID] "});
  EXPECT_EQ(filesIn("/tmp"), Lines{"scheduled_tasks"});
  expectStored(stored);
  EXPECT_EQ(readFile(kStore), readFile(kPersistentStore));

  disk.grow();
  EXPECT_EQ(saveTask(smallTask(stored + 1)), stored + 1);
  expectStored(stored + 1);
  EXPECT_EQ(filesIn("/tmp"), Lines{"scheduled_tasks"});
}

TEST_F(FullDiskTest, ARemovalWithoutRoomTakesNothingAwayAndWorksWithRoom) {
  const SmallFileSystem disk("/tmp");
  constexpr int kTasks = 5;
  for (int number = 1; number <= kTasks; ++number) saveTask(smallTask(number));
  const std::string before = readFile(kStore);
  const std::filesystem::space_info space = std::filesystem::space("/tmp");
  writeFile("/tmp/filler", std::string(space.available, 'x'));
  ASSERT_EQ(std::filesystem::space("/tmp").available, 0U);
  clearLog();
  EXPECT_EQ(ZELOSchedTaskRemove(kTasks), -1);
  ASSERT_GE(logged().size(), 2U);
  EXPECT_TRUE(withoutProcess(logged()[0])
                  .starts_with("backend_zeloschedule.cpp:N Copy sched conf failed. "
                               "[/tmp/scheduled_tasks] -> [/tmp/scheduled_tasks.tmp.PID] "));
  EXPECT_TRUE(logged()[1].starts_with("backend_zeloschedule.cpp:N set task failed. [5] "));
  EXPECT_EQ(filesIn("/tmp"), (Lines{"filler", "scheduled_tasks"}));
  EXPECT_EQ(readFile(kStore), before);
  expectStored(kTasks);

  std::filesystem::remove("/tmp/filler");
  EXPECT_EQ(ZELOSchedTaskRemove(kTasks), 0);
  expectStored(kTasks - 1);
}

TEST_F(FullDiskTest, AFullPersistentCopyLosesNothingAndIsWholeAgainWithRoom) {
  const SmallFileSystem disk(kPersistentDirectory);
  const int stored = createUntilItFails();
  ASSERT_GT(stored, 5);
  expectReported(stored, {"backend_zeloschedule.cpp:N Copy sched conf failed. "
                          "[/tmp/scheduled_tasks.tmp.PID] -> [/usr/zelo/etc/scheduled_tasks] "});
  EXPECT_FALSE(fileExists("/tmp/scheduled_tasks.tmp." + std::to_string(getpid())));
  EXPECT_EQ(filesIn(kPersistentDirectory), Lines{"scheduled_tasks"});
  expectStored(stored);

  disk.grow();
  EXPECT_EQ(saveTask(smallTask(stored + 1)), stored + 1);
  expectStored(stored + 1);
  EXPECT_EQ(readFile(kStore), readFile(kPersistentStore));
}

}  // namespace
}  // namespace support
