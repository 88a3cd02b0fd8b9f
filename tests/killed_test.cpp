// A process that changes tasks, power times or the record of runs is killed, together with its
// children: at random moments, and before each single call of a change. No acknowledged change is
// lost: the working or the persistent copy of the store is whole and has it. The task under change
// has its old or its new value, no change is based on a truncated copy, the crontab is the old or
// the new one, and no lock stays held. Every record is compared byte by byte, by a reader that is
// not the library's.
//
// ZELO_SOAK_FACTOR=100 makes the random part that much longer, 0.1 shorter.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sqlite3.h>
#include <sys/file.h>
#include <sys/mount.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <functional>
#include <map>
#include <optional>
#include <random>
#include <regex>
#include <set>
#include <string>
#include <vector>

#include "captured_log.h"
#include "failing_calls.h"
#include "fake_clock.h"
#include "power.h"
#include "sandbox_fixture.h"
#include "shared_memory.h"
#include "soak.h"
#include "status_db.h"
#include "tasks.h"
#include "zelocore.h"

namespace support {
namespace {

constexpr int kRandomKills = 1000;
constexpr unsigned kSeed = 20261121;
constexpr int kMostTasks = 12;
constexpr size_t kLongestLifeMicroseconds = 14000;  // at first
constexpr char kChangeLock[] = "/run/zeloscheduler.lock";

// ---- the tasks, as acknowledged

// Whole records, as they stand in the store, by id.
using Tasks = std::map<long, std::string>;

// Its keys in order, as the store has them.
std::string recordOf(const Task &task) {
  PSZHASH hash = QLIBCSzHashAlloc(1);
  PSZLIST keys = QLIBCSzListAlloc(1);
  EXPECT_EQ(ZELOSchedInitHashFromTask(&hash, task.get()), 0);
  QLIBCSzHashEnumKey(hash, &keys);
  std::map<std::string, std::string> values;
  for (int i = 0; i < QLIBCSzListCount(keys); ++i) {
    const char *key = QLIBCSzListGet(keys, i);
    values[key] = QLIBCSzHashGetValue(hash, key);
  }
  QLIBCSzListFree(keys);
  QLIBCSzHashFree(hash);
  std::string record;
  for (const auto &[key, value] : values) record += key + "=\"" + value + "\"\n";
  return record;
}

std::string valueIn(const std::string &record, const std::string &key) {
  for (const std::string &line : linesOf(record)) {
    const std::string beginning = key + "=\"";
    if (line.starts_with(beginning)) {
      return line.substr(beginning.size(), line.size() - beginning.size() - 1);
    }
  }
  return "(no " + key + ")";
}

struct Change {
  enum Kind : char { kCreate = 'c', kEdit = 'e', kRemove = 'r' } kind;
  long id;  // of a create, the one that it will get
  int number;

