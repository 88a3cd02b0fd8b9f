// One run of a stored task. A detached child waits for conflicting runs, records its start, runs
// the command with the owner's rights and records its end.
#include <fcntl.h>
#include <grp.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>
#include <zelocore.h>
#include <zelosched.h>

#include <cstdlib>

#include "sched_backend.h"
#include "sched_db_guard.h"
#include "sched_leave_caller.h"
#include "sched_report.h"
#include "sched_run_environment.h"
#include "sched_shared_names.h"
#include "sched_user.h"
#include "schedule_due.h"

FILE *pfLock;

namespace {

constexpr char kLockDirectory[] = "/tmp/lock";
constexpr char kLockFile[] = "/tmp/lock/lock_sched_run";
constexpr mode_t kLockDirectoryMade = 0700;  // until it is complete
constexpr mode_t kLockDirectoryMode = 0755;
constexpr mode_t kLockFileMode = 0600;  // whoever can open it can lock it and delay every run
constexpr int kLockTries = 101;
constexpr useconds_t kLockPause = 50000;
constexpr int kMostRetries = 20;  // lock failures and conflicts together
constexpr size_t kCommentCapacity = 1024;
constexpr int kForkedCaller = 1;

// ---- is now one of the task's minutes? --------------------------------------------------------

int ZELOSchedCheckRunTime(const ZELO_SCHED_TASK &task, bool *pIsDue) {
  ZELO_SCHED_DATE now = {};
  if (ZELOSchedDateGet(&now) < 0) {
    SCHED_LOG_CALLEE("get date failed. ");
    return -1;
  }
  *pIsDue = schedIsDue(task, now);
  return 0;
}

// ---- the run lock -----------------------------------------------------------------------------

// Whoever can open the lock file, or replace it in its directory, could hold its lock for ever.
bool makeLockDirectory() {
  const SchedNameState state = schedLookAt(kSchedLockDirectory, nullptr);
  if (state != SchedNameState::kFree) {
    return state == SchedNameState::kOurs || schedTakeName(kSchedLockDirectory);
  }
  return mkdir(kLockDirectory, kLockDirectoryMade) == 0 &&
         chmod(kLockDirectory, kLockDirectoryMode) == 0;
}

// Does not follow a link, nor block on a FIFO.
FILE *openLockFile(int flags, const char *szMode) {
  const int descriptor =
      open(kLockFile, flags | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC, kLockFileMode);
  if (descriptor < 0) {
    return nullptr;
  }
  struct stat info = {};
  const bool isUsable =
      fstat(descriptor, &info) == 0 && schedWhyForeign(kSchedLockFile, info) == nullptr;
  if (isUsable && (info.st_mode & ~static_cast<mode_t>(S_IFMT)) != kLockFileMode) {
    fchmod(descriptor, kLockFileMode);  // whoever can read it can lock it
  }
  FILE *stream = isUsable ? fdopen(descriptor, szMode) : nullptr;
  if (stream == nullptr) {
    close(descriptor);
  }
  return stream;
}

bool makeLockFile() {
  const SchedNameState state = schedLookAt(kSchedLockFile, nullptr);
  if (state != SchedNameState::kFree) {
    return state == SchedNameState::kOurs || schedTakeName(kSchedLockFile);
  }
  FILE *stream = openLockFile(O_WRONLY | O_CREAT | O_TRUNC, "w");
  if (stream == nullptr) {
    return false;
  }
  fclose(stream);
  return true;
}

int releaseLock() {
  if (pfLock == nullptr) {
    return 0;
  }
  const bool unlocked = flock(fileno(pfLock), LOCK_UN) == 0;
  const bool closed = fclose(pfLock) == 0;
  pfLock = nullptr;
  if (!unlocked || !closed) {
    SCHED_SET_ERROR(kErrUnlock);
    return -1;
  }
  return 0;
}

bool takeLock() {
  if (pfLock != nullptr) {
    return true;
  }
  pfLock = openLockFile(O_RDONLY, "r");
  if (pfLock == nullptr) {
    usleep(kLockPause);
    return false;
  }
  if (flock(fileno(pfLock), LOCK_EX) != 0) {
    releaseLock();
    return false;
  }
  return true;
}

bool acquireLock() {
  if (!makeLockDirectory() || !makeLockFile()) {
    return false;
  }
  for (int i = 0; i < kLockTries; ++i) {
    if (takeLock()) {
      return true;
    }
  }
  SCHED_SET_ERROR(kErrLock);
  return false;
}

class LockGuard {
 public:
  explicit LockGuard(bool needed) : needed_(needed) {}
  ~LockGuard() { release(); }
  LockGuard(const LockGuard &) = delete;
  LockGuard &operator=(const LockGuard &) = delete;

