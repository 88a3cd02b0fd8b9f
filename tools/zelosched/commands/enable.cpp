// zelosched enable, zelosched disable
#include <cstdio>

#include "commands/command.h"
#include "commands/for_each_id.h"
#include "commands/options.h"
#include "store/change_lock.h"
#include "store/save.h"
#include "store/task_list.h"

namespace {

// A task that would do harm may be disabled, which ends the harm, but not enabled.
void setState(long id, int32_t state) {
  const ChangeLock lock;
  const Task task = loadTask(id);
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

int setStates(int argc, char **argv, int32_t state) {
  const Arguments arguments(argc, argv, {});
  arguments.requireNoCommand();
  return forEachId(parseIds(arguments.operands()), [&](long id) { setState(id, state); });
}

int runEnable(int argc, char **argv) {
  return setStates(argc, argv, ZELO_SCHED_STATE_ENABLED);
}

int runDisable(int argc, char **argv) {
  return setStates(argc, argv, ZELO_SCHED_STATE_DISABLED);
}

}  // namespace

const Command kEnableCommand = {
    "enable", "TASK...", "let tasks run at their times",
    "Lets the tasks run at their times. One with a fault that would do harm is refused, and\n"
    "so is one whose line would make /etc/crontab longer than cron reads.\n",
    runEnable};

const Command kDisableCommand = {
    "disable", "TASK...", "keep tasks, but do not run them",
    "Keeps the tasks, but does not run them until they are enabled. A run that is under\n"
    "way goes on.\n",
    runDisable};
