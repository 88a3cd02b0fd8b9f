// zelosched restore
#include <sched_store_lock.h>
#include <sys/stat.h>
#include <unistd.h>
#include <zelocore.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstring>
#include <sstream>

#include "change_lock.h"
#include "command.h"
#include "failure.h"
#include "missed.h"
#include "options.h"
#include "place_file.h"
#include "save.h"
#include "store_files.h"
#include "sync.h"
#include "text.h"

namespace {

constexpr Option kOptions[] = {{"force"}};

constexpr mode_t kStoreMode = 0644;

constexpr char kTaskProgramName[] = "zeloschedtask";
constexpr char kUsualDirectory[] = "/usr/sbin/";
constexpr mode_t kProgramMode = 0755;

// ---- is a copy of the tasks fit to be used? ---------------------------------------------------

struct Copy {
  enum Condition { kMissing, kWhole, kDamaged, kForeign, kDirectory } condition;
  std::string why;  // of each but the first two: what is wrong with it

  bool isWhole() const { return condition == kWhole; }
};

bool holdsSections(const std::string &path, int *count) {
  PSZLIST names = QLIBCSzListAlloc(1);
  forgetError();
  *count = QLIBCFileEnumSection(path.c_str(), &names);
  QLIBCSzListFree(names);
  return *count >= 0;
}

bool isBlankOrComment(const std::string &line) {
  return line.find_first_not_of(" \t\r") == std::string::npos || line[0] == '#' || line[0] == ';';
}

// A store without tasks has comments only. What has lines of another kind, and no section, is the
// remains of something else.
bool hasOtherLines(const std::string &contents) {
  std::istringstream lines(contents);
  for (std::string line; std::getline(lines, line);) {
    if (!isBlankOrComment(line)) return true;
  }
  return false;
}

// After the power went, a file may have its size and no contents: none at all, or zeros.
Copy judgeContents(const std::string &path) {
  const std::string contents = contentsOf(path);
  if (contents.empty()) return {Copy::kDamaged, "is cut off: it has no bytes"};
  int sections = 0;
  if (!holdsSections(path, &sections)) {
    return {Copy::kDamaged, "cannot be read: " + errorInWords()};
  }
  const bool isOther = sections == 0 && hasOtherLines(contents);
  if (isOther || contents.find('\0') != std::string::npos) {
    return {Copy::kDamaged, "holds no tasks, but something else"};
  }
  return {Copy::kWhole, ""};
}

Copy judge(const std::string &path) {
  struct stat info {};
  if (lstat(path.c_str(), &info) != 0) {
    if (errno == ENOENT) return {Copy::kMissing, ""};
    return {Copy::kDamaged, std::string("cannot be examined: ") + std::strerror(errno)};
  }
  if (S_ISDIR(info.st_mode)) return {Copy::kDirectory, "is a directory"};
  if (!S_ISREG(info.st_mode)) return {Copy::kForeign, "is no regular file"};
  if (info.st_uid != 0 || (info.st_mode & (S_IWGRP | S_IWOTH)) != 0) {
    return {Copy::kForeign, "is not root's alone"};
  }
  try {
    return judgeContents(path);
  } catch (const Failure &failure) {
    return {Copy::kDamaged, std::string("is unreadable (") + failure.what() + ")"};
  }
}

Failure refused(const std::string &path, const Copy &copy) {
  return Failure(path + " " + copy.why + ": it is not used");
}

// ---- putting the tasks back ---------------------------------------------------------------------

// The one to fall back on at a later boot. It is rewritten only where it differs: it stands on
// memory that wears.
void keepLastGood() {
  const std::string contents = contentsOf(kPersistentCopy);
  if (judge(kLastGoodCopy).isWhole() && contentsOf(kLastGoodCopy) == contents) return;
  placeFile(kLastGoodCopy, contents, kStoreMode);
}

void placeWorkingCopy(const char *source) {
  placeFile(kWorkingCopy, contentsOf(source), kStoreMode);
  std::printf("%s was put back from %s\n", kWorkingCopy, source);
}

// What somebody else has put there would keep the library from saving any task.
void removeForeign(const Copy &working) {
  if (working.condition != Copy::kForeign || unlink(kWorkingCopy) == 0) return;
  const int reason = errno;
  throw Failure(std::string("cannot remove ") + kWorkingCopy + ": " + std::strerror(reason) +
                ": no task can be saved until it is gone");
}

void putLastGoodBack(const Copy &working, const Copy &persistent) {
  const Copy lastGood = judge(kLastGoodCopy);
  if (persistent.condition == Copy::kMissing && lastGood.condition == Copy::kMissing) {
    removeForeign(working);
    std::puts("no task was ever saved: there is nothing to put back");
    return;
  }
  const std::string what = persistent.condition == Copy::kMissing
                               ? std::string(kPersistentCopy) + " is missing"
                               : refused(kPersistentCopy, persistent).what();
  if (!lastGood.isWhole()) {
    removeForeign(working);
    const std::string why =
        lastGood.condition == Copy::kMissing ? "there is no " : "neither can be used: ";
    throw Failure(what + ", and " + why + kLastGoodCopy +
                  (lastGood.why.empty() ? "" : " " + lastGood.why) + ": no task will run");
  }
  placeWorkingCopy(kLastGoodCopy);
  throw Failure(what + ". The tasks are those of an earlier boot, from " + kLastGoodCopy +
                ": look through them, and save one to write both copies anew");
}

// A working copy that stands may hold a change that the persistent one lacks.
void keepWorkingCopy(const Copy &persistent) {
  if (persistent.isWhole()) {
    std::printf("%s is there and whole: it stays (--force replaces it)\n", kWorkingCopy);
    keepLastGood();
    return;
  }
  std::printf("%s is there and whole: it stays\n", kWorkingCopy);
  const std::string why = persistent.why.empty() ? "is missing" : persistent.why;
  throw Failure(std::string(kPersistentCopy) + " " + why +
                ": save a task, which writes it anew, or all are lost at the next boot");
}

void putStoreBack(bool isForced) {
  const StoreLock turn;
  const Copy working = judge(kWorkingCopy);
  if (working.condition == Copy::kDirectory) {
    throw Failure(std::string(kWorkingCopy) +
                  " is a directory: no task runs until it is moved away and restored again");
  }
  if (working.condition == Copy::kForeign || working.condition == Copy::kDamaged) {
    complain(refused(kWorkingCopy, working).what());
  }
  const Copy persistent = judge(kPersistentCopy);
  if (working.isWhole() && !isForced) return keepWorkingCopy(persistent);
  if (persistent.isWhole()) {
    placeWorkingCopy(kPersistentCopy);
    keepLastGood();
  } else if (working.isWhole()) {
    // Even by force, tasks that are fit are given up for none but those saved last.
    keepWorkingCopy(persistent);
  } else {
    putLastGoodBack(working, persistent);
  }
}

// ---- the program that cron starts ---------------------------------------------------------------

// Empty when /proc does not tell.
std::string ownDirectory() {
  char self[PATH_MAX];
  const ssize_t length = readlink("/proc/self/exe", self, sizeof self);
  const std::string path(self, static_cast<size_t>(std::max<ssize_t>(length, 0)));
  return path.substr(0, path.rfind('/') + 1);
}

// It is installed beside this one.
std::string installedProgram() {
  const std::string directory = ownDirectory();
  const std::string beside = directory + kTaskProgramName;
  const bool isBeside = !directory.empty() && access(beside.c_str(), F_OK) == 0;
  return isBeside ? beside : std::string(kUsualDirectory) + kTaskProgramName;
}

void putProgramBack() {
  const std::string installed = installedProgram();
  const std::string program = contentsOf(installed);
  if (program.empty()) throw Failure(installed + " is cut off: it has no bytes");
  placeFile(kTaskProgram, program, kProgramMode);
  std::printf("%s was put back from %s\n", kTaskProgram, installed.c_str());
}

// ---- all together -------------------------------------------------------------------------------

int runRestore(int argc, char **argv) {
  const Arguments arguments(argc, argv, kOptions);
  arguments.requireNoOperands();
  arguments.requireNoCommand();
  const bool isForced = arguments.has("force");
  const ChangeLock lock;
  // As much as can be shall run.
  const int results[] = {
      attempt(putProgramBack),
      attempt([&] { putStoreBack(isForced); }),
      attempt(synchronise),
      attempt(markMachineUp),
  };
  return *std::max_element(std::begin(results), std::end(results));
}

}  // namespace

const Command kRestoreCommand = {
    "restore", "[--force]", "put the tasks back into /tmp, as at boot",
    "Puts the persistent copy of the tasks and the program that cron starts back into\n"
    "/tmp, and writes the crontab. The system does it at boot, before cron and before\n"
    "anybody can log in.\n"
    "\n"
    "A persistent copy that is cut off or cannot be read is not used; the last good one,\n"
    "which each restore keeps, takes its place, and the exit status is 1. Tasks that are\n"
    "in /tmp, root's and whole, stay: a restore by hand loses nothing.\n"
    "\n"
    "  --force                        replace them by the persistent copy all the same\n",
    runRestore};
