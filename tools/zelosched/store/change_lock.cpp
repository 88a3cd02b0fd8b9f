#include "store/change_lock.h"

#include <fcntl.h>
#include <sched_store_lock.h>
#include <signal.h>
#include <sys/file.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstring>
#include <fstream>
#include <thread>

#include "terminal/failure.h"

namespace {

constexpr mode_t kLockFileMode = 0600;  // who can open it can lock it
constexpr std::chrono::milliseconds kPause(20);
constexpr std::chrono::seconds kSaidAfter(2);
constexpr std::chrono::seconds kPatience(30);

using Clock = std::chrono::steady_clock;

int openLockFile() {
  constexpr int kFlags = O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK;
  const int file = open(kChangeLockFile, kFlags, kLockFileMode);
  if (file >= 0) return file;
  const int reason = errno;
  const bool isRights = reason == EACCES || reason == EPERM;
  throw Failure(std::string("cannot open ") + kChangeLockFile + ": " + std::strerror(reason) +
                (isRights ? " (changing tasks takes root's rights)" : ""));
}

// The library waits for its own lock without a message.
void sayWhoHoldsTheLibrarysLock() {
  const Clock::time_point start = Clock::now();
  pid_t holder = schedLockHolder(kSchedStoreLockFile);
  while (holder != 0 && Clock::now() - start < kSaidAfter) {
    std::this_thread::sleep_for(kPause);
    holder = schedLockHolder(kSchedStoreLockFile);
  }
  if (holder != 0) {
    complain("waiting for " + processText(holder) + ", which holds " + kSchedStoreLockFile);
  }
}

}  // namespace

std::string processText(pid_t pid) {
  if (pid == kSchedUnknownHolder) return "another process";
  const std::string number = std::to_string(pid);
  std::string name;
  std::getline(std::ifstream("/proc/" + number + "/comm"), name);
  return "process " + number + " (" + name + ")";
}

ChangeLock::ChangeLock() : file_(openLockFile()) {
  // A closed pipe must not end us between two changes.
  signal(SIGPIPE, SIG_IGN);
  const Clock::time_point start = Clock::now();
  bool isSaid = false;
  while (flock(file_, LOCK_EX | LOCK_NB) != 0) {
    const int reason = errno;
    const Clock::duration waited = Clock::now() - start;
    if ((reason != EWOULDBLOCK && reason != EINTR) || waited >= kPatience) {
      const pid_t holder = schedLockHolder(kChangeLockFile);
      close(file_);
      throw Failure(reason == EWOULDBLOCK
                        ? processText(holder) +
                              " has been changing tasks for 30 seconds: nothing was changed, try "
                              "again when it is done"
                        : std::string("cannot lock ") + kChangeLockFile + ": " +
                              std::strerror(reason));
    }
    if (!isSaid && waited >= kSaidAfter) {
      complain("waiting for " + processText(schedLockHolder(kChangeLockFile)) +
               ", which is changing tasks");
      isSaid = true;
    }
    std::this_thread::sleep_for(kPause);
  }
  sayWhoHoldsTheLibrarysLock();
}

ChangeLock::~ChangeLock() {
  close(file_);
}