  bool acquire() { return !needed_ || acquireLock(); }
  void release() {
    if (needed_) {
      releaseLock();
    }
  }

 private:
  bool needed_;
};

// ---- waiting for conflicting runs ---------------------------------------------------------------

// Random, so that runs that collided do not collide again: 3 to 30 seconds in steps of 3.
unsigned retryWait() {
  constexpr int kWaits = 10;
  constexpr int kStep = 3;
  return static_cast<unsigned>(rand() % kWaits * kStep + kStep);
}

enum class Conflict { kNone, kRunning, kFailed };

Conflict findConflict(sqlite3 *db, const ZELO_SCHED_TASK &task, ZELO_SCHED_STATUS *other) {
  if (task.CanRunTaskSameTime == 0) {
    if (ZELOSchedDBIsTaskRunning(db, task.ID, other) < 0) {
      SCHED_LOG_CALLEE("Check task running status failed. id:[%ld]", static_cast<long>(task.ID));
      return Conflict::kFailed;
    }
    if (other->found == 1) {
      return Conflict::kRunning;
    }
  }
  if (task.CanRunAppSameTime == 0) {
    if (ZELOSchedDBIsAppRunning(db, task.App, other) < 0) {
      SCHED_LOG_CALLEE("Check app running status failed. app:[%s]", task.App);
      return Conflict::kFailed;
    }
    if (other->found == 1) {
      return Conflict::kRunning;
    }
  }
  return Conflict::kNone;
}

// Waits until nothing conflicts, and records the run. A task that excludes other runs is checked
// and recorded under the lock, so that the second of two such runs sees the first. 0 with the
// row's key, or -1: the run is given up.
int recordStart(const ZELO_SCHED_TASK &task, int *pStatusID) {
  LockGuard lock(task.CanRunTaskSameTime == 0 || task.CanRunAppSameTime == 0);
  for (int retry = 0;;) {
    if (!lock.acquire()) {
      if (retry++ >= kMostRetries) {
        return -1;
      }
      const unsigned wait = retryWait();
      SCHED_LOG("Lock failed (retry=%d), sleep %u secs.", retry, wait);
      sleep(wait);
      continue;
    }
    DBGuard db(ZELOSchedDBInit());
    if (db == nullptr) {
      SCHED_LOG_CALLEE("Init sqlite failed. ");
      return -1;
    }
    ZELO_SCHED_STATUS other = {};
    switch (findConflict(db.get(), task, &other)) {
      case Conflict::kFailed:
        return -1;
      case Conflict::kNone:
        if (ZELOSchedDBAddRecord(db.get(), &task, pStatusID) < 0) {
          SCHED_LOG_CALLEE("Add status record failed. id:[%ld]", static_cast<long>(task.ID));
          return -1;
        }
        return 0;
      case Conflict::kRunning:
        break;
    }
    lock.release();
    if (retry++ >= kMostRetries) {
      return -1;
    }
    const unsigned wait = retryWait();
    SCHED_LOG("Task %ld conflict with task %ld (running), retry = %d, wait %u secs.",
              static_cast<long>(task.ID), other.taskID, retry, wait);
    // Not closed: at most kMostRetries connections stay open until this process ends.
    static_cast<void>(db.release());
    sleep(wait);
  }
}

// ---- the owner's rights -------------------------------------------------------------------------

// All four steps are tried even after one has failed: no command is run then, and fewer rights are
// left. Only the effective ids change, so that root can be restored from the real ones.
bool becomeUser(const ZELOUSER &user) {
  bool ok = true;
  if (seteuid(0) != 0) {
    SCHED_LOG_ERRNO("Failed to change to ROOT. ");
    ok = false;
  }
  if (setegid(user.gid) != 0) {
    SCHED_LOG_ERRNO("Failed to set egid: [%u] ", user.gid);
    ok = false;
  }
  if (initgroups(user.szName, user.gid) != 0) {
    SCHED_LOG_ERRNO("Failed to initgroups: [%u] ", user.uid);
    ok = false;
  }
  if (seteuid(user.uid) != 0) {
    SCHED_LOG_ERRNO("Failed to set euid: [%u] ", user.uid);
    ok = false;
  }
  return ok;
}

int switchUser(uid_t uid) {
  if (geteuid() == uid) {
    return 0;
  }
  const UserGuard user = schedLookUpUser(uid, SCHED_HERE);
  if (user == nullptr) {
    return -1;
  }
  if (!becomeUser(*user)) {
    SCHED_SET_ERROR(kErrSystem);
    return -1;
  }
  return 0;
}

int setUserContext(uid_t uid) {
  if (switchUser(uid) < 0) {
    SCHED_LOG_CALLEE("Failed to set user context. uid:[%u] ", uid);
    return -1;
  }
  return 0;
}

int enterOwnersContext(uid_t owner) {
  if (setUserContext(owner) < 0) {
    return -1;
  }
  if (schedSetRunEnvironment(owner) < 0) {
    SCHED_LOG_CALLEE("Failed to set user context. uid:[%u] ", owner);
    return -1;
  }
  return 0;
}

// ---- the child's work ---------------------------------------------------------------------------

struct RunResult {
  int statusCode = ZELO_SCHED_STATUS_NONE;
  char szComment[kCommentCapacity] = "";
};

int runByBackend(ZELO_SCHED_TASK *pTask, RunResult *result) {
  const int index = schedFindBackend(pTask->Backend, &ZELO_SCHED_BACKEND::run);
  if (index < 0) {
    SCHED_LOG("No %s backend (%ld) is found for task [%ld] ", "run",
              static_cast<long>(pTask->Backend), static_cast<long>(pTask->ID));
    SCHED_SET_ERROR(kErrNotFound);
    return 0;  // recorded all the same, without a status
  }
  if (SchedBackends[index].run(pTask, &result->statusCode, result->szComment,
                               sizeof(result->szComment)) < 0) {
    SCHED_LOG_CALLEE("Failed to %s for backend [%d] id:[%ld] ", "run", index,
                     static_cast<long>(pTask->ID));
    return -1;
  }
  return 0;
}

int runAsOwner(ZELO_SCHED_TASK *pTask, RunResult *result) {
  const uid_t caller = geteuid();
  if (enterOwnersContext(pTask->Owner) < 0) {
    return -1;
  }
  if (runByBackend(pTask, result) < 0) {
    setUserContext(caller);
    return -1;
  }
  return setUserContext(caller);
}

void recordEnd(const ZELO_SCHED_TASK &task, int statusID, const RunResult &result) {
  const DBGuard db(ZELOSchedDBInit());
  if (db == nullptr) {
    SCHED_LOG_CALLEE("Init sqlite failed. ");
    return;
  }
  if (ZELOSchedDBSetStatus(db.get(), statusID, ZELO_SCHED_STATUS_RUNNING, result.statusCode,
                           result.szComment) < 0) {
    SCHED_LOG_CALLEE("Update status record failed. id:[%ld]", static_cast<long>(task.ID));
  }
}

void ZELOSchedTaskRunEx(ZELO_SCHED_TASK *pTask) {
  if (schedLeaveCaller() < 0) {
    return;
  }
  ZELOSchedRandInit();
  int statusID = -1;
  if (recordStart(*pTask, &statusID) < 0) {
    return;
  }
  if (ZELOSchedBackendInit() < 0) {
    SCHED_LOG_CALLEE("Init backend failed. ");
    return;
  }
  RunResult result;
  if (runAsOwner(pTask, &result) == 0) {
    recordEnd(*pTask, statusID, result);
  }
}

// 1 in the child, 0 in the caller, -1 when there is no child.
int forkRun() {
  const int side = QLIBCProcForkChildNoWait();
  if (side < 0) {
    SCHED_LOG_CALLEE("Fork error! ");
    return -1;
  }
  return side == kForkedCaller ? 0 : 1;
}

}  // namespace

