#include "check/task_check.h"

#include <chrono>
#include <cstring>
#include <tuple>

#include "runs/coming_runs.h"
#include "schedule_cron.h"
#include "schedule_days.h"
#include "schedule_runs.h"
#include "store/owner.h"
#include "store/task_list.h"
#include "terminal/schedule_text.h"
#include "terminal/text.h"

namespace {

constexpr int kLeapYear = 2024;

bool isDay(const ZELO_SCHED_TASK &task) {
  return task.StartDay >= 1 && task.StartDay <= kMostDaysOfMonth;
}

bool isMonth(const ZELO_SCHED_TASK &task) {
  return task.StartMonth >= 1 && task.StartMonth <= kMonthsOfYear;
}

size_t weekLength(const ZELO_SCHED_TASK &task) {
  return strnlen(task.Week, sizeof task.Week);
}

bool dayExists(int year, const ZELO_SCHED_TASK &task) {
  return isMonth(task) && isDay(task) &&
         std::chrono::year_month_day(std::chrono::year(year), std::chrono::month(task.StartMonth),
                                     std::chrono::day(task.StartDay))
             .ok();
}

bool dateExists(const ZELO_SCHED_TASK &task) {
  return dayExists(static_cast<int>(task.StartYear), task);
}

std::string number(uint32_t value) {
  return std::to_string(value);
}

std::string invalid(const char *what, uint32_t value, const char *range) {
  return std::string("invalid ") + what + " " + number(value) + " (" + range + ")";
}

// ---- what cron could not read ---------------------------------------------------------------

std::string badHour(const ZELO_SCHED_TASK &task) {
  if (schedAreHoursReadable(task)) return "";
  return invalid("hour", task.RunHour, "00 to 23");
}

std::string badMinute(const ZELO_SCHED_TASK &task) {
  if (schedIsMinuteReadable(task)) return "";
  return invalid("minute", task.RunMin, "00 to 59");
}

std::string badDay(const ZELO_SCHED_TASK &task) {
  if (schedIsDayReadable(task)) return "";
  return invalid("day", task.StartDay, "1 to 31");
}

std::string badMonth(const ZELO_SCHED_TASK &task) {
  if (schedIsMonthReadable(task)) return "";
  return invalid("month", task.StartMonth, "01 to 12");
}

std::string noWeekday(const ZELO_SCHED_TASK &task) {
  if (schedAreWeekdaysReadable(task)) return "";
  return "a weekly task needs a day of the week: write --weekly mon,wed,fri 08:30";
}

// ---- what makes the task itself useless -----------------------------------------------------

// In the crontab line such an hour counts as 23.
std::string badLastHour(const ZELO_SCHED_TASK &task) {
  if (task.RepeatHour == 0 || task.LastWorkHour <= kLastHourOfDay) return "";
  return invalid("last hour", task.LastWorkHour, "0 to 23");
}

std::string lateYear(const ZELO_SCHED_TASK &task) {
  if (task.StartYear <= kLastYear) return "";
  return "the year " + number(task.StartYear) + " never comes: write one up to 9999";
}

std::string neverExists(const ZELO_SCHED_TASK &task) {
  if (!schedHasMonth(task) || !isDay(task) || !isMonth(task) || task.StartYear > kLastYear)
    return "";
  const bool isOnce = task.Type == ZELO_SCHED_TYPE_ONCE;
  // 29 February comes in leap years, to a task that runs every year.
  if (isOnce ? dateExists(task) : dayExists(kLeapYear, task)) return "";
  return "month " + number(task.StartMonth) + " never has a day " + number(task.StartDay) +
         (isOnce ? " in " + number(task.StartYear) : "") + ": write a day that it has";
}

// In a start date, a month or a day of zero stands for the first.
bool canStart(const ZELO_SCHED_TASK &task) {
  if (task.StartMonth != 0 && task.StartDay != 0) return dateExists(task);
  return task.StartMonth <= kMonthsOfYear && task.StartDay <= kMostDaysOfMonth;
}

// For the other types, the date is the schedule itself, which the checks above look at.
std::string badStart(const ZELO_SCHED_TASK &task) {
  const bool isFree = task.Type == ZELO_SCHED_TYPE_DAILY || task.Type == ZELO_SCHED_TYPE_WEEKLY;
  const bool isMonthly = task.Type == ZELO_SCHED_TYPE_MONTHLY;
  const bool isBad = (isFree && task.StartYear <= kLastYear && !canStart(task)) ||
                     (isMonthly && task.StartMonth > kMonthsOfYear);
  if (!isBad) return "";
  return "the start date " + number(task.StartYear) + "-" + number(task.StartMonth) + "-" +
         number(task.StartDay) + " does not exist: write --start with a day that its month has";
}

std::string badWeek(const ZELO_SCHED_TASK &task) {
  if (task.Type != ZELO_SCHED_TYPE_WEEKLY || weekLength(task) == kDaysOfWeek) return "";
  return "the days of the week '" + printable(task.Week) +
         "' are not seven: write one character for each day from Sunday on, 0 for off";
}

std::string badType(const ZELO_SCHED_TASK &task) {
  if (task.Type >= ZELO_SCHED_TYPE_ONCE && task.Type <= ZELO_SCHED_TYPE_YEARLY) return "";
  return "type " + std::to_string(task.Type) +
         " is unknown: write once, daily, weekly, monthly or yearly";
}

std::string badState(const ZELO_SCHED_TASK &task) {
  if (task.State == ZELO_SCHED_STATE_DISABLED || task.State == ZELO_SCHED_STATE_ENABLED) return "";
  return "state " + std::to_string(task.State) + " is unknown: write enabled or disabled";
}

std::string earlyEnd(const ZELO_SCHED_TASK &task) {
  const bool isSet = task.RepeatHour != 0 && task.LastWorkHour < task.RunHour;
  if (!isSet) return "";
  return "the last hour " + number(task.LastWorkHour) + " is before the first, " +
         number(task.RunHour) + ": write a later --until, or --every off for one run a day";
}

std::string unknownOwner(const ZELO_SCHED_TASK &task) {
  if (userExists(task.Owner)) return "";
  return "there is no user " + number(task.Owner) +
         ", under whose rights the task would run: write --owner with the name of a user";
}

std::string apostrophe(const ZELO_SCHED_TASK &task) {
  if (std::strchr(task.App, '\'') == nullptr) return "";
  return "the application '" + printable(task.App) +
         "' has an apostrophe, with which no run could be recorded: write it without";
}

std::string longCommand(const ZELO_SCHED_TASK &task) {
  const size_t length = strnlen(task.Command, sizeof task.Command);
  if (length <= kMostCommandBytes) return "";
  return "the command is " + std::to_string(length) + " bytes long, and only " +
         std::to_string(kMostCommandBytes) + " can be stored: put it into a script";
}

// The store has one line for each value: a line feed is stored as a blank.
std::string lineFeed(const ZELO_SCHED_TASK &task) {
  const struct {
    const char *what;
    const char *text;
  } texts[] = {{"name", task.Name},
               {"application", task.App},
               {"application's name", task.AppName},
               {"arguments", task.AppArgs},
               {"action", task.Action},
               {"form", task.EditForm},
               {"dialog", task.EditDialog},
               {"days of the week", task.Week}};
  for (const auto &[what, text] : texts) {
    if (std::strchr(text, '\n') != nullptr) {
      return std::string("the ") + what + " has a line feed: write it on one line";
    }
  }
  return "";
}

std::string badDirection(const ZELO_SCHED_TASK &task) {
  if (!isPower(task) || std::strcmp(task.AppArgs, "poweron") == 0 ||
      std::strcmp(task.AppArgs, "poweroff") == 0) {
    return "";
  }
  return "a power time is poweron or poweroff, and not '" + printable(task.AppArgs) + "'";
}

using Check = std::string (*)(const ZELO_SCHED_TASK &task);
constexpr Check kUnreadable[] = {badHour, badMinute, badDay, badMonth, noWeekday};
constexpr Check kUseless[] = {badLastHour, lateYear, neverExists, badStart,     badWeek,
                              badType,     badState, earlyEnd,    unknownOwner, apostrophe,
                              longCommand, lineFeed, badDirection};

template <size_t count>
void collect(const Check (&checks)[count], const ZELO_SCHED_TASK &task,
             std::vector<std::string> *found) {
  for (const Check check : checks) {
    std::string sentence = check(task);
    if (!sentence.empty()) found->push_back(std::move(sentence));
  }
}

// A minute that the change to summer time skips.
bool isSkipped(const ZELO_SCHED_TASK &task) {
  const std::chrono::year_month_day date(std::chrono::year(static_cast<int>(task.StartYear)),
                                         std::chrono::month(task.StartMonth),
                                         std::chrono::day(task.StartDay));
  const LocalMinute minute{std::chrono::sys_days(date), static_cast<int>(task.RunHour),
                           static_cast<int>(task.RunMin)};
  return task.RepeatHour == 0 && !momentOf(minute);
}

}  // namespace