  // Its number shows in texts of several fields and in the crontab.
  Task task() const {
    constexpr int kMinutes = 60;
    constexpr int kHours = 24;
    const std::string text = std::to_string(number);
    Task task = makeTask("name " + text, "exit " + text);
    setText(task->AppArgs, "arguments " + text);
    task->RunMin = static_cast<uint32_t>(number % kMinutes);
    task->RunHour = static_cast<uint32_t>(number / kMinutes % kHours);
    task->ID = static_cast<int32_t>(id);
    return task;
  }
  Tasks appliedTo(Tasks tasks) const {
    if (kind == kRemove) {
      tasks.erase(id);
    } else {
      tasks[id] = recordOf(task());
    }
    return tasks;
  }
};

long smallestFreeId(const Tasks &tasks) {
  long id = 1;
  while (tasks.count(id) == 1) ++id;
  return id;
}

bool make(const Change &change) {
  const Task task = change.task();
  switch (change.kind) {
    case Change::kCreate:
      task->ID = ZELO_SCHED_ID_NEW;
      return ZELOSchedTaskCreate(task.get()) == 0 && task->ID == change.id;
    case Change::kEdit:
      return ZELOSchedTaskEdit(task.get()) == 0;
    default:
      return ZELOSchedTaskRemove(change.id) == 0;
  }
}

// ---- what is found after a kill

bool isWholeForTheLibrary(const char *path) {
  PSZLIST names = QLIBCSzListAlloc(1);
  const int count = QLIBCFileEnumSection(path, &names);
  QLIBCSzListFree(names);
  return count > 0 || (count == 0 && !readFile(path).empty());
}

// Nothing for a file that is cut off, or is not there.
std::optional<Tasks> tasksIn(const char *path) {
  static const std::regex section(R"(\[(\d+)\])");
  static const std::regex end(R"(# end of file: (\d+) sections, checksum [0-9a-f]{16})");
  const std::vector<std::string> lines = linesOf(readFile(path));
  std::optional<Tasks> tasks;
  std::smatch match;
  if (lines.size() > 1 && std::regex_match(lines.back(), match, end)) {
    const size_t count = std::stoul(match[1]);
    tasks.emplace();
    std::string *record = nullptr;
    for (size_t i = 1; i + 1 < lines.size(); ++i) {
      if (lines[i].starts_with('[') && std::regex_match(lines[i], match, section)) {
        record = &(*tasks)[std::stol(match[1])];
        EXPECT_EQ(*record, "") << "twice: " << lines[i];
      } else if (record != nullptr) {
        record->append(lines[i]).append("\n");
      }
    }
    EXPECT_EQ(tasks->size(), count) << path;
  }
  EXPECT_EQ(isWholeForTheLibrary(path), tasks.has_value()) << path;
  return tasks;
}

std::set<std::string> crontabOf(const Tasks &tasks) {
  std::set<std::string> lines;
  for (const auto &[id, record] : tasks) {
    lines.insert(valueIn(record, "run min") + "\t" + valueIn(record, "run hour") +
                 "\t*\t*\t*\troot\t/tmp/zeloschedtask --run id=" + std::to_string(id));
  }
  return lines;
}

bool lockIsFree() {
  const int descriptor = open(kChangeLock, O_RDWR | O_CREAT | O_CLOEXEC, 0600);
  const bool isFree = flock(descriptor, LOCK_EX | LOCK_NB) == 0;
  close(descriptor);
  return isFree;
}

constexpr const char *kDirectories[] = {"/tmp", "/etc", "/usr/zelo/etc"};

std::set<std::string> allNames() {
  std::set<std::string> names;
  for (const char *directory : kDirectories) {
    for (const auto &entry : std::filesystem::directory_iterator(directory)) {
      names.insert(entry.path());
    }
  }
  return names;
}

bool isKept(const std::string &path) {
  return path == kStore || path == kPersistentStore || path == support::kLastGoodStore ||
         path == support::kTaskProgram || path == kPowerSchedule || path == kStatusDatabase ||
         path == std::string(kStatusDatabase) + "-journal";
}

class KilledTest : public SandboxTest {
 protected:
  void SetUp() override {
    SandboxTest::SetUp();
    ZELOSchedTaskListFree(nullptr);
    ASSERT_EQ(ZELOSchedBackendInit(), 0);
    names_ = allNames();
  }

  // What is there now and was not before: scratch copies of the store, and temporary files beside
  // what was being changed.
  int takeLeftoversAway() const {
    static const std::regex left(R"(/tmp/scheduled_tasks\.tmp\.\d+(\.\w{6})?|/etc/crontab\.\w{6}|)"
                                 R"(/tmp/zeloscheduler\.\w{6}|)"
                                 R"(/usr/zelo/etc/scheduled_tasks\.last-good\.\w{6}|)"
                                 R"(/usr/zelo/etc/power_sched\.conf\.\w{6})");
    int count = 0;
    for (const std::string &path : allNames()) {
      if (names_.count(path) == 1 || isKept(path)) continue;
      EXPECT_TRUE(std::regex_match(path, left)) << path << " is left";
      std::filesystem::remove_all(path);
      ++count;
    }
    return count;
  }

  // Into a process group of its own. This fork does not count as a call of the library.
  static pid_t forkAlone() {
    const OwnWork own;
    const pid_t pid = fork();
    if (pid == 0) setpgid(0, 0);
    return pid;
  }

