// Load: 200 runs that are started together, 16 processes on the status database, and one process
// that lists 1,000 tasks repeatedly. No run is lost but those that give up after their twentieth
// wait, none overlaps one that it must not overlap, no row is lost or mixed up, and no memory
// leaks.
//
// ZELO_SOAK_FACTOR=20 repeats each of these that much more often. The sizes and times are printed.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <malloc.h>
#include <poll.h>
#include <signal.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdlib>
#include <fstream>
#include <map>
#include <set>
#include <string>
#include <vector>

#include "captured_log.h"
#include "failing_calls.h"
#include "sandbox_fixture.h"
#include "soak.h"
#include "status_db.h"
#include "tasks.h"
#include "text_hash.h"
#include "zelosched.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;

constexpr size_t kRuns = 200;
constexpr unsigned kMostRetries = 20;
constexpr unsigned kTimesShorter = 10;  // waits of seconds take tenths of them
constexpr char kStartedFifo[] = "/tmp/load_test.started";
constexpr char kGoFifo[] = "/tmp/load_test.go";
constexpr char kOrder[] = "/tmp/load_test.order";
constexpr mode_t kOwnersOnly = 0600;
constexpr mode_t kLockDirectoryMode = 0755;

class Stopwatch {
 public:
  double seconds() const {
    return std::chrono::duration<double>(std::chrono::steady_clock::now() - start_).count();
  }

 private:
  std::chrono::steady_clock::time_point start_ = std::chrono::steady_clock::now();
};

// ---- tasks

struct Together {
  int task;  // CanRunTaskSameTime
  int app;   // CanRunAppSameTime
};

Task makeRunTask(int id, const std::string &app, const std::string &command, Together together) {
  Task task = makeTask("task " + std::to_string(id), command);
  task->ID = id;
  setText(task->App, app);
  task->CanRunTaskSameTime = together.task;
  task->CanRunAppSameTime = together.app;
  return task;
}

// All at once: saving them one by one is not measured here.
void storeTasks(const std::vector<Task> &tasks) {
  std::string text;
  TextHash hash;
  for (const Task &task : tasks) {
    ASSERT_EQ(ZELOSchedInitHashFromTask(hash.handle(), task.get()), 0);
    text += "[" + std::to_string(task->ID) + "]\n";
    for (const auto &[key, value] : hash.entries()) text += key + "=\"" + value + "\"\n";
  }
  writeFile(kStore, text);
}

// ---- their commands

// Reports that it has begun, and ends when the test releases it.
const std::string kWaitToBeLetGo =
    std::string("echo >> ") + kStartedFifo + "; read go < " + kGoFifo + "; ";

class WaitingCommands {
 public:
  WaitingCommands() : started_(openFifo(kStartedFifo)) {
    go_ = openFifo(kGoFifo);
    signal(SIGALRM, [](int) { letAllGo(); });
    alarm(kLongestWaitSeconds);
  }
  ~WaitingCommands() {
    letGo();
    close(started_);
    close(go_);
  }
  WaitingCommands(const WaitingCommands &) = delete;
  WaitingCommands &operator=(const WaitingCommands &) = delete;

  void waitUntilStarted(size_t count) const {
    for (size_t started = 0; started < count;) {
      pollfd waiting = {started_, POLLIN, 0};
      ASSERT_EQ(poll(&waiting, 1, kLongestWaitSeconds * 1000), 1) << started << " have started";
      char bytes[kRuns];
      const ssize_t length = read(started_, bytes, std::min(sizeof(bytes), count - started));
      ASSERT_GT(length, 0);
      started += static_cast<size_t>(length);
    }
  }

  // Also called by the alarm, so that a run too many or too few fails the test and does not hang
  // it.
  void letGo() {
    if (alarm(0) != 0) letAllGo();
  }

 private:
  static constexpr unsigned kLongestWaitSeconds = 100;  // an emulator on a busy machine took 60

  // A line for each, also for those that have told that they began and have not opened it yet.
  static void letAllGo() {
    char lines[4 * kRuns];
    std::fill(std::begin(lines), std::end(lines), '\n');
    if (write(go_, lines, sizeof(lines)) < 0) _exit(EXIT_FAILURE);
  }

