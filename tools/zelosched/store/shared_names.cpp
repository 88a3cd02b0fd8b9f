#include "store/shared_names.h"

#include <dirent.h>
#include <fcntl.h>
#include <sched_shared_names.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <unistd.h>
#include <zelosched.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <string_view>

#include "store/directory.h"
#include "terminal/failure.h"
#include "terminal/text.h"

namespace {

constexpr mode_t kPermissions = 07777;
constexpr char kSharedDirectory[] = "/tmp";
constexpr std::string_view kScratchPrefix = "scheduled_tasks.tmp.";
constexpr std::string_view kAsidePrefix = "zeloscheduler.";

// In the order in which they are taken: the directory before the file in it.
constexpr const SchedSharedName *kNames[] = {&kSchedLockDirectory, &kSchedLockFile, &kSchedDatabase,
                                             &kSchedJournal};

Failure cannot(const std::string &what) {
  const int reason = errno;
  return Failure("cannot " + what + ": " + std::strerror(reason));
}

// Why the name cannot be used at all; empty when it is root's alone.
std::string whyForeign(const SchedSharedName &name) {
  const char *why = nullptr;
  return schedLookAt(name, &why) == SchedNameState::kForeign ? why : "";
}

bool isOpenToOthers(const SchedSharedName &name) {
  struct stat info {};
  return lstat(name.path, &info) == 0 && (info.st_mode & kPermissions & ~name.mode) != 0;
}

std::string faultOf(const SchedSharedName &name) {
  std::string foreign = whyForeign(name);
  if (!foreign.empty()) return foreign;
  return isOpenToOthers(name) ? "can be opened by others" : "";
}

void take(const SchedSharedName &name) {
  const std::string why = whyForeign(name);
  if (!why.empty()) complain(std::string(name.path) + " " + why + ": it is moved away");
  if (!schedTakeName(name)) throw Failure(std::string("cannot take ") + name.path);
  // It is root's, in a sticky directory: no other user can replace it before the chmod.
  if (isOpenToOthers(name) && chmod(name.path, name.mode) != 0) {
    throw cannot(std::string("close ") + name.path + " to others");
  }
}

void makeDatabase() {
  forgetError();
  sqlite3 *const database = ZELOSchedDBInit();
  if (database == nullptr) throw failedTo(std::string("make ") + kSchedDatabase.path);
  sqlite3_close(database);
}

void requireNoFault() {
  const std::vector<std::string> faults = sharedNameFaults();
  if (!faults.empty()) throw Failure(faults.front());
}

// ---- scratch copies ---------------------------------------------------------------------------

using ActOnName = std::function<void(int directory, const char *name)>;

void forEachName(std::string_view prefix, const ActOnName &act) {
  const Directory directory(opendir(kSharedDirectory));
  if (directory == nullptr) throw cannot(std::string("read ") + kSharedDirectory);
  while (const dirent *entry = readdir(directory.get())) {
    if (std::string_view(entry->d_name).starts_with(prefix))
      act(dirfd(directory.get()), entry->d_name);
  }
}

// A directory for those that cannot be removed.
class AsideDirectory {
 public:
  // Under a number, as the same name may be made again.
  void receive(int directory, const char *name) {
    if (path_.empty()) make();
    const std::string to = path_ + "/" + std::to_string(++count_);
    if (renameat(directory, name, AT_FDCWD, to.c_str()) != 0 && errno != ENOENT) {
      throw cannot("move " + printable(name) + " away");
    }
  }
  const std::string &path() const { return path_; }

 private:
  void make() {
    std::string pattern = std::string(kSharedDirectory) + "/zeloscheduler.XXXXXX";
    if (mkdtemp(pattern.data()) == nullptr) throw cannot("make a directory in /tmp");
    path_ = pattern;
  }

  std::string path_;
  uint64_t count_ = 0;
};

// SQLite would read these files when another program opens the database.
void removeForeignLogs() {
  for (const char *path : {"/tmp/sched_status.sqlite-wal", "/tmp/sched_status.sqlite-shm"}) {
    struct stat info {};
    if (lstat(path, &info) != 0) continue;
    complain(std::string(path) + " is not ours: it is taken away");
    if (unlink(path) == 0 || rmdir(path) == 0) continue;
    AsideDirectory().receive(AT_FDCWD, path);
  }
}

}  // namespace

std::vector<std::string> sharedNameFaults() {
  std::vector<std::string> faults;
  for (const SchedSharedName *name : kNames) {
    const std::string fault = faultOf(*name);
    if (fault.empty()) continue;
    faults.push_back(std::string(name->path) + " " + fault +
                     ": 'zelosched restore' makes it root's alone again");
  }
  return faults;
}

int takeSharedNames() {
  int status = kDone;
  for (const SchedSharedName *name : kNames) {
    status = std::max(status, attempt([&] { take(*name); }));
  }
  for (const auto step : {removeForeignLogs, makeDatabase, requireNoFault}) {
    status = std::max(status, attempt(step));
  }
  return status;
}

size_t foreignScratchNames() {
  size_t count = 0;
  forEachName(kScratchPrefix, [&](int directory, const char *name) {
    struct stat info {};
    const bool isThere = fstatat(directory, name, &info, AT_SYMLINK_NOFOLLOW) == 0;
    if (isThere && schedWhyForeign(kSchedStore, info) != nullptr) ++count;
  });
  return count;
}

std::vector<std::string> movedAway() {
  std::vector<std::string> directories;
  forEachName(kAsidePrefix, [&](int directory, const char *name) {
    struct stat info {};
    const bool isRoots = fstatat(directory, name, &info, AT_SYMLINK_NOFOLLOW) == 0 &&
                         S_ISDIR(info.st_mode) && info.st_uid == 0;
    if (isRoots) directories.push_back(std::string(kSharedDirectory) + "/" + name);
  });
  return directories;
}

void clearScratchNames() {
  AsideDirectory aside;
  forEachName(kScratchPrefix, [&](int directory, const char *name) {
    if (unlinkat(directory, name, 0) == 0 || unlinkat(directory, name, AT_REMOVEDIR) == 0) return;
    if (errno != ENOENT) aside.receive(directory, name);
  });
  if (!aside.path().empty()) {
    complain("directories under names of scratch copies of the tasks are now in " + aside.path());
  }
}
