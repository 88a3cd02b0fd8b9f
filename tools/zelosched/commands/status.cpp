// zelosched status
#include <sched_cron_room.h>
#include <sched_shared_names.h>
#include <sched_store_lock.h>
#include <sys/stat.h>
#include <unistd.h>
#include <zelocore.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <iterator>

#include "check/alarm_check.h"
#include "check/crontab_check.h"
#include "check/task_check.h"
#include "commands/command.h"
#include "commands/options.h"
#include "runs/coming_runs.h"
#include "runs/history_keep.h"
#include "runs/missed.h"
#include "runs/runs.h"
#include "store/change_lock.h"
#include "store/shared_names.h"
#include "store/store_copy.h"
#include "store/store_files.h"
#include "store/task_list.h"
#include "terminal/failure.h"
#include "terminal/number.h"
#include "terminal/terminal.h"
#include "terminal/text.h"

namespace {

constexpr char kCronPidFile[] = "/var/run/crond.pid";
constexpr int kAlive = 1;

struct Finding {
  bool isWell;
  std::string text;
};
using Findings = std::vector<Finding>;

Finding well(const std::string &text) {
  return {true, text};
}

Finding wrong(const std::string &text) {
  return {false, text};
}

std::string contents(const std::string &path) {
  std::ifstream file(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), {}};
}

std::string firstLine(const std::string &path) {
  const std::string text = contents(path);
  return text.substr(0, text.find_first_of(" \n"));
}

// A number that another program has got since must not pass for cron's.
bool isCron(long pid) {
  return firstLine("/proc/" + std::to_string(pid) + "/comm").find("cron") != std::string::npos;
}

Findings cronRuns() {
  const std::string text = firstLine(kCronPidFile);
  const std::optional<long> pid = parseNumber(text);
  const bool isRunning = pid && *pid > 0 && *pid <= INT32_MAX &&
                         QLIBCProcAlive(static_cast<pid_t>(*pid)) == kAlive && isCron(*pid);
  if (isRunning) return {well("cron is running (process " + text + ")")};
  return {wrong("cron is not running: no task will start by itself")};
}

Findings programIsThere() {
  struct stat info {};
  if (lstat(kTaskProgram, &info) != 0) {
    return {wrong(std::string(kTaskProgram) +
                  ", which cron starts, cannot be examined: " + std::strerror(errno))};
  }
  const bool isProgram = S_ISREG(info.st_mode) && (info.st_mode & S_IXUSR) != 0;
  if (!isProgram) return {wrong(std::string(kTaskProgram) + " is no program")};
  if (info.st_uid != 0 || schedWhyForeign(kSchedTaskProgram, info) != nullptr) {
    return {wrong(std::string(kTaskProgram) +
                  " is not root's alone: whoever can write it runs commands as root")};
  }
  if (contents(kTaskProgram) == kSchedTaskProgram.contents) {
    return {
        wrong(std::string(kTaskProgram) +
              " only stands in for the program that starts tasks: 'zelosched restore' puts that "
              "there")};
  }
  return {well(std::string(kTaskProgram) + " is there, and root's")};
}

Findings namesAreOurs() {
  Findings findings;
  for (const std::string &fault : sharedNameFaults()) findings.push_back(wrong(fault));
  const size_t scratch = foreignScratchNames();
  if (scratch > 0) {
    findings.push_back(wrong(counted(scratch, "name") +
                             " of scratch copies of the tasks in /tmp belong to other users: "
                             "'zelosched restore' takes them away"));
  }
  const bool isStoreOurs = schedLookAt(kSchedStore, nullptr) != SchedNameState::kForeign;
  if (findings.empty() && isStoreOurs) {
    findings.push_back(well("no other user is in the way of a run"));
  }
  for (const std::string &directory : movedAway()) {
    findings.push_back(well("what was in the way of ours in /tmp was moved to " + directory +
                            ": look at it and delete it"));
  }
  return findings;
}

// One that has it for a moment is no fault.
pid_t lastingHolder(const char *lockFile) {
  constexpr int kTries = 100;
  constexpr useconds_t kPause = 20000;
  const pid_t holder = schedLockHolder(lockFile);
  for (int i = 0; i < kTries && holder != 0; ++i) {
    usleep(kPause);
    if (schedLockHolder(lockFile) != holder) return 0;
  }
  return holder;
}

