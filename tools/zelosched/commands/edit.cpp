// zelosched edit
#include <cstdio>
#include <cstring>
#include <ctime>
#include <memory>

#include "check/task_check.h"
#include "commands/command.h"
#include "commands/expected_task.h"
#include "commands/task_options.h"
#include "json/task_input.h"
#include "store/change_lock.h"
#include "store/save.h"
#include "store/task_list.h"
#include "terminal/failure.h"
#include "terminal/input.h"
#include "terminal/schedule_text.h"

namespace {

constexpr Option kEditOptions[] = {TASK_OPTIONS, {"stdin"}, {"force"}, EXPECTED_TASK_OPTIONS};

void requirePermissions(const Arguments &arguments, const ZELO_SCHED_TASK &before,
                        const ZELO_SCHED_TASK &task) {
  const bool insists = arguments.has("force");
  const bool isRead = arguments.has("stdin");  // which may give a member its old value
  requirePermission(before, before.CanEditFromUI, "edited", insists);
  if (arguments.has("name") || (isRead && std::strcmp(before.Name, task.Name) != 0)) {
    requirePermission(before, before.CanEditName, "renamed", insists);
  }
  if (arguments.has("owner") || (isRead && before.Owner != task.Owner)) {
    requirePermission(before, before.CanEditOwner, "given another owner", insists);
  }
}

int runEdit(int argc, char **argv) {
  const Arguments arguments(argc, argv, kEditOptions);
  const std::vector<int64_t> ids = parseIds(arguments.operands());
  if (ids.size() > 1) throw UsageError("one task at a time");
  requireOneSource(arguments);
  const bool isRead = arguments.has("stdin");
  if (!isRead && !hasTaskOption(arguments)) throw UsageError("what is to be changed?");
  const std::string text = isRead ? readInput(kStandardInput) : "";
  const ChangeLock lock;
  const Task before = loadTask(ids.front());
  ExpectedTask(arguments).require(*before);
  const Task task = std::make_unique<TaskRecord>(*before);
  if (isRead && isPower(*task))
    throw UsageError("of a power time only --daily and --weekly can be set");
  applyTaskOptions(arguments, task.get());
  if (isRead) fillFromText(text, task.get());
  requirePermissions(arguments, *before, *task);
  requireHarmless(*task);
  const std::string past = hasSchedule(arguments) || !isSameSchedule(*before, *task)
                               ? pastSchedule(*task, time(nullptr))
                               : "";
  if (!past.empty()) throw Failure("not saved: " + past);
  editTask(task.get());
  std::printf("%s saved: %s\n", titleOf(*task).c_str(), scheduleInWords(*task).c_str());
  return kDone;
}

}  // namespace

const Command kEditCommand = {
    "edit", "TASK [OPTION...] [-- COMMAND...]", "change a task",
    "Changes what the options name; the rest of the task stays. It is named by its id, or by\n"
    "its name when no other has that. Another kind of schedule takes the start date away,\n"
    "and keeps --every and --until.\n"
    "\n"
    "The id of a power time is made of its times and changes with them.\n"
    "\n" TASK_OPTIONS_HELP
    "\n"
    "Also:\n"
    "  --stdin                        the task as JSON (zelosched-json(5)) from the standard\n"
    "                                 input, in place of options; what is not named stays\n"
    "  --force                        even if its application does not let it be "
    "edited\n" EXPECTED_TASK_HELP,
    runEdit};
