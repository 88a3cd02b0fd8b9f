#include "json/task_json.h"

#include <json/json.h>

#include <algorithm>
#include <array>
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <cstring>

#include "check/task_check.h"
#include "json/json_in.h"
#include "json/json_out.h"
#include "json/run_json.h"
#include "runs/time_limit.h"
#include "schedule_days.h"
#include "schedule_hours.h"
#include "schedule_runs.h"
#include "store/owner.h"
#include "store/power_room.h"
#include "store/task_list.h"
#include "terminal/failure.h"
#include "terminal/text.h"

namespace {

// ---- the members ----------------------------------------------------------------------------

struct TextMember {
  const char *name;
  const char *what;  // for messages
  char *(*field)(ZELO_SCHED_TASK &task);
  size_t capacity;
};
#define TEXT_MEMBER(name, what, field)                                                            \
  {                                                                                               \
    name, what, [](ZELO_SCHED_TASK &task) { return +task.field; }, sizeof(ZELO_SCHED_TASK::field) \
  }
constexpr TextMember kTexts[] = {
    TEXT_MEMBER("app", "application", App),
    TEXT_MEMBER("app_name", "application's name", AppName),
    TEXT_MEMBER("app_args", "text for the application", AppArgs),
    TEXT_MEMBER("action", "action", Action),
};
constexpr TextMember kName = TEXT_MEMBER("name", "name", Name);
constexpr TextMember kUiTexts[] = {
    TEXT_MEMBER("edit_dialog", "dialog", EditDialog),
    TEXT_MEMBER("edit_form", "form", EditForm),
};
#undef TEXT_MEMBER

struct FlagMember {
  const char *name;
  int32_t ZELO_SCHED_TASK::*flag;
};
constexpr FlagMember kOverlap[] = {
    {"task", &ZELO_SCHED_TASK::CanRunTaskSameTime},
    {"app", &ZELO_SCHED_TASK::CanRunAppSameTime},
};
constexpr FlagMember kUiFlags[] = {
    {"simple_edit_form", &ZELO_SCHED_TASK::SimpleEditForm},
    {"listable", &ZELO_SCHED_TASK::Listable},
    {"can_edit_name", &ZELO_SCHED_TASK::CanEditName},
    {"can_edit_owner", &ZELO_SCHED_TASK::CanEditOwner},
    {"can_run", &ZELO_SCHED_TASK::CanRunFromUI},
    {"can_delete", &ZELO_SCHED_TASK::CanDeleteFromUI},
    {"can_edit", &ZELO_SCHED_TASK::CanEditFromUI},
};
constexpr int32_t kYes = 1;

// Printed by zelosched, and ignored in a file.
constexpr const char *kReadOnly[] = {"id",       "owner_uid", "next_run",
                                     "last_run", "running",   "problems"};

constexpr const char *kTypes[] = {"once", "daily", "weekly", "monthly", "yearly"};
constexpr uint32_t kFirstOfWeek = 1;  // Monday, as people list them
constexpr const char *kDays[kDaysOfWeek] = {"sun", "mon", "tue", "wed", "thu", "fri", "sat"};

// ---- writing --------------------------------------------------------------------------------

std::string clockText(uint32_t hour, uint32_t minute) {
  char text[64];
  std::snprintf(text, sizeof text, "%02u:%02u", hour, minute);
  return text;
}

std::string dateText(uint32_t year, uint32_t month, uint32_t day) {
  char text[64];
  std::snprintf(text, sizeof text, "%04u-%02u-%02u", year, month, day);
  return text;
}

bool dateExists(uint32_t year, uint32_t month, uint32_t day) {
  return std::chrono::year_month_day(std::chrono::year(static_cast<int>(year)),
                                     std::chrono::month(month), std::chrono::day(day))
      .ok();
}

// The first day of the schedule on or after the start date. A year of zero is no start date; a
// month or a day of zero stands for the first.
Json::Value startOf(const ZELO_SCHED_TASK &task) {
  if (task.StartYear == 0) return {};
  uint32_t year = task.StartYear;
  uint32_t month = std::max(task.StartMonth, 1U);
  const uint32_t day = std::max(task.StartDay, 1U);
  const bool canExist = month <= kMonthsOfYear && day <= kMostDaysOfMonth;
  const bool isMonthly = task.Type == ZELO_SCHED_TYPE_MONTHLY;
  const bool isYearly = task.Type == ZELO_SCHED_TYPE_YEARLY;
  constexpr int kLongestGap = 8;  // years from one leap year to the next
  for (int i = 0; (isMonthly || isYearly) && canExist && i < kLongestGap; ++i) {
    if (year > kLastYear || dateExists(year, month, day)) break;
    if (isMonthly) {
      ++month;  // which cannot be December, as that has all days
    } else {
      ++year;
    }
  }
  return dateText(year, month, day);
}

Json::Value daysOf(const ZELO_SCHED_TASK &task) {
  Json::Value days(Json::arrayValue);
  for (uint32_t i = 0; i < kDaysOfWeek; ++i) {
    const uint32_t day = (kFirstOfWeek + i) % kDaysOfWeek;
    if (schedIsWeekdayOn(task, day)) days.append(kDays[day]);
  }
  return days;
}

Json::Value scheduleOf(const ZELO_SCHED_TASK &task) {
  Json::Value schedule(Json::objectValue);
  schedule["type"] = typeName(task);
  schedule["at"] = clockText(task.RunHour, task.RunMin);
  if (task.Type == ZELO_SCHED_TYPE_ONCE) {
    schedule["date"] = dateText(task.StartYear, task.StartMonth, task.StartDay);
  } else {
    schedule["from"] = startOf(task);
  }
  if (task.Type == ZELO_SCHED_TYPE_WEEKLY) schedule["days"] = daysOf(task);
  if (schedHasDayOfMonth(task) && task.Type != ZELO_SCHED_TYPE_ONCE) {
    schedule["day"] = task.StartDay;
  }
  if (task.Type == ZELO_SCHED_TYPE_YEARLY) schedule["month"] = task.StartMonth;
  const bool repeats = task.RepeatHour != 0;
  schedule["every_hours"] = repeats ? Json::Value(task.RepeatHour) : Json::Value();
  schedule["until_hour"] = repeats ? Json::Value(task.LastWorkHour) : Json::Value();
  return schedule;
}

template <size_t count>
void writeFlags(const FlagMember (&members)[count], const ZELO_SCHED_TASK &task,
                Json::Value *object) {
  for (const FlagMember &member : members) (*object)[member.name] = task.*member.flag == kYes;
}

const char *textOf(const TextMember &member, const ZELO_SCHED_TASK &task) {
  return member.field(const_cast<ZELO_SCHED_TASK &>(task));  // which it only reads
}

template <size_t count>
void writeTexts(const TextMember (&members)[count], const ZELO_SCHED_TASK &task,
                Json::Value *object) {
  for (const TextMember &member : members) {
    (*object)[member.name] = jsonTextOrNull(textOf(member, task));
  }
}

Json::Value ownerOf(uid_t uid) {
  return userExists(uid) ? jsonText(userName(uid)) : Json::Value(uid);
}

Json::Value minuteOrNull(const std::optional<LocalMinute> &minute) {
  return minute ? jsonOf(*minute) : Json::Value();
}

// Adds the task's name and owner to a run that was recorded without them.
RunRecord completed(const RunRecord &run, const ZELO_SCHED_TASK &task) {
  RunRecord record = run;
  if (record.taskName.empty()) record.taskName = task.Name;
  if (record.owner.empty()) record.owner = userName(task.Owner);
  return record;
}

// ---- reading --------------------------------------------------------------------------------

std::string quotedText(const Json::Value &value) {
  constexpr size_t kMostColumns = 60;
  return fitted(printable(value.isString() ? "'" + value.asString() + "'" : onOneLine(value)),
                kMostColumns);
}

template <size_t count>
bool isOneOf(const char *const (&names)[count], const std::string &name) {
  return std::find(std::begin(names), std::end(names), name) != std::end(names);
}

// An object whose members are read one by one; finish() reports the others as unknown.
class Members {
 public:
  Members(std::string place, const Json::Value &object, JsonFaults *faults,
          Needed needed = Needed::kAll)
      : place_(std::move(place)), object_(object), faults_(faults), needed_(needed) {
    if (!object_.isObject()) fault("must be an object, not " + quotedText(object_));
  }