Findings changesHaveTheirTurn() {
  if (geteuid() != 0) return {well("whether changes of tasks have their turn, only root may see")};
  Findings findings;
  for (const char *lockFile : {kSchedStoreLockFile, kChangeLockFile}) {
    const pid_t holder = lastingHolder(lockFile);
    if (holder == 0) continue;
    findings.push_back(wrong(processText(holder) + " keeps changes of tasks waiting: it holds " +
                             lockFile + ": end it, if it does not end by itself"));
  }
  if (findings.empty()) findings.push_back(well("changes of tasks have their turn"));
  return findings;
}

bool exists(const char *path) {
  return QLIBCFileExist(path) != 0;
}

bool isWhole(const char *path, int *sections) {
  PSZLIST names = QLIBCSzListAlloc(1);
  forgetError();
  *sections = QLIBCFileEnumSection(path, &names);
  QLIBCSzListFree(names);
  return *sections >= 0;
}

constexpr char kPutTasksBack[] = ": 'zelosched restore' puts the tasks back";

// What the next restore falls back on.
Findings lastGoodAgrees() {
  if (!exists(kPersistentCopy) || !judgeStore(kPersistentCopy).isWhole()) return {};
  const char *const remedy = ": 'zelosched restore' writes it anew";
  if (!exists(kLastGoodCopy)) return {wrong(std::string(kLastGoodCopy) + " is missing" + remedy)};
  if (contents(kLastGoodCopy) == contents(kPersistentCopy)) return {};
  return {wrong(std::string(kLastGoodCopy) + " is not as " + kPersistentCopy + " is" + remedy)};
}

Findings copiesAgree() {
  const char *why = nullptr;
  if (schedLookAt(kSchedStore, &why) == SchedNameState::kForeign) {
    return {wrong(std::string(kWorkingCopy) + " " + why + kPutTasksBack)};
  }
  int working = 0;
  const bool isNothing = !exists(kWorkingCopy) || (isWhole(kWorkingCopy, &working) && working == 0);
  const bool isNoneKept = !exists(kPersistentCopy) && !exists(kLastGoodCopy);
  if (isNothing && isNoneKept) return {well("no task was ever saved")};
  if (exists(kWorkingCopy) && doTasksWaitForRestore()) {
    return {
        wrong(std::string(kWorkingCopy) + " has no tasks, though some are kept" + kPutTasksBack)};
  }
  for (const char *path : {kWorkingCopy, kPersistentCopy}) {
    int sections = 0;
    if (!exists(path)) {
      return {
          wrong(std::string(path) + " is missing" +
                (path == kWorkingCopy ? kPutTasksBack : ": 'zelosched restore' writes it anew"))};
    }
    if (!isWhole(path, &sections)) {
      return {wrong(std::string(path) + " cannot be read: " + errorInWords())};
    }
  }
  if (contents(kPersistentCopy).empty()) {
    return {wrong(std::string(kPersistentCopy) +
                  " is cut off: 'zelosched restore' writes it anew from " + kWorkingCopy)};
  }
  if (contents(kWorkingCopy) == contents(kPersistentCopy)) {
    return {well("the working and the persistent copy of the tasks agree")};
  }
  return {
      wrong("the working and the persistent copy of the tasks differ: save a task again, or "
            "what was changed last is lost at the next boot")};
}

Findings tasksAreReadable(const TaskList &list) {
  int sections = 0;
  if (!exists(kWorkingCopy) || !isWhole(kWorkingCopy, &sections)) return {};
  int stored = 0;
  for (const ZELO_SCHED_TASK *task : list.tasks()) stored += isPower(*task) ? 0 : 1;
  if (stored == sections) return {};
  return {wrong(counted(static_cast<size_t>(sections - stored), "stored task") +
                " cannot be read, and will not run (the system log says why)")};
}

Findings crontabIsInStep(const TaskList &list) {
  const std::vector<std::string> differences = crontabDifferences(list.tasks());
  if (differences.empty()) return {well("the crontab is in step with the tasks")};
  Findings findings;
  for (const std::string &difference : differences) findings.push_back(wrong(difference));
  const bool isReadable =
      std::none_of(list.tasks().begin(), list.tasks().end(), [](const ZELO_SCHED_TASK *task) {
        return isEnabled(*task) && !unreadableFieldsOf(*task).empty();
      });
  findings.push_back(wrong(isReadable ? "'zelosched sync' writes the crontab again"
                                      : "'zelosched sync' writes the crontab again once no task "
                                        "has a field that cron cannot read"));
  return findings;
}

Findings crontabIsShortEnough() {
  const size_t lines = schedCountCronLines();
  if (lines <= kSchedMostCronLines) return {};
  return {wrong("/etc/crontab has " + std::to_string(lines) +
                " lines, and cron ignores all of it when there are more than " +
                std::to_string(kSchedMostCronLines) + ": remove or disable tasks, or other lines")};
}

