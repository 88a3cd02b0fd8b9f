// File systems that are full or read-only, under each of the store's copies, the status database
// and the crontab: acknowledged changes stay, failures are reported, no temporary files are left,
// and with room changes succeed again. They are real ones, mounted in the sandbox.
#include <gtest/gtest.h>
#include <sqlite3.h>
#include <sys/mount.h>
#include <sys/resource.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <filesystem>
#include <functional>
#include <map>

#include "captured_log.h"
#include "failing_calls.h"
#include "power.h"
#include "sandbox_fixture.h"
#include "status_db.h"
#include "tasks.h"
#include "zelocore.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;

constexpr char kPersistentDirectory[] = "/usr/zelo/etc";
constexpr char kSmall[] = "size=64k,mode=1777";
constexpr char kLarge[] = "size=4m,mode=1777";
constexpr int kMoreThanFit = 200;

class SmallFileSystem {
 public:
  // Over a directory, of which it has these files.
  explicit SmallFileSystem(const char *path, const Lines &names = {}) : path_(path) {
    std::map<std::string, std::string> kept;
    for (const std::string &name : names) kept[fileIn(name)] = readFile(fileIn(name));
    if (mount("small", path, "tmpfs", 0, kSmall) != 0) {
      ADD_FAILURE() << "cannot mount over " << path << ": " << strerror(errno);
    }
    for (const auto &[file, contents] : kept) writeFile(file, contents);
  }
  ~SmallFileSystem() { umount2(path_, MNT_DETACH); }
  SmallFileSystem(const SmallFileSystem &) = delete;
  SmallFileSystem &operator=(const SmallFileSystem &) = delete;

  void grow() const { EXPECT_EQ(mount("small", path_, "tmpfs", MS_REMOUNT, kLarge), 0); }
  void makeReadOnly() const {
    EXPECT_EQ(mount("small", path_, "tmpfs", MS_REMOUNT | MS_RDONLY, kSmall), 0);
  }
  void makeWritable() const { EXPECT_EQ(mount("small", path_, "tmpfs", MS_REMOUNT, kSmall), 0); }

  void fill() const {
    writeFile(fileIn(kFiller),
              std::string(static_cast<size_t>(std::filesystem::space(path_).available), 'x'));
    EXPECT_EQ(std::filesystem::space(path_).available, 0U);
  }
  void makeRoom() const { std::filesystem::remove(fileIn(kFiller)); }

  static constexpr char kFiller[] = "filler";

 private:
  std::string fileIn(const std::string &name) const { return path_ + ("/" + name); }

  const char *path_;
};

// The names that the library always has in "/tmp", beside the store's.
const Lines kTaken = {"lock", "sched_status.sqlite", "sched_status.sqlite-journal",
                      "zeloschedtask"};

