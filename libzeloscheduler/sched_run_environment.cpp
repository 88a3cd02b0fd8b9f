// What a command starts with: environment, directory, file mode mask and ids.
#include "sched_run_environment.h"

#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>
#include <zelocore.h>
#include <zelosched.h>

#include <cstdlib>
#include <cstring>

#include "sched_report.h"
#include "sched_user.h"

namespace {

constexpr char kPath[] = "PATH=/usr/local/sbin:/usr/local/bin:/usr/sbin:/usr/bin:/sbin:/bin";
constexpr char kDefaultShell[] = "/bin/sh";
constexpr char kRootDirectory[] = "/";
constexpr mode_t kFileModeMask = 022;

// Only these variables of the caller's environment are passed to a command, for the language and
// the time zone.
constexpr const char *kKeptVariables[] = {
    "TZ",          "LANG",         "LANGUAGE",       "LC_ALL",
    "LC_CTYPE",    "LC_NUMERIC",   "LC_TIME",        "LC_COLLATE",
    "LC_MONETARY", "LC_MESSAGES",  "LC_PAPER",       "LC_NAME",
    "LC_ADDRESS",  "LC_TELEPHONE", "LC_MEASUREMENT", "LC_IDENTIFICATION",
};

// The new environment, which replaces the old one only when it is complete.
class Environment {
 public:
  Environment() { add(kPath); }

  void addVariable(const char *szName, const char *szValue) {
    char *szEntry = nullptr;
    if (asprintf(&szEntry, "%s=%s", szName, szValue) < 0) {
      whole_ = false;
      return;
    }
    add(szEntry);
  }

  bool install() {
    if (!whole_ || clearenv() != 0) {
      return false;
    }
    for (size_t i = 0; i < count_; ++i) {
      if (putenv(const_cast<char *>(entries_[i])) != 0) {
        return false;
      }
    }
    return true;
  }

 private:
  // Entries become part of the environment and live as long as the process.
  void add(const char *szEntry) { entries_[count_++] = szEntry; }

  static constexpr size_t kOwnVariables = 5;  // PATH, HOME, USER, LOGNAME, SHELL
  const char *entries_[kOwnVariables + sizeof(kKeptVariables) / sizeof(kKeptVariables[0])] = {};
  size_t count_ = 0;
  bool whole_ = true;
};

// Without a user record (possible only where the user need not be changed) the variables that
// depend on it are left out or have defaults.
bool installEnvironment(const ZELOUSER *user) {
  Environment environment;
  environment.addVariable("HOME", user != nullptr ? user->szHome : kRootDirectory);
  if (user != nullptr) {
    environment.addVariable("USER", user->szName);
    environment.addVariable("LOGNAME", user->szName);
  }
  const bool hasShell = user != nullptr && user->szShell[0] != '\0';
  environment.addVariable("SHELL", hasShell ? user->szShell : kDefaultShell);
  for (const char *szName : kKeptVariables) {
    const char *szValue = getenv(szName);
    if (szValue != nullptr) {
      environment.addVariable(szName, szValue);
    }
  }
  return environment.install();
}

bool enterHome(const ZELOUSER *user) {
  return (user != nullptr && chdir(user->szHome) == 0) || chdir(kRootDirectory) == 0;
}

}  // namespace

int schedSetRunEnvironment(uid_t uid) {
  const UserGuard user = schedLookUpUser(uid, SCHED_HERE);
  if (!installEnvironment(user.get())) {
    SCHED_LOG_ERRNO("Failed to set environment: [%u] ", uid);
    SCHED_SET_ERROR(kErrSystem);
    return -1;
  }
  umask(kFileModeMask);
  if (!enterHome(user.get())) {
    SCHED_LOG_ERRNO("Failed to change directory: [%u] ", uid);
    SCHED_SET_ERROR(kErrSystem);
    return -1;
  }
  return 0;
}

SchedRealIds::SchedRealIds() : uid_(getuid()), gid_(getgid()) {
  const auto keep = static_cast<uid_t>(-1);
  set_ = setresgid(getegid(), keep, keep) == 0 && setresuid(geteuid(), keep, keep) == 0;
  if (!set_) {
    SCHED_LOG_ERRNO("Failed to set real ids: [%u:%u] ", geteuid(), getegid());
    SCHED_SET_ERROR(kErrSystem);
  }
}

SchedRealIds::~SchedRealIds() {
  const auto keep = static_cast<uid_t>(-1);
  if (setresgid(gid_, keep, keep) != 0 || setresuid(uid_, keep, keep) != 0) {
    SCHED_LOG_ERRNO("Failed to restore real ids: [%u:%u] ", uid_, gid_);
    SCHED_SET_ERROR(kErrSystem);
  }
}
