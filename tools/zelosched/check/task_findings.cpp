#include "check/task_findings.h"

#include <sched_cron_room.h>
#include <unistd.h>
#include <zelocore.h>

#include <algorithm>

#include "check/alarm_check.h"
#include "check/crontab_check.h"
#include "check/task_check.h"
#include "store/power_room.h"
#include "store/store_copy.h"
#include "store/store_files.h"
#include "terminal/text.h"

namespace {

bool isUnreadableByCron(const ZELO_SCHED_TASK *task) {
  return isEnabled(*task) && !unreadableFieldsOf(*task).empty();
}

bool isPowerOff(const ZELO_SCHED_TASK *task) {
  return isPower(*task) && isEnabled(*task) && directionOf(*task) == "off";
}

}  // namespace

Findings checkTasksAreReadable(const TaskList &list) {
  const std::optional<int> sections = countSections(kWorkingCopy);
  if (!sections) return {};  // checkCopies reports that
  const auto stored = std::count_if(list.tasks().begin(), list.tasks().end(),
                                    [](const ZELO_SCHED_TASK *task) { return !isPower(*task); });
  if (stored == *sections) return {};
  return {{Severity::kWarning, "unreadable-task",
           counted(static_cast<size_t>(*sections - stored), "stored task") +
               " cannot be read, and will not run (the system log says why)"}};
}

Findings checkCrontab(const TaskList &list) {
  const std::vector<std::string> differences = crontabDifferences(list.tasks());
  if (differences.empty()) {
    return {{Severity::kOk, "crontab", "the crontab is in step with the tasks"}};
  }
  Findings findings;
  for (const std::string &difference : differences) {
    findings.push_back({Severity::kWarning, "crontab", difference});
  }
  const bool isReadable =
      std::none_of(list.tasks().begin(), list.tasks().end(), isUnreadableByCron);
  findings.back().remedy = isReadable ? "'zelosched sync' writes the crontab again"
                                      : "'zelosched sync' writes the crontab again once no task "
                                        "has a field that cron cannot read";
  return findings;
}

Findings checkCrontabLength() {
  const size_t lines = schedCountCronLines();
  if (lines <= kSchedMostCronLines) return {};
  return {{Severity::kCritical, "crontab",
           "/etc/crontab has " + std::to_string(lines) +
               " lines, and cron ignores all of it when there are more than " +
               std::to_string(kSchedMostCronLines),
           "remove or disable tasks, or other lines"}};
}

// One field that cron cannot read can stop every other task too.
Findings checkTaskFields(const TaskList &list) {
  Findings findings;
  const auto add = [&](Severity severity, const ZELO_SCHED_TASK &task, const std::string &text) {
    findings.push_back({severity, "task", text, "", task.ID, task.Name});
  };
  for (const ZELO_SCHED_TASK *task : list.tasks()) {
    if (!isEnabled(*task)) continue;
    for (const std::string &harm : harmsOf(*task)) {
      add(Severity::kWarning, *task, titleOf(*task) + ": " + harm);
    }
    if (isUnreadableByCron(task)) {
      add(Severity::kCritical, *task,
          "cron may pass over all of /etc/crontab for that line: edit " + titleOf(*task) +
              " or disable it");
    }
  }
  if (findings.empty()) {
    findings.push_back({Severity::kOk, "task", "no enabled task has a fault"});
  }
  return findings;
}

Findings checkPower(const TaskList &list) {
  Findings findings;
  const std::string fault = alarmFault(list);
  if (!fault.empty()) findings.push_back({Severity::kWarning, "power", fault});
  if (std::any_of(list.tasks().begin(), list.tasks().end(), isPowerOff) &&
      access(kPowerOffProgram, X_OK) != 0) {
    findings.push_back({Severity::kWarning, "power",
                        std::string(kPowerOffProgram) +
                            ", which cron starts at a power-off time, is no program: the machine "
                            "will not go off"});
  }
  if (findings.empty()) {
    findings.push_back(
        {Severity::kOk, "power", "no power-on time waits for a clock that is not armed"});
  }
  return findings;
}
