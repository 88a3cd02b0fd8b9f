#include "sched_store_lock.h"

#include <fcntl.h>
#include <signal.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <unistd.h>

#include <cctype>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "sched_report.h"

namespace {

constexpr const char *kFile = kSchedStoreLockFile;
constexpr mode_t kMode = 0600;
constexpr int kLockTries = 6000;  // thirty seconds in all
constexpr useconds_t kPause = 5000;

// If the file was removed while we waited, the next process would lock a new one.
bool isStillThere(int file) {
  struct statx held = {};
  struct statx there = {};
  return statx(file, "", AT_EMPTY_PATH, STATX_INO, &held) == 0 &&
         statx(AT_FDCWD, kFile, AT_SYMLINK_NOFOLLOW, STATX_INO, &there) == 0 &&
         held.stx_ino == there.stx_ino && held.stx_dev_major == there.stx_dev_major &&
         held.stx_dev_minor == there.stx_dev_minor;
}

// The number that ends at szEnd.
pid_t lastNumber(const char *szLine, const char *szEnd) {
  const char *szNumber = szEnd;
  while (szNumber > szLine && isdigit(static_cast<unsigned char>(szNumber[-1])) != 0) {
    --szNumber;
  }
  return static_cast<pid_t>(strtol(szNumber, nullptr, 10));
}

// From /proc/locks, which does not list processes of other pid namespaces.
pid_t whoHolds(int file) {
  struct stat info = {};
  FILE *const locks = fstat(file, &info) == 0 ? fopen("/proc/locks", "re") : nullptr;
  if (locks == nullptr) {
    return kSchedUnknownHolder;
  }
  char where[64];
  snprintf(where, sizeof(where), " %02x:%02x:%llu ", major(info.st_dev), minor(info.st_dev),
           static_cast<unsigned long long>(info.st_ino));
  pid_t holder = kSchedUnknownHolder;
  char line[256];
  while (holder <= 0 && fgets(line, sizeof(line), locks) != nullptr) {
    const char *const szWhere = strstr(line, where);
    const bool isHeld = strstr(line, ": FLOCK ") != nullptr;  // a waiting one has "->" there
    if (szWhere != nullptr && isHeld) {
      holder = lastNumber(line, szWhere);
    }
  }
  fclose(locks);
  // The process may have passed its descriptor on and ended, as flock(1) does for a script.
  const bool isThere = holder > 0 && (kill(holder, 0) == 0 || errno != ESRCH);
  return isThere ? holder : kSchedUnknownHolder;
}

int openFile() {
  return open(kFile, O_RDWR | O_CREAT | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC, kMode);
}

enum class Turn { kOurs, kWait, kNever };

Turn tryLock(int *pFile) {
  if (flock(*pFile, LOCK_EX | LOCK_NB) != 0) {
    return errno == EWOULDBLOCK || errno == EINTR ? Turn::kWait : Turn::kNever;
  }
  if (isStillThere(*pFile)) {
    return Turn::kOurs;
  }
  close(*pFile);
  *pFile = openFile();
  return *pFile < 0 ? Turn::kNever : Turn::kWait;
}

// Waits for the lock. The caller closes *pFile.
Turn lock(int *pFile) {
  Turn turn = *pFile < 0 ? Turn::kNever : tryLock(pFile);
  for (int i = 0; i < kLockTries && turn == Turn::kWait; ++i) {
    usleep(kPause);
    turn = tryLock(pFile);
  }
  return turn;
}

void reportHolder(pid_t holder) {
  if (holder == kSchedUnknownHolder) {
    SCHED_LOG("Lock [%s] failed. Another process holds it.", kFile);
  } else {
    SCHED_LOG("Lock [%s] failed. Process %ld holds it.", kFile, static_cast<long>(holder));
  }
}

}  // namespace

StoreLock::StoreLock() : file_(openFile()) {
  const Turn turn = lock(&file_);
  if (turn == Turn::kOurs) {
    return;
  }
  if (turn == Turn::kWait) {
    reportHolder(whoHolds(file_));
  } else {
    SCHED_LOG_ERRNO("Lock [%s] failed. ", kFile);
  }
  SCHED_SET_ERROR(kErrLock);
  if (file_ >= 0) {
    close(file_);
    file_ = -1;
  }
}

StoreLock::~StoreLock() {
  if (file_ >= 0) {
    close(file_);
  }
}

pid_t schedLockHolder(const char *szFile) {
  const int file = open(szFile, O_RDWR | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC);
  if (file < 0) {
    return 0;
  }
  const bool isFree = flock(file, LOCK_SH | LOCK_NB) == 0;
  const pid_t holder = isFree ? 0 : whoHolds(file);
  close(file);
  return holder;
}
