#include "change_lock.h"

#include <fcntl.h>
#include <signal.h>
#include <sys/file.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstring>
#include <string>
#include <thread>

#include "failure.h"

namespace {

constexpr char kLockFile[] = "/run/zelosched.lock";
constexpr mode_t kLockFileMode = 0600;  // who can open it can hold every change up
constexpr std::chrono::milliseconds kPause(20);
constexpr std::chrono::seconds kSaidAfter(2);
constexpr std::chrono::seconds kPatience(30);

using Clock = std::chrono::steady_clock;

int openLockFile() {
  constexpr int kFlags = O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK;
  const int file = open(kLockFile, kFlags, kLockFileMode);
  if (file >= 0) return file;
  const int reason = errno;
  const bool isRights = reason == EACCES || reason == EPERM;
  throw Failure(std::string("cannot open ") + kLockFile + ": " + std::strerror(reason) +
                (isRights ? " (changing tasks takes root's rights)" : ""));
}

}  // namespace

ChangeLock::ChangeLock() : file_(openLockFile()) {
  // A reader that goes away must not end us between two changes.
  signal(SIGPIPE, SIG_IGN);
  const Clock::time_point start = Clock::now();
  bool isSaid = false;
  while (flock(file_, LOCK_EX | LOCK_NB) != 0) {
    const int reason = errno;
    const Clock::duration waited = Clock::now() - start;
    if ((reason != EWOULDBLOCK && reason != EINTR) || waited >= kPatience) {
      close(file_);
      throw Failure(reason == EWOULDBLOCK
                        ? "another zelosched command has been changing tasks for 30 seconds: "
                          "nothing was changed, try again when it is done"
                        : std::string("cannot lock ") + kLockFile + ": " + std::strerror(reason));
    }
    if (!isSaid && waited >= kSaidAfter) {
      complain("waiting for another zelosched command that is changing tasks");
      isSaid = true;
    }
    std::this_thread::sleep_for(kPause);
  }
}

ChangeLock::~ChangeLock() {
  close(file_);
}
