#include "crontab_check.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <fstream>

#include "sched_run_hours.h"
#include "sched_week.h"
#include "task_list.h"
#include "text.h"

namespace {

constexpr char kCrontab[] = "/etc/crontab";
constexpr char kTaskProgram[] = "/tmp/zeloschedtask";  // what marks a line as a task's
constexpr char kPowerOffProgram[] = "/usr/zelo/bin/zelo_poweroff_feasible_check";
constexpr char kPowerOff[] = "poweroff";

using Tasks = std::vector<const ZELO_SCHED_TASK *>;

// The library writes a number of a list with its sign.
void appendItem(std::string *list, uint32_t number) {
  if (!list->empty()) *list += ',';
  *list += std::to_string(static_cast<int32_t>(number));
}

std::string hours(const ZELO_SCHED_TASK &task) {
  std::string list;
  anyRunHour(task, [&](uint32_t hour) {
    appendItem(&list, hour);
    return false;
  });
  return list;
}

std::string weekdays(const ZELO_SCHED_TASK &task) {
  std::string list;
  for (uint32_t day = 0; day < kDaysOfWeek; ++day) {
    if (schedIsDayOn(task.Week, day)) appendItem(&list, day);
  }
  return list;
}

std::string days(const ZELO_SCHED_TASK &task) {
  const std::string day = std::to_string(task.StartDay);
  switch (task.Type) {
    case ZELO_SCHED_TYPE_ONCE:
    case ZELO_SCHED_TYPE_YEARLY:
      return day + "\t" + std::to_string(task.StartMonth) + "\t*";
    case ZELO_SCHED_TYPE_MONTHLY:
      return day + "\t*\t*";
    case ZELO_SCHED_TYPE_WEEKLY:
      return "*\t*\t" + weekdays(task);
    default:
      return "*\t*\t*";
  }
}

// The platform writes every day as an asterisk.
std::string powerOffLine(const ZELO_SCHED_TASK &task) {
  constexpr char kEveryDay[] = "0,1,2,3,4,5,6";
  const std::string days = weekdays(task);
  return std::to_string(task.RunMin) + "\t" + std::to_string(task.RunHour) + "\t*\t*\t" +
         (days == kEveryDay ? "*" : days) + "\troot\t" + kPowerOffProgram;
}

bool isOurs(const std::string &line) {
  return line.find(kTaskProgram) != std::string::npos ||
         line.find(kPowerOffProgram) != std::string::npos;
}

std::vector<std::string> expectedLines(const Tasks &tasks) {
  std::vector<std::string> lines;
  for (const ZELO_SCHED_TASK *task : tasks) {
    if (!isEnabled(*task)) continue;
    if (!isPower(*task)) {
      lines.push_back(crontabLine(*task));
    } else if (std::strcmp(task->AppArgs, kPowerOff) == 0 && !weekdays(*task).empty()) {
      lines.push_back(powerOffLine(*task));
    }
  }
  std::sort(lines.begin(), lines.end());
  return lines;
}

bool readLines(std::vector<std::string> *lines) {
  std::ifstream crontab(kCrontab);
  if (!crontab) return false;
  for (std::string line; std::getline(crontab, line);) {
    if (isOurs(line)) lines->push_back(line);
  }
  std::sort(lines->begin(), lines->end());
  return true;
}

// What `lines` has and `others` has not, as sentences.
void report(const std::vector<std::string> &lines, const std::vector<std::string> &others,
            const char *sentence, std::vector<std::string> *differences) {
  std::vector<std::string> alone;
  std::set_difference(lines.begin(), lines.end(), others.begin(), others.end(),
                      std::back_inserter(alone));
  for (std::string line : alone) {
    std::replace(line.begin(), line.end(), '\t', ' ');
    differences->push_back(sentence + printable(line));
  }
}

}  // namespace

std::string crontabLine(const ZELO_SCHED_TASK &task) {
  const std::string hour = task.RepeatHour == 0 ? std::to_string(task.RunHour) : hours(task);
  return std::to_string(task.RunMin) + "\t" + hour + "\t" + days(task) + "\troot\t" + kTaskProgram +
         " --run id=" + std::to_string(task.ID);
}

std::vector<std::string> crontabDifferences(const Tasks &tasks) {
  std::vector<std::string> found;
  if (!readLines(&found)) {
    return {std::string(kCrontab) + " cannot be read: " + std::strerror(errno)};
  }
  const std::vector<std::string> expected = expectedLines(tasks);
  std::vector<std::string> differences;
  report(expected, found, "/etc/crontab lacks the line: ", &differences);
  report(found, expected, "/etc/crontab has a line that belongs to no task: ", &differences);
  return differences;
}
