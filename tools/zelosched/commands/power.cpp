// zelosched power
#include <json/json.h>

#include <cstdio>
#include <cstring>
#include <ctime>

#include "check/alarm_check.h"
#include "commands/command.h"
#include "commands/options.h"
#include "commands/remove_tasks.h"
#include "json/json_out.h"
#include "json/task_json.h"
#include "runs/coming_runs.h"
#include "store/change_lock.h"
#include "store/power_room.h"
#include "store/save.h"
#include "store/task_list.h"
#include "terminal/failure.h"
#include "terminal/schedule_text.h"
#include "terminal/table.h"

namespace {

// ---- list -----------------------------------------------------------------------------------

void printTable(const std::vector<const ZELO_SCHED_TASK *> &tasks) {
  const LocalMinute now = localMinute(time(nullptr));
  Table table(
      {{"ID", Column::kRight}, {"POWER"}, {"STATE"}, {"NEXT"}, {"WHEN", Column::kLeft, true}});
  for (const ZELO_SCHED_TASK *task : tasks) {
    const std::optional<LocalMinute> next = nextRun(*task, now);
    table.add({{std::to_string(task->ID)},
               {directionOf(*task)},
               {stateName(*task), isEnabled(*task) ? Emphasis::kNone : Emphasis::kDim},
               {next ? minuteText(*next) : kNoValue},
               {scheduleInWords(*task)}});
  }
  table.print();
}

Json::Value clockAsJson() {
  const Alarm alarm = readAlarm();
  Json::Value clock;
  clock["is_there"] = alarm.isThere;
  clock["is_armed"] = alarm.isArmed;
  clock["wakes_at"] = alarm.wakesAt ? jsonTime(*alarm.wakesAt) : Json::Value();
  return clock;
}

int runPowerList(int argc, char **argv) {
  constexpr Option kOptions[] = {{"json"}};
  const Arguments arguments(argc, argv, kOptions);
  arguments.requireNoOperands();
  arguments.requireNoCommand();
  const TaskList list;
  std::vector<const ZELO_SCHED_TASK *> tasks = list.tasks();
  std::erase_if(tasks, [](const ZELO_SCHED_TASK *task) { return !isPower(*task); });
  if (!arguments.has("json")) {
    printTable(tasks);
    return kDone;
  }
  const LocalMinute now = localMinute(time(nullptr));
  Json::Value top = topObject();
  Json::Value &times = top["power_times"] = Json::Value(Json::arrayValue);
  for (const ZELO_SCHED_TASK *task : tasks) times.append(powerTimeOf(*task, nextRun(*task, now)));
  top["clock"] = clockAsJson();
  printTop(top);
  return kDone;
}

// ---- add ------------------------------------------------------------------------------------

std::string direction(const Arguments &arguments) {
  const std::vector<std::string> &words = arguments.operands();
  if (words.size() != 1 || (words[0] != "on" && words[0] != "off")) {
    throw UsageError("power on or power off? Give 'on' or 'off'");
  }
  return words[0];
}

int runPowerAdd(int argc, char **argv) {
  constexpr Option kOptions[] = {{"daily", Option::kValue},
                                 {"weekly", Option::kTwoValues},
                                 {"disabled"},
                                 {"quiet", Option::kNone, 'q'}};
  const Arguments arguments(argc, argv, kOptions);
  arguments.requireNoCommand();
  const std::string wanted = direction(arguments);
  if (arguments.has("daily") == arguments.has("weekly")) {
    throw UsageError("when? Give either --daily or --weekly");
  }
  const ChangeLock lock;
  const Task task = newTask(ZELO_SCHED_BACKEND_AUTOPOWER);
  setText(task->App, "application", kPowerApp);
  setText(task->AppArgs, "direction", "power" + wanted);
  if (const auto text = arguments.value("daily")) setDaily(task.get(), *text);
  if (const auto text = arguments.value("weekly")) setWeekly(task.get(), *text);
  if (arguments.has("disabled")) task->State = ZELO_SCHED_STATE_DISABLED;
  createTask(task.get());
  if (arguments.has("quiet")) {
    std::printf("%d\n", task->ID);
  } else {
    std::printf("power %s %s: task %d\n", wanted.c_str(), scheduleInWords(*task).c_str(), task->ID);
  }
  return kDone;
}

// ---- remove ---------------------------------------------------------------------------------

int runPowerRemove(int argc, char **argv) {
  constexpr Option kOptions[] = {{"yes", Option::kNone, 'y'}};
  const Arguments arguments(argc, argv, kOptions);
  arguments.requireNoCommand();
  return removeTasks(parseIds(arguments.operands()), {arguments.has("yes"), false, true});
}

struct Action {
  const char *name;
  int (*run)(int argc, char **argv);
};
constexpr Action kActions[] = {
    {"list", runPowerList}, {"add", runPowerAdd}, {"remove", runPowerRemove}};

int runPower(int argc, char **argv) {
  if (argc < 2) throw UsageError("which of list, add and remove?");
  for (const Action &action : kActions) {
    if (std::strcmp(argv[1], action.name) == 0) return action.run(argc - 1, argv + 1);
  }
  throw UsageError("there is nothing but list, add and remove");
}

}  // namespace

const Command kPowerCommand = {
    "power", "list|add|remove ...", "look after the times at which the machine goes on and off",
    "  zelosched power list [--json]\n"
    "  zelosched power add on|off --daily 07:30\n"
    "  zelosched power add on|off --weekly mon-fri 07:30\n"
    "  zelosched power remove TASK...\n"
    "\n"
    "The power times are tasks too: enable, disable, edit and show take them. Their ids\n"
    "are made of the times and change with them. At a power-off time cron starts\n"
    "/usr/zelo/bin/zelo_poweroff_feasible_check; the sample of it that comes with this\n"
    "package looks at running tasks and switches nothing off.\n"
    "\n"
    "  --daily 07:30                  every day\n"
    "  --weekly mon-fri 07:30         on these days\n"
    "  --disabled                     save it, but without effect until it is enabled\n"
    "  -q, --quiet                    print the id and nothing else\n"
    "  -y, --yes                      remove without a question\n"
    "  --json                         as JSON: see zelosched-json(5)\n",
    runPower};