  bool isObject() const { return object_.isObject(); }
  bool needsAll() const { return needed_ == Needed::kAll; }

  // Null when it is absent.
  const Json::Value *find(const char *name) {
    if (!isObject()) return nullptr;
    asked_.emplace_back(name);
    return object_.find(name, name + std::strlen(name));
  }
  const Json::Value *require(const char *name) {
    const Json::Value *value = find(name);
    if (value == nullptr && isObject() && needed_ == Needed::kAll) faultOf(name, "is missing");
    return value;
  }

  // Reports a member that other objects of this kind may have, but not this one.
  void refuse(const char *name, const std::string &why) {
    if (find(name) != nullptr) faultOf(name, why);
  }

  void finish() {
    if (!isObject()) return;
    for (const std::string &name : object_.getMemberNames()) {
      if (std::find(asked_.begin(), asked_.end(), name) == asked_.end()) {
        faultOf(printable(name), "there is no such member");
      }
    }
  }

  std::string placeOf(const std::string &name) const {
    return place_.empty() ? name : place_ + "." + name;
  }
  void faultOf(const std::string &name, const std::string &what) {
    faults_->push_back({placeOf(name), what});
  }
  void fault(const std::string &what) { faults_->push_back({place_, what}); }
  JsonFaults *faults() const { return faults_; }