  // For both ways, so that no command waits for the other end.
  static int openFifo(const char *path) {
    std::remove(path);
    EXPECT_EQ(mkfifo(path, kOwnersOnly), 0);
    return open(path, O_RDWR | O_CLOEXEC);
  }

  int started_;
  static inline int go_ = -1;
};

// ---- runs

bool ended(pid_t pid) {
  int status = -1;
  return waitpid(pid, &status, 0) == pid && status == 0;
}

// As cron does it: a process for each, which starts its run and ends. They wait until all are
// there. Returns how long it took until all were answered.
double startTogether(const std::vector<int> &ids) {
  int gate[2];
  EXPECT_EQ(pipe2(gate, O_CLOEXEC), 0);
  std::vector<pid_t> callers;
  for (const int id : ids) {
    const pid_t pid = fork();
    if (pid == 0) {
      close(gate[1]);
      char none = 0;
      const bool opened = read(gate[0], &none, 1) == 0;
      _exit(opened && ZELOSchedTaskRun(id, 0, 0) == 0 ? EXIT_SUCCESS : EXIT_FAILURE);
    }
    callers.push_back(pid);
  }
  close(gate[0]);
  const Stopwatch watch;
  close(gate[1]);
  for (const pid_t pid : callers) EXPECT_TRUE(ended(pid));
  return watch.seconds();
}

// The next runs that end, at most so many of them.
std::vector<pid_t> waitForRuns(size_t count) {
  std::vector<pid_t> runs;
  while (runs.size() < count) {
    int status = -1;
    const pid_t pid = waitpid(-1, &status, 0);
    if (pid > 0) {
      EXPECT_EQ(status, 0);
      runs.push_back(pid);
    } else if (errno != EINTR) {
      break;
    }
  }
  return runs;
}

size_t distinctPids(const std::vector<StatusRow> &rows) {
  std::set<long> pids;
  for (const StatusRow &row : rows) pids.insert(row.pid);
  return pids.size();
}

std::vector<int> idsUpTo(size_t count) {
  std::vector<int> ids;
  for (size_t i = 1; i <= count; ++i) ids.push_back(static_cast<int>(i));
  return ids;
}

// The last row of each is the first one too.
std::map<long, StatusRow> rowsByTask(const std::vector<StatusRow> &rows) {
  std::map<long, StatusRow> byTask;
  for (const StatusRow &row : rows) byTask[row.taskId] = row;
  EXPECT_EQ(byTask.size(), rows.size());
  return byTask;
}

class RunsTest : public SandboxTest {
 protected:
  void SetUp() override {
    SandboxTest::SetUp();
    newRound();
  }

  static void newRound() {
    cleanWorld();
    std::remove(kOrder);
    // Sleeps are real, so that a process that finds the database locked yields to the others.
    realSleep(true, kTimesShorter);
  }

  // As after the first run since the boot. When several runs find none at once, one makes it, and
  // the others log a failure and retry seconds later.
  static void makeLockDirectory() { ASSERT_EQ(mkdir(kLockDirectory, kLockDirectoryMode), 0); }
};

// ---- runs that may overlap

TEST_F(RunsTest, DistinctTasksAllRunAtOnceAndEachTellsHowItEnded) {
  for (int round = 0; round < timesSoaked(1) && !HasFailure(); ++round) {
    newRound();
    makeLockDirectory();
    constexpr int kCodes = 3;
    std::vector<Task> tasks;
    for (const int id : idsUpTo(kRuns)) {
      tasks.push_back(makeRunTask(id, "app " + std::to_string(id),
                                  kWaitToBeLetGo + "exit " + std::to_string(id % kCodes), {0, 0}));
    }
    storeTasks(tasks);
    WaitingCommands commands;
    const Stopwatch watch;
    const double answered = startTogether(idsUpTo(kRuns));
    commands.waitUntilStarted(kRuns);
    const double started = watch.seconds();
    EXPECT_EQ(distinctPids(statusRows()), kRuns);
    for (const StatusRow &row : statusRows()) EXPECT_EQ(row.statusCode, 2) << row.taskId;
    commands.letGo();
    EXPECT_EQ(waitForRuns(kRuns + 1).size(), kRuns);

    const std::map<long, StatusRow> rows = rowsByTask(statusRows());
    EXPECT_EQ(rows.size(), kRuns);
    for (const auto &[id, row] : rows) {
      SCOPED_TRACE(id);
      const long exitCode = id % kCodes;
      EXPECT_EQ(row.app, "app " + std::to_string(id));
      EXPECT_EQ(row.statusCode, exitCode == 0 ? 3 : 7);
      EXPECT_EQ(row.comment.value_or("none"), exitCode == 0 ? "none" : std::to_string(exitCode));
    }
    EXPECT_EQ(logged(), Lines{});
    printf("%zu distinct tasks: answered in %.2f s, all running after %.2f s, ended after %.2f s\n",
           kRuns, answered, started, watch.seconds());
  }
}

