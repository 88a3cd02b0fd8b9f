// What a run does not keep of the process that started it.
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

// The platform's fork may have begun a session already.
bool beginSession() {
  return setsid() >= 0 || getsid(0) == getpid();
}

// A command that has the caller's session keyring can read the keys in it, whoever it runs as.
// Without keyrings in the kernel, or with a seccomp filter against the call, the command cannot
// read them either.
bool beginKeyring() {
  return syscall(SYS_keyctl, KEYCTL_JOIN_SESSION_KEYRING, nullptr) >= 0 || errno == ENOSYS ||
         errno == EPERM;
}

// ---- capabilities -------------------------------------------------------------------------------

// With this bit a change of the user ids takes no capability away, neither from this process nor
// from a set-uid program that the command starts. Where the bit is locked, the exec of the command
// still takes them.
void letUserChangesTakeCapabilities() {
  const int bits = prctl(PR_GET_SECUREBITS);
  if (bits > 0 && (bits & SECBIT_NO_SETUID_FIXUP) != 0) {
    prctl(PR_SET_SECUREBITS, static_cast<unsigned long>(bits & ~SECBIT_NO_SETUID_FIXUP));
  }
}

// EINVAL: the kernel has no ambient capabilities.
bool clearAmbientCapabilities() {
  return prctl(PR_CAP_AMBIENT, PR_CAP_AMBIENT_CLEAR_ALL, 0UL, 0UL, 0UL) == 0 || errno == EINVAL;
}

// The C library has no functions for these system calls.
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

// The permitted and effective ones are still needed to become the owner; the exec of a command
// that is not root's drops them. Ambient and inheritable ones would survive the exec.
bool giveUpCapabilities() {
  letUserChangesTakeCapabilities();
  return clearAmbientCapabilities() && clearInheritableCapabilities();
}

// ---- descriptors --------------------------------------------------------------------------------

// Moves the lock file's stream off a standard descriptor, which it has where the caller had that
// one closed.
bool moveLockFromStandardDescriptors() {
  if (pfLock == nullptr || fileno(pfLock) >= kFirstOwnDescriptor) {
    return true;
  }
  const int moved = fcntl(fileno(pfLock), F_DUPFD_CLOEXEC, kFirstOwnDescriptor);
  FILE *stream = moved >= 0 ? fdopen(moved, "r") : nullptr;
  if (stream == nullptr) {
    return false;
  }
  pfLock = stream;  // the former stream is not closed: the process is short-lived
  return true;
}

// An anonymous pipe. A caller may open it for reading and writing, so that the command gets no
// SIGPIPE when the reader ends; all that can be read there is output of the run.
bool isOwnPipe(int descriptor) {
  struct statfs where = {};
  return fstatfs(descriptor, &where) == 0 && where.f_type == PIPEFS_MAGIC;
}

// Whether it is open for writing only (such a pipe, also for reading). One with FD_CLOEXEC was
// never meant for a command.
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

// The number of a closed one would be given to the next file opened, and a command could then
// write its output into the database.
bool replaceStandardDescriptors() {
  return moveLockFromStandardDescriptors() && leadToNothing(STDIN_FILENO, O_RDONLY) &&
         (isOutputOnly(STDOUT_FILENO) || leadToNothing(STDOUT_FILENO, O_WRONLY)) &&
         (isOutputOnly(STDERR_FILENO) || leadToNothing(STDERR_FILENO, O_WRONLY));
}

// Where the kernel or a seccomp filter does not allow close_range.
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

// The caller's protection from the out-of-memory killer is not for the command.
void resetOutOfMemoryScore() {
  const int score = open("/proc/self/oom_score_adj", O_WRONLY | O_CLOEXEC);
  if (score >= 0) {
    static_cast<void>(write(score, "0", 1) < 0);
    close(score);
  }
}

// These give no access, and the kernel may refuse a process to raise its own priority: failures
// are ignored.
void resetScheduling() {
  const sched_param none = {};
  sched_setscheduler(0, SCHED_OTHER, &none);
  setpriority(PRIO_PROCESS, 0, 0);
  // From linux/ioprio.h, which does not compile as C++ everywhere.
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
  closelog();  // or syslog would use its descriptor's number, which is closed below
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
