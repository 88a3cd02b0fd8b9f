#include "check/crontab_check.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <fstream>

#include "schedule_cron.h"
#include "schedule_days.h"
#include "store/task_list.h"
#include "terminal/text.h"

namespace {

constexpr char kCrontab[] = "/etc/crontab";
constexpr char kPowerOff[] = "poweroff";
constexpr unsigned kEveryDay = (1U << kDaysOfWeek) - 1;

// The platform writes every day as an asterisk.
std::string powerOffLine(const ZELO_SCHED_TASK &task) {
  const std::string days = schedWeekdayListOf(task).text;
  return std::to_string(task.RunMin) + "\t" + std::to_string(task.RunHour) + "\t*\t*\t" +
         (schedWeekdayMaskOf(task) == kEveryDay ? "*" : days) + "\troot\t" + kPowerOffProgram;
}

bool isOurs(const std::string &line) {
  return line.find(kSchedCronProgram) != std::string::npos ||
         line.find(kPowerOffProgram) != std::string::npos;
}

std::vector<std::string> expectedLines(const std::vector<const ZELO_SCHED_TASK *> &tasks) {
  std::vector<std::string> lines;
  for (const ZELO_SCHED_TASK *task : tasks) {
    if (!isEnabled(*task)) continue;
    if (!isPower(*task)) {
      lines.push_back(schedCronLineOf(*task).text);
    } else if (std::strcmp(task->AppArgs, kPowerOff) == 0 && schedWeekdayMaskOf(*task) != 0) {
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

std::vector<std::string> crontabDifferences(const std::vector<const ZELO_SCHED_TASK *> &tasks) {
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
