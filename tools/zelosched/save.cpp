#include "save.h"

#include <cstring>

#include "crontab_check.h"
#include "failure.h"
#include "task_check.h"
#include "task_list.h"
#include "text.h"

namespace {

constexpr int kFlagYes = 1;
constexpr char kDayOff = '0';

// The library's rule; see zeloautopower_init.
int32_t powerId(const ZELO_SCHED_TASK &task) {
  constexpr int32_t kPowerOn = 60000000;
  constexpr int32_t kPowerOff = 80000000;
  constexpr int32_t kEnabled = 10000000;
  constexpr int32_t kWeekdays = 10000;
  constexpr int32_t kHour = 100;
  constexpr int kDays = 7;
  int32_t weekdays = 0;
  for (int day = 0; day < kDays; ++day) {
    if (task.Week[day] != kDayOff) weekdays |= 1 << day;
  }
  const int32_t base = std::strcmp(task.AppArgs, "poweroff") == 0 ? kPowerOff : kPowerOn;
  return base + (isEnabled(task) ? kEnabled : 0) + weekdays * kWeekdays +
         static_cast<int32_t>(task.RunHour) * kHour + static_cast<int32_t>(task.RunMin);
}

void requireNew(const ZELO_SCHED_TASK &task) {
  const int32_t id = powerId(task);
  if (id != task.ID && findTask(id) != nullptr) {
    throw Failure("there is such a power time already: it is task " + std::to_string(id));
  }
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
  if (isPower(*task)) requireNew(*task);
  forgetError();
  if (ZELOSchedTaskCreate(task) < 0) {
    throwFailedChange(failedTo("save the task"),
                      [&] { return isPower(*task) && isStored(powerId(*task)); });
  }
  requireCrontabInStep();
}

void editTask(ZELO_SCHED_TASK *task) {
  if (isPower(*task)) requireNew(*task);
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