TEST_F(RunsTest, ATaskThatMayOverlapItselfRunsAsOftenAsItIsStarted) {
  ASSERT_EQ(ZELOSchedBackendInit(), 0);  // which takes the name of the lock's directory
  for (int round = 0; round < timesSoaked(1) && !HasFailure(); ++round) {
    newRound();
    std::vector<Task> tasks;
    tasks.push_back(makeRunTask(1, "app", kWaitToBeLetGo + "exit 0", {1, 1}));
    storeTasks(tasks);
    WaitingCommands commands;
    const Stopwatch watch;
    const double answered = startTogether(std::vector<int>(kRuns, 1));
    commands.waitUntilStarted(kRuns);
    const double started = watch.seconds();
    commands.letGo();
    EXPECT_EQ(waitForRuns(kRuns + 1).size(), kRuns);
    EXPECT_FALSE(fileExists(kLockDirectory));
    const std::vector<StatusRow> rows = statusRows();
    EXPECT_EQ(rows.size(), kRuns);
    EXPECT_EQ(distinctPids(rows), kRuns);
    for (const StatusRow &row : rows) EXPECT_EQ(row.statusCode, 3) << row.statusId;
    EXPECT_EQ(logged(), Lines{});
    printf(
        "one task %zu times: answered in %.2f s, all running after %.2f s, ended after %.2f s, "
        "%zu waits for the database\n",
        kRuns, answered, started, watch.seconds(), recordedSleeps("usleep").size());
  }
}

// ---- runs that must not overlap

struct Conflicting {
  const char *name;
  Together together;
  size_t tasks;
};

std::ostream &operator<<(std::ostream &out, const Conflicting &conflicting) {
  return out << conflicting.name;
}

class ConflictingRunsTest : public RunsTest, public testing::WithParamInterface<Conflicting> {
 protected:
  static void storeThem(const std::string &command) {
    std::vector<Task> tasks;
    for (const int id : idsUpTo(GetParam().tasks)) {
      tasks.push_back(makeRunTask(id, "app", command, GetParam().together));
    }
    storeTasks(tasks);
  }

  // Of as many tasks as there are.
  static std::vector<int> runs() {
    return GetParam().tasks == 1 ? std::vector<int>(kRuns, 1) : idsUpTo(kRuns);
  }
};

std::string withoutWait(const std::string &line) {
  return line.substr(0, line.find(", wait "));
}