  // Until none of the killed processes is left. Does not count as a call of the library either.
  static void reap() {
    const OwnWork own;
    while (waitpid(-1, nullptr, 0) > 0 || errno == EINTR) {
    }
  }

  static int statusOf(pid_t pid) {
    const OwnWork own;
    int status = 0;
    waitpid(pid, &status, 0);
    return status;
  }

  // Runs `act` in a process that is killed before its nth call, with its children. Returns its wait
  // status; with fewer calls it exits by itself.
  static int killBefore(unsigned nth, const std::function<bool()> &act) {
    const KillingStep step(nth);
    const pid_t pid = forkAlone();
    if (pid == 0) _exit(act() ? 0 : 1);
    const int status = statusOf(pid);
    reap();
    return status;
  }

  void build(int count) {
    for (int i = 0; i < count; ++i) {
      const Change change = {Change::kCreate, smallestFreeId(tasks_), number_++};
      ASSERT_TRUE(make(change));
      tasks_ = change.appliedTo(tasks_);
    }
  }

  // `tasks_` are the acknowledged tasks, `pending` is the change that may have been under way.
  void check(const std::optional<Change> &pending) {
    const Tasks changed = pending ? pending->appliedTo(tasks_) : tasks_;
    const std::optional<Tasks> working = tasksIn(kStore);
    const std::optional<Tasks> persistent = tasksIn(kPersistentStore);
    ASSERT_TRUE(working || persistent) << "no copy is whole";
    const auto isGood = [&](const Tasks &copy) { return copy == tasks_ || copy == changed; };
    EXPECT_TRUE(isGood(working ? *working : *persistent)) << "not the old tasks, not the new ones";
    // After a loss of power now, only these two copies are left.
    const std::optional<Tasks> kept = persistent ? persistent : tasksIn(support::kLastGoodStore);
    EXPECT_TRUE(kept) << "nothing is kept for the next boot";
    EXPECT_TRUE(!kept || persistent || isGood(*kept) || kept == kept_);
    kept_ = kept;
    // The one for the next boot may still be that of a change that was never acknowledged.
    EXPECT_TRUE(!persistent || isGood(*persistent) || persistent == persistent_);
    persistent_ = persistent;
    checkCrontab(changed);
    EXPECT_TRUE(lockIsFree());
    if (!working) checkThatNothingIsBuiltOnIt(*persistent);
    leftovers_ += takeLeftoversAway();
    tasks_ = tasksIn(kStore).value_or(Tasks{{-1, "the store is still cut off"}});
  }

  void checkCrontab(const Tasks &changed) {
    const std::vector<std::string> lines = crontabLines();
    const std::set<std::string> found(lines.begin(), lines.end());
    EXPECT_TRUE(readFile(kCrontab).starts_with(kPlainCrontab));
    EXPECT_EQ(found.size(), lines.size());
    EXPECT_TRUE(found == crontabOf(changed) || found == crontab_ || found == crontabOf(tasks_))
        << "not the old one and not the new one: " << testing::PrintToString(found) << " of tasks "
        << testing::PrintToString(tasks_) << " or " << testing::PrintToString(changed);
  }

  // The persistent copy is then put back, as it is after a boot.
  void checkThatNothingIsBuiltOnIt(const Tasks &persistent) {
    ++cutOff_;
    const std::string before = readFile(kPersistentStore);
    EXPECT_FALSE(make({Change::kCreate, -1, number_}));
    EXPECT_EQ(errorRecord().code, 0x0B00);
    EXPECT_EQ(readFile(kPersistentStore), before);
    std::filesystem::remove(kStore);
    writeFile(kStore, before);
    const std::optional<Tasks> restored = tasksIn(kStore);
    ASSERT_TRUE(restored);
    EXPECT_EQ(*restored, persistent);
  }

  // What stands before the next change. The crontab may lag behind, after an earlier kill.
  void lookBefore() {
    const std::vector<std::string> lines = crontabLines();
    crontab_ = {lines.begin(), lines.end()};
  }

