#include "sched_shared_names.h"

#include <fcntl.h>
#include <stdio.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>

#include "sched_report.h"
#include "sched_stand_in.h"

namespace {

constexpr mode_t kReadableByAll = 0644;
constexpr mode_t kOwnersOnly = 0600;  // whoever can open it can delay every run
constexpr mode_t kOpenDirectory = 0755;
constexpr char kStorePath[] = "/tmp/scheduled_tasks";
// Contents of a new store: an empty one beside a persistent copy counts as cut off.
constexpr char kNoTasks[] = "# The scheduler's tasks.\n";

// Reserved space, as another user can fill the file system, and a run that cannot be recorded is
// not started: for some 10,000 runs, and for the journal of one.
constexpr off_t kRoomForRuns = 1 << 20;
constexpr off_t kRoomForJournal = 1 << 17;

constexpr int kTries = 1000;  // against a process that takes the name again and again

bool makeDirectory(const char *szPath, mode_t mode) {
  return mkdir(szPath, S_IRWXU) == 0 && chmod(szPath, mode) == 0;
}

bool writeAll(int descriptor, std::string_view contents) {
  while (!contents.empty()) {
    const ssize_t written = write(descriptor, contents.data(), contents.size());
    if (written < 0 && errno == EINTR) {
      continue;
    }
    if (written <= 0) {
      return false;
    }
    contents.remove_prefix(static_cast<size_t>(written));
  }
  return true;
}

// A failure is ignored: there may be space when it is needed.
void reserve(const SchedSharedName &name, int descriptor) {
  if (name.reserve > 0) {
    fallocate(descriptor, FALLOC_FL_KEEP_SIZE, 0, name.reserve);
  }
}

bool makeFile(const SchedSharedName &name, const char *szPath) {
  constexpr int kFlags = O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC;
  const int descriptor = open(szPath, kFlags, name.mode & S_IRWXU);
  if (descriptor < 0) {
    return false;
  }
  const bool isWritten = writeAll(descriptor, name.contents) && fchmod(descriptor, name.mode) == 0;
  reserve(name, descriptor);
  return close(descriptor) == 0 && isWritten;
}

bool make(const SchedSharedName &name, const char *szPath) {
  return name.isDirectory ? makeDirectory(szPath, name.mode) : makeFile(name, szPath);
}

void removeEither(const char *szPath) {
  if (unlink(szPath) != 0) {
    rmdir(szPath);
  }
}

// What becomes of the file in the name's place if that is ours by now.
enum class Ours { kStays, kGoes, kIsKept };

// A new file or directory for the name, in a directory that nobody else can enter. Both are
// removed at the end, unless a file was moved there to be kept.
class Replacement {
 public:
  Replacement(const SchedSharedName &name, Ours ours) : name_(name), ours_(ours) {
    isMade_ = mkdtemp(directory_) != nullptr;
    snprintf(path_, sizeof(path_), "%s%s", directory_, strrchr(name.path, '/'));
    isMade_ = isMade_ && make(name, path_);
  }
  ~Replacement() {
    const int reason = errno;  // of the failure, for the caller
    if (!isKept_) {
      removeEither(path_);
    }
    rmdir(directory_);
    errno = reason;
  }
  Replacement(const Replacement &) = delete;
  Replacement &operator=(const Replacement &) = delete;

  bool isMade() const { return isMade_; }
  // The path of the file that was replaced, if it is kept.
  const char *movedTo() const { return isKept_ ? path_ : ""; }

  enum class Placed { kYes, kAgain, kNever };

  Placed place() {
    if (move(RENAME_EXCHANGE)) {
      settleExchanged();
      return Placed::kYes;
    }
    if (errno == ENOENT && move(RENAME_NOREPLACE)) {
      return Placed::kYes;
    }
    if (errno == EEXIST) {
      return Placed::kAgain;
    }
    return errno == EINVAL || errno == ENOSYS ? placeWithoutExchange() : Placed::kNever;
  }

 private:
  bool move(unsigned flags) { return renameat2(AT_FDCWD, path_, AT_FDCWD, name_.path, flags) == 0; }

  // Another process of ours may have taken the name since it was examined: its file may be in use.
  void settleExchanged() {
    struct stat info = {};
    const char *szWhy = lstat(path_, &info) == 0 ? schedWhyForeign(name_, info) : "is gone";
    if (szWhy == nullptr) {
      if (ours_ == Ours::kStays) {
        move(RENAME_EXCHANGE);
      }
      isKept_ = ours_ == Ours::kIsKept;
    } else if (rmdir(path_) != 0) {
      isKept_ = true;
      SCHED_LOG("%s %s: it is now %s", name_.path, szWhy, path_);
    }
  }

  // For a file system without RENAME_EXCHANGE. A file replaces any other file in one step. A
  // directory is moved away first, and then another process may take the name.
  Placed placeWithoutExchange() {
    if (rename(path_, name_.path) == 0) {
      return Placed::kYes;
    }
    char away[sizeof(path_) + sizeof(kAway)];
    snprintf(away, sizeof(away), "%s%s", path_, kAway);
    if (rename(name_.path, away) == 0 && rmdir(away) != 0) {
      SCHED_LOG("%s is not ours: it is now %s", name_.path, away);
    }
    return Placed::kAgain;
  }