TEST_P(ConflictingRunsTest, WhileOneGoesOnAllOthersGiveUpAfterTwentyRetriesWithoutARow) {
  for (int round = 0; round < timesSoaked(1) && !HasFailure(); ++round) {
    newRound();
    makeLockDirectory();
    realSleep(false);  // none of them meets a lock on the database
    storeThem(kWaitToBeLetGo + "exit 0");
    WaitingCommands commands;
    const Stopwatch watch;
    startTogether(runs());
    commands.waitUntilStarted(1);
    const std::vector<pid_t> gaveUp = waitForRuns(kRuns - 1);
    EXPECT_EQ(gaveUp.size(), kRuns - 1);

    const std::vector<StatusRow> rows = statusRows();
    ASSERT_EQ(rows.size(), 1U);
    EXPECT_EQ(rows[0].statusCode, 2);
    std::multiset<std::string> expected;
    const long going = rows[0].taskId;
    std::vector<int> others = runs();
    others.erase(std::find(others.begin(), others.end(), going));
    for (const int id : others) {
      for (unsigned retry = 1; retry <= kMostRetries; ++retry) {
        expected.insert("sched_task_run.cpp:N Task " + std::to_string(id) + " conflict with task " +
                        std::to_string(going) + " (running), retry = " + std::to_string(retry));
      }
    }
    std::multiset<std::string> found;
    for (const std::string &line : logged()) found.insert(withoutWait(line));
    EXPECT_TRUE(found == expected) << found.size() << " lines";
    const std::map<pid_t, unsigned> waits = sleepsByProcess("sleep");
    EXPECT_EQ(waits.size(), kRuns - 1);
    for (const pid_t pid : gaveUp) {
      EXPECT_TRUE(waits.count(pid) == 1 && waits.at(pid) == kMostRetries) << pid;
    }

    commands.letGo();
    EXPECT_EQ(waitForRuns(2), std::vector<pid_t>{static_cast<pid_t>(rows[0].pid)});
    ASSERT_EQ(statusRows().size(), 1U);
    EXPECT_EQ(statusRows()[0].statusCode, 3);
    printf("%zu runs of %s, one that goes on: %zu gave up after %u retries each, in %.2f s\n",
           kRuns, GetParam().name, gaveUp.size(), kMostRetries, watch.seconds());
  }
}

TEST_P(ConflictingRunsTest, TheyRunOneAfterTheOtherAndNoneIsLostButThoseThatGiveUp) {
  for (int round = 0; round < timesSoaked(1) && !HasFailure(); ++round) {
    newRound();
    storeThem(std::string("echo begin >> ") + kOrder + "; echo end >> " + kOrder);
    const Stopwatch watch;
    startTogether(runs());
    const std::vector<pid_t> all = waitForRuns(kRuns + 1);
    EXPECT_EQ(all.size(), kRuns);

    const std::vector<StatusRow> rows = statusRows();
    std::set<pid_t> recorded;
    for (const StatusRow &row : rows) {
      EXPECT_EQ(row.statusCode, 3) << row.statusId;
      EXPECT_TRUE(recorded.insert(static_cast<pid_t>(row.pid)).second) << row.pid;
    }
    const std::map<pid_t, unsigned> waits = sleepsByProcess("sleep");
    size_t conflicts = 0;
    for (const pid_t pid : all) {
      const unsigned waited = waits.count(pid) == 1 ? waits.at(pid) : 0;
      EXPECT_TRUE(recorded.count(pid) == 1 || waited == kMostRetries)
          << pid << " has no row and waited " << waited << " times";
      EXPECT_LE(waited, kMostRetries);
      conflicts += waited;
    }
    EXPECT_EQ(logged().size(), conflicts);
    Lines order;
    for (size_t i = 0; i < rows.size(); ++i) order.insert(order.end(), {"begin", "end"});
    EXPECT_TRUE(linesOf(readFile(kOrder)) == order) << "two ran at once:\n" << readFile(kOrder);
    EXPECT_GT(rows.size(), kRuns / 10);
    EXPECT_GT(conflicts, kRuns / 10);
    printf(
        "%zu runs of %s: %zu ran, %zu conflicts, %zu gave up, in %.2f s (waits %u times "
        "shorter)\n",
        kRuns, GetParam().name, rows.size(), conflicts, kRuns - rows.size(), watch.seconds(),
        kTimesShorter);
  }
}

INSTANTIATE_TEST_SUITE_P(Each, ConflictingRunsTest,
                         testing::Values(Conflicting{"one task", {0, 1}, 1},
                                         Conflicting{"one application", {1, 0}, kRuns}),
                         [](const testing::TestParamInfo<Conflicting> &param) {
                           return param.param.tasks == 1 ? "OneTask" : "OneApplication";
                         });

// ---- the status database

constexpr int kWriters = 16;
const int kRows = isShortRun() ? 1600 : 10000;
const int kRowsOfWriter = kRows / kWriters;

std::string commentOf(int id) {
  return "end of " + std::to_string(id);
}