int ZELOSchedTaskRun(long id, int checkRunTime, int skipDisabled) {
  ZELO_SCHED_TASK task = {};
  if (ZELOSchedTaskGetByID(id, &task) < 0) {
    SCHED_LOG_CALLEE("get task failed. [%ld] ", id);
    return -1;
  }
  if (task.State == ZELO_SCHED_STATE_NOT_EXISTED) {
    SCHED_LOG("task [%ld] does not exist. ", id);
    SCHED_SET_ERROR(kErrNotFound);
    return -1;
  }
  if (skipDisabled == 1 && task.State == ZELO_SCHED_STATE_DISABLED) {
    return 0;
  }
  if (checkRunTime == 1) {
    bool isDue = false;
    if (ZELOSchedCheckRunTime(task, &isDue) < 0) {
      SCHED_LOG_CALLEE("check run time failed. [%ld] ", id);
      return -1;
    }
    if (!isDue) {
      return 0;
    }
  }
  const int side = forkRun();
  if (side < 0) {
    SCHED_LOG_CALLEE("run task failed. [%ld] ", id);
    return -1;
  }
  if (side == 0) {
    return 0;
  }
  ZELOSchedTaskRunEx(&task);
  _exit(EXIT_SUCCESS);  // the caller's exit handlers and buffers must not run twice
}