 private:
  std::string place_;
  const Json::Value &object_;
  JsonFaults *faults_;
  Needed needed_;
  std::vector<std::string> asked_;
};

// Nothing, and a fault, for what is no text that can be stored.
std::optional<std::string> readText(const Json::Value &value, const char *name, Members *members) {
  std::string fault;
  if (!value.isString()) {
    fault = "must be a text, not " + quotedText(value);
  } else if (value.asString().find('\0') != std::string::npos) {
    fault = "holds a zero byte";
  } else if (!isUtf8(value.asString())) {
    fault = "holds half a character";
  }
  if (fault.empty()) return value.asString();
  members->faultOf(name, fault);
  return std::nullopt;
}

void readField(const TextMember &member, const Json::Value *value, Members *members,
               ZELO_SCHED_TASK *task) {
  if (value == nullptr) return;
  const auto text = value->isNull() ? std::string() : readText(*value, member.name, members);
  if (!text) return;
  if (text->size() >= member.capacity) {
    members->faultOf(member.name, "is " + std::to_string(text->size()) +
                                      " bytes long: shorten it to " +
                                      std::to_string(member.capacity - 1));
  } else if (text->find('\n') != std::string::npos) {
    members->faultOf(member.name, "has a line feed: write it on one line");
  } else {
    setText(member.field(*task), member.capacity, member.what, *text);
  }
}

template <size_t count>
void readTexts(const TextMember (&texts)[count], Members *members, ZELO_SCHED_TASK *task) {
  for (const TextMember &member : texts) {
    readField(member, members->find(member.name), members, task);
  }
}

std::optional<bool> readFlag(const char *name, Members *members) {
  const Json::Value *value = members->find(name);
  if (value == nullptr) return std::nullopt;
  if (value->isBool()) return value->asBool();
  members->faultOf(name, "must be true or false, not " + quotedText(*value));
  return std::nullopt;
}

template <size_t count>
void readFlags(const FlagMember (&flags)[count], Members *members, ZELO_SCHED_TASK *task) {
  for (const FlagMember &member : flags) {
    if (const std::optional<bool> flag = readFlag(member.name, members)) {
      task->*member.flag = *flag ? kYes : 0;
    }
  }
}

std::optional<uint32_t> readNumber(const Json::Value &value, const char *name, uint32_t least,
                                   uint32_t most, Members *members) {
  if (value.isUInt64() && value.asUInt64() >= least && value.asUInt64() <= most) {
    return static_cast<uint32_t>(value.asUInt64());
  }
  members->faultOf(name, "must be a number from " + std::to_string(least) + " to " +
                             std::to_string(most) + ", not " + quotedText(value));
  return std::nullopt;
}

// So many digits between separators, and nothing else.
template <size_t count>
std::optional<std::array<uint32_t, count>> digitGroups(const std::string &text,
                                                       const size_t (&lengths)[count],
                                                       char separator) {
  std::array<uint32_t, count> numbers{};
  size_t at = 0;
  for (size_t group = 0; group < count; ++group) {
    if (group > 0 && (at >= text.size() || text[at++] != separator)) return std::nullopt;
    for (size_t i = 0; i < lengths[group]; ++i, ++at) {
      if (at >= text.size() || text[at] < '0' || text[at] > '9') return std::nullopt;
      constexpr uint32_t kDecimal = 10;
      numbers[group] = numbers[group] * kDecimal + static_cast<uint32_t>(text[at] - '0');
    }
  }
  if (at != text.size()) return std::nullopt;
  return numbers;
}

void readTime(Members *members, ZELO_SCHED_TASK *task) {
  const Json::Value *value = members->require("at");
  if (value == nullptr) return;
  constexpr size_t kLengths[] = {2, 2};
  const auto time = value->isString() ? digitGroups(value->asString(), kLengths, ':')
                                      : std::optional<std::array<uint32_t, 2>>();
  if (!time || (*time)[0] > kLastHourOfDay || (*time)[1] > kLastMinuteOfHour) {
    members->faultOf("at", quotedText(*value) + " is no time of day: write it as \"08:30\"");
    return;
  }
  task->RunHour = (*time)[0];
  task->RunMin = (*time)[1];
}

struct Date {
  uint32_t year;
  uint32_t month;
  uint32_t day;
};

std::optional<Date> readDate(const Json::Value &value, const char *name, Members *members) {
  constexpr size_t kLengths[] = {4, 2, 2};
  const auto date = value.isString() ? digitGroups(value.asString(), kLengths, '-')
                                     : std::optional<std::array<uint32_t, 3>>();
  if (!date || (*date)[0] == 0) {
    members->faultOf(name, quotedText(value) + " is no date: write it as \"2026-12-24\"");
  } else if (!dateExists((*date)[0], (*date)[1], (*date)[2])) {
    members->faultOf(name, quotedText(value) + " does not exist: write a day that its month has");
  } else {
    return Date{(*date)[0], (*date)[1], (*date)[2]};
  }
  return std::nullopt;
}

void readDays(const Json::Value *value, Members *members, ZELO_SCHED_TASK *task) {
  if (value == nullptr) return;
  if (!value->isArray() || value->empty()) {
    members->faultOf(
        "days", "must be a list of days, such as [\"mon\", \"fri\"], not " + quotedText(*value));
    return;
  }
  std::string week(kDaysOfWeek, '0');
  for (Json::ArrayIndex i = 0; i < value->size(); ++i) {
    const Json::Value &name = (*value)[i];
    const auto *const day = std::find_if(
        std::begin(kDays), std::end(kDays),
        [&](const char *known) { return name.isString() && name.asString() == known; });
    const std::string place = "days[" + std::to_string(i) + "]";
    if (day == std::end(kDays)) {
      members->faultOf(place,
                       quotedText(name) + " is no day: write mon, tue, wed, thu, fri, sat or sun");
      continue;
    }
    char &flag = week[static_cast<size_t>(day - std::begin(kDays))];
    if (flag == '1') members->faultOf(place, quotedText(name) + " stands there twice");
    flag = '1';
  }
  std::memcpy(task->Week, week.c_str(), sizeof task->Week);
}

void readRepetition(Members *members, ZELO_SCHED_TASK *task) {
  const Json::Value *every = members->find("every_hours");
  const Json::Value *until = members->find("until_hour");
  if (every != nullptr && every->isNull()) {
    task->RepeatHour = 0;
    task->LastWorkHour = 0;
  } else if (every != nullptr) {
    if (task->RepeatHour == 0) task->LastWorkHour = kLastHourOfDay;
    // More than a day means one run a day; another program may have saved such a task.
    const auto hours = readNumber(*every, "every_hours", 1, UINT32_MAX, members);
    task->RepeatHour = hours.value_or(1);  // avoids faults that follow from this one
  }
  if (until == nullptr) return;
  if (until->isNull()) {
    if (task->RepeatHour != 0) task->LastWorkHour = kLastHourOfDay;
    return;
  }
  const auto hour = readNumber(*until, "until_hour", 0, kLastHourOfDay, members);
  if (!hour) return;
  if (task->RepeatHour == 0) {
    members->faultOf("until_hour", "is for a task that repeats: add every_hours");
  } else if (*hour < task->RunHour) {
    members->faultOf("until_hour", "is before the hour of \"at\"");
  } else {
    task->LastWorkHour = *hour;
  }
}

// The date that the schedule itself has; 0 for each part that it has not.
Date readDay(const std::string &type, Members *members) {
  Date day{};
  if (type == "once") {
    if (const Json::Value *value = members->require("date")) {
      day = readDate(*value, "date", members).value_or(Date{});
    }
  }
  if (type == "yearly") {
    if (const Json::Value *value = members->require("month")) {
      day.month = readNumber(*value, "month", 1, kMonthsOfYear, members).value_or(0);
    }
  }
  if (type == "monthly" || type == "yearly") {
    if (const Json::Value *value = members->require("day")) {
      day.day = readNumber(*value, "day", 1, kMostDaysOfMonth, members).value_or(0);
    }
  }
  constexpr uint32_t kLeapYear = 2024;
  if (type == "yearly" && day.month != 0 && day.day != 0 &&
      !dateExists(kLeapYear, day.month, day.day)) {
    members->faultOf("day", "month " + std::to_string(day.month) + " never has a day " +
                                std::to_string(day.day));
  }
  return day;
}

void setDate(const Date &date, ZELO_SCHED_TASK *task) {
  task->StartYear = date.year;
  task->StartMonth = date.month;
  task->StartDay = date.day;
}

bool isOn(const Date &date, const Date &day) {
  return (day.month == 0 || date.month == day.month) && (day.day == 0 || date.day == day.day);
}

void readStart(const std::string &type, const Date &day, Members *members, ZELO_SCHED_TASK *task) {
  const ZELO_SCHED_TASK before = *task;
  setDate(day, task);
  if (type == "once") {
    members->refuse("from", "is not for a task that runs once");
    return;
  }
  const Json::Value *value = members->find("from");
  if (value == nullptr) {
    const bool isSame = isOn({before.StartYear, before.StartMonth, before.StartDay}, day);
    if (before.Type == task->Type && isSame) {
      setDate({before.StartYear, before.StartMonth, before.StartDay}, task);
    }
    return;
  }
  if (value->isNull()) return;
  const auto from = readDate(*value, "from", members);
  if (!from) return;
  if (!isOn(*from, day)) {
    members->faultOf(
        "from", "must be a day on which the task runs, which " + quotedText(*value) + " is not");
    return;
  }
  setDate(*from, task);
}

// Members of other types of schedule.
void refuseOthers(const std::string &type, Members *members) {
  constexpr struct {
    const char *name;
    const char *types;
  } kOfTypes[] = {
      {"date", "once"}, {"days", "weekly"}, {"month", "yearly"}, {"day", "monthly yearly"}};
  for (const auto &[name, types] : kOfTypes) {
    if (std::string(types).find(type) == std::string::npos) {
      members->refuse(name, "is not for a schedule of type " + type);
    }
  }
}

void readSchedule(const Json::Value &value, const std::string &place, JsonFaults *faults,
                  ZELO_SCHED_TASK *task) {
  Members members(place, value, faults);
  const Json::Value *type = members.require("type");
  if (type == nullptr) return;
  if (!type->isString() || !isOneOf(kTypes, type->asString())) {
    members.faultOf("type",
                    "must be once, daily, weekly, monthly or yearly, not " + quotedText(*type));
    return;
  }
  const std::string name = type->asString();
  const int32_t formerType = task->Type;
  const auto *const found = std::find(std::begin(kTypes), std::end(kTypes), name);
  refuseOthers(name, &members);
  readTime(&members, task);
  const Date day = readDay(name, &members);
  const auto newType = static_cast<int32_t>(found - std::begin(kTypes));
  if (newType != formerType) setDate({}, task);
  task->Type = newType;
  readStart(name, day, &members, task);
  if (name == "weekly") {
    readDays(members.require("days"), &members, task);
  } else {
    std::memcpy(task->Week, "1111111", sizeof task->Week);
  }
  readRepetition(&members, task);
  members.finish();
}

// The name of the task, whose index is hard to find in a long file.
std::string ownedText(Members *members) {
  const Json::Value *name = members->find(kName.name);
  const bool isNamed = name != nullptr && name->isString() && !name->asString().empty();
  return isNamed ? ", the owner of " + quotedText(*name) : "";
}

void readOwner(Members *members, ZELO_SCHED_TASK *task) {
  const Json::Value *value = members->require("owner");
  if (value == nullptr) return;
  std::optional<uid_t> uid;
  if (value->isString()) {
    uid = findUserByName(value->asString());
  } else if (value->isUInt64() && value->asUInt64() <= UINT32_MAX) {
    const auto number = static_cast<uid_t>(value->asUInt64());
    if (userExists(number)) uid = number;
  }
  if (uid) {
    task->Owner = *uid;
  } else {
    members->faultOf("owner", "there is no user " + quotedText(*value) + ownedText(members) +
                                  ": write the name of one that 'getent passwd' lists");
  }
}

std::optional<std::string> readLimit(Members *members) {
  const Json::Value *value = members->find("time_limit");
  if (value == nullptr) return std::nullopt;
  if (value->isNull()) return "";
  if (value->isString() && secondsOfLimit(value->asString())) return value->asString();
  members->faultOf("time_limit", quotedText(*value) +
                                     " is no time limit: write it as \"90s\", \"30m\", \"2h\" "
                                     "or \"1d\"");
  return std::nullopt;
}

void readCommand(Members *members, ZELO_SCHED_TASK *task) {
  LimitedCommand limited = takeApart(task->Command);
  if (const auto limit = readLimit(members)) limited.limit = *limit;
  const Json::Value *value = members->require("command");
  if (value == nullptr && members->needsAll()) return;
  const auto text =
      value != nullptr ? readText(*value, "command", members) : std::optional(limited.command);
  if (!text) return;
  limited.command = *text;
  const std::string stored = storedCommand(limited);
  if (text->find_first_not_of(" \t\r\n") == std::string::npos) {
    members->faultOf("command", "there is no command");
  } else if (stored.size() > kMostCommandBytes) {
    members->faultOf("command", (limited.limit.empty() ? "is " : "is with its time limit ") +
                                    std::to_string(stored.size()) + " bytes long, and only " +
                                    std::to_string(kMostCommandBytes) +
                                    " can be stored: put it into a script");
  } else if (limited.limit.empty() && !takeApart(stored).limit.empty()) {
    members->faultOf("command", "has a time limit of its own: write it as \"time_limit\"");
  } else {
    setText(task->Command, "command", stored);
  }
}

void readTaskName(Members *members, ZELO_SCHED_TASK *task) {
  const Json::Value *name = members->require(kName.name);
  if (name != nullptr && (name->isNull() || (name->isString() && name->asString().empty()))) {
    members->faultOf(kName.name, "is empty: give the task a name");
  } else {
    readField(kName, name, members, task);
  }
}

void readParts(Members *members, ZELO_SCHED_TASK *task) {
  if (const Json::Value *value = members->find("overlap")) {
    Members overlap(members->placeOf("overlap"), *value, members->faults());
    readFlags(kOverlap, &overlap, task);
    overlap.finish();
  }
  if (const Json::Value *value = members->find("ui")) {
    Members ui(members->placeOf("ui"), *value, members->faults());
    readTexts(kUiTexts, &ui, task);
    readFlags(kUiFlags, &ui, task);
    ui.finish();
  }
  if (const Json::Value *value = members->require("schedule")) {
    readSchedule(*value, members->placeOf("schedule"), members->faults(), task);
  }
}

}  // namespace

