// zelosched import
#include <json/json.h>

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <memory>

#include "check/task_check.h"
#include "commands/apply_tasks.h"
#include "commands/command.h"
#include "commands/options.h"
#include "json/wire_json.h"
#include "store/change_lock.h"
#include "store/power_room.h"
#include "store/save.h"
#include "store/task_list.h"
#include "terminal/failure.h"
#include "terminal/input.h"
#include "terminal/text.h"

namespace {

constexpr Option kImportOptions[] = {{"wire"}, {"new"}, {"force"}};
constexpr char kNoTask[] = "there is no task to import";

// ---- the library's own form -----------------------------------------------------------------

bool isBlank(const char *text) {
  return text[std::strspn(text, " \t\r\n")] == '\0';
}

Task taskOf(const Json::Value &object) {
  Task task = std::make_unique<TaskRecord>();
  fillFromJson(object, task.get());
  const bool isPowerTime = std::strcmp(task->App, kPowerApp) == 0;
  task->Backend = isPowerTime ? ZELO_SCHED_BACKEND_AUTOPOWER : ZELO_SCHED_BACKEND_SCHEDULE;
  if (!isPowerTime && isBlank(task->Command)) throw Failure("there is no command");
  requireHarmless(*task);
  return task;
}

// The stored task of the id, if it is the same by the rule of ZELOSchedTaskSaveFromJson.
Task storedOf(const ZELO_SCHED_TASK &task) {
  Task stored = findTask(task.ID);
  const bool isSame = stored != nullptr && stored->Backend == task.Backend &&
                      std::strcmp(stored->App, task.App) == 0 &&
                      (isPower(task) || std::strcmp(stored->Name, task.Name) == 0);
  return isSame ? std::move(stored) : nullptr;
}

bool isStored(const ZELO_SCHED_TASK &task) {
  return storedOf(task) != nullptr;
}

bool addsLine(const ZELO_SCHED_TASK &task, bool isNew) {
  if (!hasCronLine(task)) return false;
  const Task stored = isNew ? nullptr : storedOf(task);
  return stored == nullptr || !hasCronLine(*stored);
}

std::string orderOf(size_t index, size_t count) {
  return "object " + std::to_string(index + 1) + " of " + std::to_string(count);
}

// Nothing is saved unless every object can be, together with the others of the file.
std::vector<Task> readTasks(const std::vector<Json::Value> &objects, bool areNew) {
  std::vector<Task> tasks;
  PowerRoom room;
  for (size_t i = 0; i < objects.size(); ++i) {
    try {
      Task task = taskOf(objects[i]);
      const bool isKnown = !areNew && isStored(*task);
      if (isPower(*task)) {
        if (isKnown) room.leave(*task);
        room.take(*task);
      }
      tasks.push_back(std::move(task));
    } catch (const Failure &failure) {
      complain(orderOf(i, objects.size()) + ": " + failure.what());
    }
  }
  if (tasks.size() < objects.size()) {
    throw Failure("nothing was imported: " + counted(objects.size() - tasks.size(), "object") +
                  " of " + std::to_string(objects.size()) + " cannot be saved");
  }
  return tasks;
}

// Checked before the first save, so that not only some are saved. A line that one task removes does
// not count, as it may still be there when another is added.
void requireSavable(const std::vector<Task> &tasks, bool areNew) {
  const bool hasLine =
      std::any_of(tasks.begin(), tasks.end(), [](const Task &task) { return !isPower(*task); });
  if (hasLine) requireReadableTasks();
  const auto added = std::count_if(tasks.begin(), tasks.end(),
                                   [&](const Task &task) { return addsLine(*task, areNew); });
  requireCronRoom(static_cast<size_t>(added));
}

void save(ZELO_SCHED_TASK *task, bool isNew) {
  if (!isNew && isStored(*task)) {
    editTask(task);
    std::printf("%s overwritten\n", titleOf(*task).c_str());
  } else {
    task->ID = ZELO_SCHED_ID_NEW;
    createTask(task);
    std::printf("%s added\n", titleOf(*task).c_str());
  }
}

int importWire(const std::string &text, bool areNew) {
  const std::vector<Json::Value> objects = parseObjects(text);
  const ChangeLock lock;
  const std::vector<Task> tasks = readTasks(objects, areNew);
  requireSavable(tasks, areNew);
  int status = kDone;
  if (tasks.empty()) std::puts(kNoTask);
  for (size_t i = 0; i < tasks.size(); ++i) {
    try {
      save(tasks[i].get(), areNew);
    } catch (const Failure &failure) {
      status = complain(orderOf(i, tasks.size()) + ": " + failure.what());
    }
  }
  return status;
}

// ---- the command ----------------------------------------------------------------------------

int runImport(int argc, char **argv) {
  const Arguments arguments(argc, argv, kImportOptions);
  arguments.requireNoCommand();
  if (arguments.operands().size() != 1) throw UsageError("give one file, or - for standard input");
  if (arguments.has("new") && !arguments.has("wire")) throw UsageError("'--new' is for --wire");
  if (arguments.has("force") && arguments.has("wire")) {
    throw UsageError("'--force' is not for --wire");
  }
  const std::string text = readInput(arguments.operands().front());
  if (arguments.has("wire")) return importWire(text, arguments.has("new"));
  ApplyRules rules;
  rules.undone = "nothing was imported";
  rules.insists = arguments.has("force");
  return applyTasks(text, rules);
}

}  // namespace

const Command kImportCommand = {
    "import", "FILE|- [--force | --wire [--new]]", "save the tasks of an export",
    "Saves the tasks of a file that 'zelosched export' wrote, as 'zelosched apply' does: one of\n"
    "a known application and name is changed, any other is created, and none is removed.\n"
    "\n"
    "When one of them cannot be saved, none is, and every fault is told with its place. Nor\n"
    "is any when all together would make /etc/crontab longer than cron reads.\n"
    "At most 16 MB and 10000 tasks are read at once.\n"
    "\n"
    "  --force                        even if its application hides a task, or does not let\n"
    "                                 it be changed\n"
    "  --wire                         the form of the library's JSON calls instead: an array,\n"
    "                                 one object, or an object a line, also of plain texts\n"
    "                                 and numbers. A task overwrites the stored one of its id\n"
    "                                 when that has the same name and application\n"
    "  --new                          with --wire: overwrite nothing, all become new tasks\n",
    runImport};