// As a run does it, with a connection for its beginning and one for its end.
bool addRow(int id) {
  const Task task = makeRunTask(id, "app " + std::to_string(id), "", {1, 1});
  int statusId = -1;
  sqlite3 *database = ZELOSchedDBInit();
  const bool added = ZELOSchedDBAddRecord(database, task.get(), &statusId) == 0;
  sqlite3_close(database);
  database = ZELOSchedDBInit();
  int code = 0;
  char comment[32] = "";
  const bool ended =
      added && ZELOSchedDBSetStatus(database, statusId, 2, 7, commentOf(id).c_str()) == 0 &&
      ZELOSchedDBGetStatusByStatusID(database, statusId, &code, comment, sizeof(comment)) == 1;
  sqlite3_close(database);
  return ended && code == 7 && comment == commentOf(id);
}

pid_t startWriter(int writer) {
  const pid_t pid = fork();
  if (pid == 0) {
    bool good = true;
    for (int i = 0; i < kRowsOfWriter; ++i) good = addRow(writer * kRowsOfWriter + i) && good;
    _exit(good ? EXIT_SUCCESS : EXIT_FAILURE);
  }
  return pid;
}

TEST_F(RunsTest, NoRowOfSeveralProcessesIsLostOrMixedUp) {
  for (int round = 0; round < timesSoaked(1) && !HasFailure(); ++round) {
    newRound();
    const Stopwatch watch;
    std::vector<pid_t> writers;
    for (int writer = 0; writer < kWriters; ++writer) writers.push_back(startWriter(writer));
    for (const pid_t pid : writers) EXPECT_TRUE(ended(pid));
    const double seconds = watch.seconds();
    EXPECT_EQ(logged(), Lines{});
    const std::map<long, StatusRow> rows = rowsByTask(statusRows());
    EXPECT_EQ(rows.size(), static_cast<size_t>(kRows));
    for (const auto &[id, row] : rows) {
      EXPECT_EQ(row.pid, writers.at(static_cast<size_t>(id / kRowsOfWriter)));
      EXPECT_EQ(row.app, "app " + std::to_string(id));
      EXPECT_EQ(row.statusCode, 7);
      EXPECT_EQ(row.comment, commentOf(static_cast<int>(id)));
      if (HasFailure()) break;
    }
    printf("%d processes, %d rows begun and ended: %.2f s, %zu waits for the database\n", kWriters,
           kRows, seconds, recordedSleeps("usleep").size());
  }
}

// ---- memory

long residentKilobytes() {
  std::ifstream status("/proc/self/status");
  for (std::string word; status >> word;) {
    long kilobytes = 0;
    if (word == "VmRSS:" && status >> kilobytes) return kilobytes;
  }
  return 0;
}

TEST_F(RunsTest, ListingOverAndOverTakesNoMoreMemory) {
  if (!kAllocationsCanFail) GTEST_SKIP() << "the sanitizer's allocator keeps what is given back";
  constexpr size_t kTasks = 1000;
  constexpr int kListsBefore = 20;
  constexpr int kLists = 500;
  constexpr long kMostGrowthKilobytes = 512;
  std::vector<Task> tasks;
  for (const int id : idsUpTo(kTasks)) tasks.push_back(makeRunTask(id, "app", "true", {1, 1}));
  storeTasks(tasks);
  tasks.clear();
  const auto list = [](int times) {
    for (int i = 0; i < times; ++i) {
      ZELO_SCHED_TASK *head = nullptr;
      ASSERT_EQ(ZELOSchedTaskListGet(&head, nullptr), static_cast<int>(kTasks));
      ZELOSchedTaskListFree(&head);
    }
  };
  list(kListsBefore);
  const size_t allocated = mallinfo2().uordblks;
  const long resident = residentKilobytes();
  const Stopwatch watch;
  list(timesSoaked(kLists));
  const double seconds = watch.seconds();
  const long residentAfter = residentKilobytes();
  EXPECT_EQ(mallinfo2().uordblks, allocated);
  EXPECT_LE(residentAfter, resident + kMostGrowthKilobytes);
  printf(
      "%zu tasks listed %d times in %.2f s: VmRSS %ld kB before, %ld kB after; %zu and %zu bytes "
      "allocated\n",
      kTasks, timesSoaked(kLists), seconds, resident, residentAfter, allocated,
      mallinfo2().uordblks);
}

}  // namespace
}  // namespace support