  std::set<std::string> names_;
  Tasks tasks_;
  std::optional<Tasks> persistent_;
  std::set<std::string> crontab_;
  int number_ = 0;
  int cutOff_ = 0;
  std::optional<Tasks> kept_;
  int leftovers_ = 0;
};

// ---- at random moments

class RandomChanges {
 public:
  explicit RandomChanges(unsigned seed) : random_(seed) {}

  Change next(const Tasks &tasks, int number) {
    const size_t choice = below(3);
    if (tasks.empty() || (choice == 0 && tasks.size() < kMostTasks)) {
      return {Change::kCreate, smallestFreeId(tasks), number};
    }
    const auto chosen = std::next(tasks.begin(), static_cast<long>(below(tasks.size())));
    return {choice == 1 ? Change::kEdit : Change::kRemove, chosen->first, number};
  }
  size_t below(size_t bound) { return random_() % bound; }

 private:
  std::mt19937 random_;
};

// What the worker reports: that it begins a change, and that the library has acknowledged it.
struct Word {
  Change change;
  bool isDone;
};

class Worker {
 public:
  Worker(const Tasks &tasks, int number, unsigned seed) {
    int ends[2];
    if (pipe(ends) != 0) std::abort();
    pid_ = fork();
    if (pid_ == 0) {
      setpgid(0, 0);
      work(ends[1], tasks, number, seed);
    }
    setpgid(pid_, pid_);
    close(ends[1]);
    reading_ = ends[0];
  }
  ~Worker() { close(reading_); }
  Worker(const Worker &) = delete;
  Worker &operator=(const Worker &) = delete;

  void killAll() const { kill(-pid_, SIGKILL); }

  // Everything that was said until the end.
  std::vector<Word> words() const {
    std::vector<Word> words;
    Word word;
    while (read(reading_, &word, sizeof(word)) == static_cast<ssize_t>(sizeof(word))) {
      words.push_back(word);
    }
    return words;
  }

 private:
  [[noreturn]] static void work(int writing, Tasks tasks, int number, unsigned seed) {
    RandomChanges changes(seed);
    for (;;) {
      const Change change = changes.next(tasks, number++);
      say(writing, {change, false});
      if (!make(change)) _exit(1);
      say(writing, {change, true});
      tasks = change.appliedTo(tasks);
    }
  }
  static void say(int writing, const Word &word) {
    if (write(writing, &word, sizeof(word)) != static_cast<ssize_t>(sizeof(word))) _exit(1);
  }

  pid_t pid_ = -1;
  int reading_ = -1;
};

TEST_F(KilledTest, AtAnyMomentNothingAcknowledgedIsLost) {
  RandomChanges random(kSeed);
  build(kMostTasks / 2);
  const int kills = timesSoaked(kRandomKills);
  int acknowledged = 0;
  int underWay = 0;
  size_t longestLife = kLongestLifeMicroseconds;
  for (int round = 0; round < kills && !HasFailure(); ++round) {
    SCOPED_TRACE("kill " + std::to_string(round));
    lookBefore();
    // About one change is acknowledged in each life, however slow the machine is at the moment.
    const size_t step = longestLife / 10;
    longestLife = acknowledged < round ? longestLife + step + 1 : longestLife - step;
    const Worker worker(tasks_, number_, kSeed + static_cast<unsigned>(round));
    realSleep(true);
    usleep(static_cast<useconds_t>(random.below(longestLife)));
    realSleep(false);
    worker.killAll();
    reap();
    std::optional<Change> pending;
    for (const Word &word : worker.words()) {
      number_ = word.change.number + 1;
      if (word.isDone) {
        tasks_ = word.change.appliedTo(tasks_);
        ++acknowledged;
        pending.reset();
      } else {
        pending = word.change;
      }
    }
    underWay += pending ? 1 : 0;
    check(pending);
  }
  printf(
      "%d kills (seed %u): %d changes acknowledged, %d under way; %d working copies cut off, "
      "%d temporary files left\n",
      kills, kSeed, acknowledged, underWay, cutOff_, leftovers_);
  EXPECT_GT(acknowledged, kills / 10);
  EXPECT_GT(underWay, kills / 2);
  EXPECT_LE(leftovers_, 3 * underWay);
}

// ---- before each call

TEST_F(KilledTest, BeforeEachCallNothingAcknowledgedIsLost) {
  build(3);
  const std::string store = readFile(kStore);
  const std::string crontab = readFile(kCrontab);
  for (const Change::Kind kind : {Change::kCreate, Change::kEdit, Change::kRemove}) {
    const Change change = {kind, kind == Change::kCreate ? 4 : 1, number_++};
    unsigned nth = 0;
    for (bool isDone = false; !isDone && !HasFailure();) {
      SCOPED_TRACE(std::string(1, kind) + " killed before call " + std::to_string(++nth));
      for (const char *path : {kStore, kPersistentStore}) writeFile(path, store);
      writeFile(kCrontab, crontab);
      tasks_ = *tasksIn(kStore);
      lookBefore();
      const int status = killBefore(nth, [&] { return make(change); });
      isDone = WIFEXITED(status);
      EXPECT_TRUE(!isDone || WEXITSTATUS(status) == 0);
      check(change);
    }
    printf("%c: %u calls\n", kind, nth - 1);
    EXPECT_GT(nth, 20U);
  }
}

// ---- a working copy that was cut off

struct Attempt {
  const char *name;
  Change change;
};

const Attempt kAttempts[] = {
    {"create", {Change::kCreate, -1, 50}},
    {"edit", {Change::kEdit, 2, 51}},
    {"edit of one that is not there", {Change::kEdit, 9, 52}},
    {"remove", {Change::kRemove, 2, 0}},
};

class CutOffTest : public KilledTest {
 protected:
  void SetUp() override {
    KilledTest::SetUp();
    build(4);
    store_ = readFile(kStore);
    crontabText_ = readFile(kCrontab);
    ASSERT_EQ(readFile(kPersistentStore), store_);
  }

