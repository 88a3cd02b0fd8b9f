#include "store/save.h"

#include <algorithm>

#include "check/crontab_check.h"
#include "check/task_check.h"
#include "runs/task_notes.h"
#include "sched_cron_room.h"
#include "store/held_signals.h"
#include "store/power_room.h"
#include "store/store_copy.h"
#include "terminal/failure.h"
#include "terminal/text.h"

namespace {

constexpr int kFlagYes = 1;

// A power time that is edited to equal another one would be merged with it.
void requireUnlike(const ZELO_SCHED_TASK &task) {
  PowerRoom room;
  room.leave(task);
  room.take(task);
}

bool isStored(int64_t id) {
  return findTask(id) != nullptr;
}

bool hasStoredCronLine(int64_t id) {
  const Task stored = findTask(id);
  return stored != nullptr && hasCronLine(*stored);
}

// A power time is stored before the machine's clock is armed, and stays so when that fails.
template <class IsChanged>
[[noreturn]] void throwFailedChange(const Failure &failure, IsChanged isChanged) {
  if (!isChanged()) throw failure;
  throw Failure(std::string(failure.what()) +
                "; it is stored all the same, and 'zelosched sync' tries to put it into effect");
}

}  // namespace

void requireHarmless(const ZELO_SCHED_TASK &task) {
  const std::vector<std::string> harms = harmsOf(task);
  if (harms.empty()) return;
  std::string sentences = "not saved: ";
  for (size_t i = 0; i < harms.size(); ++i) {
    sentences += (i == 0 ? "" : "\nzelosched: not saved: ") + harms[i];
  }
  throw Failure(sentences);
}

bool isUnreadable(const ZELO_SCHED_TASK &task) {
  return isEnabled(task) && !unreadableFieldsOf(task).empty();
}

std::string unreadableTask(const TaskList &list) {
  for (const ZELO_SCHED_TASK *task : list.tasks()) {
    if (!isUnreadable(*task)) continue;
    return titleOf(*task) + ": " + unreadableFieldsOf(*task).front() + ", or disable the task";
  }
  return "";
}

void requireReadableTasks(std::optional<int64_t> changedId) {
  requireTasksAreBack();
  const TaskList list;
  // Where there are several, each can be mended while the others are there.
  const bool isMended = std::any_of(
      list.tasks().begin(), list.tasks().end(),
      [&](const ZELO_SCHED_TASK *task) { return changedId == task->ID && isUnreadable(*task); });
  const std::string fault = unreadableTask(list);
  if (fault.empty() || isMended) return;
  throw Failure("nothing was saved, as cron may then pass over all of /etc/crontab: " + fault);
}

bool hasCronLine(const ZELO_SCHED_TASK &task) {
  return isEnabled(task) && !isPower(task);
}

void requireCronRoom(size_t lines) {
  if (schedHasCronRoom(lines)) return;
  throw Failure("not saved: /etc/crontab would have more than " +
                std::to_string(kSchedMostFilledCronLines) +
                " lines, and cron ignores all of it when there are more than " +
                std::to_string(kSchedMostCronLines) + ": remove or disable tasks first");
}

void saveNewTask(ZELO_SCHED_TASK *task) {
  requireHarmless(*task);
  if (isPower(*task)) {
    PowerRoom().take(*task);
  } else {
    requireReadableTasks();
    requireCronRoom(hasCronLine(*task) ? 1 : 0);
  }
  storeNew(task);
}

void createTask(ZELO_SCHED_TASK *task) {
  saveNewTask(task);
  requireCrontabInStep();
}

void editTask(ZELO_SCHED_TASK *task) {
  if (isPower(*task)) {
    requireUnlike(*task);
  } else {
    requireReadableTasks(task->ID);
    if (hasCronLine(*task) && !hasStoredCronLine(task->ID)) requireCronRoom(1);
  }
  storeChanged(task);
  requireCrontabInStep();
}

void removeTask(const ZELO_SCHED_TASK &task) {
  // Power times have lines of their own, which a task does not affect.
  if (!isPower(task)) requireReadableTasks(task.ID);
  storeRemoved(task);
  requireCrontabInStep();
}

void storeNew(ZELO_SCHED_TASK *task) {
  const HeldSignals held;
  forgetError();
  if (ZELOSchedTaskCreate(task) < 0) {
    throwFailedChange(failedTo("save the task"),
                      [&] { return isPower(*task) && isStored(powerId(*task)); });
  }
  noteCreated(*task);
}

void storeChanged(ZELO_SCHED_TASK *task) {
  const HeldSignals held;
  forgetError();
  if (ZELOSchedTaskEdit(task) < 0) {
    throwFailedChange(failedTo("save " + titleOf(*task)),
                      [&] { return isPower(*task) && isStored(powerId(*task)); });
  }
  if (isPower(*task)) task->ID = powerId(*task);
  noteEdited(*task);
}

void storeRemoved(const ZELO_SCHED_TASK &task) {
  const HeldSignals held;
  forgetError();
  if (ZELOSchedTaskRemove(task.ID) < 0) {
    throwFailedChange(failedTo("remove " + titleOf(task)),
                      [&] { return isPower(task) && !isStored(task.ID); });
  }
  noteRemoved(task);
}

std::string crontabFault(const TaskList &list) {
  // While there is an unreadable task, the crontab is not written, and may differ.
  if (!unreadableTask(list).empty()) return "";
  const std::vector<std::string> differences = crontabDifferences(list.tasks());
  return differences.empty() ? "" : differences.front();
}

void requireCrontabInStep() {
  const std::string fault = crontabFault(TaskList());
  if (fault.empty()) return;
  throw Failure("the tasks are saved, but cron does not know them all: " + fault +
                " (the system log says why; 'zelosched sync' tries again)");
}

void requirePermission(const ZELO_SCHED_TASK &task, int32_t flag, const char *what, bool insists) {
  if (flag == kFlagYes || insists) return;
  throw Failure("the application of " + titleOf(task) + " does not let it be " + what +
                " by hand: --force does it all the same");
}
