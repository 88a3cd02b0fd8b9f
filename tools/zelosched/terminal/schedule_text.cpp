#include "terminal/schedule_text.h"

#include <algorithm>
#include <cctype>
#include <charconv>
#include <chrono>
#include <cstdio>
#include <cstring>
#include <optional>
#include <string_view>
#include <vector>

#include "schedule_days.h"
#include "schedule_hours.h"
#include "terminal/failure.h"
#include "terminal/number.h"
#include "terminal/text.h"

namespace {

constexpr char kEveryDay[] = "1111111";
constexpr const char *kShortDays[kDaysOfWeek] = {"Sun", "Mon", "Tue", "Wed", "Thu", "Fri", "Sat"};
constexpr const char *kLongDays[kDaysOfWeek] = {"sunday",   "monday", "tuesday", "wednesday",
                                                "thursday", "friday", "saturday"};
constexpr const char *kMonths[] = {"January",   "February", "March",    "April",
                                   "May",       "June",     "July",     "August",
                                   "September", "October",  "November", "December"};

struct NamedDays {
  const char *name;
  const char *week;
};
constexpr NamedDays kNamedDays[] = {
    {"weekdays", "0111110"}, {"weekend", "1000001"}, {"weekends", "1000001"}, {"all", kEveryDay}};

[[noreturn]] void refuse(const std::string &text, const char *what, const char *example) {
  throw UsageError("'" + printable(text) + "' is no " + what + ": write it as " + example);
}

std::string lowered(std::string_view text) {
  std::string result(text);
  std::transform(result.begin(), result.end(), result.begin(),
                 [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
  return result;
}

std::vector<std::string> split(std::string_view text, char separator) {
  std::vector<std::string> parts;
  for (;;) {
    const size_t end = text.find(separator);
    parts.emplace_back(text.substr(0, end));
    if (end == std::string_view::npos) return parts;
    text.remove_prefix(end + 1);
  }
}

// Up to so many digits, and nothing else.
std::optional<uint32_t> digits(std::string_view text, size_t most) {
  const bool isNumber =
      !text.empty() && text.size() <= most &&
      std::all_of(text.begin(), text.end(), [](unsigned char c) { return std::isdigit(c) != 0; });
  if (!isNumber) return std::nullopt;
  uint32_t number = 0;
  std::from_chars(text.data(), text.data() + text.size(), number);
  return number;
}

struct TimeOfDay {
  uint32_t hour;
  uint32_t minute;
};

TimeOfDay parseTime(const std::string &text) {
  const std::vector<std::string> parts = split(text, ':');
  if (parts.size() == 2 && parts[1].size() == 2) {
    const std::optional<uint32_t> hour = digits(parts[0], 2);
    const std::optional<uint32_t> minute = digits(parts[1], 2);
    if (hour && minute) return {*hour, *minute};
  }
  refuse(text, "time of day", "08:30");
}

struct Date {
  uint32_t year;
  uint32_t month;
  uint32_t day;
};

Date parseDate(const std::string &text) {
  const std::vector<std::string> parts = split(text, '-');
  if (parts.size() == 3 && parts[0].size() == 4) {
    const std::optional<uint32_t> year = digits(parts[0], 4);
    const std::optional<uint32_t> month = digits(parts[1], 2);
    const std::optional<uint32_t> day = digits(parts[2], 2);
    if (year && month && day) return {*year, *month, *day};
  }
  refuse(text, "date", "2026-12-24");
}

// What stands before the last of the separators, and after it.
struct Halves {
  std::string first;
  std::string second;
};
std::optional<Halves> halves(const std::string &text, const char *separators) {
  const size_t at = text.find_last_of(separators);
  if (at == std::string::npos) return std::nullopt;
  return Halves{text.substr(0, at), text.substr(at + 1)};
}

std::optional<size_t> weekday(const std::string &name) {
  constexpr size_t kShort = 3;
  for (size_t day = 0; day < kDaysOfWeek; ++day) {
    const std::string whole = kLongDays[day];
    if (name == whole || name == whole.substr(0, kShort)) return day;
  }
  return std::nullopt;
}

// One name, a range, or a name for several; false when it is none.
bool addDays(const std::string &item, std::string *week) {
  for (const NamedDays &named : kNamedDays) {
    if (item != named.name) continue;
    for (size_t day = 0; day < kDaysOfWeek; ++day) {
      if (named.week[day] == '1') (*week)[day] = '1';
    }
    return true;
  }
  const std::vector<std::string> ends = split(item, '-');
  const std::optional<size_t> first = weekday(ends.front());
  const std::optional<size_t> last = weekday(ends.back());
  if (ends.size() > 2 || !first || !last) return false;
  for (size_t day = *first;; day = (day + 1) % kDaysOfWeek) {
    (*week)[day] = '1';
    if (day == *last) return true;
  }
}

std::string parseWeek(const std::string &text) {
  std::string week(kDaysOfWeek, '0');
  if (text.empty() || text == "none") return week;
  for (const std::string &item : split(lowered(text), ',')) {
    if (!addDays(item, &week)) refuse(item, "day of the week", "mon,wed,fri or mon-fri");
  }
  return week;
}

// Seven characters, and the zero that ends them.
void setWeek(ZELO_SCHED_TASK *task, const std::string &week) {
  std::memcpy(task->Week, week.c_str(), sizeof task->Week);
}

void setTime(ZELO_SCHED_TASK *task, const std::string &text) {
  const TimeOfDay time = parseTime(text);
  task->RunHour = time.hour;
  task->RunMin = time.minute;
}

void setDate(ZELO_SCHED_TASK *task, const Date &date) {
  task->StartYear = date.year;
  task->StartMonth = date.month;
  task->StartDay = date.day;
}

void begin(ZELO_SCHED_TASK *task, int32_t type, const Date &date) {
  task->Type = type;
  setWeek(task, kEveryDay);
  setDate(task, date);
}

std::string hourText(uint32_t hour) {
  char text[32];
  std::snprintf(text, sizeof text, "%02u", hour);
  return text;
}

std::string timeOf(const ZELO_SCHED_TASK &task) {
  return hourText(task.RunHour) + ":" + hourText(task.RunMin);
}

std::string dateOf(const ZELO_SCHED_TASK &task) {
  char text[64];
  std::snprintf(text, sizeof text, "%04u-%02u-%02u", task.StartYear, task.StartMonth,
                task.StartDay);
  return text;
}

std::string daysOf(const ZELO_SCHED_TASK &task) {
  std::vector<const char *> names;
  for (uint32_t day = 0; day < kDaysOfWeek; ++day) {
    if (schedIsWeekdayOn(task, day)) names.push_back(kShortDays[day]);
  }
  if (names.empty()) return "no day";
  std::string text;
  for (size_t i = 0; i < names.size(); ++i) {
    const bool isLast = i + 1 == names.size();
    text += i == 0 ? "" : isLast ? " and " : ", ";
    text += names[i];
  }
  return text;
}

std::string monthName(uint32_t month) {
  const bool isMonth = month >= 1 && month <= std::size(kMonths);
  return isMonth ? kMonths[month - 1] : "month " + std::to_string(month);
}

std::string dayInWords(const ZELO_SCHED_TASK &task) {
  switch (task.Type) {
    case ZELO_SCHED_TYPE_ONCE:
      return "once on " + dateOf(task);
    case ZELO_SCHED_TYPE_DAILY:
      return "daily";
    case ZELO_SCHED_TYPE_WEEKLY:
      return "weekly on " + daysOf(task);
    case ZELO_SCHED_TYPE_MONTHLY:
      return "monthly on day " + std::to_string(task.StartDay);
    case ZELO_SCHED_TYPE_YEARLY:
      return "yearly on " + std::to_string(task.StartDay) + " " + monthName(task.StartMonth);
    default:
      return "of unknown type " + std::to_string(task.Type);
  }
}

// "mon-fri", "mon,wed-fri", from Monday on. Two days beside each other are no range.
std::string daysInBrief(const ZELO_SCHED_TASK &task) {
  constexpr size_t kLeastOfRange = 3;
  const auto dayAt = [](size_t i) { return static_cast<uint32_t>((i + 1) % kDaysOfWeek); };
  std::string text;
  for (size_t first = 0; first < kDaysOfWeek;) {
    size_t end = first;
    while (end < kDaysOfWeek && schedIsWeekdayOn(task, dayAt(end))) ++end;
    const bool isRange = end - first >= kLeastOfRange;
    if (end > first) {
      text += (text.empty() ? "" : ",") + lowered(kShortDays[dayAt(first)]);
      if (isRange) text += "-" + lowered(kShortDays[dayAt(end - 1)]);
    }
    first = isRange ? end : first + 1;
  }
  return text.empty() ? "no day" : text;
}

std::string dayInBrief(const ZELO_SCHED_TASK &task) {
  switch (task.Type) {
    case ZELO_SCHED_TYPE_ONCE:
      return dateOf(task);
    case ZELO_SCHED_TYPE_DAILY:
      return "daily";
    case ZELO_SCHED_TYPE_WEEKLY:
      return daysInBrief(task);
    case ZELO_SCHED_TYPE_MONTHLY:
      return "monthly " + std::to_string(task.StartDay);
    case ZELO_SCHED_TYPE_YEARLY:
      return "yearly " + hourText(task.StartMonth) + "-" + hourText(task.StartDay);
    default:
      return "unknown type " + std::to_string(task.Type);
  }
}

}  // namespace

void setOnce(ZELO_SCHED_TASK *task, const std::string &text) {
  const std::optional<Halves> parts = halves(text, "T ");
  if (!parts) refuse(text, "date and time", "2026-12-24T18:30");
  begin(task, ZELO_SCHED_TYPE_ONCE, parseDate(parts->first));
  setTime(task, parts->second);
}

void setDaily(ZELO_SCHED_TASK *task, const std::string &text) {
  begin(task, ZELO_SCHED_TYPE_DAILY, {});
  setTime(task, text);
}

void setWeekly(ZELO_SCHED_TASK *task, const std::string &text) {
  const std::optional<Halves> parts = halves(text, " ");
  if (!parts) refuse(text, "weekly schedule", "mon,wed,fri 08:30");
  begin(task, ZELO_SCHED_TYPE_WEEKLY, {});
  setWeek(task, parseWeek(parts->first));
  setTime(task, parts->second);
}

void setMonthly(ZELO_SCHED_TASK *task, const std::string &text) {
  constexpr size_t kMostDigits = 2;
  const std::optional<Halves> parts = halves(text, " ");
  const std::optional<uint32_t> day = parts ? digits(parts->first, kMostDigits) : std::nullopt;
  if (!day) refuse(text, "monthly schedule", "15 08:30");
  begin(task, ZELO_SCHED_TYPE_MONTHLY, {0, 0, *day});
  setTime(task, parts->second);
}

void setYearly(ZELO_SCHED_TASK *task, const std::string &text) {
  constexpr size_t kMostDigits = 2;
  const std::optional<Halves> parts = halves(text, " ");
  const std::optional<Halves> date = parts ? halves(parts->first, "-") : std::nullopt;
  const std::optional<uint32_t> month = date ? digits(date->first, kMostDigits) : std::nullopt;
  const std::optional<uint32_t> day = date ? digits(date->second, kMostDigits) : std::nullopt;
  if (!month || !day) refuse(text, "yearly schedule", "02-29 08:30 (month and day)");
  begin(task, ZELO_SCHED_TYPE_YEARLY, {0, *month, *day});
  setTime(task, parts->second);
}

void setEvery(ZELO_SCHED_TASK *task, const std::string &text) {
  constexpr size_t kMostDigits = 2;
  if (text == "off") {
    task->RepeatHour = 0;
    task->LastWorkHour = 0;
    return;
  }
  const std::string number = text.ends_with('h') ? text.substr(0, text.size() - 1) : text;
  const std::optional<uint32_t> hours = digits(number, kMostDigits);
  if (!hours || *hours < 1 || *hours > kLastHourOfDay) {
    refuse(text, "number of hours from 1 to 23", "2h, or off for one run a day");
  }
  if (task->RepeatHour == 0) task->LastWorkHour = kLastHourOfDay;
  task->RepeatHour = *hours;
}

void setUntil(ZELO_SCHED_TASK *task, const std::string &text) {
  constexpr size_t kMostDigits = 2;
  const std::string hour = text.ends_with(":00") ? text.substr(0, text.size() - 3) : text;
  const std::optional<uint32_t> number = digits(hour, kMostDigits);
  if (!number) refuse(text, "hour of the day", "18");
  task->LastWorkHour = *number;
}

void setStart(ZELO_SCHED_TASK *task, const std::string &text) {
  const Date date = parseDate(text);
  const bool isDayFixed = (task->Type == ZELO_SCHED_TYPE_MONTHLY && date.day != task->StartDay) ||
                          (task->Type == ZELO_SCHED_TYPE_YEARLY &&
                           (date.day != task->StartDay || date.month != task->StartMonth));
  if (task->Type == ZELO_SCHED_TYPE_ONCE || isDayFixed) {
    throw UsageError("'--start' must be a day on which the task runs, which " + printable(text) +
                     " is not");
  }
  const std::chrono::year_month_day day(std::chrono::year(static_cast<int>(date.year)),
                                        std::chrono::month(date.month), std::chrono::day(date.day));
  if (!day.ok()) {
    throw Failure("not saved: the start date " + printable(text) +
                  " does not exist: write a day that its month has");
  }
  setDate(task, date);
}

std::string scheduleInWords(const ZELO_SCHED_TASK &task) {
  std::string text = dayInWords(task) + " at " + timeOf(task);
  if (task.RepeatHour != 0 && task.LastWorkHour > task.RunHour) {
    text += ", every " + counted(task.RepeatHour, "hour") + " until " + hourText(task.LastWorkHour);
  }
  return text;
}

std::string scheduleInBrief(const ZELO_SCHED_TASK &task) {
  std::string text = dayInBrief(task) + " " + timeOf(task);
  if (task.RepeatHour == 0 || task.LastWorkHour <= task.RunHour) return text;
  text += " every " + std::to_string(task.RepeatHour) + "h";
  if (task.LastWorkHour != kLastHourOfDay) text += " until " + hourText(task.LastWorkHour);
  return text;
}
