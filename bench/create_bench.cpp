// Creating a task in a store of others, compared with the work that a create cannot do without:
// three runs of /bin/cp on the store and one synced rewrite of the crontab.
#include <sys/stat.h>
#include <unistd.h>
#include <zelocore.h>
#include <zelosched.h>

#include <cstdio>
#include <cstdlib>
#include <string>

#include "support/row.h"
#include "support/stored_tasks.h"

namespace {

constexpr char kCrontab[] = "/etc/crontab";

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

// The crontab read line for line, written, synced, given its mode and renamed.
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
  constexpr char kScratch[] = "/tmp/create_bench.scratch";
  copy(kStore, kScratch);
  copy(kScratch, "/usr/zelo/etc/scheduled_tasks");
  copy(kScratch, kStore);
  rewriteCrontab();
  unlink(kScratch);
}

// The task that is created and removed again, over and over.
Task &created() {
  static Task task;
  return task;
}

void create() {
  orDie(ZELOSchedTaskCreate(created().get()) >= 0, "ZELOSchedTaskCreate");
}

void removeCreated() {
  if (created()->ID != ZELO_SCHED_ID_NEW) {
    orDie(ZELOSchedTaskRemove(created()->ID) == 0, "ZELOSchedTaskRemove");
    created()->ID = ZELO_SCHED_ID_NEW;
  }
}

void fillStoreAndCrontab(int others) {
  fillStore(others);
  orDie(ZELOSchedTaskSync() >= 0, "ZELOSchedTaskSync");
  created() = newTask(others + 1);
}

void compareCreating(int others) {
  const std::string beside = " beside " + std::to_string(others);
  const auto setUp = [others] { fillStoreAndCrontab(others); };
  // The compared work starts from the files that a create leaves.
  const auto setUpCreated = [others] {
    fillStoreAndCrontab(others);
    create();
  };
  Row("ZELOSchedTaskCreate" + beside, Work{create, setUp, removeCreated})
      .atMost(1.3, "three cp, one synced crontab" + beside, Work{prescribedWork, setUpCreated});
}

}  // namespace

void makeRows() {
  for (const int others : {0, 100, 1000}) {
    compareCreating(others);
  }
}
