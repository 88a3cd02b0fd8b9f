// Ordinary tasks: each is a section of a section file, and is started by the cron daemon from a
// line in the system crontab. All these lines are rewritten after every change.
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/types.h>
#include <unistd.h>
#include <zelocore.h>
#include <zelosched.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>

#include "id_array.h"
#include "new_file.h"
#include "sched_guards.h"
#include "sched_hash.h"
#include "sched_record.h"
#include "sched_report.h"
#include "sched_run_environment.h"
#include "sched_shared_names.h"
#include "sched_store_lock.h"
#include "sched_text.h"
#include "sched_trigger_clock.h"
#include "sched_wait_status.h"
#include "schedule_cron.h"
#include "store_state.h"

namespace {

constexpr char kName[] = "zeloschedule";

// Every read uses the working copy. The persistent one is for the next boot, and the last good one
// for a loss of power while the persistent one is written.
constexpr char kWorkingCopy[] = "/tmp/scheduled_tasks";
constexpr const auto &kPersistentCopy = kSchedPersistentStore;
constexpr char kPersistentDirectory[] = "/usr/zelo/etc";
constexpr const auto &kLastGoodCopy = kSchedLastGoodStore;
constexpr char kScratchPrefix[] = "/tmp/scheduled_tasks.tmp";
constexpr char kCopyProgram[] = "/bin/cp";
constexpr mode_t kStoreMode = 0644;

constexpr char kCrontab[] = "/etc/crontab";
constexpr char kCrontabDirectory[] = "/etc";
constexpr char kCronPidFile[] = "/var/run/crond.pid";
constexpr char kSignalCron[] = "/bin/kill -HUP `/bin/cat /var/run/crond.pid` > /dev/null 2>&1";

constexpr int kContainerCapacity = 1024;
constexpr int kFound = 1;
constexpr int kNotFound = 0;

class SectionName {
 public:
  explicit SectionName(long id) { snprintf(text_, sizeof(text_), "%ld", id); }
  const char *c_str() const { return text_; }

 private:
  char text_[32];
};

// ---- reading the store --------------------------------------------------------------------------

// 1 read, 0 there is no such section, -1 on failure.
int readSection(const char *szSection, HashGuard *hash) {
  QLIBCHashRemoveAll(hash->get());
  const int result = QLIBCFileGetSection(kWorkingCopy, szSection, hash->handle());
  if (result < 0) {
    SCHED_LOG_CALLEE("Get section [%s] from [%s] failed. ", szSection, kWorkingCopy);
    return -1;
  }
  return result > 0 ? kFound : kNotFound;
}

int convert(ZELO_SCHED_TASK *pTask, PSZHASH hash) {
  if (ZELOSchedInitTaskFromHash(pTask, hash) < 0) {
    SCHED_LOG_CALLEE("Init task from hash failed. ");
    return -1;
  }
  return 0;
}

int setNextTrigger(ZELO_SCHED_TASK *pTask, SchedTriggerClock *clock) {
  if (schedNextTriggerTime(pTask, clock) < 0) {
    SCHED_LOG_CALLEE("Failed to obtain next trigger time. id:[%ld]. ",
                     static_cast<long>(pTask->ID));
    return -1;
  }
  return 0;
}

// Iterates over the sections of the store. One that cannot be read does not end the iteration, and
// one that was removed since the names were listed is skipped.
class StoreWalk {
 public:
  // The number of sections, 0 without a store; -1 when they cannot be listed or memory is short.
  int open() {
    state_ = schedLookAtStore();
    if (state_ == SchedNameState::kFree) {
      return 0;
    }
    if (state_ == SchedNameState::kForeign) {
      SCHED_SET_ERROR(kErrOpen);
      return -1;
    }
    *names_.handle() = QLIBCSzListAlloc(kContainerCapacity);
    *hash_.handle() = QLIBCSzHashAlloc(kContainerCapacity);
    if (!names_ || !hash_) {
      return -1;
    }
    sections_ = QLIBCFileEnumSection(kWorkingCopy, names_.handle());
    if (sections_ == 0 && schedIsCutToNothing(kWorkingCopy)) {
      SCHED_SET_ERROR(kErrIo);
      return -1;
    }
    return sections_ < 0 ? -1 : sections_;
  }

