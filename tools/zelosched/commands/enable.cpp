// zelosched enable, zelosched disable
#include <cstdio>

#include "commands/command.h"
#include "commands/expected_task.h"
#include "commands/for_each.h"
#include "commands/options.h"
#include "commands/stop_task.h"
#include "store/change_lock.h"
#include "store/save.h"
#include "store/task_list.h"

namespace {

constexpr Option kEnableOptions[] = {EXPECTED_TASK_OPTIONS};
constexpr Option kDisableOptions[] = {{"stop"}, EXPECTED_TASK_OPTIONS};

// A task with faults may be disabled, but not enabled.
void setState(int64_t id, int32_t state, const ExpectedTask &expected) {
  const ChangeLock lock;
  const Task task = loadTask(id);
  expected.require(*task);
  if (task->State == state) {
    std::printf("%s is %s already\n", titleOf(*task).c_str(), stateName(*task));
    return;
  }
  task->State = state;
  if (isEnabled(*task)) requireHarmless(*task);
  const int32_t formerId = task->ID;
  editTask(task.get());
  std::printf("%s %s\n", titleOf(*task).c_str(), stateName(*task));
  if (task->ID != formerId) std::printf("it was task %d before\n", formerId);
}

void disable(int64_t id, bool stops, const ExpectedTask &expected) {
  setState(id, ZELO_SCHED_STATE_DISABLED, expected);
  const Task task = findTask(id);
  if (!task) return;  // a power time, which has another id now
  if (stops) {
    stopTask(id, "a run of it");
  } else {
    tellOfRunsOf(*task);
  }
}

int runEnable(int argc, char **argv) {
  const Arguments arguments(argc, argv, kEnableOptions);
  arguments.requireNoCommand();
  const ExpectedTask expected(arguments);
  return forEach(parseIds(arguments.operands()),
                 [&](int64_t id) { setState(id, ZELO_SCHED_STATE_ENABLED, expected); });
}

int runDisable(int argc, char **argv) {
  const Arguments arguments(argc, argv, kDisableOptions);
  arguments.requireNoCommand();
  const ExpectedTask expected(arguments);
  return forEach(parseIds(arguments.operands()),
                 [&](int64_t id) { disable(id, arguments.has("stop"), expected); });
}

}  // namespace

const Command kEnableCommand = {
    "enable", "TASK... [OPTION...]", "let tasks run at their times",
    "Lets the tasks run at their times. One with a fault that would do harm is refused, and\n"
    "so is one whose line would make /etc/crontab longer than cron reads.\n"
    "\n" EXPECTED_TASK_HELP,
    runEnable};

const Command kDisableCommand = {
    "disable", "TASK... [--stop] [OPTION...]", "keep tasks, but do not run them",
    "Keeps the tasks, but does not run them until they are enabled. A run that is under\n"
    "way, or waits for its turn, goes on, which is told.\n"
    "\n"
    "  --stop                         end it, as 'zelosched stop' does\n" EXPECTED_TASK_HELP,
    runDisable};