// One field that cron cannot read can stop every other task too.
Findings tasksAreHarmless(const TaskList &list) {
  Findings findings;
  for (const ZELO_SCHED_TASK *task : list.tasks()) {
    if (!isEnabled(*task)) continue;
    const bool stopsCron = !unreadableFieldsOf(*task).empty();
    for (const std::string &harm : harmsOf(*task)) {
      findings.push_back(wrong(titleOf(*task) + ": " + harm));
    }
    if (stopsCron) {
      findings.push_back(wrong("cron may pass over all of /etc/crontab for that line: edit " +
                               titleOf(*task) + " or disable it"));
    }
  }
  if (findings.empty()) findings.push_back(well("no enabled task has a fault"));
  return findings;
}

Findings clockIsArmed(const TaskList &list) {
  const std::string fault = alarmFault(list);
  if (!fault.empty()) return {wrong(fault)};
  return {well("no power-on time waits for a clock that is not armed")};
}

Findings runsInProgress(const TaskList &list) {
  if (!mayReadRuns()) return {well("whether a task is running, only root may see")};
  Findings findings;
  for (const Run &run : RunDatabase().running()) {
    std::string title = "task " + std::to_string(run.taskId);
    for (const ZELO_SCHED_TASK *task : list.tasks()) {
      if (task->ID == run.taskId) title = titleOf(*task);
    }
    findings.push_back(well(title + " is running since " + minuteText(localMinute(run.start)) +
                            " as process " + std::to_string(run.pid)));
  }
  if (findings.empty()) findings.push_back(well("no task is running"));
  return findings;
}

Findings runsMissed(const TaskList &list) {
  if (!mayReadAllRuns()) return {well("whether a run was missed, only root may see")};
  Findings findings;
  for (const MissedTask &missed : missedTasks(list, time(nullptr) - kMissedRemembered)) {
    findings.push_back(wrong(titleOf(*missed.task) + " was due at " +
                             minuteText(localMinute(missed.due)) +
                             ", when the machine was off: 'zelosched run " +
                             std::to_string(missed.task->ID) + "' runs it now"));
  }
  if (findings.empty()) findings.push_back(well("no run was missed"));
  return findings;
}

int report(const Findings &findings) {
  const bool colour = showsColour();
  int status = kDone;
  for (const Finding &finding : findings) {
    const char *mark = finding.isWell ? "ok   " : colour ? "\033[31mWRONG\033[0m" : "WRONG";
    std::printf("%s  %s\n", mark, printable(finding.text).c_str());
    if (!finding.isWell) status = kFailed;
  }
  return status;
}

int runStatus(int argc, char **argv) {
  const Arguments arguments(argc, argv, {});
  arguments.requireNoOperands();
  arguments.requireNoCommand();
  Findings all;
  // One that cannot be made does not hide the others.
  const auto add = [&](auto check) {
    try {
      const Findings findings = check();
      all.insert(all.end(), findings.begin(), findings.end());
    } catch (const Failure &failure) {
      const bool isSaid = std::any_of(all.begin(), all.end(), [&](const Finding &finding) {
        return finding.text == failure.what();
      });
      if (!isSaid) all.push_back(wrong(failure.what()));
    }
  };
  for (const auto check : {cronRuns, programIsThere, namesAreOurs, changesHaveTheirTurn,
                           copiesAgree, lastGoodAgrees, crontabIsShortEnough}) {
    add(check);
  }
  add([&] {
    const TaskList list;
    for (const auto check : {tasksAreReadable, crontabIsInStep, tasksAreHarmless, clockIsArmed,
                             runsInProgress, runsMissed}) {
      add([&] { return check(list); });
    }
    return Findings();
  });
  return report(all);
}

}  // namespace

const Command kStatusCommand = {
    "status", "", "say whether all is well",
    "Prints a line for each check: whether cron is running, whether the program that it\n"
    "starts is there and root's, whether another user is in the way of runs in /tmp, whether\n"
    "a process keeps changes waiting, whether the copies of the tasks agree, whether each\n"
    "task can be read, whether the crontab is in step with them and short enough for cron,\n"
    "whether an enabled task has a fault, whether the clock is armed for the next power-on\n"
    "time, which tasks are running, and which were due while the machine was off.\n"
    "\n"
    "Exit status: 0 when all is well, 1 when something is wrong.\n",
    runStatus};