Lines filesIn(const char *directory) {
  Lines names;
  for (const auto &entry : std::filesystem::directory_iterator(directory)) {
    const std::string name = entry.path().filename();
    if (std::find(kTaken.begin(), kTaken.end(), name) == kTaken.end()) names.push_back(name);
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

// A copy that ran out of room after reusing the pages that it had freed has the length of the old
// file.
TEST_F(FullDiskTest, AWorkingCopyThatIsCutOffAtItsOldLengthIsMadeWhole) {
  ASSERT_EQ(saveTask(smallTask(1)), 1);
  const std::string before = readFile(kStore);
  support::failCall("QLIBCExec", {.from = 3, .times = 1, .result = 1});
  support::onExec([&](const std::string &command) {
    if (command.ends_with(std::string(" ") + kStore)) {
      writeFile(kStore, std::string(before.size(), '#'));
    }
  });
  EXPECT_EQ(ZELOSchedTaskSave(smallTask(2).get()), -1);
  support::onExec(nullptr);
  support::resetFailingCalls();
  EXPECT_EQ(readFile(kStore), readFile(kPersistentStore));
  EXPECT_EQ(saveTask(smallTask(3)), 3);
  expectStored(3);
}

TEST_F(FullDiskTest, ARemovalWithoutRoomTakesNothingAwayAndWorksWithRoom) {
  const SmallFileSystem disk("/tmp");
  constexpr int kTasks = 5;
  for (int number = 1; number <= kTasks; ++number) saveTask(smallTask(number));
  const std::string before = readFile(kStore);
  disk.fill();
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

  disk.makeRoom();
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
  EXPECT_EQ(filesIn(kPersistentDirectory), (Lines{"scheduled_tasks", "scheduled_tasks.last-good"}));
  expectStored(stored);

  disk.grow();
  EXPECT_EQ(saveTask(smallTask(stored + 1)), stored + 1);
  expectStored(stored + 1);
  EXPECT_EQ(readFile(kStore), readFile(kPersistentStore));
}

// ---- the copy over the working copy

// In which way it fails half way. The limit holds until the end of the test.
struct HalfWay {
  const char *name;
  std::function<void(const SmallFileSystem &)> stop;
};

const HalfWay kHalfWays[] = {
    {"the disk is full", [](const SmallFileSystem &disk) { disk.fill(); }},
    {"the copy is ended",
     [](const SmallFileSystem &) {
       rlimit limit = {};
       getrlimit(RLIMIT_FSIZE, &limit);
       limit.rlim_cur = readFile(kStore).size() / 2;
       EXPECT_EQ(setrlimit(RLIMIT_FSIZE, &limit), 0);
     }},
};

class HalfWayTest : public FullDiskTest {
 protected:
  void TearDown() override {
    makeFilesUnlimited();
    FullDiskTest::TearDown();
  }

  static void makeFilesUnlimited() {
    rlimit limit = {};
    getrlimit(RLIMIT_FSIZE, &limit);
    limit.rlim_cur = limit.rlim_max;
    EXPECT_EQ(setrlimit(RLIMIT_FSIZE, &limit), 0);
  }

  // So large that emptying the old copy does not make enough room.
  static Task largeTask(int number) {
    Task task = smallTask(number);
    setText(task->Command, std::string(8000, ':'));
    return task;
  }

  // Reads and changes report it; a list passes over a backend that fails.
  static void expectToldOfTheCutOff() {
    const Task task = smallTask(9);
    const Task edited = smallTask(9);
    edited->ID = 1;
    ZELO_SCHED_TASK *head = nullptr;
    const std::pair<std::function<long()>, long> calls[] = {
        {[&] { return long{ZELOSchedTaskSave(task.get())}; }, -1},
        {[&] { return long{ZELOSchedTaskSave(edited.get())}; }, -1},
        {[] { return long{ZELOSchedTaskRemove(1)}; }, -1},
        {[&] { return long{ZELOSchedTaskGetByID(1, task.get())}; }, -1},
        {[&] { return long{ZELOSchedTaskListGet(&head, nullptr)}; }, 0},
        {[] { return long{ZELOSchedTaskSync()}; }, 0},
    };
    for (const auto &[call, answer] : calls) {
      clearLog();
      EXPECT_EQ(call(), answer);
      EXPECT_EQ(errorRecord(), (ErrorRecord{0x0B00, "section_file.cpp"}));
      ASSERT_FALSE(logged().empty());
      EXPECT_TRUE(logged()[0].find("[0x0B00 section_file.cpp:N]") != std::string::npos)
          << logged()[0];
    }
  }

  static void failLastCopy(const std::function<void()> &stop) {
    onExec([stop](const std::string &line) {
      if (line.ends_with(std::string(" ") + kStore)) stop();
    });
  }
};

// A truncated store would keep every task from running until a restore.
TEST_F(HalfWayTest, AWorkingCopyThatCouldNotBeFilledIsWholeAllTheSame) {
  for (const HalfWay &way : kHalfWays) {
    SCOPED_TRACE(way.name);
    cleanWorld();
    const SmallFileSystem disk("/tmp");
    constexpr int kTasks = 5;
    for (int number = 1; number <= kTasks; ++number) saveTask(smallTask(number));
    const std::string crontab = readFile(kCrontab);
    clearLog();
    failLastCopy([&] { way.stop(disk); });
    const Task task = largeTask(kTasks + 1);
    EXPECT_EQ(ZELOSchedTaskSave(task.get()), -1);
    EXPECT_EQ(errorRecord(), (ErrorRecord{0x2A00, "proc.cpp"}));
    EXPECT_EQ(task->ID, ZELO_SCHED_ID_NEW);
    onExec(nullptr);
    makeFilesUnlimited();
    disk.makeRoom();
    expectReported(kTasks, {"backend_zeloschedule.cpp:N Copy sched conf failed. "
                            "[/tmp/scheduled_tasks.tmp.PID] -> [/tmp/scheduled_tasks] "});
    EXPECT_EQ(filesIn("/tmp"), Lines{"scheduled_tasks"});
    EXPECT_EQ(readFile(kCrontab), crontab);

    const std::string persistent = readFile(kPersistentStore);
    EXPECT_EQ(readFile(kStore), persistent);
    EXPECT_STREQ(loadTask(kTasks + 1)->Command, task->Command);

    const std::string cutOff = persistent.substr(0, persistent.size() / 2);
    writeFile(kStore, cutOff);
    expectToldOfTheCutOff();
    EXPECT_EQ(readFile(kStore), cutOff);
    EXPECT_EQ(readFile(kPersistentStore), persistent);
    EXPECT_EQ(readFile(kCrontab), crontab);

    // As a boot does.
    writeFile(kStore, persistent);
    EXPECT_EQ(ZELOSchedTaskRemove(kTasks + 1), 0);
    expectStored(kTasks);
  }
}

// ---- the record of runs

class FullStatusTest : public FullDiskTest {
 protected:
  static constexpr char kMark[] = "/run/full_disk_test.ran";

  void SetUp() override {
    FullDiskTest::SetUp();
    std::filesystem::remove(kMark);
  }

  static int addRow(long task) {
    int id = -1;
    sqlite3 *database = ZELOSchedDBInit();
    if (database == nullptr) return -1;
    const Task record = smallTask(1);
    record->ID = static_cast<int32_t>(task);
    const int result = ZELOSchedDBAddRecord(database, record.get(), &id);
    sqlite3_close(database);
    return result < 0 ? -1 : id;
  }

  static void expectRows(const std::vector<int> &ids) {
    const std::vector<StatusRow> rows = statusRows();
    ASSERT_EQ(rows.size(), ids.size());
    for (size_t i = 0; i < ids.size(); ++i) {
      EXPECT_EQ(rows[i].statusId, ids[i]);
      EXPECT_EQ(rows[i].taskId, static_cast<long>(i) + 1);
      EXPECT_EQ(rows[i].statusCode, ZELO_SCHED_STATUS_RUNNING);
    }
  }

  static long saveMarking() {
    return saveTask(makeTask("marks", std::string("/bin/touch ") + kMark));
  }

  static void run(long id) {
    EXPECT_EQ(ZELOSchedTaskRun(id, 0, 0), 0);
    waitForChildRuns();
  }
};

TEST_F(FullStatusTest, RowsStayWhereThereIsNoRoomForMore) {
  constexpr int kMoreRowsThanFit = 1000;
  const SmallFileSystem disk("/tmp");
  std::vector<int> ids = {addRow(1)};
  disk.fill();
  clearLog();
  int id = 0;
  while (ids.size() < kMoreRowsThanFit && (id = addRow(static_cast<long>(ids.size()) + 1)) > 0) {
    ids.push_back(id);
  }
  ASSERT_EQ(id, -1);
  ASSERT_EQ(logged().size(), 1U);
  EXPECT_TRUE(logged()[0].find("error: database or disk is full") != std::string::npos)
      << logged()[0];
  expectRows(ids);

  disk.makeRoom();
  ids.push_back(addRow(static_cast<long>(ids.size()) + 1));
  expectRows(ids);
}

// Another user fills it, beside the names that were taken before.
TEST_F(FullStatusTest, RunsAreRecordedInTheRoomThatWasReserved) {
  const SmallFileSystem disk("/tmp");
  disk.grow();
  std::vector<int> ids = {addRow(1)};
  disk.fill();
  clearLog();
  for (long i = 2; i <= 1000; ++i) ids.push_back(addRow(i));
  expectRows(ids);
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(FullStatusTest, ARunThatCannotBeRecordedIsNotStarted) {
  const SmallFileSystem disk("/tmp");
  const long id = saveMarking();
  disk.fill();
  clearLog();
  run(id);
  EXPECT_FALSE(fileExists(kMark));
  EXPECT_FALSE(logged().empty());

  disk.makeRoom();
  run(id);
  EXPECT_TRUE(fileExists(kMark));
  const std::vector<StatusRow> rows = statusRows();
  ASSERT_EQ(rows.size(), 1U);
  EXPECT_EQ(rows[0].taskId, id);
  EXPECT_NE(rows[0].statusCode, ZELO_SCHED_STATUS_RUNNING);
}

// Recording its end takes no more room than its row did.
TEST_F(FullStatusTest, TheEndOfARunThatFillsTheDiskIsRecorded) {
  const SmallFileSystem disk("/tmp");
  const long id =
      saveTask(makeTask("fills", "/bin/head -c 1000000 /dev/zero >/tmp/filler; exit 3"));
  run(id);
  EXPECT_EQ(std::filesystem::space("/tmp").available, 0U);
  const std::vector<StatusRow> rows = statusRows();
  ASSERT_EQ(rows.size(), 1U);
  EXPECT_EQ(rows[0].taskId, id);
  EXPECT_EQ(rows[0].statusCode, ZELO_SCHED_STATUS_EXIT_NONZERO);
  EXPECT_EQ(rows[0].comment, "3");
  disk.makeRoom();
}

TEST_F(FullStatusTest, NothingRunsUnrecordedOnAReadOnlyFileSystem) {
  for (const bool hasDatabase : {false, true}) {
    SCOPED_TRACE(hasDatabase);
    cleanWorld();
    const SmallFileSystem disk("/tmp");
    const long id = saveMarking();
    if (hasDatabase) addRow(1);
    const Lines files = filesIn("/tmp");
    disk.makeReadOnly();
    clearLog();
    run(id);
    EXPECT_FALSE(fileExists(kMark));
    EXPECT_FALSE(logged().empty());
    EXPECT_EQ(addRow(2), -1);
    disk.makeWritable();
    EXPECT_EQ(filesIn("/tmp"), files);
    EXPECT_EQ(statusRows().size(), hasDatabase ? 1U : 0U);
  }
}

// ---- the crontab

class FullCrontabTest : public FullDiskTest {
 protected:
  static constexpr char kDirectory[] = "/etc";
  static const Lines &files() {
    static const Lines names = {"crontab", "group", "passwd"};
    return names;
  }

  // The task is stored all the same. `names` is what lies beside the crontab.
  static void expectOldCrontab(int number, const Lines &names, const std::string &reason) {
    const std::string before = readFile(kCrontab);
    clearLog();
    EXPECT_EQ(saveTask(smallTask(number)), number);
    EXPECT_EQ(logged(), Lines{"backend_zeloschedule.cpp:N sync task list failed. [" + reason +
                              " backend_zeloschedule.cpp:N]"});
    EXPECT_EQ(readFile(kCrontab), before);
    EXPECT_EQ(filesIn(kDirectory), names);
    EXPECT_EQ(readFile(kStore), readFile(kPersistentStore));
  }
};

TEST_F(FullCrontabTest, WithoutRoomItStaysAndTheNextSyncWritesItWhole) {
  const SmallFileSystem disk(kDirectory, files());
  saveTask(smallTask(1));
  disk.fill();
  Lines names = files();
  names.insert(names.begin() + 1, SmallFileSystem::kFiller);
  expectOldCrontab(2, names, "0x0B00");

  disk.makeRoom();
  EXPECT_EQ(ZELOSchedTaskSync(), 0);
  expectStored(2);
}

TEST_F(FullCrontabTest, OnAReadOnlyFileSystemItStaysAndTheNextSyncWritesItWhole) {
  const SmallFileSystem disk(kDirectory, files());
  saveTask(smallTask(1));
  disk.makeReadOnly();
  expectOldCrontab(2, files(), "0x0900");

  disk.makeWritable();
  EXPECT_EQ(ZELOSchedTaskSync(), 0);
  expectStored(2);
}

TEST_F(FullCrontabTest, TheLinesOfPowerOffTimesStayToo) {
  std::filesystem::remove_all(kPowerSchedule);
  haveNoClock();
  const SmallFileSystem disk(kDirectory, files());
  const std::vector<Entry> one = {{1, 127, 21, 30}};
  const std::vector<Entry> two = {{1, 127, 21, 30}, {1, 127, 22, 0}};
  setPowerList(kOff, one);
  EXPECT_EQ(ZELOSchedTaskSync(), 0);
  ASSERT_EQ(crontabLines().size(), 1U);
  const std::string before = readFile(kCrontab);
  for (const bool isFull : {true, false}) {
    SCOPED_TRACE(isFull ? "full" : "read-only");
    setPowerList(kOff, one);
    isFull ? disk.fill() : disk.makeReadOnly();
    const Task task = makeTask("power", "");
    task->Backend = ZELO_SCHED_BACKEND_AUTOPOWER;
    setText(task->AppArgs, "poweroff");
    task->RunHour = 22;
    clearLog();
    EXPECT_EQ(ZELOSchedTaskCreate(task.get()), -1);
    EXPECT_FALSE(logged().empty());
    EXPECT_EQ(readFile(kCrontab), before);
    EXPECT_EQ(powerList(kOff), two);
    isFull ? disk.makeRoom() : disk.makeWritable();
  }
  EXPECT_EQ(ZELOSchedTaskSync(), 0);
  EXPECT_EQ(crontabLines().size(), 2U);
  std::filesystem::remove_all(kPowerSchedule);
}

// ---- read-only

class ReadOnlyTest : public FullDiskTest {
 protected:
  static constexpr int kTasks = 3;

  struct Refusal {
    const char *name;
    std::function<long()> act;
  };

  static std::vector<Refusal> refusals() {
    return {
        {"create", [] { return long{ZELOSchedTaskSave(smallTask(kTasks + 1).get())}; }},
        {"edit",
         [] {
           const Task task = smallTask(9);
           task->ID = 1;
           return long{ZELOSchedTaskEdit(task.get())};
         }},
        {"remove", [] { return long{ZELOSchedTaskRemove(2)}; }},
    };
  }

  // Nothing changes while it is read-only; it does afterwards.
  static void expectRefused(const SmallFileSystem &disk, const std::string &message) {
    for (int number = 1; number <= kTasks; ++number) saveTask(smallTask(number));
    disk.makeReadOnly();
    for (const Refusal &refusal : refusals()) {
      SCOPED_TRACE(refusal.name);
      clearLog();
      EXPECT_EQ(refusal.act(), -1);
      ASSERT_FALSE(logged().empty());
      EXPECT_TRUE(withoutProcess(logged()[0]).starts_with(message)) << logged()[0];
      expectStored(kTasks);
      EXPECT_EQ(readFile(kStore), readFile(kPersistentStore));
      EXPECT_EQ(filesIn("/tmp"), Lines{"scheduled_tasks"});
    }
    disk.makeWritable();
    EXPECT_EQ(saveTask(smallTask(kTasks + 1)), kTasks + 1);
    expectStored(kTasks + 1);
  }
};

TEST_F(ReadOnlyTest, TheWorkingCopyLosesNothing) {
  const SmallFileSystem disk("/tmp");
  expectRefused(disk,
                "backend_zeloschedule.cpp:N Copy sched conf failed. [/tmp/scheduled_tasks] "
                "-> [/tmp/scheduled_tasks.tmp.PID] [0x0900 ");
}

TEST_F(ReadOnlyTest, ThePersistentCopyLosesNothing) {
  const SmallFileSystem disk(kPersistentDirectory);
  expectRefused(disk,
                "backend_zeloschedule.cpp:N Copy sched conf failed. "
                "[/tmp/scheduled_tasks.tmp.PID] -> [/usr/zelo/etc/scheduled_tasks] ");
}

TEST_F(ReadOnlyTest, ThePowerTimesStay) {
  const SmallFileSystem disk(kPersistentDirectory);
  haveNoClock();
  const std::vector<Entry> one = {{1, 127, 21, 30}};
  setPowerList(kOff, one);
  disk.makeReadOnly();
  const Task task = makeTask("power", "");
  task->Backend = ZELO_SCHED_BACKEND_AUTOPOWER;
  setText(task->AppArgs, "poweroff");
  EXPECT_EQ(ZELOSchedTaskCreate(task.get()), -1);
  EXPECT_EQ(powerList(kOff), one);
  EXPECT_EQ(filesIn(kPersistentDirectory), Lines{"power_sched.conf"});
}

}  // namespace
}  // namespace support
