#include "store/task_list.h"

#include <sched_shared_names.h>
#include <zelocore.h>
#include <zelosdk.h>

#include <algorithm>
#include <climits>
#include <cstring>

#include "terminal/failure.h"
#include "terminal/text.h"

namespace {

constexpr int kNotFound = 0x2000;

const char *nameOf(const char *const *names, size_t count, int32_t value) {
  return value >= 0 && static_cast<size_t>(value) < count ? names[value] : "unknown";
}

constexpr int kBackendFailures[] = {0x0100, 0x0200, 0x0900, 0x0B00};

bool isPowerListReadable(int list) {
  ZELO_AUTOPOWER first;
  return ZELOAutoPowerConfGet(list, 1, &first) >= 0;
}

// The library skips a backend that fails, whose tasks must not seem to be removed. It also skips an
// unreadable task, which must not keep the others from being listed; that leaves other codes.
bool hasBackendFailed() {
  const int code = QLIBCErrGet();
  if (code == 0) return false;
  if (std::find(std::begin(kBackendFailures), std::end(kBackendFailures), code) !=
      std::end(kBackendFailures)) {
    return true;
  }
  return !isPowerListReadable(ZELO_AUTOPOWER_ON) || !isPowerListReadable(ZELO_AUTOPOWER_OFF);
}

// With the file and the remedy, where the store is the reason.
Failure cannotList() {
  Failure failure = failedTo("list the tasks");
  const char *why = nullptr;
  if (schedLookAt(kSchedStore, &why) != SchedNameState::kForeign) {
    PSZLIST names = QLIBCSzListAlloc(1);
    const int sections = QLIBCFileEnumSection(kSchedStore.path, &names);
    QLIBCSzListFree(names);
    if (sections > 0 || (sections == 0 && !schedAreTasksKept())) return failure;
    why = sections < 0 ? "cannot be read" : "has no tasks, though some are kept";
  }
  return Failure(std::string(failure.what()) + "; " + kSchedStore.path + " " + why +
                 ": 'zelosched restore' puts the tasks back");
}

}  // namespace

Task newTask(int32_t backend) {
  forgetError();
  const std::unique_ptr<TaskRecord, decltype(&ZELOSchedTaskFree)> made(ZELOSchedTaskAlloc(),
                                                                       ZELOSchedTaskFree);
  if (made == nullptr) throw failedTo("make a task");
  made->Backend = backend;
  if (backend != ZELO_SCHED_BACKEND_SCHEDULE && ZELOSchedTaskGetDefault(made.get()) < 0) {
    throw failedTo("make a task");
  }
  made->Backend = backend;
  return std::make_unique<TaskRecord>(*made);
}

Task findTask(int64_t id) {
  if (id < 0 || id > INT32_MAX) return nullptr;
  Task task = std::make_unique<TaskRecord>();
  forgetError();
  if (ZELOSchedTaskGetByID(static_cast<long>(id), task.get()) == 0) {
    return task->State == ZELO_SCHED_STATE_NOT_EXISTED ? nullptr : std::move(task);
  }
  if (QLIBCErrGet() == kNotFound) return nullptr;
  throw failedTo("read task " + std::to_string(id));
}

Task loadTask(int64_t id) {
  Task task = findTask(id);
  if (task == nullptr) throw Failure("there is no task " + std::to_string(id));
  return task;
}

TaskList::TaskList(Unreadable backend) {
  forgetError();
  if (ZELOSchedTaskListGet(&head_, nullptr) < 0) throw cannotList();
  if (backend == Unreadable::kIsFailure && hasBackendFailed()) {
    ZELOSchedTaskListFree(&head_);
    throw cannotList();
  }
  for (const TaskRecord *task = head_; task != nullptr; task = task->next) tasks_.push_back(task);
  std::stable_sort(tasks_.begin(), tasks_.end(),
                   [](const TaskRecord *a, const TaskRecord *b) { return a->ID < b->ID; });
}

TaskList::~TaskList() {
  ZELOSchedTaskListFree(&head_);
}

bool isEnabled(const TaskRecord &task) {
  return task.State == ZELO_SCHED_STATE_ENABLED;
}

bool isListed(const TaskRecord &task) {
  return task.Listable == 1;
}

bool isPower(const TaskRecord &task) {
  return task.Backend == ZELO_SCHED_BACKEND_AUTOPOWER;
}

const char *stateName(const TaskRecord &task) {
  static constexpr const char *kNames[] = {"disabled", "enabled"};
  return nameOf(kNames, std::size(kNames), task.State);
}

const char *typeName(const TaskRecord &task) {
  static constexpr const char *kNames[] = {"once", "daily", "weekly", "monthly", "yearly"};
  return nameOf(kNames, std::size(kNames), task.Type);
}

std::string titleOf(const TaskRecord &task) {
  return "task " + std::to_string(task.ID) + " (" + printable(task.Name) + ")";
}

void setText(char *field, size_t capacity, const char *what, const std::string &text) {
  if (text.size() >= capacity) {
    throw Failure(std::string("the ") + what + " is " + std::to_string(text.size()) +
                  " bytes long: shorten it to " + std::to_string(capacity - 1));
  }
  std::memset(field, 0, capacity);
  std::memcpy(field, text.data(), text.size());
}