  // In its header, in the first section and in the last, and in the line that ends it.
  std::vector<size_t> lengths() const {
    constexpr size_t kHeader = 19;
    const size_t size = store_.size();
    return {0, 1, kHeader, store_.find("\n[2]"), size / 2, store_.rfind("\n# end") + 1, size - 2};
  }

  void cutOff(size_t length) {
    std::filesystem::remove(kStore);
    writeFile(kStore, store_.substr(0, length));
    clearLog();
    QLIBCErrSetEx(0, "", 0);
  }

  void expectAllAsItWas(size_t length) const {
    EXPECT_EQ(readFile(kStore), store_.substr(0, length));
    EXPECT_EQ(readFile(kPersistentStore), store_);
    EXPECT_EQ(readFile(kCrontab), crontabText_);
    EXPECT_EQ(takeLeftoversAway(), 0);
    EXPECT_TRUE(lockIsFree());
  }

  std::string store_;
  std::string crontabText_;
};

TEST_F(CutOffTest, NothingIsBuiltOnIt) {
  for (const size_t length : lengths()) {
    for (const Attempt &attempt : kAttempts) {
      SCOPED_TRACE(attempt.name + std::string(", cut off after ") + std::to_string(length));
      cutOff(length);
      EXPECT_FALSE(make(attempt.change));
      EXPECT_EQ(errorRecord().code, 0x0B00);
      expectAllAsItWas(length);
    }
  }
}

TEST_F(CutOffTest, NoCrontabIsWrittenFromIt) {
  for (const size_t length : lengths()) {
    SCOPED_TRACE(length);
    cutOff(length);
    EXPECT_EQ(ZELOSchedTaskSync(), 0);
    const std::vector<std::string> lines = logged();
    ASSERT_FALSE(lines.empty());
    EXPECT_TRUE(lines[0].starts_with("backend_zeloschedule.cpp:N get task list failed. [0x0B00 "))
        << lines[0];
    expectAllAsItWas(length);
  }
}

// ---- power times

class KilledPowerTest : public KilledTest {
 protected:
  using Lines = std::multiset<std::string>;

  struct Files {
    std::string list = readFile(kPowerSchedule);
    std::string crontab = readFile(kCrontab);
    std::string alarm = readFile(kWakeAlarm);

