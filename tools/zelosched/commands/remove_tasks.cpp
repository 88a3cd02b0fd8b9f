#include "commands/remove_tasks.h"

#include <unistd.h>

#include <cstdio>
#include <string>

#include "commands/for_each.h"
#include "commands/options.h"
#include "commands/stop_task.h"
#include "json/wire_json.h"
#include "store/change_lock.h"
#include "store/save.h"
#include "store/task_list.h"

namespace {

bool isYes(const std::string &answer) {
  return answer == "y" || answer == "Y" || answer == "yes";
}

// Asked on standard error, so that it is seen when the output is redirected.
bool isConfirmed(const ZELO_SCHED_TASK &task) {
  std::fprintf(stderr, "Remove %s? [y/N] ", titleOf(task).c_str());
  std::fflush(stderr);
  std::string answer;
  for (int c; (c = std::getchar()) != EOF && c != '\n';) answer += static_cast<char>(c);
  return isYes(answer);
}

// The id may have been given to another task since. The name of a power time is its position in the
// list, which changes when one before it is removed.
bool isSame(const ZELO_SCHED_TASK &one, const ZELO_SCHED_TASK &other) {
  const auto membersOf = [](const ZELO_SCHED_TASK &task) {
    std::vector<StoredMember> members = storedMembersOf(task);
    if (isPower(task)) {
      std::erase_if(members, [](const StoredMember &member) { return member.key == "name"; });
    }
    return members;
  };
  return membersOf(one) == membersOf(other);
}

Task loadRemovable(int64_t id, const RemoveRules &rules) {
  Task task = loadTask(id);
  rules.expected.require(*task);
  if (rules.powerOnly && !isPower(*task)) throw Failure(titleOf(*task) + " is no power time");
  requirePermission(*task, task->CanDeleteFromUI, "removed", rules.insists);
  return task;
}

void tellRemoved(const ZELO_SCHED_TASK &task) {
  std::printf("%s removed\n", titleOf(task).c_str());
}

// The lock is not held while the user is asked.
Task askAndRemove(int64_t id, const RemoveRules &rules) {
  Task task = loadRemovable(id, rules);
  if (!isConfirmed(*task)) throw Failure(titleOf(*task) + " stays");
  const ChangeLock lock;
  if (!isSame(*task, *loadTask(id))) {
    throw Failure(titleOf(*task) + " stays: it has been changed meanwhile");
  }
  removeAndCancel(*task, removeTask, tellRemoved);
  return task;
}

Task removeUnasked(int64_t id, const RemoveRules &rules) {
  const ChangeLock lock;
  Task task = loadRemovable(id, rules);
  removeAndCancel(*task, removeTask, tellRemoved);
  return task;
}

void removeOne(int64_t id, const RemoveRules &rules) {
  const Task task = rules.isSure ? removeUnasked(id, rules) : askAndRemove(id, rules);
  if (rules.stops) {
    stopTask(task->ID, "a run of it");
  } else {
    tellOfRunsOf(*task);
  }
}

}  // namespace

void removeAndCancel(const ZELO_SCHED_TASK &task, const TaskStep &remove, const TaskStep &tell,
                     FILE *to) {
  const int before = attempt([&] { cancelWaitingOf(task, to); });
  remove(task);
  tell(task);
  cancelWaitingOf(task, to);
  if (before != kDone) throw Failure("a run of it that waited may start all the same");
}

int removeTasks(const std::vector<int64_t> &ids, const RemoveRules &rules) {
  if (!rules.isSure && isatty(STDIN_FILENO) != 1) {
    throw UsageError("there is nobody to ask: give --yes to remove without a question");
  }
  return forEach(ids, [&](int64_t id) { removeOne(id, rules); });
}
