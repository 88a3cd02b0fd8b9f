#include "commands/task_options.h"

#include <algorithm>

#include "check/task_check.h"
#include "runs/time_limit.h"
#include "store/owner.h"
#include "store/task_list.h"
#include "terminal/failure.h"
#include "terminal/schedule_text.h"
#include "terminal/text.h"

namespace {

struct ScheduleOption {
  const char *name;
  void (*set)(ZELO_SCHED_TASK *task, const std::string &text);
};
constexpr ScheduleOption kKinds[] = {{"once", setOnce},
                                     {"daily", setDaily},
                                     {"weekly", setWeekly},
                                     {"monthly", setMonthly},
                                     {"yearly", setYearly}};
// After the kind, which some of them depend on, and in this order.
constexpr ScheduleOption kRefinements[] = {
    {"every", setEvery}, {"until", setUntil}, {"start", setStart}};

constexpr const char *kOtherOptions[] = {"name",     "owner",       "app",
                                         "app-name", "app-args",    "action",
                                         "overlap",  "app-overlap", "time-limit"};

bool hasAny(const Arguments &arguments, const ScheduleOption *begin, const ScheduleOption *end) {
  return std::any_of(begin, end,
                     [&](const ScheduleOption &option) { return arguments.has(option.name); });
}

bool hasOther(const Arguments &arguments) {
  return std::any_of(std::begin(kOtherOptions), std::end(kOtherOptions),
                     [&](const char *name) { return arguments.has(name); });
}

void requireOneKind(const Arguments &arguments) {
  const auto kinds =
      std::count_if(std::begin(kKinds), std::end(kKinds),
                    [&](const ScheduleOption &option) { return arguments.has(option.name); });
  if (kinds > 1) {
    throw UsageError("give one of --once, --daily, --weekly, --monthly and --yearly");
  }
}

void applySchedule(const Arguments &arguments, ZELO_SCHED_TASK *task) {
  requireOneKind(arguments);
  for (const ScheduleOption &option : kKinds) {
    if (const auto text = arguments.value(option.name)) option.set(task, *text);
  }
  for (const ScheduleOption &option : kRefinements) {
    if (const auto text = arguments.value(option.name)) option.set(task, *text);
  }
  if (arguments.has("until") && task->RepeatHour == 0) {
    throw UsageError("'--until' is for a task that repeats: add --every 2h");
  }
}

template <size_t capacity>
void applyText(const Arguments &arguments, const char *option, const char *what,
               char (&field)[capacity]) {
  if (const auto text = arguments.value(option)) setText(field, what, *text);
}

void applyFlag(const Arguments &arguments, const char *option, int32_t *flag) {
  const auto text = arguments.value(option);
  if (!text) return;
  if (*text != "yes" && *text != "no") {
    throw UsageError(std::string("'--") + option + "' takes yes or no");
  }
  *flag = *text == "yes" ? 1 : 0;
}

void applyOwner(const Arguments &arguments, ZELO_SCHED_TASK *task) {
  const auto owner = arguments.value("owner");
  if (!owner) return;
  const auto uid = findUser(*owner);
  if (!uid) {
    throw Failure("not saved: there is no user '" + printable(*owner) +
                  "': write the name or the uid of one that 'getent passwd' lists");
  }
  task->Owner = *uid;
}

std::string timeLimit(const std::string &text) {
  if (text == "none") return "";
  if (secondsOfLimit(text)) return text;
  throw UsageError("'--time-limit' takes 90s, 30m, 2h, 1d or none, not '" + printable(text) + "'");
}

// The limit is a part of the stored command; changing one of both keeps the other.
void applyCommand(const Arguments &arguments, ZELO_SCHED_TASK *task) {
  const auto limit = arguments.value("time-limit");
  if (!arguments.afterDashes() && !limit) return;
  LimitedCommand limited = takeApart(task->Command);
  if (limit) limited.limit = timeLimit(*limit);
  if (arguments.afterDashes()) limited.command = commandLine(*arguments.afterDashes());
  if (limited.command.find_first_not_of(" \t\r\n") == std::string::npos)
    throw UsageError("there is no command after '--'");
  const std::string stored = storedCommand(limited);
  if (!limited.limit.empty() && stored.size() > kMostCommandBytes) {
    throw Failure("not saved: with its time limit the command is " + std::to_string(stored.size()) +
                  " bytes long, and only " + std::to_string(kMostCommandBytes) +
                  " can be stored: put it into a script");
  }
  setText(task->Command, "command", stored);
}

// A power time has a schedule and nothing else.
void requirePowerOptions(const Arguments &arguments) {
  const bool isOther = hasOther(arguments) || arguments.afterDashes() ||
                       hasAny(arguments, std::begin(kRefinements), std::end(kRefinements)) ||
                       arguments.has("once") || arguments.has("monthly") || arguments.has("yearly");
  if (isOther) throw UsageError("of a power time only --daily and --weekly can be set");
}

}  // namespace

bool hasSchedule(const Arguments &arguments) {
  return hasAny(arguments, std::begin(kKinds), std::end(kKinds)) ||
         hasAny(arguments, std::begin(kRefinements), std::end(kRefinements));
}

bool hasTaskOption(const Arguments &arguments) {
  return hasSchedule(arguments) || hasOther(arguments) || arguments.afterDashes();
}

void requireOneSource(const Arguments &arguments) {
  if (!arguments.has("stdin") || !hasTaskOption(arguments)) return;
  throw UsageError("'--stdin' is in place of the options that describe a task");
}

void applyTaskOptions(const Arguments &arguments, ZELO_SCHED_TASK *task) {
  if (isPower(*task)) requirePowerOptions(arguments);
  applySchedule(arguments, task);
  applyText(arguments, "name", "name", task->Name);
  applyText(arguments, "app", "application", task->App);
  applyText(arguments, "app-name", "application's name", task->AppName);
  applyText(arguments, "app-args", "text for the application", task->AppArgs);
  applyText(arguments, "action", "action", task->Action);
  applyFlag(arguments, "overlap", &task->CanRunTaskSameTime);
  applyFlag(arguments, "app-overlap", &task->CanRunAppSameTime);
  applyOwner(arguments, task);
  applyCommand(arguments, task);
}

std::string commandLine(const std::vector<std::string> &words) {
  if (words.size() == 1) return words.front();
  std::string line;
  for (const std::string &word : words) {
    if (!line.empty()) line += ' ';
    line += shellQuoted(word);
  }
  return line;
}
