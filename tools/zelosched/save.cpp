#include "save.h"

#include <cstring>

#include "crontab_check.h"
#include "failure.h"
#include "power_room.h"
#include "task_check.h"
#include "task_list.h"
#include "text.h"

namespace {

constexpr int kFlagYes = 1;

// An entry that is edited into one like another would be one less.
void requireUnlike(const ZELO_SCHED_TASK &task) {
  if (powerId(task) != task.ID) PowerRoom().take(task);
}

bool isStored(long id) {
  return findTask(id) != nullptr;
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

void createTask(ZELO_SCHED_TASK *task) {
  requireHarmless(*task);
  if (isPower(*task)) PowerRoom().take(*task);
  forgetError();
  if (ZELOSchedTaskCreate(task) < 0) {
    throwFailedChange(failedTo("save the task"),
                      [&] { return isPower(*task) && isStored(powerId(*task)); });
  }
  requireCrontabInStep();
}

void editTask(ZELO_SCHED_TASK *task) {
  if (isPower(*task)) requireUnlike(*task);
  forgetError();
  if (ZELOSchedTaskEdit(task) < 0) {
    throwFailedChange(failedTo("save " + titleOf(*task)),
                      [&] { return isPower(*task) && isStored(powerId(*task)); });
  }
  if (isPower(*task)) task->ID = powerId(*task);
  requireCrontabInStep();
}

void removeTask(const ZELO_SCHED_TASK &task) {
  forgetError();
  if (ZELOSchedTaskRemove(task.ID) < 0) {
    throwFailedChange(failedTo("remove " + titleOf(task)),
                      [&] { return isPower(task) && !isStored(task.ID); });
  }
  requireCrontabInStep();
}

void requireCrontabInStep() {
  const TaskList list;
  const std::vector<std::string> differences = crontabDifferences(list.tasks());
  if (differences.empty()) return;
  throw Failure("the tasks are saved, but cron does not know them all: " + differences.front() +
                " (the system log says why; 'zelosched sync' tries again)");
}

void requirePermission(const ZELO_SCHED_TASK &task, int32_t flag, const char *what, bool insists) {
  if (flag == kFlagYes || insists) return;
  throw Failure("the application of " + titleOf(task) + " does not let it be " + what +
                " by hand: --force does it all the same");
}