    // The kernel shows nothing where no alarm is armed.
    std::string armed() const { return alarm == "0\n" ? "" : alarm; }
    Lines lines() const {
      const std::vector<std::string> all = linesOf(crontab);
      return {all.begin(), all.end()};
    }
    void putBack() const {
      writeFile(kPowerSchedule, list);
      writeFile(kCrontab, crontab);
      writeFile(kWakeAlarm, alarm);
    }
  };

  void SetUp() override {
    KilledTest::SetUp();
    std::filesystem::remove_all(kPowerSchedule);
    haveClock();
    setClock("2026-11-21 12:00");
    build(2);
    off_ = createPower(powerTask("poweroff", 22));
    createPower(powerTask("poweroff", 23));
    on_ = createPower(powerTask("poweron", 7));
  }
  void TearDown() override {
    std::filesystem::remove_all(kPowerSchedule);
    KilledTest::TearDown();
  }

  static Task powerTask(const char *direction, uint32_t hour) {
    Task task = makeTask("power", "");
    task->Backend = ZELO_SCHED_BACKEND_AUTOPOWER;
    setText(task->AppArgs, direction);
    setText(task->Week, "1111111");
    task->RunHour = hour;
    return task;
  }
  static long createPower(const Task &task) {
    return ZELOSchedTaskCreate(task.get()) == 0 ? long{task->ID} : -1;
  }

  static bool isPowerLine(const std::string &line) {
    return line.find("zelo_poweroff_feasible_check") != std::string::npos;
  }

  // The lines of power-off times are taken out and put back one by one. Every other line stays, and
  // none comes twice.
  static void expectLinesOfEither(const Lines &found, const Files &before, const Files &after) {
    const Lines old = before.lines();
    const Lines changed = after.lines();
    for (const std::string &line : found) {
      EXPECT_TRUE(found.count(line) == old.count(line) || found.count(line) == changed.count(line))
          << line;
    }
    for (const std::string &line : old) {
      EXPECT_TRUE(isPowerLine(line) || found.count(line) == old.count(line)) << line;
    }
  }

  // Whether the crontab is neither the old nor the new one.
  bool checkFiles(const Files &before, const Files &after, bool isDone) {
    const Files found;
    EXPECT_TRUE(found.list == after.list || (!isDone && found.list == before.list)) << found.list;
    const Lines lines = found.lines();
    expectLinesOfEither(lines, before, after);
    const bool isBetween = lines != before.lines() && lines != after.lines();
    EXPECT_TRUE(!isDone || lines == after.lines());
    EXPECT_TRUE(lockIsFree());
    leftovers_ += takeLeftoversAway();

    const Files &wanted = found.list == after.list ? after : before;
    EXPECT_EQ(ZELOSchedTaskSync(), 0);
    const Files synced;
    EXPECT_EQ(synced.lines(), wanted.lines());
    EXPECT_EQ(synced.armed(), wanted.armed());
    EXPECT_EQ(synced.list, found.list);
    return isBetween;
  }

  void killAtEachCallOf(const char *name, const std::function<bool()> &act) {
    const unsigned stride = isShortRun() ? 9 : 1;  // a short run takes some of them
    SCOPED_TRACE(name);
    const Files before;
    ASSERT_TRUE(act());
    const Files after;
    ASSERT_NE(before.list, after.list);
    before.putBack();
    int between = 0;
    unsigned nth = 1;
    for (bool isDone = false; !isDone && !HasFailure(); nth += stride) {
      SCOPED_TRACE("killed before call " + std::to_string(nth));
      const int status = killBefore(nth, act);
      isDone = WIFEXITED(status);
      EXPECT_TRUE(!isDone || WEXITSTATUS(status) == 0);
      between += checkFiles(before, after, isDone) ? 1 : 0;
      before.putBack();
    }
    printf("%-24s %u kills, %d times only a part of the power-off lines stood until the sync\n",
           name, (nth - 1) / stride - 1, between);
    EXPECT_GT(nth, 20U);
  }

