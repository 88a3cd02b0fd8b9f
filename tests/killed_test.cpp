// A process that changes tasks is killed, together with all that it has started: at random moments,
// and before each single call of a change. Nothing that it acknowledged is lost: one of the two
// copies of the store is whole and holds it, what was being changed is there as it was or as it was
// to be, nothing is built on a copy that was cut off, the crontab is the old or the new one, and no
// lock stays held.
//
// ZELO_SOAK_FACTOR=100 makes the random part that much longer, 0.1 shorter.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/file.h>
#include <sys/mount.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <map>
#include <optional>
#include <random>
#include <set>
#include <string>
#include <vector>

#include "captured_log.h"
#include "failing_calls.h"
#include "sandbox_fixture.h"
#include "tasks.h"
#include "zelocore.h"

namespace support {
namespace {

constexpr int kRandomKills = 1000;
constexpr unsigned kSeed = 20261121;
constexpr int kMostTasks = 12;
constexpr int kLongestLifeMicroseconds = 14000;
constexpr char kChangeLock[] = "/run/zeloscheduler.lock";

double soakFactor() {
  const char *factor = getenv("ZELO_SOAK_FACTOR");
  return factor != nullptr ? std::atof(factor) : 1;
}

// ---- the tasks, as acknowledged

// Names by id. A task's line in the crontab follows from its id alone.
using Tasks = std::map<long, std::string>;

struct Change {
  enum Kind : char { kCreate = 'c', kEdit = 'e', kRemove = 'r' } kind;
  long id;  // of a create, the one that it will get
  int number;

  std::string name() const { return "name " + std::to_string(number); }
  Tasks appliedTo(Tasks tasks) const {
    if (kind == kRemove) {
      tasks.erase(id);
    } else {
      tasks[id] = name();
    }
    return tasks;
  }
};

long smallestFreeId(const Tasks &tasks) {
  long id = 1;
  while (tasks.count(id) == 1) ++id;
  return id;
}

Task taskOf(const Change &change) {
  Task task = makeTask(change.name(), "true");
  task->ID = change.kind == Change::kCreate ? -1 : static_cast<int32_t>(change.id);
  return task;
}

bool make(const Change &change) {
  switch (change.kind) {
    case Change::kCreate: {
      const Task task = taskOf(change);
      return ZELOSchedTaskCreate(task.get()) == 0 && task->ID == change.id;
    }
    case Change::kEdit:
      return ZELOSchedTaskEdit(taskOf(change).get()) == 0;
    default:
      return ZELOSchedTaskRemove(change.id) == 0;
  }
}

// ---- what is found after a kill

// Nothing for a file that is cut off, or is not there.
std::optional<Tasks> tasksIn(const char *path) {
  PSZLIST names = QLIBCSzListAlloc(1);
  PSZHASH hash = QLIBCSzHashAlloc(1);
  std::optional<Tasks> tasks;
  const int count = QLIBCFileEnumSection(path, &names);
  if (count >= 0 && !(count == 0 && readFile(path).empty())) {
    tasks.emplace();
    for (int i = 0; i < count; ++i) {
      const char *section = QLIBCSzListGet(names, i);
      QLIBCHashRemoveAll(hash);
      EXPECT_EQ(QLIBCFileGetSection(path, section, &hash), 1);
      const char *name = QLIBCSzHashGetValue(hash, "name");
      EXPECT_NE(name, nullptr);
      (*tasks)[std::atol(section)] = name != nullptr ? name : "";
    }
  }
  QLIBCSzHashFree(hash);
  QLIBCSzListFree(names);
  return tasks;
}

std::set<std::string> crontabOf(const Tasks &tasks) {
  std::set<std::string> lines;
  for (const auto &[id, name] : tasks) {
    lines.insert("0\t0\t*\t*\t*\troot\t/tmp/zeloschedtask --run id=" + std::to_string(id));
  }
  return lines;
}

bool lockIsFree() {
  const int descriptor = open(kChangeLock, O_RDWR | O_CREAT | O_CLOEXEC, 0600);
  const bool isFree = flock(descriptor, LOCK_EX | LOCK_NB) == 0;
  close(descriptor);
  return isFree;
}

// Scratch copies of the store, temporary files beside them and beside the crontab.
int takeLeftoversAway() {
  int count = 0;
  for (const char *directory : {"/tmp", "/etc", "/usr/zelo/etc"}) {
    for (const auto &entry : std::filesystem::directory_iterator(directory)) {
      const std::string path = entry.path();
      if (path.starts_with("/tmp/scheduled_tasks.") || path.starts_with("/etc/crontab.")) {
        std::filesystem::remove(path);
        ++count;
      }
    }
  }
  return count;
}

class KilledTest : public SandboxTest {
 protected:
  void SetUp() override {
    SandboxTest::SetUp();
    ZELOSchedTaskListFree(nullptr);
    ASSERT_EQ(ZELOSchedBackendInit(), 0);
    takeLeftoversAway();
  }

