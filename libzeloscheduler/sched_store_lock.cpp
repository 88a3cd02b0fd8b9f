#include "sched_store_lock.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>

#include "sched_report.h"

namespace {

constexpr char kFile[] = "/run/zeloscheduler.lock";
constexpr mode_t kMode = 0600;
constexpr int kTries = 6000;  // thirty seconds in all
constexpr useconds_t kPause = 5000;

// Whoever removes the file while we wait would let the next process lock another one.
bool isStillThere(int file) {
  struct statx held = {};
  struct statx there = {};
  return statx(file, "", AT_EMPTY_PATH, STATX_INO, &held) == 0 &&
         statx(AT_FDCWD, kFile, AT_SYMLINK_NOFOLLOW, STATX_INO, &there) == 0 &&
         held.stx_ino == there.stx_ino && held.stx_dev_major == there.stx_dev_major &&
         held.stx_dev_minor == there.stx_dev_minor;
}

// The lock does not say who holds it, so the holder does.
void sayWhoHolds(int file) {
  char text[32];
  const int length = snprintf(text, sizeof(text), "%ld\n", static_cast<long>(getpid()));
  if (pwrite(file, text, static_cast<size_t>(length), 0) != length) {
    return;  // nobody is told then; the lock is held all the same
  }
}

pid_t whoHolds(int file) {
  char text[32] = "";
  const ssize_t length = pread(file, text, sizeof(text) - 1, 0);
  return length > 0 ? static_cast<pid_t>(strtol(text, nullptr, 10)) : 0;
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

// Waits for the lock; what is left in *pFile is to be closed.
Turn lock(int *pFile) {
  Turn turn = *pFile < 0 ? Turn::kNever : tryLock(pFile);
  for (int i = 0; i < kTries && turn == Turn::kWait; ++i) {
    usleep(kPause);
    turn = tryLock(pFile);
  }
  return turn;
}

}  // namespace

StoreLock::StoreLock() : file_(openFile()) {
  const Turn turn = lock(&file_);
  if (turn == Turn::kOurs) {
    sayWhoHolds(file_);
    return;
  }
  if (turn == Turn::kWait) {
    SCHED_LOG("Lock [%s] failed. Process %ld holds it.", kFile, static_cast<long>(whoHolds(file_)));
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

pid_t schedStoreLockHolder() {
  const int file = open(kFile, O_RDWR | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC);
  if (file < 0) {
    return 0;
  }
  const bool isFree = flock(file, LOCK_SH | LOCK_NB) == 0;
  const pid_t holder = isFree ? 0 : whoHolds(file);
  close(file);
  return holder;
}