  long off_ = 0;
  long on_ = 0;
};

TEST_F(KilledPowerTest, BeforeEachCallTheListIsOldOrNewAndASyncMakesTheRestFit) {
  killAtEachCallOf("create a power-off time",
                   [] { return createPower(powerTask("poweroff", 20)) > 0; });
  killAtEachCallOf("create a power-on time",
                   [] { return createPower(powerTask("poweron", 6)) > 0; });
  killAtEachCallOf("remove a power-off time", [&] { return ZELOSchedTaskRemove(off_) == 0; });
  killAtEachCallOf("remove a power-on time", [&] { return ZELOSchedTaskRemove(on_) == 0; });
}

// ---- the record of runs

class KilledStatusTest : public KilledTest {
 protected:
  // How far the process that is killed has come.
  enum Progress : int { kNothing, kRecorded, kEnded };

  static constexpr long kTask = 7;
  static constexpr int kExitCode = 3;
  static constexpr char kComment[] = "it is done";

  void SetUp() override {
    KilledTest::SetUp();
    if (sqlite3 *database = ZELOSchedDBInit()) sqlite3_close(database);
    for (const long task : {5L, 6L}) {
      addStatusRow({.pid = 1, .timestamp = 9, .app = "before", .taskId = task, .statusCode = 3});
    }
    before_ = statusRows();
    ASSERT_EQ(before_.size(), 2U);
    for (const std::string &path : paths()) files_[path] = readFile(path);
  }
  void TearDown() override {
    for (const std::string &path : paths()) std::filesystem::remove(path);
    KilledTest::TearDown();
  }

  static std::vector<std::string> paths() {
    return {kStatusDatabase, std::string(kStatusDatabase) + "-journal"};
  }
  void putBack() const {
    for (const auto &[path, contents] : files_) {
      std::filesystem::remove(path);
      writeFile(path, contents, 0600);
    }
  }

  static bool recordARun(Progress *progress) {
    sqlite3 *database = ZELOSchedDBInit();
    const Task task = makeTask("run", "true");
    task->ID = kTask;
    int id = 0;
    if (database == nullptr || ZELOSchedDBAddRecord(database, task.get(), &id) != 0) return false;
    *progress = kRecorded;
    if (ZELOSchedDBSetStatus(database, id, ZELO_SCHED_STATUS_RUNNING, kExitCode, kComment) != 0) {
      return false;
    }
    *progress = kEnded;
    return sqlite3_close(database) == SQLITE_OK;
  }

  static Progress progressOf(const StatusRow &row) {
    EXPECT_EQ(row.taskId, kTask);
    EXPECT_GT(row.pid, 0);
    EXPECT_GT(row.timestamp, 0);
    if (row.statusCode == ZELO_SCHED_STATUS_RUNNING && !row.comment) return kRecorded;
    EXPECT_EQ(row.statusCode, kExitCode);
    EXPECT_EQ(row.comment, kComment);
    return kEnded;
  }

  // As the next process finds them.
  static Progress checkRows(const std::vector<StatusRow> &before) {
    sqlite3 *database = ZELOSchedDBInit();
    EXPECT_NE(database, nullptr);
    std::string verdict;
    sqlite3_exec(
        database, "PRAGMA integrity_check",
        [](void *text, int, char **values, char **) {
          static_cast<std::string *>(text)->append(values[0]);
          return 0;
        },
        &verdict, nullptr);
    EXPECT_EQ(verdict, "ok");
    sqlite3_close(database);
    std::vector<StatusRow> rows = statusRows();
    Progress found = kNothing;
    if (rows.size() == before.size() + 1) {
      found = progressOf(rows.back());
      rows.pop_back();
    }
    EXPECT_EQ(rows, before);
    return found;
  }