  // Into a process group of its own. The fork is no call of the library's.
  static pid_t forkAlone() {
    const OwnWork own;
    const pid_t pid = fork();
    if (pid == 0) setpgid(0, 0);
    return pid;
  }

  // Until none of the killed processes is left.
  static void reap() {
    while (waitpid(-1, nullptr, 0) > 0 || errno == EINTR) {
    }
  }

  void build(int count) {
    for (int i = 0; i < count; ++i) {
      const Change change = {Change::kCreate, smallestFreeId(tasks_), number_++};
      ASSERT_TRUE(make(change));
      tasks_ = change.appliedTo(tasks_);
    }
  }

  // What was acknowledged is `tasks_`; the change that may have been under way is `pending`.
  void check(const std::optional<Change> &pending) {
    const Tasks changed = pending ? pending->appliedTo(tasks_) : tasks_;
    const std::optional<Tasks> working = tasksIn(kStore);
    const std::optional<Tasks> persistent = tasksIn(kPersistentStore);
    ASSERT_TRUE(working || persistent) << "no copy is whole";
    const auto isGood = [&](const Tasks &copy) { return copy == tasks_ || copy == changed; };
    EXPECT_TRUE(isGood(working ? *working : *persistent)) << "not the old tasks, not the new ones";
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

  // The last good copy is then put back, as it is after a boot.
  void checkThatNothingIsBuiltOnIt(const Tasks &persistent) {
    ++cutOff_;
    const std::string before = readFile(kPersistentStore);
    EXPECT_EQ(ZELOSchedTaskCreate(taskOf({Change::kCreate, -1, number_}).get()), -1);
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

  Tasks tasks_;
  std::optional<Tasks> persistent_;
  std::set<std::string> crontab_;
  int number_ = 0;
  int cutOff_ = 0;
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

// What the worker says: that it begins a change, and that the library has acknowledged it.
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
  const int kills = static_cast<int>(kRandomKills * soakFactor());
  int acknowledged = 0;
  int underWay = 0;
  for (int round = 0; round < kills && !HasFailure(); ++round) {
    SCOPED_TRACE("kill " + std::to_string(round));
    lookBefore();
    const Worker worker(tasks_, number_, kSeed + static_cast<unsigned>(round));
    realSleep(true);
    usleep(static_cast<useconds_t>(random.below(kLongestLifeMicroseconds)));
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
      int status = 0;
      {
        const KillingStep step(nth);
        const pid_t pid = forkAlone();
        if (pid == 0) _exit(make(change) ? 0 : 1);
        waitpid(pid, &status, 0);
        reap();
      }
      isDone = WIFEXITED(status);
      EXPECT_TRUE(!isDone || WEXITSTATUS(status) == 0);
      check(change);
    }
    printf("%c: %u calls\n", kind, nth - 1);
    EXPECT_GT(nth, 20U);
  }
}

// ---- in the middle of a copy

// In the place of /bin/cp: the copy that is to be cut off writes so many bytes and has the whole
// group killed. A count of copies that no change comes to lets all of them be made.
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
        int status = 0;
        waitpid(pid, &status, 0);
        reap();
        EXPECT_TRUE(WIFSIGNALED(status));
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