Json::Value jsonOf(const LocalMinute &minute) {
  const std::optional<time_t> moment = momentOf(minute);
  return moment ? jsonTime(*moment) : Json::Value();
}

Json::Value settingsOf(const ZELO_SCHED_TASK &task) {
  const LimitedCommand limited = takeApart(task.Command);
  Json::Value object(Json::objectValue);
  object["name"] = jsonText(task.Name);
  object["owner"] = ownerOf(task.Owner);
  object["enabled"] = isEnabled(task);
  object["schedule"] = scheduleOf(task);
  object["command"] = jsonText(limited.command);
  object["time_limit"] = jsonTextOrNull(limited.limit);
  writeTexts(kTexts, task, &object);
  writeFlags(kOverlap, task, &object["overlap"]);
  Json::Value &ui = object["ui"];
  writeTexts(kUiTexts, task, &ui);
  writeFlags(kUiFlags, task, &ui);
  return object;
}

Json::Value jsonOf(const ZELO_SCHED_TASK &task, const std::optional<LocalMinute> &next,
                   const LatestRuns &runs) {
  Json::Value object = settingsOf(task);
  object["id"] = task.ID;
  object["owner_uid"] = task.Owner;
  object["next_run"] = minuteOrNull(next);
  if (runs.isKnown) {
    const RunRecord *last = runs.of(task.ID);
    object["last_run"] = last != nullptr ? jsonOf(completed(*last, task)) : Json::Value();
    object["running"] = runs.running.count(task.ID) != 0;
  }
  Json::Value &problems = object["problems"] = Json::Value(Json::arrayValue);
  for (const std::string &harm : harmsOf(task)) problems.append(jsonText(harm));
  return object;
}