  std::vector<StatusRow> before_;
  std::map<std::string, std::string> files_;
};

TEST_F(KilledStatusTest, BeforeEachCallNoRowIsLostOrHalfThere) {
  auto *progress = static_cast<Progress *>(sharedMemory(sizeof(Progress)));
  std::map<Progress, int> counts;
  unsigned nth = 0;
  for (bool isDone = false; !isDone && !HasFailure();) {
    SCOPED_TRACE("killed before call " + std::to_string(++nth));
    putBack();
    *progress = kNothing;
    const int status = killBefore(nth, [&] { return recordARun(progress); });
    isDone = WIFEXITED(status);
    EXPECT_TRUE(!isDone || WEXITSTATUS(status) == 0);
    const Progress found = checkRows(before_);
    EXPECT_GE(found, *progress) << "what was acknowledged is lost";
    EXPECT_LE(found, std::min(*progress + 1, int{kEnded}));
    EXPECT_EQ(takeLeftoversAway(), 0);
    ++counts[found];
  }
  printf("%u calls: %d times without the row, %d times with a running one, %d with an ended one\n",
         nth - 1, counts[kNothing], counts[kRecorded], counts[kEnded]);
  EXPECT_GT(counts[kNothing], 1);
  EXPECT_GT(counts[kRecorded], 1);
}

// ---- in the middle of a copy

// Replaces /bin/cp: the copy that is to be truncated writes so many bytes and kills the process
// group. A number of copies that no change reaches lets all of them be made.
constexpr char kCopyProgram[] = "/usr/bin/cp";
constexpr char kRealCopy[] = "/run/killed_test.cp";
constexpr char kPlan[] = "/run/killed_test.plan";
constexpr char kStandIn[] =
    "#!/bin/sh\n"
    "read nth bytes < /run/killed_test.plan\n"
    "nth=$((nth - 1))\n"
    "echo $nth $bytes > /run/killed_test.plan\n"
    "if [ $nth = 0 ]; then head -c $bytes \"$2\" > \"$3\"; kill -9 0; fi\n"
    "exec /run/killed_test.cp \"$@\"\n";

class CutOffCopyTest : public KilledTest {
 protected:
  void SetUp() override {
    KilledTest::SetUp();
    std::filesystem::copy_file(kCopyProgram, kRealCopy,
                               std::filesystem::copy_options::overwrite_existing);
    writeFile("/run/killed_test.stand_in", kStandIn, 0755);
    ASSERT_EQ(mount("/run/killed_test.stand_in", kCopyProgram, nullptr, MS_BIND, nullptr), 0);
  }
  void TearDown() override {
    umount(kCopyProgram);
    KilledTest::TearDown();
  }
};

TEST_F(CutOffCopyTest, WhereverItStopsAWholeCopyStands) {
  constexpr int kCopies = 3;  // to the scratch file, the persistent and the working copy
  writeFile(kPlan, "1000000 0\n");
  build(4);
  const size_t size = readFile(kStore).size();
  for (int nth = 1; nth <= kCopies; ++nth) {
    for (const size_t bytes : {size_t{0}, size_t{1}, size / 2, size - 1}) {
      for (const Change::Kind kind : {Change::kCreate, Change::kEdit, Change::kRemove}) {
        SCOPED_TRACE("copy " + std::to_string(nth) + " after " + std::to_string(bytes) + " bytes");
        const Change change = {kind, kind == Change::kCreate ? smallestFreeId(tasks_) : 2,
                               number_++};
        lookBefore();
        writeFile(kPlan, std::to_string(nth) + " " + std::to_string(bytes) + "\n");
        const pid_t pid = forkAlone();
        if (pid == 0) _exit(make(change) ? 0 : 1);
        EXPECT_TRUE(WIFSIGNALED(statusOf(pid)));
        reap();
        writeFile(kPlan, "1000000 0\n");
        check(change);
        if (tasks_.count(2) == 0) build(1);
        if (HasFailure()) return;
      }
    }
  }
  printf("%d working copies cut off\n", cutOff_);
  EXPECT_GT(cutOff_, 0);
}

// ---- what stays behind

TEST_F(KilledTest, AScratchFileGoesWithTheNextChangeOfAProcessOfItsNumber) {
  const std::string scratch = "/tmp/scheduled_tasks.tmp." + std::to_string(getpid());
  writeFile(scratch, "left by one that was killed");
  build(1);
  EXPECT_FALSE(fileExists(scratch));
}

TEST_F(KilledTest, AScratchFileOfAnotherProcessIsInNobodysWay) {
  const std::string scratch = "/tmp/scheduled_tasks.tmp.1";
  writeFile(scratch, "left by one that was killed");
  build(2);
  EXPECT_TRUE(fileExists(scratch));
  EXPECT_EQ(tasksIn(kStore)->size(), 2U);
}

}  // namespace
}  // namespace support
