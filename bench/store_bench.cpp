// What the task store costs, as ratios measured in one run: listing 10,000 tasks beside listing
// 1,000, and creating one task beside 1,000 others beside the work that a create cannot do without
// (three runs of /bin/cp on the store and one synced rewrite of the crontab).
//
//   scripts/sandbox build/bin/store_bench
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>
#include <zelocore.h>
#include <zelosched.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <string>
#include <vector>

namespace {

constexpr char kStore[] = "/tmp/scheduled_tasks";
constexpr char kCrontab[] = "/etc/crontab";
constexpr int kRepeats = 15;

double millisecondsOf(const std::function<void()> &work) {
  const auto start = std::chrono::steady_clock::now();
  work();
  const std::chrono::duration<double, std::milli> elapsed =
      std::chrono::steady_clock::now() - start;
  return elapsed.count();
}

double medianOf(std::vector<double> times) {
  std::sort(times.begin(), times.end());
  return times[times.size() / 2];
}

double median(const std::function<void()> &work) {
  std::vector<double> times;
  for (int i = 0; i < kRepeats; ++i) {
    times.push_back(millisecondsOf(work));
  }
  return medianOf(times);
}

void orDie(bool ok, const char *what) {
  if (!ok) {
    fprintf(stderr, "store_bench: %s failed: 0x%04X %s:%d\n", what,
            static_cast<unsigned>(QLIBCErrGet()), QLIBCErrorGetFile(), QLIBCErrorGetLine());
    exit(EXIT_FAILURE);
  }
}

ZELO_SCHED_TASK *newTask(int number) {
  ZELO_SCHED_TASK *task = ZELOSchedTaskAlloc();
  orDie(task != nullptr, "ZELOSchedTaskAlloc");
  snprintf(task->Name, sizeof(task->Name), "Task %d", number);
  snprintf(task->App, sizeof(task->App), "ZELO.TOV.TaskScheduler.Script");
  snprintf(task->AppName, sizeof(task->AppName), "#schedule:script#");
  snprintf(task->Action, sizeof(task->Action), "Run a script");
  snprintf(task->Command, sizeof(task->Command), "/usr/local/bin/job --number %d", number);
  task->RunHour = static_cast<uint32_t>(number % 24);
  task->RunMin = static_cast<uint32_t>(number % 60);
  return task;
}

// The file is built through the platform, a section at a time in one text, since creating so many
// tasks one by one is not what is measured here.
void fillStore(int count) {
  unlink(kStore);
  ZELO_SCHED_TASK *task = newTask(0);
  task->ID = 1;
  PSZHASH hash = QLIBCSzHashAlloc(64);
  std::string text;
  for (int id = 1; id <= count; ++id) {
    task->ID = id;
    snprintf(task->Name, sizeof(task->Name), "Task %d", id);
    orDie(ZELOSchedInitHashFromTask(&hash, task) == 0, "ZELOSchedInitHashFromTask");
    PSZLIST keys = QLIBCSzListAlloc(64);
    const int keyCount = QLIBCSzHashEnumKey(hash, &keys);
    text += "[" + std::to_string(id) + "]\n";
    for (int i = 0; i < keyCount; ++i) {
      const char *key = QLIBCSzListGet(keys, i);
      text += std::string(key) + "=\"" + QLIBCSzHashGetValue(hash, key) + "\"\n";
    }
    QLIBCSzListFree(keys);
  }
  QLIBCSzHashFree(hash);
  ZELOSchedTaskFree(task);
  FILE *file = fopen(kStore, "w");
  orDie(file != nullptr && fwrite(text.data(), 1, text.size(), file) == text.size() &&
            fclose(file) == 0,
        "writing the store");
}

void list() {
  ZELO_SCHED_TASK *tasks = nullptr;
  orDie(ZELOSchedTaskListGet(&tasks, nullptr) > 0, "ZELOSchedTaskListGet");
  ZELOSchedTaskListFree(&tasks);
}

void compareListing() {
  constexpr int kFew = 1000;
  constexpr int kMany = 10000;
  fillStore(kFew);
  const double few = median(list);
  fillStore(kMany);
  const double many = median(list);
  printf("list %d tasks: %.2f ms, list %d tasks: %.2f ms, ratio %.1f (to reach: at most 12)\n",
         kFew, few, kMany, many, many / few);
}

std::string readAll(const char *szPath) {
  std::string text;
  FILE *file = fopen(szPath, "r");
  orDie(file != nullptr, "fopen");
  char *line = nullptr;
  size_t capacity = 0;
  for (ssize_t length = 0; (length = getline(&line, &capacity, file)) >= 0;) {
    text.append(line, static_cast<size_t>(length));
  }
  free(line);
  fclose(file);
  return text;
}

// The crontab read and written line for line, synced, given its owner and mode and renamed.
void rewriteCrontab() {
  const std::string text = readAll(kCrontab);
  char path[] = "/etc/crontab.XXXXXX";
  const int descriptor = mkstemp(path);
  FILE *file = fdopen(descriptor, "w");
  orDie(file != nullptr && fwrite(text.data(), 1, text.size(), file) == text.size() &&
            fflush(file) == 0 && fsync(descriptor) == 0 && fchmod(descriptor, 0644) == 0 &&
            fclose(file) == 0 && rename(path, kCrontab) == 0,
        "rewriting the crontab");
}

void copy(const char *szSource, const char *szTarget) {
  orDie(QLIBCExec("/bin/cp", "-f", szSource, szTarget, nullptr) == 0, "/bin/cp");
}

void prescribedWork() {
  constexpr char kScratch[] = "/tmp/store_bench.scratch";
  copy(kStore, kScratch);
  copy(kScratch, "/usr/zelo/etc/scheduled_tasks");
  copy(kScratch, kStore);
  rewriteCrontab();
  unlink(kScratch);
}

void compareCreating() {
  constexpr int kOthers = 1000;
  fillStore(kOthers);
  std::vector<double> creating;
  std::vector<double> prescribed;
  ZELO_SCHED_TASK *task = newTask(kOthers);
  for (int i = 0; i < kRepeats; ++i) {
    task->ID = -1;
    creating.push_back(
        millisecondsOf([&] { orDie(ZELOSchedTaskCreate(task) >= 0, "ZELOSchedTaskCreate"); }));
    prescribed.push_back(millisecondsOf(prescribedWork));
    orDie(ZELOSchedTaskRemove(task->ID) == 0, "ZELOSchedTaskRemove");
  }
  ZELOSchedTaskFree(task);
  printf(
      "create one beside %d tasks: %.2f ms, the copies and the crontab alone: %.2f ms, "
      "ratio %.2f (to reach: at most 2)\n",
      kOthers, medianOf(creating), medianOf(prescribed), medianOf(creating) / medianOf(prescribed));
}

}  // namespace

int main() {
  orDie(getenv("ZELO_SANDBOX") != nullptr, "being in the sandbox (scripts/sandbox)");
  compareListing();
  compareCreating();
  return EXIT_SUCCESS;
}