std::vector<std::string> harmsOf(const ZELO_SCHED_TASK &task) {
  std::vector<std::string> found;
  collect(kUnreadable, task, &found);
  collect(kUseless, task, &found);
  return found;
}

std::vector<std::string> unreadableFieldsOf(const ZELO_SCHED_TASK &task) {
  std::vector<std::string> found;
  if (!isPower(task)) collect(kUnreadable, task, &found);
  return found;
}

std::string pastSchedule(const ZELO_SCHED_TASK &task, time_t now) {
  if (task.Type != ZELO_SCHED_TYPE_ONCE || !harmsOf(task).empty()) return "";
  if (ComingRuns(task, localMinute(now)).next()) return "";
  if (isSkipped(task)) {
    return scheduleInWords(task).substr(strlen("once on ")) +
           " does not come, as the clocks go forward then: write another time";
  }
  return "the task would never run, as " + scheduleInWords(task).substr(strlen("once on ")) +
         " is over: write a later date";
}

bool isSameSchedule(const ZELO_SCHED_TASK &a, const ZELO_SCHED_TASK &b) {
  const auto timesOf = [](const ZELO_SCHED_TASK &task) {
    return std::tie(task.Type, task.StartYear, task.StartMonth, task.StartDay, task.RunHour,
                    task.RunMin, task.RepeatHour, task.LastWorkHour);
  };
  return timesOf(a) == timesOf(b) && std::strncmp(a.Week, b.Week, sizeof a.Week) == 0;
}
