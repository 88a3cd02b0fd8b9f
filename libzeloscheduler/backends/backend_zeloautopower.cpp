// The machine's power schedule as tasks. The platform stores the two lists of power times, and a
// task's id encodes its entry, so nothing is stored here. Power-on times set the alarm of the
// real-time clock; power-off times become lines of the system crontab.
#include <zelocore.h>
#include <zelosched.h>
#include <zelosdk.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <limits>
#include <optional>
#include <utility>

#include "power_day_names.h"
#include "power_id.h"
#include "sched_guards.h"
#include "sched_hash.h"
#include "sched_record.h"
#include "sched_report.h"
#include "sched_store_lock.h"
#include "sched_text.h"
#include "sched_wait_status.h"
#include "schedule_days.h"

namespace {

constexpr char kName[] = "zeloautopower";
constexpr char kCrontab[] = "/etc/crontab";
// The program that cron runs at a power-off time, whose name marks a crontab line as ours.
constexpr char kFeasibleCheck[] = "/usr/zelo/bin/zelo_poweroff_feasible_check";

constexpr int kContainerCapacity = 1024;
constexpr int kFound = 1;
constexpr int kNotFound = 0;
constexpr int kNoIndex = -1;
constexpr long kNoId = -1;
constexpr int kListCapacity = 100;
constexpr unsigned kEveryDay = 127;
constexpr char kDayOff = '0';
constexpr char kDayOn = '1';

// ---- the lists of the platform ----------------------------------------------------------------

// Room for one entry more than is read, to append to a full list.
struct PowerList {
  int type;
  int count;
  ZELO_AUTOPOWER entries[kListCapacity + 1];