Json::Value powerTimeOf(const ZELO_SCHED_TASK &task, const std::optional<LocalMinute> &next) {
  Json::Value object(Json::objectValue);
  object["id"] = task.ID;
  object["name"] = jsonText(task.Name);
  object["power"] = directionOf(task);
  object["enabled"] = isEnabled(task);
  object["days"] = daysOf(task);
  object["at"] = clockText(task.RunHour, task.RunMin);
  object["next"] = minuteOrNull(next);
  return object;
}

std::vector<std::string> lossyMembersOf(const ZELO_SCHED_TASK &task) {
  std::vector<std::string> members;
  const auto look = [&](const std::string &name, const char *text) {
    if (!isUtf8(text)) members.push_back(name);
  };
  look(kName.name, task.Name);
  look("command", task.Command);
  for (const TextMember &member : kTexts) look(member.name, textOf(member, task));
  for (const TextMember &member : kUiTexts) {
    look(std::string("ui.") + member.name, textOf(member, task));
  }
  return members;
}

std::vector<TaskText> taskTextsOf(const std::string &text, JsonFaults *faults) {
  const Json::Value whole = parseStrictJson(text);
  Members top("", whole, faults);
  const Json::Value *version = top.require("version");
  if (version != nullptr && !(version->isInt() && version->asInt() == kJsonVersion)) {
    top.faultOf("version", "is " + quotedText(*version) + ", and this zelosched reads " +
                               std::to_string(kJsonVersion));
  }
  std::vector<TaskText> tasks;
  if (const Json::Value *list = top.require("tasks")) {
    if (!list->isArray()) {
      top.faultOf("tasks", "must be a list, not " + quotedText(*list));
    } else if (list->size() > kMostTasks) {
      top.faultOf("tasks", "are " + std::to_string(list->size()) + ", and at most " +
                               std::to_string(kMostTasks) + " can be read at once: divide them");
    } else {
      for (Json::ArrayIndex i = 0; i < list->size(); ++i) {
        tasks.push_back({"tasks[" + std::to_string(i) + "]", (*list)[i]});
      }
    }
  }
  top.finish();
  return tasks;
}

