// zelosched show
#include <json/json.h>

#include <algorithm>
#include <cstdio>
#include <ctime>

#include "check/task_check.h"
#include "commands/command.h"
#include "commands/for_each.h"
#include "commands/options.h"
#include "json/json_out.h"
#include "json/task_json.h"
#include "runs/coming_runs.h"
#include "runs/latest_runs.h"
#include "runs/time_limit.h"
#include "store/owner.h"
#include "store/task_list.h"
#include "terminal/failure.h"
#include "terminal/schedule_text.h"
#include "terminal/text.h"

namespace {

constexpr Option kShowOptions[] = {{"json"}};

struct Line {
  const char *title;
  std::string text;
};

std::string lastRunInWords(const ZELO_SCHED_TASK &task, const LatestRuns &runs) {
  if (!runs.isKnown) return runs.fault.empty() ? "only root may see" : "?";
  const RunRecord *run = runs.of(task.ID);
  if (run == nullptr) return "none is recorded";
  const std::string brief = runInBrief(*run, time(nullptr));
  const std::optional<int64_t> begin = run->start ? run->start : run->queued;
  return begin ? minuteText(localMinute(*begin)) + ", " + brief : brief;
}

// A month or a day of zero stands for the first.
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

std::vector<Line> linesOf(const ZELO_SCHED_TASK &task, const LatestRuns &runs) {
  const LocalMinute now = localMinute(time(nullptr));
  const std::optional<LocalMinute> next = nextRun(task, now);
  const LimitedCommand limited = takeApart(task.Command);
  std::vector<Line> lines = {
      {"ID", std::to_string(task.ID)},
      {"Name", task.Name},
      {"State", stateName(task)},
      {"Runs", scheduleInWords(task)},
      {"From", startsLater(task, now) ? startDate(task) + " on" : ""},
      {"Next run", next ? minuteText(*next) : "none"},
      {"Last run", lastRunInWords(task, runs)},
      {"Owner", userText(task)},
      {"Command", limited.command},
      {"Time limit", limited.limit},
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

void print(const ZELO_SCHED_TASK &task, const LatestRuns &runs) {
  for (const Line &line : linesOf(task, runs)) {
    std::printf("%12s: %s\n", line.title, printable(line.text).c_str());
  }
}

// Power times are other objects than tasks, in a list of their own.
void add(const ZELO_SCHED_TASK &task, const LatestRuns &runs, Json::Value *top) {
  const std::optional<LocalMinute> next = nextRun(task, localMinute(time(nullptr)));
  if (isPower(task)) {
    (*top)["power_times"].append(powerTimeOf(task, next));
  } else {
    (*top)["tasks"].append(jsonOf(task, next, runs));
  }
}

int runShow(int argc, char **argv) {
  const Arguments arguments(argc, argv, kShowOptions);
  arguments.requireNoCommand();
  const std::vector<int64_t> ids = parseIds(arguments.operands());
  const LatestRuns runs = latestRuns();
  Json::Value top = topObject();
  top["tasks"] = Json::Value(Json::arrayValue);
  bool isFirst = true;
  const int found = forEach(ids, [&](int64_t id) {
    const Task task = loadTask(id);
    if (arguments.has("json")) return add(*task, runs, &top);
    if (!isFirst) std::puts("");
    isFirst = false;
    print(*task, runs);
  });
  if (arguments.has("json")) printTop(top);
  const int known = runs.fault.empty() ? kDone : complain(runs.fault);
  return std::max(found, known);
}

}  // namespace

const Command kShowCommand = {
    "show", "TASK... [--json]", "show all that is known of tasks",
    "Shows all that is known of the tasks, with what is wrong with them. A task is named by\n"
    "its id, or by its name when no other has that.\n"
    "\n"
    "  --json                         as JSON: see zelosched-json(5)\n",
    runShow};