  // Goes to the next section. False at the end.
  bool next() {
    while (next_ < sections_) {
      szSection_ = QLIBCSzListGet(names_.get(), next_++);
      read_ = readSection(szSection_, &hash_);
      if (read_ != kNotFound) {
        return true;
      }
    }
    return false;
  }

  bool isStored() const { return state_ == SchedNameState::kOurs; }
  bool isRead() const { return read_ == kFound; }
  const char *section() const { return szSection_; }
  // Its lowest 32 bits, as of every stored number.
  int32_t sectionId() const { return static_cast<int32_t>(strtoll(szSection_, nullptr, kDecimal)); }

  // The section that was read, as a task: its stored fields, and its next run. Each 0 or -1.
  int convert(ZELO_SCHED_TASK *pTask) { return ::convert(pTask, hash_.get()); }
  int setNextTrigger(ZELO_SCHED_TASK *pTask) { return ::setNextTrigger(pTask, &clock_); }
  int fill(ZELO_SCHED_TASK *pTask) { return convert(pTask) < 0 ? -1 : setNextTrigger(pTask); }

 private:
  ListGuard names_{nullptr};
  HashGuard hash_{nullptr};
  SchedTriggerClock clock_;
  SchedNameState state_ = SchedNameState::kFree;
  int sections_ = 0;
  int next_ = 0;
  int read_ = kNotFound;
  const char *szSection_ = nullptr;
};

TaskGuard recordFor(const StoreWalk &walk, TaskGuard task) {
  if (task == nullptr) {
    SCHED_LOG("malloc ZELO_SCHED_TASK failed. key:[%s]", walk.section());
    SCHED_SET_ERROR(kErrRecordAlloc);
  }
  return task;
}

// Allocates the record that is used for all tasks of a walk, or zeroes it again. 0 or -1.
int emptyRecordFor(const StoreWalk &walk, TaskGuard *task) {
  if (*task == nullptr) {
    *task = recordFor(walk, schedRecordAlloc());
    return *task == nullptr ? -1 : 0;
  }
  memset(task->get(), 0, sizeof(ZELO_SCHED_TASK));
  return 0;
}

int list_get(ZELO_SCHED_TASK **pTaskList, ZELO_SCHED_TASK_FILTER filter) {
  SCHED_CHECK_ARG(pTaskList != nullptr, "((void *)0) != pTaskList", -1);
  StoreWalk walk;
  const int sections = walk.open();
  if (sections < 0) {
    return -1;
  }
  if (!walk.isStored()) {
    schedTakeFreeStore();
    return 0;
  }
  SchedRecordSource records(sections);
  TaskChain tasks;
  int count = 0;
  TaskGuard task;
  while (walk.next()) {
    if (!walk.isRead()) {
      continue;
    }
    if (task != nullptr) {
      memset(task.get(), 0, sizeof(*task));
    } else if ((task = recordFor(walk, records.take())) == nullptr) {
      return -1;
    }
    if (walk.fill(task.get()) == 0 && (filter == nullptr || filter(task.get()) != 0)) {
      task->Backend = ZELO_SCHED_BACKEND_SCHEDULE;
      tasks.pushFront(TaskGuard(task.release()));
      ++count;
    }
  }
  tasks.appendTo(pTaskList);
  return count;
}

int get_by_id(long id, ZELO_SCHED_TASK *pTask) {
  SCHED_CHECK_ARG(pTask != nullptr, "((void *)0) != pTask", -1);
  HashGuard hash(QLIBCSzHashAlloc(kContainerCapacity));
  if (!hash) {
    return -1;
  }
  pTask->State = ZELO_SCHED_STATE_NOT_EXISTED;
  pTask->Backend = ZELO_SCHED_BACKEND_SCHEDULE;
  const SchedNameState state = schedLookAtStore();
  if (state == SchedNameState::kFree) {
    schedTakeFreeStore();
    return kNotFound;
  }
  const SectionName section(id);
  if (state == SchedNameState::kForeign) {
    SCHED_SET_ERROR(kErrOpen);
    SCHED_LOG_CALLEE("Get section [%s] from [%s] failed. ", section.c_str(), kWorkingCopy);
    return -1;
  }
  const int read = readSection(section.c_str(), &hash);
  if (read == kNotFound && schedIsCutToNothing(kWorkingCopy)) {
    SCHED_SET_ERROR(kErrIo);
    SCHED_LOG_CALLEE("Get section [%s] from [%s] failed. ", section.c_str(), kWorkingCopy);
    return -1;
  }
  if (read != kFound) {
    return read;
  }
  SchedTriggerClock clock;
  return convert(pTask, hash.get()) < 0 || setNextTrigger(pTask, &clock) < 0 ? -1 : kFound;
}

// ---- ids ----------------------------------------------------------------------------------------

// A section that does not convert is no task, and its id is free. One that cannot be read just now
// may be a task, which a new one of its id would overwrite.
int next_id(long *pID) {
  SCHED_CHECK_ARG(pID != nullptr, "((void *)0) != pID", -1);
  StoreWalk walk;
  if (walk.open() < 0) {
    return -1;
  }
  IdArray ids;
  TaskGuard task;
  while (walk.next()) {
    if (!walk.isRead()) {
      ids.add(walk.sectionId());
      continue;
    }
    if (emptyRecordFor(walk, &task) < 0) {
      return -1;
    }
    if (walk.convert(task.get()) == 0) {
      ids.add(task->ID);
      walk.setNextTrigger(task.get());  // only to log a failure, which leaves the id taken
    }
  }
  if (!ids.isWhole()) {
    SCHED_LOG_CALLEE("Alloc id slot failed. num:[%d] ", ids.count());
    return -1;
  }
  *pID = ids.smallestFree();
  return 0;
}

int fail(SchedSourceLocation location, int code) {
  QLIBCErrSetEx(code, location.file, location.line);
  return -1;
}

// ---- writing the store --------------------------------------------------------------------------

// The private copy on which one write is made. A file that has its name already was left behind or
// planted: it is removed and never written to. Only root can replace a directory there.
class ScratchFile {
 public:
  ScratchFile() {
    snprintf(path_, sizeof(path_), "%s.%d", kScratchPrefix, static_cast<int>(getpid()));
    made_ = schedMakeAnew({path_, kStoreMode, false, ""});
    if (!made_) {
      SCHED_SET_ERROR(kErrOpen);
    }
  }
  ~ScratchFile() { unlink(path_); }
  ScratchFile(const ScratchFile &) = delete;
  ScratchFile &operator=(const ScratchFile &) = delete;

