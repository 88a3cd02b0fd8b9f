// zelosched show
#include <json/json.h>

#include <algorithm>
#include <cstdio>
#include <ctime>

#include "check/task_check.h"
#include "commands/command.h"
#include "commands/for_each_id.h"
#include "commands/options.h"
#include "json/json_out.h"
#include "runs/coming_runs.h"
#include "runs/result_text.h"
#include "runs/runs.h"
#include "store/owner.h"
#include "store/task_list.h"
#include "terminal/failure.h"
#include "terminal/schedule_text.h"
#include "terminal/text.h"

namespace {

constexpr Option kOptions[] = {{"json"}};

struct Line {
  const char *title;
  std::string text;
};

std::optional<Run> lastRun(const ZELO_SCHED_TASK &task) {
  if (!mayReadRuns()) return std::nullopt;
  const std::vector<Run> runs = RunDatabase().newest(task.ID, 1);
  if (runs.empty()) return std::nullopt;
  return runs.front();
}

// The status database is in "/tmp", where anybody can be in its way: the task is shown without it.
std::string lastRunInWords(const ZELO_SCHED_TASK &task, int *status) {
  if (!mayReadRuns()) return "only root may see";
  std::string words = "?";
  const int result = attempt([&] {
    const std::optional<Run> run = lastRun(task);
    words = run ? minuteText(localMinute(run->start)) + ", " +
                      resultInWords(run->statusCode, run->comment)
                : "none is recorded";
  });
  *status = std::max(*status, result);
  return words;
}

// A zero stands for the beginning: of the year, or of the month.
std::string startDate(const ZELO_SCHED_TASK &task) {
  char text[64];
  std::snprintf(text, sizeof text, "%04u-%02u-%02u", task.StartYear, std::max(task.StartMonth, 1U),
                std::max(task.StartDay, 1U));
  return text;
}

bool startsLater(const ZELO_SCHED_TASK &task, const LocalMinute &now) {
  return task.Type != ZELO_SCHED_TYPE_ONCE && startDate(task) > dayText(now);
}

std::string userText(const ZELO_SCHED_TASK &task) {
  return userName(task.Owner) + " (" + std::to_string(task.Owner) + ")";
}

std::string overlapText(const ZELO_SCHED_TASK &task) {
  const std::string self = task.CanRunTaskSameTime == 1 ? "may" : "must not";
  const std::string app = task.CanRunAppSameTime == 1 ? "may" : "must not";
  return self + " overlap another run of it, " + app + " overlap others of its application";
}

std::vector<Line> linesOf(const ZELO_SCHED_TASK &task, int *status) {
  const LocalMinute now = localMinute(time(nullptr));
  const std::optional<LocalMinute> next = nextRun(task, now);
  std::vector<Line> lines = {
      {"ID", std::to_string(task.ID)},
      {"Name", task.Name},
      {"State", stateName(task)},
      {"Runs", scheduleInWords(task)},
      {"From", startsLater(task, now) ? startDate(task) + " on" : ""},
      {"Next run", next ? minuteText(*next) : "none"},
      {"Last run", lastRunInWords(task, status)},
      {"Owner", userText(task)},
      {"Command", task.Command},
      {"Action", task.Action},
      {"App", task.App},
      {"App name", task.AppName},
      {"App args", task.AppArgs},
      {"Runs of it", isPower(task) ? "" : overlapText(task)},
  };
  for (const std::string &harm : harmsOf(task)) lines.push_back({"Fault", harm});
  std::erase_if(lines, [](const Line &line) { return line.text.empty(); });
  return lines;
}

// The exit status.
int print(const ZELO_SCHED_TASK &task) {
  int status = kDone;
  for (const Line &line : linesOf(task, &status)) {
    std::printf("%12s: %s\n", line.title, printable(line.text).c_str());
  }
  return status;
}

int runShow(int argc, char **argv) {
  const Arguments arguments(argc, argv, kOptions);
  arguments.requireNoCommand();
  const std::vector<long> ids = parseIds(arguments.operands());
  std::vector<Json::Value> objects;
  bool isFirst = true;
  int shown = kDone;
  const int found = forEachId(ids, [&](long id) {
    const Task task = loadTask(id);
    if (arguments.has("json")) {
      objects.push_back(jsonOf(*task));
      return;
    }
    if (!isFirst) std::puts("");
    isFirst = false;
    shown = std::max(shown, print(*task));
  });
  // One task is one object, without an array around it.
  if (objects.size() == 1 && ids.size() == 1) {
    std::puts(onOneLine(objects.front()).c_str());
  } else if (arguments.has("json") && ids.size() > 1) {
    printJson(objects);
  }
  return std::max(found, shown);
}

}  // namespace

const Command kShowCommand = {
    "show", "ID... [--json]", "show all that is known of tasks",
    "Shows all that is known of the tasks, with what is wrong with them.\n"
    "\n"
    "  --json                         a JSON object; of several tasks an array\n",
    runShow};
