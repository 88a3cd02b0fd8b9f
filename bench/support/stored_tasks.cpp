#include "stored_tasks.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>
#include <zelocore.h>

#include <cstdint>
#include <cstdio>
#include <string>

#include "row.h"

namespace {

constexpr int kCapacity = 64;

void describe(ZELO_SCHED_TASK *task, int number) {
  task->ID = number;
  snprintf(task->Name, sizeof(task->Name), "Task %d", number);
  snprintf(task->App, sizeof(task->App), "ZELO.TOV.TaskScheduler.Script");
  snprintf(task->AppName, sizeof(task->AppName), "#schedule:script#");
  snprintf(task->Action, sizeof(task->Action), "Run a script");
  snprintf(task->Command, sizeof(task->Command), "/usr/local/bin/job --number %d", number);
  task->RunHour = static_cast<uint32_t>(number) % 24;
  task->RunMin = static_cast<uint32_t>(number) % 60;
}

void appendSection(std::string *text, int id, PSZHASH hash, PSZLIST keys) {
  *text += "[" + std::to_string(id) + "]\n";
  for (int i = 0; i < QLIBCSzListCount(keys); ++i) {
    const char *key = QLIBCSzListGet(keys, i);
    *text += std::string(key) + "=\"" + QLIBCSzHashGetValue(hash, key) + "\"\n";
  }
}

void write(const char *szPath, const std::string &text) {
  FILE *file = fopen(szPath, "w");
  orDie(file != nullptr && fwrite(text.data(), 1, text.size(), file) == text.size() &&
            fclose(file) == 0,
        "writing a section file");
}

// All but the last one are written as one text, since adding them one by one would take minutes.
// The last one is added by the platform, which gives the file its header and trailer.
void writeStore(int count, PSZHASH *hash, PSZLIST *keys) {
  const Task task = newTask(0);
  std::string text;
  for (int id = 1; id <= count; ++id) {
    describe(task.get(), id);
    orDie(ZELOSchedInitHashFromTask(hash, task.get()) == 0, "ZELOSchedInitHashFromTask");
    if (id == 1) {
      orDie(QLIBCSzHashEnumKey(*hash, keys) > 0, "QLIBCSzHashEnumKey");
    }
    if (id < count) {
      appendSection(&text, id, *hash, *keys);
    }
  }
  write(kStore, text);
  orDie(QLIBCFileAddSection(kStore, std::to_string(count).c_str(), *hash, 0) > 0,
        "QLIBCFileAddSection");
}

}  // namespace

Task newTask(int number) {
  Task task(ZELOSchedTaskAlloc());
  orDie(task != nullptr, "ZELOSchedTaskAlloc");
  describe(task.get(), number);
  task->ID = ZELO_SCHED_ID_NEW;
  return task;
}

void fillStore(int count) {
  unlink(kStore);
  if (count == 0) {
    return;
  }
  PSZHASH hash = QLIBCSzHashAlloc(kCapacity);
  PSZLIST keys = QLIBCSzListAlloc(kCapacity);
  writeStore(count, &hash, &keys);
  QLIBCSzListFree(keys);
  QLIBCSzHashFree(hash);
}

void growOld() {
  constexpr useconds_t kYouth = 1100000;
  usleep(kYouth);
}

void forgetStore() {
  constexpr char kOther[] = "/tmp/other_section_file";
  if (access(kOther, F_OK) != 0) {
    write(kOther, "[other]\n");
  }
  PSZLIST names = QLIBCSzListAlloc(1);
  orDie(QLIBCFileEnumSection(kOther, &names) == 1, "QLIBCFileEnumSection");
  QLIBCSzListFree(names);
}

void list(int count) {
  ZELO_SCHED_TASK *tasks = nullptr;
  orDie(ZELOSchedTaskListGet(&tasks, nullptr) == count, "ZELOSchedTaskListGet");
  ZELOSchedTaskListFree(&tasks);
}

size_t readStore() {
  const int file = open(kStore, O_RDONLY | O_CLOEXEC);
  struct stat info = {};
  orDie(file >= 0 && fstat(file, &info) == 0, "opening the store");
  const auto size = static_cast<size_t>(info.st_size);
  const auto contents = std::make_unique_for_overwrite<char[]>(size);
  orDie(read(file, contents.get(), size) == info.st_size && close(file) == 0, "reading the store");
  return size;
}