  bool made() const { return made_; }
  const char *path() const { return path_; }

 private:
  char path_[64];
  bool made_ = false;
};

int reportCopy(const char *szSource, const char *szTarget) {
  SCHED_LOG_CALLEE("Copy sched conf failed. [%s] -> [%s] ", szSource, szTarget);
  return -1;
}

int copyFile(const char *szSource, const char *szTarget) {
  const int result = QLIBCExec(kCopyProgram, "-f", szSource, szTarget, nullptr);
  return result == 0 ? 0 : reportCopy(szSource, szTarget);
}

// cp -f truncates its target before it writes. A scratch file that is empty, or shorter or longer
// than the working copy, was therefore most likely read while another process was copying: a write
// based on it would lose other tasks.
int copyWorkingCopy(const ScratchFile &scratch) {
  constexpr int kTries = 20;
  constexpr useconds_t kPause = 5000;
  for (int i = 0; i < kTries; ++i) {
    if (copyFile(kWorkingCopy, scratch.path()) < 0) {
      return -1;
    }
    const off_t size = schedSizeOf(scratch.path());
    const bool mayBeEmpty = !schedAreTasksKept();  // not cut off, but without tasks
    if (size == schedSizeOf(kWorkingCopy) && (size > 0 || mayBeEmpty)) {
      return 0;
    }
    usleep(kPause);
  }
  if (schedIsCutToNothing(scratch.path())) {
    SCHED_SET_ERROR(kErrIo);
    return reportCopy(kWorkingCopy, scratch.path());
  }
  return 0;
}

int fillScratch(const ScratchFile &scratch, bool stored) {
  if (stored) {
    return scratch.made() ? copyWorkingCopy(scratch) : reportCopy(kWorkingCopy, scratch.path());
  }
  if (!scratch.made() || QLIBCFileTouch(scratch.path()) < 0) {
    SCHED_LOG_CALLEE("QLIBCFileTouch [%s] failed. ", scratch.path());
    return -1;
  }
  return 0;
}

int writeSection(const ScratchFile &scratch, const SectionName &section,
                 const ZELO_SCHED_TASK *pTask) {
  HashGuard hash(QLIBCSzHashAlloc(kContainerCapacity));
  if (!hash) {
    SCHED_LOG_CALLEE("QLIBCSzHashAlloc failed.");
    return -1;
  }
  if (ZELOSchedInitHashFromTask(hash.handle(), pTask) < 0) {
    SCHED_LOG_CALLEE("Init hash from task failed. ");
    return -1;
  }
  const int set = QLIBCFileSetSection(scratch.path(), section.c_str(), 0, hash.get(), 0);
  if (set < 0) {
    SCHED_LOG_CALLEE("Save section [%s] to [%s] failed. ", section.c_str(), scratch.path());
    return -1;
  }
  if (set == 0 && QLIBCFileAddSection(scratch.path(), section.c_str(), hash.get(), 0) < 0) {
    SCHED_LOG_CALLEE("Add section [%s] to [%s] failed. ", section.c_str(), scratch.path());
    return -1;
  }
  return 0;
}

// 1 removed, 0 there was no such section, -1 on failure.
int removeSection(const ScratchFile &scratch, const SectionName &section) {
  const int removed = QLIBCFileRemoveSection(scratch.path(), section.c_str());
  if (removed < 0) {
    SCHED_LOG_CALLEE("QLIBCFileRemoveSection [%s] from [%s] failed.", section.c_str(),
                     scratch.path());
    return -1;
  }
  return removed > 0 ? 1 : 0;
}

// Writes the last good copy, which must be on the disk before the persistent copy is overwritten.
int keepLastGood(const ScratchFile &scratch) {
  const Stream source(fopen(scratch.path(), "re"));
  if (source == nullptr) {
    return fail(SCHED_HERE, kErrOpen);
  }
  struct stat like = {};
  like.st_uid = geteuid();
  like.st_gid = getegid();
  like.st_mode = kStoreMode;
  NewFile file(kLastGoodCopy, SCHED_HERE);
  if (file.open() < 0 || file.writeAllOf(source.get()) < 0 || file.finish(like) < 0) {
    return -1;
  }
  if (file.replaceOld() < 0) {
    return -1;
  }
  return schedSyncDirectory(kPersistentDirectory) ? 0 : fail(SCHED_HERE, kErrIo);
}

// cp -f truncates its target before it writes. If the power fails in between, the tasks are in the
// last good copy, which is on the disk by now.
int copyToPersistent(const ScratchFile &scratch) {
  if (keepLastGood(scratch) < 0) {
    return reportCopy(scratch.path(), kPersistentCopy);
  }
  if (copyFile(scratch.path(), kPersistentCopy) < 0) {
    return -1;
  }
  if (!schedSyncFile(kPersistentCopy) || !schedSyncDirectory(kPersistentDirectory)) {
    SCHED_SET_ERROR(kErrIo);
    return reportCopy(scratch.path(), kPersistentCopy);
  }
  return 0;
}

// The persistent copy is written first: after a failure the working copy, which every read uses,
// is as it was.
int publish(const ScratchFile &scratch) {
  if (copyToPersistent(scratch) < 0) {
    return -1;
  }
  if (!schedTakeName(kSchedStore)) {
    SCHED_SET_ERROR(kErrOpen);
    return reportCopy(scratch.path(), kWorkingCopy);
  }
  const FileState before(kWorkingCopy);
  if (copyFile(scratch.path(), kWorkingCopy) < 0) {
    // It was truncated, and the disk was full. Renaming the scratch file needs no space.
    if (!before.isThatOf(kWorkingCopy)) {
      rename(scratch.path(), kWorkingCopy);
    }
    return -1;
  }
  return 1;
}

// Every change of the store: writes one section, or deletes it when pTask is null. 1 when the
// store changed, 0 when there was nothing to delete, -1 on failure.
int write_store(long id, const ZELO_SCHED_TASK *pTask) {
  const ScratchFile scratch;
  const SectionName section(id);
  const SchedNameState state = schedLookAtStore();
  if (state == SchedNameState::kForeign) {
    SCHED_SET_ERROR(kErrOpen);
    return reportCopy(kWorkingCopy, scratch.path());
  }
  const bool stored = state == SchedNameState::kOurs;
  if (fillScratch(scratch, stored) < 0) {
    return -1;
  }
  if (pTask != nullptr) {
    return writeSection(scratch, section, pTask) < 0 ? -1 : publish(scratch);
  }
  if (!stored) {
    return 0;
  }
  const int removed = removeSection(scratch, section);
  return removed > 0 ? publish(scratch) : removed;
}

// ---- the crontab --------------------------------------------------------------------------------

int toCronLine(const ZELO_SCHED_TASK *pTask, SchedCronLine *line) {
  SCHED_CHECK_ARG(pTask != nullptr, "((void *)0) != pTask", -1);
  *line = schedCronLineOf(*pTask);
  return 0;
}

int keepOtherLines(FILE *old, NewFile *crontab) {
  char *buffer = nullptr;
  size_t capacity = 0;
  ssize_t length = 0;
  int result = 0;
  while (result == 0 && (length = getline(&buffer, &capacity, old)) >= 0) {
    const auto count = static_cast<size_t>(length);
    if (memmem(buffer, count, kSchedCronProgram, strlen(kSchedCronProgram)) == nullptr) {
      result = crontab->write({buffer, count});
    }
  }
  free(buffer);
  if (result == 0 && feof(old) == 0) {
    return fail(SCHED_HERE, kErrIo);
  }
  return result;
}

int addTaskLines(const ZELO_SCHED_TASK *pTask, NewFile *crontab) {
  for (; pTask != nullptr; pTask = pTask->next) {
    if (pTask->State != ZELO_SCHED_STATE_ENABLED) {
      continue;
    }
    SchedCronLine line;
    if (toCronLine(pTask, &line) < 0) {
      SCHED_LOG_CALLEE("Failed to convert task [%ld] to cron line. ", static_cast<long>(pTask->ID));
      return -1;
    }
    if (crontab->writeLine(line.text) < 0) {
      return -1;
    }
  }
  return 0;
}

void signalCron() {
  if (QLIBCFileExist(kCronPidFile) != 0 && system(kSignalCron) != 0) {
    SCHED_LOG("Failed to hup crond.");
  }
}

int rewriteCrontab(const ZELO_SCHED_TASK *tasks) {
  const Stream old(fopen(kCrontab, "r"));
  if (old == nullptr) {
    return -1;  // without a crontab whose owner and mode to keep, none is made
  }
  struct stat info = {};
  if (fstat(fileno(old.get()), &info) != 0) {
    return fail(SCHED_HERE, kErrStat);
  }
  if (S_ISDIR(info.st_mode)) {
    return fail(SCHED_HERE, kErrOpen);
  }
  // Cron starts the program of that name as root: unless the file is ours, no task has a line.
  const bool isProgramOurs = schedTakeName(kSchedTaskProgram);
  NewFile crontab(kCrontab, SCHED_HERE);
  if (crontab.open() < 0 || keepOtherLines(old.get(), &crontab) < 0 ||
      addTaskLines(isProgramOurs ? tasks : nullptr, &crontab) < 0 || crontab.finish(info) < 0 ||
      crontab.replaceOld() < 0) {
    return -1;
  }
  signalCron();
  if (!isProgramOurs) {
    return fail(SCHED_HERE, kErrOpen);
  }
  return schedSyncDirectory(kCrontabDirectory) ? 0 : fail(SCHED_HERE, kErrIo);
}

// The schedule of each task, as a list of records in one array, in the order of the store. A sort
// by a number, which is by address, keeps that order. The texts of the records are not written, so
// that their pages take no memory.
class Schedules {
 public:
  // The number of tasks, or -1.
  int read() {
    StoreWalk walk;
    const int sections = walk.open();
    if (sections <= 0) {
      return sections;
    }
    tasks_.reset(static_cast<ZELO_SCHED_TASK *>(
        calloc(static_cast<size_t>(sections), sizeof(ZELO_SCHED_TASK))));
    ZELO_SCHED_TASK **end = &head_;
    size_t count = 0;
    TaskGuard task;
    while (walk.next()) {
      if (!walk.isRead()) {
        continue;
      }
      if (!hasRoom(walk) || emptyRecordFor(walk, &task) < 0) {
        return -1;
      }
      if (walk.fill(task.get()) == 0) {
        *end = &tasks_[count++];
        copySchedule(*end, *task);
        end = &(*end)->next;
      }
    }
    return static_cast<int>(count);
  }

