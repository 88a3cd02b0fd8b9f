// What a run gives up of the process that asked for it.
#include "sched_leave_caller.h"

#include <fcntl.h>
#include <linux/capability.h>
#include <linux/keyctl.h>
#include <linux/magic.h>
#include <linux/securebits.h>
#include <sched.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/vfs.h>
#include <syslog.h>
#include <unistd.h>
#include <zelosched.h>

#include "sched_report.h"

namespace {

constexpr char kNothing[] = "/dev/null";
constexpr int kFirstOwnDescriptor = STDERR_FILENO + 1;
constexpr unsigned kLastDescriptor = ~0U;

// ---- session and keys -------------------------------------------------------------------------

// A platform's fork may have begun it already.
bool beginSession() {
  return setsid() >= 0 || getsid(0) == getpid();
}

// A command that has the caller's session keyring can read the keys in it, whoever it runs as.
// Where the kernel has no keyrings, or a filter keeps them from the process, it keeps them from the
// command too.
bool beginKeyring() {
  return syscall(SYS_keyctl, KEYCTL_JOIN_SESSION_KEYRING, nullptr) >= 0 || errno == ENOSYS ||
         errno == EPERM;
}

// ---- capabilities -------------------------------------------------------------------------------

// With this bit a change of users takes no capability away, neither from this process nor from a
// set-uid program that the command starts. Where it is locked the exec of the command still does.
void letUserChangesTakeCapabilities() {
  const int bits = prctl(PR_GET_SECUREBITS);
  if (bits > 0 && (bits & SECBIT_NO_SETUID_FIXUP) != 0) {
    prctl(PR_SET_SECUREBITS, static_cast<unsigned long>(bits & ~SECBIT_NO_SETUID_FIXUP));
  }
}

// EINVAL comes from a kernel that has none.
bool clearAmbientCapabilities() {
  return prctl(PR_CAP_AMBIENT, PR_CAP_AMBIENT_CLEAR_ALL, 0UL, 0UL, 0UL) == 0 || errno == EINVAL;
}

// The library of the C language has no call for these.
bool clearInheritableCapabilities() {
  __user_cap_header_struct header = {};
  header.version = _LINUX_CAPABILITY_VERSION_3;
  __user_cap_data_struct sets[_LINUX_CAPABILITY_U32S_3] = {};
  if (syscall(SYS_capget, &header, sets) != 0) {
    return false;
  }
  bool isAnyInheritable = false;
  for (__user_cap_data_struct &set : sets) {
    isAnyInheritable = isAnyInheritable || set.inheritable != 0;
    set.inheritable = 0;
  }
  return !isAnyInheritable || syscall(SYS_capset, &header, sets) == 0;
}

// The permitted and effective ones are still needed to become the owner, and end with the exec of
// a command that is not root's. These would go through it.
bool giveUpCapabilities() {
  letUserChangesTakeCapabilities();
  return clearAmbientCapabilities() && clearInheritableCapabilities();
}

// ---- descriptors --------------------------------------------------------------------------------

// A lock file's stream on a standard descriptor, which only a caller without that one has, makes
// room.
bool moveLockFromStandardDescriptors() {
  if (pfLock == nullptr || fileno(pfLock) >= kFirstOwnDescriptor) {
    return true;
  }
  const int moved = fcntl(fileno(pfLock), F_DUPFD_CLOEXEC, kFirstOwnDescriptor);
  FILE *stream = moved >= 0 ? fdopen(moved, "r") : nullptr;
  if (stream == nullptr) {
    return false;
  }
  pfLock = stream;  // the former one is left to the end of this short-lived process
  return true;
}

// A pipe without a name. Its caller opens the writing end both ways lest the command is ended when
// whoever reads it is; what can be read there is what the run has written.
bool isOwnPipe(int descriptor) {
  struct statfs where = {};
  return fstatfs(descriptor, &where) == 0 && where.f_type == PIPEFS_MAGIC;
}

// Whether it can be written to and, but for such a pipe, nothing else. One that is to be closed on
// an exec was never meant for a command.
bool isOutputOnly(int descriptor) {
  const int flags = fcntl(descriptor, F_GETFL);
  const int ownFlags = fcntl(descriptor, F_GETFD);
  if (flags < 0 || ownFlags < 0 || (ownFlags & FD_CLOEXEC) != 0) {
    return false;
  }
  const int access = flags & O_ACCMODE;
  struct stat info = {};
  return (access == O_WRONLY || (access == O_RDWR && isOwnPipe(descriptor))) &&
         fstat(descriptor, &info) == 0 && (S_ISFIFO(info.st_mode) || S_ISREG(info.st_mode));
}

bool leadToNothing(int descriptor, int access) {
  const int nothing = open(kNothing, access);
  if (nothing < 0 || nothing == descriptor) {
    return nothing >= 0;
  }
  const bool isLed = dup2(nothing, descriptor) == descriptor;
  close(nothing);
  return isLed;
}

// One that stayed closed would be given to the next file opened, and the command would then write
// its output into a database.
bool replaceStandardDescriptors() {
  return moveLockFromStandardDescriptors() && leadToNothing(STDIN_FILENO, O_RDONLY) &&
         (isOutputOnly(STDOUT_FILENO) || leadToNothing(STDOUT_FILENO, O_WRONLY)) &&
         (isOutputOnly(STDERR_FILENO) || leadToNothing(STDERR_FILENO, O_WRONLY));
}

// One by one where the kernel, or a filter on its calls, does not know the call for all at once.
bool closeOneByOne(unsigned first, unsigned last) {
  const long most = sysconf(_SC_OPEN_MAX);
  if (most < 0) {
    return false;
  }
  for (unsigned descriptor = first; descriptor <= last && descriptor < static_cast<unsigned>(most);
       ++descriptor) {
    close(static_cast<int>(descriptor));
  }
  return true;
}

bool closeDescriptors(unsigned first, unsigned last) {
  return first > last || close_range(first, last, 0) == 0 || closeOneByOne(first, last);
}

bool closeCallersDescriptors() {
  if (pfLock == nullptr) {
    return closeDescriptors(kFirstOwnDescriptor, kLastDescriptor);
  }
  const int lock = fileno(pfLock);
  const auto kept = static_cast<unsigned>(lock);
  return fcntl(lock, F_SETFD, FD_CLOEXEC) == 0 && closeDescriptors(kFirstOwnDescriptor, kept - 1) &&
         closeDescriptors(kept + 1, kLastDescriptor);
}

// ---- signals and scheduling ----------------------------------------------------------------

void resetSignals() {
  struct sigaction action = {};
  action.sa_handler = SIG_DFL;
  for (int signal = 1; signal < NSIG; ++signal) {
    sigaction(signal, &action, nullptr);  // SIGKILL and SIGSTOP refuse, and are default anyway
  }
  sigset_t none;
  sigemptyset(&none);
  sigprocmask(SIG_SETMASK, &none, nullptr);
}

// Not to be killed before others is a privilege of the caller's, and so is to be killed last.
void resetOutOfMemoryScore() {
  const int score = open("/proc/self/oom_score_adj", O_WRONLY | O_CLOEXEC);
  if (score >= 0) {
    static_cast<void>(write(score, "0", 1) < 0);
    close(score);
  }
}

// None of these is a right, and a kernel may keep a process from raising its own: what is refused
// stays as it is.
void resetScheduling() {
  const sched_param none = {};
  sched_setscheduler(0, SCHED_OTHER, &none);
  setpriority(PRIO_PROCESS, 0, 0);
  // The kernel's header of these does not compile as C++ everywhere.
  constexpr int kWhoProcess = 1;
  constexpr int kDiskPriorityOfNice = 0;
  syscall(SYS_ioprio_set, kWhoProcess, 0, kDiskPriorityOfNice);
  resetOutOfMemoryScore();
}

struct Step {
  bool (*take)();
  const char *what;
};
constexpr Step kSteps[] = {
    {beginSession, "begin a session"},
    {beginKeyring, "begin a session keyring"},
    {giveUpCapabilities, "give up capabilities"},
    {replaceStandardDescriptors, "replace standard descriptors"},
    {closeCallersDescriptors, "close descriptors"},
};

}  // namespace

int schedLeaveCaller() {
  resetSignals();
  closelog();  // its descriptor is closed below; the C library would go on using the number
  for (const Step &step : kSteps) {
    if (!step.take()) {
      SCHED_LOG_ERRNO("Failed to %s. ", step.what);
      SCHED_SET_ERROR(kErrSystem);
      return -1;
    }
  }
  resetScheduling();
  return 0;
}