  PowerTime at(int index) const { return {type, entries[index]}; }
};

int readList(int type, PowerList *list) {
  list->type = type;
  list->count = ZELOAutoPowerConfGet(type, kListCapacity, list->entries);
  return list->count < 0 ? -1 : 0;
}

// ---- an entry as a task -----------------------------------------------------------------------

// The values of a new task that differ from the field table's defaults, and those of the keys that
// a hash must have. Power times have no start date.
struct DefaultValue {
  const char *szKey;
  const char *szValue;
};
constexpr DefaultValue kDefaults[] = {
    {"id", "-1"},       {"name", "Power"},   {"run hour", "0"},
    {"run min", "0"},   {"start year", "0"}, {"start month", "0"},
    {"start day", "0"}, {"app", ""},         {"app name", "#schedule:power_on_off#"},
    {"action", ""},     {"cmd", ""},         {"state", "enabled"},
    {"type", "daily"},
};

// A value that could not be set is reported as a missing key.
int get_default(ZELO_SCHED_TASK *pTask) {
  SCHED_CHECK_ARG(pTask != nullptr, "((void *)0) != pTask", -1);
  HashGuard hash(QLIBCSzHashAlloc(kContainerCapacity));
  if (!hash) {
    SCHED_LOG_CALLEE("Alloc hash failed. ");
    return -1;
  }
  for (const DefaultValue &value : kDefaults) {
    if (QLIBCSzHashSetValue(hash.handle(), value.szKey, value.szValue) < 0) {
      SCHED_LOG_CALLEE("Get hash value failed. key:[%s]. ", value.szKey);
      return -1;
    }
  }
  return schedFillTaskFromHash(pTask, hash.get(), SCHED_HERE);
}

int setNextTriggerTime(ZELO_SCHED_TASK *pTask) {
  if (ZELOSchedNextTriggerTime(pTask) < 0) {
    SCHED_LOG_CALLEE("Failed to obtain next trigger time. id:[%ld]. ",
                     static_cast<long>(pTask->ID));
    return -1;
  }
  return 0;
}

void writeWeek(unsigned weekdays, ZELO_SCHED_TASK *pTask) {
  for (size_t i = 0; i < kDaysOfWeek; ++i) {
    pTask->Week[i] = (weekdays >> i & 1U) != 0 ? kDayOn : kDayOff;
  }
  pTask->Week[kDaysOfWeek] = '\0';
}

// All fields but id and name, which the caller sets.
int fillFromEntry(ZELO_SCHED_TASK *pTask, const ZELO_AUTOPOWER *psched, bool powerOff) {
  SCHED_CHECK_ARG(pTask != nullptr, "((void *)0) != pTask", -1);
  SCHED_CHECK_ARG(psched != nullptr, "NULL != psched", -1);
  pTask->State = psched->enabled == 1 ? ZELO_SCHED_STATE_ENABLED : ZELO_SCHED_STATE_DISABLED;
  writeWeek(psched->weekdays, pTask);
  pTask->Type = psched->weekdays == kEveryDay ? ZELO_SCHED_TYPE_DAILY : ZELO_SCHED_TYPE_WEEKLY;
  pTask->RunHour = psched->hour;
  pTask->RunMin = psched->minute;
  pTask->RepeatHour = 0;
  pTask->LastWorkHour = psched->hour;
  pTask->Listable = 1;
  pTask->CanEditName = 0;
  pTask->CanEditOwner = 0;
  pTask->CanRunAppSameTime = 1;
  pTask->CanRunTaskSameTime = 1;
  pTask->CanRunFromUI = powerOff ? 1 : 0;
  const char *szDirection = powerOff ? "off" : "on";
  copyText(pTask->App, "ZELO.TOV.TaskScheduler.AutoPower");
  copyText(pTask->AppName, "#schedule:power_on_off#");
  snprintf(pTask->AppArgs, sizeof(pTask->AppArgs), "power%s", szDirection);
  snprintf(pTask->Action, sizeof(pTask->Action), "#schedule:power_%s#", szDirection);
  pTask->Backend = ZELO_SCHED_BACKEND_AUTOPOWER;
  return setNextTriggerTime(pTask);
}

// ---- a task as an entry -----------------------------------------------------------------------

// The platform refuses hours and minutes that are out of range. A number that does not fit into a
// byte is refused here, as the entry would have another time.
int makeEntry(ZELO_AUTOPOWER *pSched, const ZELO_SCHED_TASK *pTask) {
  constexpr uint32_t kMostOfByte = std::numeric_limits<unsigned char>::max();
  SCHED_CHECK_ARG(pSched != nullptr, "((void *)0) != pSched", -1);
  SCHED_CHECK_ARG(pTask != nullptr, "NULL != pTask", -1);
  SCHED_CHECK_ARG(pTask->RunHour <= kMostOfByte, "255 >= pTask->RunHour", -1);
  SCHED_CHECK_ARG(pTask->RunMin <= kMostOfByte, "255 >= pTask->RunMin", -1);
  pSched->enabled = pTask->State == ZELO_SCHED_STATE_ENABLED ? 1 : 0;
  pSched->weekdays = static_cast<unsigned char>(schedWeekdayMaskOf(*pTask));
  pSched->hour = static_cast<unsigned char>(pTask->RunHour);
  pSched->minute = static_cast<unsigned char>(pTask->RunMin);
  return 0;
}

// ---- reading ----------------------------------------------------------------------------------

TaskGuard newRecord() {
  TaskGuard task = schedRecordAlloc();
  if (task == nullptr) {
    SCHED_LOG("malloc ZELO_SCHED_TASK failed.");
    SCHED_SET_ERROR(kErrRecordAlloc);
  }
  return task;
}

// Null on failure, which is logged.
TaskGuard taskOfEntry(const PowerList &list, int index) {
  const bool powerOff = list.type == ZELO_AUTOPOWER_OFF;
  TaskGuard task = newRecord();
  if (task == nullptr) {
    return nullptr;
  }
  if (get_default(task.get()) < 0) {
    SCHED_LOG_CALLEE("Get default failed. ");
    return nullptr;
  }
  snprintf(task->Name, sizeof(task->Name), "Power%s task %d", powerOff ? "Off" : "On", index);
  const std::optional<long> id = powerIdOf(list.at(index));
  if (!id) {
    SCHED_LOG("zeloautopower_get_from_psched failed.");
    return nullptr;
  }
  task->ID = static_cast<int32_t>(*id);
  if (fillFromEntry(task.get(), &list.entries[index], powerOff) < 0) {
    SCHED_LOG("Get task from Power schedule failed. ");
    return nullptr;
  }
  return task;
}

int addTasksOf(int type, ZELO_SCHED_TASK_FILTER filter, TaskChain *tasks) {
  PowerList list;
  if (readList(type, &list) < 0) {
    SCHED_LOG_CALLEE("Get auto poweron conf failed. ");
    return -1;
  }
  int added = 0;
  for (int i = 0; i < list.count; ++i) {
    TaskGuard task = taskOfEntry(list, i);
    if (task == nullptr) {
      return -1;
    }
    if (filter != nullptr && filter(task.get()) == 0) {
      // Deliberately leaked: a filter may keep the pointer.
      static_cast<void>(task.release());
      continue;
    }
    tasks->pushFront(std::move(task));
    ++added;
  }
  return added;
}

int list_get(ZELO_SCHED_TASK **pTaskList, ZELO_SCHED_TASK_FILTER filter) {
  SCHED_CHECK_ARG(pTaskList != nullptr, "((void *)0) != pTaskList", -1);
  TaskChain tasks;
  int count = 0;
  for (const int type : {ZELO_AUTOPOWER_ON, ZELO_AUTOPOWER_OFF}) {
    const int added = addTasksOf(type, filter, &tasks);
    if (added < 0) {
      return -1;
    }
    count += added;
  }
  if (count > 0) {
    tasks.appendTo(pTaskList);
  }
  return count;
}

int owns_id(long id) {
  return isPowerId(id) ? 1 : 0;
}

// Sets *pIndex to the index of the first entry with that id, or to kNoIndex. -1 when an entry
// before it has no id.
int findEntry(const PowerList &list, long id, int *pIndex) {
  *pIndex = kNoIndex;
  for (int i = 0; i < list.count; ++i) {
    const std::optional<long> entryId = powerIdOf(list.at(i));
    if (!entryId) {
      SCHED_LOG("transform power schedule to id failed. ");
      return -1;
    }
    if (*entryId == id) {
      *pIndex = i;
      return 0;
    }
  }
  return 0;
}

int fillFound(const PowerTime &time, long id, int index, ZELO_SCHED_TASK *pTask) {
  const bool powerOff = time.list == ZELO_AUTOPOWER_OFF;
  if (get_default(pTask) < 0) {
    SCHED_LOG_CALLEE("Get default failed. ");
    return -1;
  }
  snprintf(pTask->Name, sizeof(pTask->Name), "Power%s %d", powerOff ? "off" : "on", index);
  pTask->ID = static_cast<int32_t>(id);
  if (fillFromEntry(pTask, &time.entry, powerOff) < 0) {
    SCHED_LOG("Get task from Power schedule failed. id:[%ld]", id);
    return -1;
  }
  return setNextTriggerTime(pTask);
}

int get_by_id(long id, ZELO_SCHED_TASK *pTask) {
  SCHED_CHECK_ARG(pTask != nullptr, "((void *)0) != pTask", -1);
  pTask->Backend = ZELO_SCHED_BACKEND_AUTOPOWER;
  const std::optional<PowerTime> time = powerTimeOf(id);
  if (!time) {
    return kNotFound;
  }
  PowerList list;
  if (readList(time->list, &list) < 0) {
    SCHED_LOG_CALLEE("Get auto poweron conf failed. ");
    return -1;
  }
  int index = kNoIndex;
  if (findEntry(list, id, &index) < 0) {
    return -1;
  }
  if (index == kNoIndex) {
    return kNotFound;
  }
  return fillFound(*time, id, index, pTask) < 0 ? -1 : kFound;
}

// ---- the hardware and the crontab -------------------------------------------------------------

int removePowerOffLines() {
  for (int i = 0; i < kListCapacity; ++i) {
    const int removed = QLIBCFileSetLine(kCrontab, kFeasibleCheck, nullptr, 0);
    if (removed < 0) {
      SCHED_LOG("Failed to remove line in crontab (0x%x)", static_cast<unsigned>(QLIBCErrGet()));
      return -1;
    }
    if (removed == 0) {
      break;
    }
  }
  return 0;
}

int updateCron() {
  if (ZELOUpdateCrontab(kFeasibleCheck, 0, 1) < 0) {
    SCHED_LOG("Failed to kill crontab task (0x%x)", static_cast<unsigned>(QLIBCErrGet()));
    return -1;
  }
  return 0;
}

int addPowerOffLine(const ZELO_AUTOPOWER &entry) {
  ZELO_SCHEDULE schedule = {};
  schedule.weekdays = entry.weekdays;
  schedule.hour = entry.hour;
  schedule.lastHour = entry.hour;
  schedule.minute = entry.minute;
  copyText(schedule.szCommand, kFeasibleCheck);
  if (ZELOScheduleSet(&schedule, 1) == -1) {
    SCHED_LOG("ZELOScheduleSet Error %d", QLIBCErrGet());
    return -1;
  }
  return 0;
}

// Builds a text of the day names and the time, which nothing uses, and logs when it is cut.
void describe(const ZELO_AUTOPOWER &entry, PowerDayNames *names) {
  if (names->of(entry.weekdays).wasCut()) {
    SCHED_LOG("Out of string size");
  }
  BoundedText<16> time;
  time.append("%02d:%02d", entry.hour, entry.minute);
}

int addPowerOffLines(const PowerList &list) {
  PowerDayNames names;
  for (int i = 0; i < list.count; ++i) {
    const ZELO_AUTOPOWER &entry = list.entries[i];
    if (entry.enabled != 1) {
      continue;
    }
    if (addPowerOffLine(entry) < 0) {
      return -1;
    }
    describe(entry, &names);
  }
  return 0;
}

int applySchedule() {
  if (ZELOAutoPoweronSet() < 0) {
    SCHED_LOG_CALLEE("set auto poweron failed. ");
    return -1;
  }
  PowerList list;
  if (readList(ZELO_AUTOPOWER_OFF, &list) < 0) {
    SCHED_LOG_CALLEE("get auto power off failed. ");
    return -1;
  }
  if (removePowerOffLines() < 0 || updateCron() < 0 || addPowerOffLines(list) < 0) {
    SCHED_LOG_CALLEE("Set Power Off Schedule ERROR! ");
    return -1;
  }
  return 0;
}

// ---- changing ---------------------------------------------------------------------------------

// An entry without an id is skipped, so that the others can still be changed.
int findEntryToSet(const PowerList &list, long id) {
  for (int i = 0; i < list.count; ++i) {
    const std::optional<long> entryId = powerIdOf(list.at(i));
    if (!entryId) {
      SCHED_LOG("wired id in power schedule [%ld] ", kNoId);
    } else if (*entryId == id) {
      return i;
    }
  }
  return kNoIndex;
}

// The list may then be one entry longer than a read returns: the platform stores or refuses it.
int putEntry(PowerList *list, int index, const ZELO_SCHED_TASK *pTask) {
  ZELO_AUTOPOWER entry = {};
  if (makeEntry(&entry, pTask) < 0) {
    SCHED_LOG("Convert to autopower schedule failed. ");
    return -1;
  }
  if (index == kNoIndex) {
    index = list->count++;
  }
  list->entries[index] = entry;
  return 0;
}

void takeEntry(PowerList *list, int index) {
  ZELO_AUTOPOWER *entry = &list->entries[index];
  memmove(entry, entry + 1, static_cast<size_t>(list->count - index - 1) * sizeof(*entry));
  --list->count;
}

// Writes the task into the entry of that id, or appends it; removes the entry when pTask is null.
// 1 when the list changed, 0 when the id is not ours or there is nothing to remove, -1 on failure.
int setById(long id, const ZELO_SCHED_TASK *pTask) {
  const std::optional<PowerTime> time = powerTimeOf(id);
  if (!time) {
    return 0;
  }
  PowerList list;
  if (readList(time->list, &list) < 0) {
    SCHED_LOG_CALLEE("Get auto poweron conf failed. ");
    return -1;
  }
  const int index = findEntryToSet(list, id);
  if (pTask != nullptr) {
    if (putEntry(&list, index, pTask) < 0) {
      return -1;
    }
  } else if (index == kNoIndex) {
    return 0;
  } else {
    takeEntry(&list, index);
  }
  if (ZELOAutoPowerConfSet(list.type, list.count, list.entries) < 0) {
    SCHED_LOG_CALLEE("ZELOAutoPowerConfSet failed. num:[%d] ", list.count);
    return -1;
  }
  return 1;
}

int setAndReport(long id, const ZELO_SCHED_TASK *pTask) {
  const int result = setById(id, pTask);
  if (result < 0) {
    SCHED_LOG_CALLEE("set task failed. [%ld] ", id);
  }
  return result;
}

int syncAfterChange() {
  if (applySchedule() < 0) {
    SCHED_LOG_CALLEE("sync power hw failed. ");
    return -1;
  }
  return 0;
}

// The list that the task's arguments name; -1, which is logged, when they name none.
int listOf(const ZELO_SCHED_TASK &task) {
  if (strcmp(task.AppArgs, "poweron") == 0) {
    return ZELO_AUTOPOWER_ON;
  }
  if (strcmp(task.AppArgs, "poweroff") == 0) {
    return ZELO_AUTOPOWER_OFF;
  }
  SCHED_LOG("Invalid app args for power [%s]", task.AppArgs);
  return -1;
}

int sync() {
  const StoreLock lock;
  return lock.isHeld() ? applySchedule() : -1;
}

int create(ZELO_SCHED_TASK *pTask) {
  SCHED_CHECK_ARG(pTask != nullptr, "((void *)0) != pTask", -1);
  const StoreLock lock;
  if (!lock.isHeld()) {
    return -1;
  }
  PowerTime time = {};
  if (makeEntry(&time.entry, pTask) < 0) {
    SCHED_LOG_CALLEE("convert task from power schedule failed. ");
    return -1;
  }
  time.list = listOf(*pTask);
  if (time.list < 0) {
    return -1;
  }
  const std::optional<long> id = powerIdOf(time);
  if (!id) {
    SCHED_LOG("wired id in transform [%ld] ", kNoId);
    return -1;
  }
  pTask->ID = static_cast<int32_t>(*id);
  if (pTask->Name[0] == '\0') {
    copyText(pTask->Name, "Power task");
  }
  if (setAndReport(*id, pTask) < 0) {
    return -1;
  }
  return syncAfterChange();
}

int edit(ZELO_SCHED_TASK *pTask) {
  SCHED_CHECK_ARG(pTask != nullptr, "((void *)0) != pTask", -1);
  const StoreLock lock;
  if (!lock.isHeld() || setAndReport(pTask->ID, pTask) < 0) {
    return -1;
  }
  if (applySchedule() < 0) {
    SCHED_LOG_CALLEE("sync hw autopower failed. ");
    return -1;
  }
  return 0;
}

int remove(long id) {
  const StoreLock lock;
  if (!lock.isHeld()) {
    return -1;
  }
  const int removed = setAndReport(id, nullptr);
  if (removed <= 0) {
    return removed;
  }
  return syncAfterChange() < 0 ? -1 : 1;
}

// ---- running ----------------------------------------------------------------------------------

// Runs the check at a power-off time, which decides what follows. At a power-on time there is
// nothing to do: the machine is on.
int run(ZELO_SCHED_TASK *pTask, int *pStatusCode, char *szComment, size_t cbComment) {
  SCHED_CHECK_ARG(pTask != nullptr, "((void *)0) != pTask", -1);
  SCHED_CHECK_ARG(pStatusCode != nullptr, "((void *)0) != pStatusCode", -1);
  SCHED_CHECK_ARG(szComment != nullptr, "((void *)0) != szComment", -1);
  SCHED_CHECK_ARG(0 < cbComment, "0 < cbComment", -1);
  szComment[0] = '\0';
  const bool powerOff = strcmp(pTask->AppArgs, "poweroff") == 0;
  schedReportWaitStatus(powerOff ? system(kFeasibleCheck) : 0, pStatusCode, szComment);
  return 0;
}

}  // namespace

int zeloautopower_init(const char *szName, ZELO_SCHED_BACKEND *pBackend) {
  SCHED_CHECK_ARG(szName != nullptr, "((void *)0) != szName", -1);
  SCHED_CHECK_ARG(pBackend != nullptr, "NULL != pBackend", -1);
  if (strcmp(szName, kName) != 0) {
    SCHED_LOG("backend name is mismatch for zeloautopower!! [%s]", szName);
    return -1;
  }
  pBackend->szName = szName;
  pBackend->sync = sync;
  pBackend->create = create;
  pBackend->edit = edit;
  pBackend->remove = remove;
  pBackend->get_default = get_default;
  pBackend->owns_id = owns_id;
  pBackend->get_by_id = get_by_id;
  pBackend->run = run;
  pBackend->list_get = list_get;
  return 0;
}
