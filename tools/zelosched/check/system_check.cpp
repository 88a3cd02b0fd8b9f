#include "check/system_check.h"

#include <sched_shared_names.h>
#include <sched_store_lock.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "runs/cron_surroundings.h"
#include "runs/settings.h"
#include "store/change_lock.h"
#include "store/place_file.h"
#include "store/shared_names.h"
#include "store/store_files.h"
#include "terminal/text.h"

namespace {

constexpr char kTmp[] = "/tmp";

// The process that keeps the lock for two seconds, or 0.
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

}  // namespace

Findings checkCron() {
  const int64_t cron = cronProcess();
  if (cron != 0) {
    return {{Severity::kOk, "cron", "cron is running (process " + std::to_string(cron) + ")"}};
  }
  return {{Severity::kCritical, "cron", "cron is not running: no task will start by itself"}};
}

Findings checkProgram() {
  const auto critical = [](const std::string &what, const std::string &remedy = "") {
    return Findings{{Severity::kCritical, "program", kTaskProgram + what, remedy}};
  };
  struct stat info {};
  if (lstat(kTaskProgram, &info) != 0) {
    return critical(std::string(", which cron starts, cannot be examined: ") +
                    std::strerror(errno));
  }
  const bool isProgram = S_ISREG(info.st_mode) && (info.st_mode & S_IXUSR) != 0;
  if (!isProgram) return critical(" is no program");
  if (info.st_uid != 0 || schedWhyForeign(kSchedTaskProgram, info) != nullptr) {
    return critical(" is not root's alone: whoever can write it runs commands as root");
  }
  if (contentsIfReadable(kTaskProgram) == kSchedTaskProgram.contents) {
    return critical(" only stands in for the program that starts tasks",
                    "'zelosched restore' puts that there");
  }
  return {{Severity::kOk, "program", std::string(kTaskProgram) + " is there, and root's"}};
}

Findings checkTmp() {
  struct stat info {};
  if (stat(kTmp, &info) != 0) {
    return {{Severity::kCritical, "tmp",
             std::string(kTmp) + " cannot be examined: " + std::strerror(errno)}};
  }
  const bool isForOthers = (info.st_mode & (S_IWGRP | S_IWOTH)) != 0;
  if (info.st_uid == 0 && (!isForOthers || (info.st_mode & S_ISVTX) != 0)) {
    return {{Severity::kOk, "tmp", std::string(kTmp) + " is root's, and sticky"}};
  }
  return {{Severity::kWarning, "tmp",
           std::string(kTmp) + (info.st_uid != 0 ? " is not root's" : " is not sticky") +
               ", so another user can put his own program in the place of the one that cron starts "
               "as root",
           "'chown root /tmp' and 'chmod 1777 /tmp' set that right"}};
}

Findings checkSharedNames() {
  Findings findings;
  for (const std::string &fault : sharedNameFaults()) {
    findings.push_back({Severity::kWarning, "names", fault});
  }
  const size_t scratch = foreignScratchNames();
  if (scratch > 0) {
    findings.push_back(
        {Severity::kWarning, "names",
         counted(scratch, "name") + " of scratch copies of the tasks in /tmp belong to other users",
         "'zelosched restore' takes them away"});
  }
  const bool isStoreOurs = schedLookAt(kSchedStore, nullptr) != SchedNameState::kForeign;
  if (findings.empty() && isStoreOurs) {
    findings.push_back({Severity::kOk, "names", "no other user is in the way of a run"});
  }
  for (const std::string &directory : movedAway()) {
    findings.push_back({Severity::kOk, "names",
                        "what was in the way of ours in /tmp was moved to " + directory +
                            ": look at it and delete it"});
  }
  return findings;
}

Findings checkSettings() {
  SettingsFaults faults;
  readSettings(&faults);
  Findings findings;
  for (const std::string &fault : faults) {
    findings.push_back({Severity::kWarning, "settings", fault + ": the usual value holds"});
  }
  return findings;
}

Findings checkTurns() {
  if (geteuid() != 0) {
    return {{Severity::kUnknown, "turns",
             "whether changes of tasks have their turn, only root may see"}};
  }
  Findings findings;
  for (const char *lockFile : {kSchedStoreLockFile, kChangeLockFile}) {
    const pid_t holder = lastingHolder(lockFile);
    if (holder == 0) continue;
    findings.push_back({Severity::kWarning, "turns",
                        processText(holder) + " keeps changes of tasks waiting: it holds " +
                            lockFile + ": end it, if it does not end by itself"});
  }
  if (findings.empty()) {
    findings.push_back({Severity::kOk, "turns", "changes of tasks have their turn"});
  }
  return findings;
}