  static constexpr char kAway[] = ".away";
  const SchedSharedName &name_;
  Ours ours_;
  char directory_[sizeof("/tmp/zeloscheduler.XXXXXX")] = "/tmp/zeloscheduler.XXXXXX";
  char path_[sizeof(directory_) + 64];
  bool isMade_ = false;
  bool isKept_ = false;
};

bool replace(const SchedSharedName &name, Ours ours, SchedMovedTo *pMovedTo = nullptr) {
  using Placed = Replacement::Placed;
  Replacement replacement(name, ours);
  Placed placed = replacement.isMade() ? Placed::kAgain : Placed::kNever;
  for (int i = 0; i < kTries && placed == Placed::kAgain; ++i) {
    placed = replacement.place();
  }
  if (pMovedTo != nullptr) {
    copyText(*pMovedTo, replacement.movedTo());
  }
  return placed == Placed::kYes;
}

// A file with contents is not made in place: nobody must find a part of it.
bool takeFree(const SchedSharedName &name) {
  return name.contents.empty() ? make(name, name.path) : replace(name, Ours::kStays);
}

}  // namespace

const SchedSharedName kSchedStore = {kStorePath, kReadableByAll, false, kNoTasks};
const SchedSharedName kSchedStoreToRestore = {kStorePath, kReadableByAll, false, ""};
const SchedSharedName kSchedTaskProgram = {"/tmp/zeloschedtask", kOpenDirectory, false,
                                           kSchedStandIn};
const SchedSharedName kSchedLockDirectory = {"/tmp/lock", kOpenDirectory, true, ""};
const SchedSharedName kSchedLockFile = {"/tmp/lock/lock_sched_run", kOwnersOnly, false, ""};
const SchedSharedName kSchedDatabase = {"/tmp/sched_status.sqlite", kOwnersOnly, false, "",
                                        kRoomForRuns};
const SchedSharedName kSchedJournal = {"/tmp/sched_status.sqlite-journal", kOwnersOnly, false, "",
                                       kRoomForJournal};

const char *schedWhyForeign(const SchedSharedName &name, const struct stat &info) {
  if (info.st_uid != 0 && info.st_uid != geteuid()) {
    return "is another user's";
  }
  if (name.isDirectory ? !S_ISDIR(info.st_mode) : !S_ISREG(info.st_mode)) {
    return name.isDirectory ? "is no directory" : "is no regular file";
  }
  if (!name.isDirectory && info.st_nlink != 1) {
    return "has a second name";
  }
  return (info.st_mode & (S_IWGRP | S_IWOTH)) != 0 ? "can be written by others" : nullptr;
}

SchedNameState schedLookAt(const SchedSharedName &name, const char **pszWhy) {
  struct stat info = {};
  const char *szWhy = nullptr;
  if (lstat(name.path, &info) != 0) {
    if (errno == ENOENT) {
      return SchedNameState::kFree;
    }
    szWhy = "cannot be examined";
  } else {
    szWhy = schedWhyForeign(name, info);
  }
  if (pszWhy != nullptr) {
    *pszWhy = szWhy;
  }
  return szWhy == nullptr ? SchedNameState::kOurs : SchedNameState::kForeign;
}

bool schedTakeName(const SchedSharedName &name) {
  for (int i = 0; i < kTries; ++i) {
    const SchedNameState state = schedLookAt(name, nullptr);
    if (state == SchedNameState::kOurs) {
      return true;
    }
    if (state == SchedNameState::kForeign) {
      return geteuid() == 0 && replace(name, Ours::kStays);
    }
    if (!takeFree(name) && errno != EEXIST) {
      return false;
    }
  }
  return false;
}

void schedReserve(const SchedSharedName &name) {
  const int descriptor = open(name.path, O_WRONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC);
  if (descriptor >= 0) {
    reserve(name, descriptor);
    close(descriptor);
  }
}

bool schedReplaceName(const SchedSharedName &name, SchedMovedTo *pMovedTo) {
  return geteuid() == 0 && replace(name, Ours::kGoes, pMovedTo);
}

bool schedMoveAside(const SchedSharedName &name, SchedMovedTo *pMovedTo) {
  return replace(name, Ours::kIsKept, pMovedTo);
}

bool schedMakeAnew(const SchedSharedName &name) {
  constexpr int kPlainTries = 10;
  for (int i = 0; i < kPlainTries && (unlink(name.path) == 0 || errno == ENOENT); ++i) {
    if (make(name, name.path)) {
      return true;
    }
    if (errno != EEXIST) {
      return false;
    }
  }
  return schedReplaceName(name, nullptr);
}

bool schedAreTasksKept() {
  struct stat kept = {};
  struct stat lastGood = {};
  return stat(kSchedPersistentStore, &kept) == 0 &&
         (kept.st_size > 0 || (stat(kSchedLastGoodStore, &lastGood) == 0 && lastGood.st_size > 0));
}

void schedTakeNames() {
  if (geteuid() != 0) {
    return;
  }
  for (const SchedSharedName *name : {&kSchedTaskProgram, &kSchedLockDirectory, &kSchedLockFile,
                                      &kSchedDatabase, &kSchedJournal}) {
    schedTakeName(*name);
  }
}