void setTimes(const ZELO_SCHED_TASK &task, TaskText *text) {
  Json::Value &schedule = text->object["schedule"];
  schedule["at"] = clockText(task.RunHour, task.RunMin);
  if (task.RepeatHour != 0 && schedule.isMember("until_hour") && !schedule["until_hour"].isNull()) {
    schedule["until_hour"] = task.LastWorkHour;
  }
}

void fillTask(const TaskText &text, ZELO_SCHED_TASK *task, JsonFaults *faults, Needed needed) {
  const size_t before = faults->size();
  Members members(text.place, text.object, faults, needed);
  if (!members.isObject()) return;
  for (const char *name : kReadOnly) members.find(name);
  readTaskName(&members, task);
  readOwner(&members, task);
  readTexts(kTexts, &members, task);
  if (std::strcmp(task->App, kPowerApp) == 0) {
    members.faultOf("app", "is that of the power times, which 'zelosched power add' adds");
  }
  if (const auto enabled = readFlag("enabled", &members)) {
    task->State = *enabled ? ZELO_SCHED_STATE_ENABLED : ZELO_SCHED_STATE_DISABLED;
  }
  readCommand(&members, task);
  readParts(&members, task);
  members.finish();
  if (faults->size() > before) return;
  for (const std::string &harm : harmsOf(*task)) members.fault(harm);
}

void complainOf(const JsonFaults &faults) {
  for (const JsonFault &fault : faults) {
    complain(fault.place.empty() ? "it " + fault.what : fault.place + ": " + fault.what);
  }
}
