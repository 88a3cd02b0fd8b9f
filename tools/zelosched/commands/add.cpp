// zelosched add
#include <cstdio>
#include <ctime>

#include "check/task_check.h"
#include "commands/command.h"
#include "commands/task_options.h"
#include "json/task_input.h"
#include "runs/coming_runs.h"
#include "store/change_lock.h"
#include "store/save.h"
#include "store/stagger.h"
#include "store/task_list.h"
#include "terminal/failure.h"
#include "terminal/input.h"
#include "terminal/schedule_text.h"
#include "terminal/text.h"

namespace {

constexpr Option kAddOptions[] = {TASK_OPTIONS,
                                  {"stdin"},
                                  {"disabled"},
                                  {"stagger", Option::kValue},
                                  {"quiet", Option::kNone, 'q'}};

void announce(const ZELO_SCHED_TASK &task) {
  const std::optional<LocalMinute> next = nextRun(task, localMinute(time(nullptr)));
  std::printf("%s added: %s", titleOf(task).c_str(), scheduleInWords(task).c_str());
  if (next) std::printf("; runs next at %s", minuteText(*next).c_str());
  std::puts(isEnabled(task) ? "" : "; disabled");
}

int runAdd(int argc, char **argv) {
  const Arguments arguments(argc, argv, kAddOptions);
  arguments.requireNoOperands();
  requireOneSource(arguments);
  const bool isRead = arguments.has("stdin");
  if (!isRead && !hasSchedule(arguments)) throw UsageError("when? Give --daily 08:30, say");
  if (!isRead && !arguments.afterDashes()) throw UsageError("what? Give the command after '--'");
  const auto window = arguments.value("stagger");
  if (window && !isRead && !arguments.has("name")) {
    throw UsageError("'--stagger' goes by the task's name: add --name");
  }
  const uint32_t minutes = window ? minutesOfWindow(*window) : 0;
  // Before the lock is taken: the input may take long to come.
  const std::string text = isRead ? readInput(kStandardInput) : "";
  const ChangeLock lock;
  const Task task = newTask(ZELO_SCHED_BACKEND_SCHEDULE);
  applyTaskOptions(arguments, task.get());
  if (isRead) fillFromText(text, task.get());
  if (arguments.has("disabled")) task->State = ZELO_SCHED_STATE_DISABLED;
  requireHarmless(*task);
  if (window) stagger(minutes, task.get());
  const std::string past = pastSchedule(*task, time(nullptr));
  if (!past.empty()) throw Failure("not saved: " + past);
  saveNewTask(task.get());
  if (arguments.has("quiet")) {
    std::printf("%d\n", task->ID);
  } else {
    announce(*task);
  }
  requireCrontabInStep();
  return kDone;
}

}  // namespace

const Command kAddCommand = {
    "add", "[OPTION...] -- COMMAND...", "save a new task",
    "Saves a new task, which runs COMMAND by a shell, and says its id. One is refused whose\n"
    "line would make /etc/crontab longer than cron reads.\n"
    "\n" TASK_OPTIONS_HELP
    "\n"
    "Also:\n"
    "  --stdin                        the whole task as JSON (zelosched-json(5)) from the\n"
    "                                 standard input, in place of options and command\n"
    "  --disabled                     save it, but do not run it until it is enabled\n"
    "  --stagger 30m                  at a minute of so many, from its time on: always the\n"
    "                                 same one for this machine, application and name\n"
    "  -q, --quiet                    print the id and nothing else\n",
    runAdd};