  ZELO_SCHED_TASK **handle() { return &head_; }
  const ZELO_SCHED_TASK *head() const { return head_; }

 private:
  bool hasRoom(const StoreWalk &walk) const {
    if (tasks_ == nullptr) {
      recordFor(walk, nullptr);
    }
    return tasks_ != nullptr;
  }

  static void copySchedule(ZELO_SCHED_TASK *pTo, const ZELO_SCHED_TASK &from) {
    pTo->ID = from.ID;
    pTo->State = from.State;
    pTo->Type = from.Type;
    memcpy(pTo->Week, from.Week, sizeof(pTo->Week));
    pTo->StartYear = from.StartYear;
    pTo->StartMonth = from.StartMonth;
    pTo->StartDay = from.StartDay;
    pTo->RunHour = from.RunHour;
    pTo->RunMin = from.RunMin;
    pTo->RepeatHour = from.RepeatHour;
    pTo->LastWorkHour = from.LastWorkHour;
  }

  std::unique_ptr<ZELO_SCHED_TASK[], MemoryDeleter> tasks_;
  ZELO_SCHED_TASK *head_ = nullptr;
};

// A crontab that could not be rewritten is only logged: the task is stored, and the next change or
// sync rewrites the crontab.
int writeCrontab() {
  Schedules tasks;
  const int count = tasks.read();
  if (count < 0) {
    SCHED_LOG_CALLEE("get task list failed. ");
    return count;
  }
  if (ZELOSchedTaskListSort(tasks.handle(), "id", 1) < 0) {
    SCHED_LOG_CALLEE("failed to sort task list. ");
    return count;
  }
  if (rewriteCrontab(tasks.head()) < 0) {
    SCHED_LOG_CALLEE("sync task list failed. ");
    return count;
  }
  return 0;
}

int syncAfterChange() {
  if (writeCrontab() < 0) {
    SCHED_LOG_CALLEE("sync crontab failed. ");
    return -1;
  }
  return 0;
}

// ---- the operations of the backend --------------------------------------------------------------

int sync() {
  const StoreLock lock;
  return lock.isHeld() ? writeCrontab() : -1;
}

int storeTask(const ZELO_SCHED_TASK *pTask) {
  if (write_store(pTask->ID, pTask) < 0) {
    SCHED_LOG_CALLEE("set task failed. [%ld] ", static_cast<long>(pTask->ID));
    return -1;
  }
  return 0;
}

int create(ZELO_SCHED_TASK *pTask) {
  SCHED_CHECK_ARG(pTask != nullptr, "((void *)0) != pTask", -1);
  const StoreLock lock;
  long id = 0;
  if (!lock.isHeld() || next_id(&id) < 0) {
    return -1;
  }
  const bool isNamed = pTask->Name[0] != '\0';
  if (!isNamed) {
    snprintf(pTask->Name, sizeof(pTask->Name), "Task %ld", id);
  }
  const int32_t formerId = pTask->ID;
  pTask->ID = static_cast<int32_t>(id);
  if (storeTask(pTask) < 0) {
    // Still a new task: saving it again must create it, not edit another that has the id by then.
    pTask->ID = formerId;
    pTask->Name[0] = isNamed ? pTask->Name[0] : '\0';
    return -1;
  }
  return syncAfterChange();
}

int edit(ZELO_SCHED_TASK *pTask) {
  SCHED_CHECK_ARG(pTask != nullptr, "((void *)0) != pTask", -1);
  const StoreLock lock;
  return !lock.isHeld() || storeTask(pTask) < 0 ? -1 : syncAfterChange();
}

int remove(long id) {
  const StoreLock lock;
  if (!lock.isHeld()) {
    return -1;
  }
  const int removed = write_store(id, nullptr);
  if (removed < 0) {
    SCHED_LOG_CALLEE("set task failed. [%ld] ", id);
    return -1;
  }
  if (removed == 0) {
    return 0;
  }
  return syncAfterChange() < 0 ? -1 : 1;
}

// The values of a new task that differ from the field table's defaults, and those of the keys that
// a hash must have. The start date is for an editor to fill in.
struct DefaultValue {
  const char *szKey;
  const char *szValue;
};
constexpr DefaultValue kDefaults[] = {
    {"id", "-1"},         {"run hour", "0"},  {"run min", "0"},     {"start year", "0"},
    {"start month", "0"}, {"start day", "0"}, {"app", ""},          {"app name", ""},
    {"action", ""},       {"cmd", ""},        {"state", "enabled"}, {"type", "daily"},
};

int setDefaultValue(HashGuard *hash, const char *szKey, const char *szValue) {
  if (QLIBCSzHashSetValue(hash->handle(), szKey, szValue) < 0) {
    SCHED_LOG_CALLEE("Set hash value failed. key:[%s], val:[%s]. ", szKey, szValue);
    return -1;
  }
  return 0;
}

int get_default(ZELO_SCHED_TASK *pTask) {
  SCHED_CHECK_ARG(pTask != nullptr, "((void *)0) != pTask", -1);
  HashGuard hash(QLIBCSzHashAlloc(kContainerCapacity));
  if (!hash) {
    SCHED_LOG_CALLEE("Alloc hash failed. ");
    return -1;
  }
  long id = 0;
  if (next_id(&id) < 0) {
    SCHED_LOG_CALLEE("Get next id failed. ");
    return -1;
  }
  char szName[32];
  snprintf(szName, sizeof(szName), "Task %ld", id);
  if (setDefaultValue(&hash, "name", szName) < 0) {
    return -1;
  }
  for (const DefaultValue &value : kDefaults) {
    if (setDefaultValue(&hash, value.szKey, value.szValue) < 0) {
      return -1;
    }
  }
  pTask->NextTriggerTime[0] = '\0';
  return schedFillTaskFromHash(pTask, hash.get(), SCHED_HERE);
}

int run(ZELO_SCHED_TASK *pTask, int *pStatusCode, char *szComment, size_t cbComment) {
  SCHED_CHECK_ARG(pTask != nullptr, "((void *)0) != pTask", -1);
  SCHED_CHECK_ARG(pStatusCode != nullptr, "((void *)0) != pStatusCode", -1);
  SCHED_CHECK_ARG(szComment != nullptr, "((void *)0) != szComment", -1);
  SCHED_CHECK_ARG(0 < cbComment, "0 < cbComment", -1);
  szComment[0] = '\0';
  const SchedRealIds ids;
  if (!ids.set()) {
    return -1;
  }
  schedReportWaitStatus(system(pTask->Command), pStatusCode, szComment);
  return 0;
}

}  // namespace

int zeloschedule_init(const char *szName, ZELO_SCHED_BACKEND *pBackend) {
  SCHED_CHECK_ARG(szName != nullptr, "((void *)0) != szName", -1);
  SCHED_CHECK_ARG(pBackend != nullptr, "NULL != pBackend", -1);
  if (strcmp(szName, kName) != 0) {
    SCHED_LOG("backend name is mismatch for zeloschedule!! [%s]", szName);
    return -1;
  }
  pBackend->szName = szName;
  pBackend->sync = sync;
  pBackend->create = create;
  pBackend->edit = edit;
  pBackend->remove = remove;
  pBackend->get_default = get_default;
  pBackend->owns_id = nullptr;
  pBackend->get_by_id = get_by_id;
  pBackend->run = run;
  pBackend->list_get = list_get;
  return 0;
}
