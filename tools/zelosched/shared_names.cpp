#include "shared_names.h"

#include <fcntl.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <unistd.h>
#include <zelosched.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "failure.h"

namespace {

constexpr mode_t kPermissions = 07777;
constexpr mode_t kOthersMayWrite = S_IWGRP | S_IWOTH;

enum class Kind { kDirectory, kFile };

// In the order in which they are taken: what is in the directory can be judged only behind it.
struct SharedName {
  const char *path;
  Kind kind;
  mode_t mode;  // who can open the lock or the database can keep every run waiting
};
constexpr SharedName kLockDirectory = {"/tmp/lock", Kind::kDirectory, 0755};
constexpr SharedName kLockFile = {"/tmp/lock/lock_sched_run", Kind::kFile, 0600};
constexpr char kDatabase[] = "/tmp/sched_status.sqlite";
constexpr SharedName kNames[] = {
    kLockDirectory,
    kLockFile,
    {kDatabase, Kind::kFile, 0600},
    {"/tmp/sched_status.sqlite-journal", Kind::kFile, 0600},
    {"/tmp/sched_status.sqlite-wal", Kind::kFile, 0600},
    {"/tmp/sched_status.sqlite-shm", Kind::kFile, 0600},
};

Failure cannot(const std::string &what) {
  const int reason = errno;
  return Failure("cannot " + what + ": " + std::strerror(reason));
}

// False when there is nothing, or nothing that we may see: then it is the directory that is at
// fault.
bool examine(const std::string &path, struct stat *info) {
  if (lstat(path.c_str(), info) == 0) return true;
  if (errno == ENOENT || errno == ENOTDIR || errno == EACCES) return false;
  throw cannot("examine " + path);
}

// Why it is not to be used at all; nothing when it is root's alone.
std::string whyForeign(const SharedName &name, const struct stat &info) {
  const bool isDirectory = name.kind == Kind::kDirectory;
  if (info.st_uid != 0) return "is another user's";
  if (isDirectory && !S_ISDIR(info.st_mode)) return "is no directory";
  if (!isDirectory && !S_ISREG(info.st_mode)) return "is no regular file";
  if (!isDirectory && info.st_nlink > 1) return "has a second name";
  if ((info.st_mode & kOthersMayWrite) != 0) return "can be written by others";
  return "";
}

bool isOpenToOthers(const SharedName &name, const struct stat &info) {
  return (info.st_mode & kPermissions & ~name.mode) != 0;
}

std::string faultOf(const SharedName &name) {
  struct stat info {};
  if (!examine(name.path, &info)) return "";
  std::string foreign = whyForeign(name, info);
  if (!foreign.empty()) return foreign;
  return isOpenToOthers(name, info) ? "can be opened by others" : "";
}

// ---- taking away ------------------------------------------------------------------------------

// What is in a directory of somebody else's may be more than can be removed in time, and may change
// meanwhile: it is given a name that is nobody's.
void moveAway(const std::string &path) {
  std::string away = path + ".XXXXXX";
  if (mkdtemp(away.data()) == nullptr) throw cannot("make a directory beside " + path);
  if (rename(path.c_str(), away.c_str()) != 0) {
    const int reason = errno;
    rmdir(away.c_str());
    errno = reason;
    throw cannot("move " + path + " away");
  }
  complain(path + " is now " + away);
}

void takeAway(const SharedName &name, const struct stat &info, const std::string &why) {
  complain(std::string(name.path) + " " + why + ": it is taken away");
  if (S_ISDIR(info.st_mode)) {
    moveAway(name.path);
  } else if (unlink(name.path) != 0) {
    throw cannot(std::string("remove ") + name.path);
  }
}

void clear(const SharedName &name) {
  struct stat info {};
  if (!examine(name.path, &info)) return;
  const std::string why = whyForeign(name, info);
  if (!why.empty()) {
    takeAway(name, info, why);
  } else if (isOpenToOthers(name, info) && chmod(name.path, info.st_mode & name.mode) != 0) {
    // Root's alone, in a directory where nobody else can put another in its place.
    throw cannot(std::string("close ") + name.path + " to others");
  }
}

// ---- taking -----------------------------------------------------------------------------------

void makeLockDirectory() {
  if (mkdir(kLockDirectory.path, kLockDirectory.mode) == 0) {
    chmod(kLockDirectory.path, kLockDirectory.mode);  // whatever our mask is
  } else if (errno != EEXIST) {
    throw cannot(std::string("make ") + kLockDirectory.path);
  }
}

void makeLockFile() {
  constexpr int kFlags = O_WRONLY | O_CREAT | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC;
  const int file = open(kLockFile.path, kFlags, kLockFile.mode);
  if (file < 0) throw cannot(std::string("make ") + kLockFile.path);
  close(file);
}

void makeDatabase() {
  forgetError();
  sqlite3 *const database = ZELOSchedDBInit();
  if (database == nullptr) throw failedTo(std::string("make ") + kDatabase);
  sqlite3_close(database);
}

// Somebody may have been faster than we between taking away and taking.
void requireNoFault() {
  const std::vector<std::string> faults = sharedNameFaults();
  if (!faults.empty()) throw Failure(faults.front());
}

}  // namespace

std::string runLockFault() {
  for (const SharedName &name : {kLockDirectory, kLockFile}) {
    struct stat info {};
    const std::string why = examine(name.path, &info) ? whyForeign(name, info) : "";
    if (!why.empty()) return std::string(name.path) + " " + why;
  }
  return "";
}

std::vector<std::string> sharedNameFaults() {
  std::vector<std::string> faults;
  for (const SharedName &name : kNames) {
    const std::string fault = faultOf(name);
    if (fault.empty()) continue;
    faults.push_back(std::string(name.path) + " " + fault +
                     ": it keeps tasks from running until 'zelosched restore' takes it away");
  }
  return faults;
}

int takeSharedNames() {
  int status = kDone;
  for (const SharedName &name : kNames) {
    status = std::max(status, attempt([&] {
                        clear(name);
                        if (name.kind == Kind::kDirectory) makeLockDirectory();
                      }));
  }
  for (const auto step : {makeLockFile, makeDatabase, requireNoFault}) {
    status = std::max(status, attempt(step));
  }
  return status;
}

void freeOfDirectory(const std::string &path) {
  struct stat info {};
  if (!examine(path, &info) || !S_ISDIR(info.st_mode)) return;
  complain(path + " is a directory: it is taken away");
  moveAway(path);
}
