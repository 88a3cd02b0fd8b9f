// Processes: running a program, forking a detached child, and whether a process is alive.
#include <fcntl.h>
#include <signal.h>
#include <sys/types.h>
#include <unistd.h>

#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "child.h"
#include "support.h"

namespace {

// With the program itself. A longer list most likely lacks its end.
constexpr size_t kMostArguments = 256;

int runAndWait(const char *program, char *const *argv) noexcept {
  const zelo::ChildStatusGuard guard;
  zelo::Launch launch;
  const pid_t pid = launch.start(program, argv, environ);
  int status = 0;
  if (pid < 0 || !zelo::waitForChild(pid, &status)) {
    return zelo::fail(QLIBC_ERR_SYSTEM);
  }
  return zelo::exitCode(status);
}

// In the intermediate process: forks the detached child and reports success to the caller, through
// the pipe, because a caller that ignores SIGCHLD gets no exit status. Returns in the child only.
void forkAndLeave(int report) noexcept {
  const pid_t pid = fork();
  if (pid == 0) {
    return;
  }
  const char forked = pid > 0 ? 1 : 0;
  const ssize_t written = write(report, &forked, sizeof forked);
  // Not exit, which would run the caller's exit handlers and write its buffers.
  _exit(written == sizeof forked ? EXIT_SUCCESS : EXIT_FAILURE);
}

bool reportsSuccess(int report) noexcept {
  char forked = 0;
  ssize_t count;
  do {
    count = read(report, &forked, sizeof forked);
  } while (count < 0 && errno == EINTR);
  return count == sizeof forked && forked != 0;
}

bool exists(pid_t pid) noexcept {
  return kill(pid, 0) == 0 || errno == EPERM;
}

enum class Life { kUnknown, kAlive, kDead };

// From /proc/PID/status: the letter of its state, and whether the number is that of a process and
// not of one of its threads.
Life lifeOnStatusPage(pid_t pid) noexcept {
  constexpr size_t kRoom = 512;  // both lines are among the first
  char path[sizeof "/proc//status" + 3 * sizeof pid];
  std::snprintf(path, sizeof path, "/proc/%ld/status", static_cast<long>(pid));
  const zelo::Descriptor file(open(path, O_RDONLY | O_CLOEXEC));
  char text[kRoom];
  const ssize_t size = file.valid() ? read(file.get(), text, sizeof text - 1) : -1;
  if (size <= 0) {
    return Life::kUnknown;
  }
  text[size] = '\0';
  const char *state = std::strstr(text, "\nState:\t");
  const char *group = std::strstr(text, "\nTgid:\t");
  if (state == nullptr || group == nullptr) {
    return Life::kUnknown;
  }
  const char letter = state[std::strlen("\nState:\t")];
  const long leader = std::strtol(group + std::strlen("\nTgid:\t"), nullptr, 10);
  const bool gone = letter == 'Z' || letter == 'X' || letter == 'x';
  return gone || leader != pid ? Life::kDead : Life::kAlive;
}

}  // namespace

int QLIBCExec(const char *szProgram, ...) {
  if (szProgram == nullptr) {
    return zelo::fail(QLIBC_ERR_BAD_PARAMETER);
  }
  char *argv[kMostArguments + 1] = {const_cast<char *>(szProgram)};
  size_t count = 1;
  va_list arguments;
  va_start(arguments, szProgram);
  while (count <= kMostArguments && (argv[count] = va_arg(arguments, char *)) != nullptr) {
    ++count;
  }
  va_end(arguments);
  if (count > kMostArguments) {
    return zelo::fail(QLIBC_ERR_BAD_PARAMETER);
  }
  const int status = runAndWait(szProgram, argv);
  if (status > 0) {
    zelo::fail(QLIBC_ERR_SYSTEM);
  }
  return status;
}

int QLIBCProcForkChildNoWait(void) {
  int report[2];
  if (pipe2(report, O_CLOEXEC) != 0) {
    return zelo::fail(QLIBC_ERR_SYSTEM);
  }
  zelo::Descriptor reading(report[0]);
  zelo::Descriptor writing(report[1]);
  const pid_t between = fork();
  if (between == 0) {
    forkAndLeave(writing.get());
    return 0;
  }
  // Otherwise the read would never see the end of the pipe.
  writing.close();
  if (between < 0 || !reportsSuccess(reading.get())) {
    if (between > 0) {
      zelo::waitForChild(between, nullptr);
    }
    return zelo::fail(QLIBC_ERR_SYSTEM);
  }
  // Fails where the caller ignores SIGCHLD and the kernel has reaped the child, which is as good.
  zelo::waitForChild(between, nullptr);
  return 1;
}

int QLIBCProcAlive(pid_t pid) {
  if (pid <= 0 || !exists(pid)) {
    return 0;
  }
  const Life life = lifeOnStatusPage(pid);
  // Without a readable status it has just ended, or /proc hides it from us.
  return life == Life::kAlive || (life == Life::kUnknown && exists(pid)) ? 1 : 0;
}
