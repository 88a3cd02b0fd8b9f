#include "runs/start_run.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <sqlite3.h>
#include <sys/wait.h>
#include <unistd.h>
#include <zelocore.h>

#include <array>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <vector>

#include "runs/cron_surroundings.h"
#include "store/task_list.h"
#include "store/task_program.h"
#include "terminal/failure.h"

namespace {

constexpr int kNoProgram = 127;

// A run that cannot be recorded ends at once, which only the system log says.
void requireRecords() {
  forgetError();
  sqlite3 *const database = ZELOSchedDBInit();
  if (database == nullptr) throw failedTo("record a run in /tmp/sched_status.sqlite");
  sqlite3_close(database);
}

struct Pipe {
  int reading = -1;
  int writing = -1;
};

// Both are above the standard streams, of which main opens those that the caller has closed.
Pipe makePipe() {
  int ends[2];
  if (pipe2(ends, O_CLOEXEC) != 0) {
    throw Failure(std::string("cannot make a pipe: ") + std::strerror(errno));
  }
  return {ends[0], ends[1]};
}

std::vector<char *> pointersTo(std::vector<std::string> *words) {
  std::vector<char *> pointers;
  for (std::string &word : *words) pointers.push_back(word.data());
  pointers.push_back(nullptr);
  return pointers;
}

// The child executes the program, with the signals as cron leaves them.
[[noreturn]] void becomeProgram(char *const *argv, char *const *envp, const Pipe &tell,
                                const Pipe &copy, int64_t cron) {
  const int nothing = open("/dev/null", O_RDWR);
  for (const int stream : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO}) dup2(nothing, stream);
  if (nothing > STDERR_FILENO) close(nothing);
  for (const int kept : {tell.writing, copy.writing}) {
    if (kept >= 0) fcntl(kept, F_SETFD, 0);
  }
  for (int number = 1; number < NSIG; ++number) signal(number, SIG_DFL);
  sigset_t none;
  sigemptyset(&none);
  sigprocmask(SIG_SETMASK, &none, nullptr);
  takeLimitsOfCron(cron);
  execve(argv[0], argv, envp);
  _exit(kNoProgram);
}

int waitFor(pid_t pid) {
  int status = 0;
  while (waitpid(pid, &status, 0) < 0) {
    if (errno != EINTR) return EXIT_FAILURE;
  }
  return WIFEXITED(status) ? WEXITSTATUS(status) : EXIT_FAILURE;
}

}  // namespace

StartedRun::StartedRun(const ZELO_SCHED_TASK &task, const RunRequest &request) {
  std::fflush(stdout);
  requireRecords();
  const Pipe tell = makePipe();
  const Pipe copy = request.wantsOutput ? makePipe() : Pipe();
  telling_ = tell.reading;
  output_ = copy.reading;
  std::vector<std::string> words = {installedTaskProgram(),
                                    "--run",
                                    "id=" + std::to_string(task.ID),
                                    "--now",
                                    std::string("--trigger=") + nameOf(request.trigger),
                                    "--tell=" + std::to_string(tell.writing)};
  if (copy.writing >= 0) words.push_back("--copy=" + std::to_string(copy.writing));
  if (request.due) words.push_back("--due=" + std::to_string(*request.due));
  if (request.isDisabledSkipped) words.emplace_back("--skip-disabled");
  std::vector<std::string> environment = environmentOfCron();
  const std::vector<char *> argv = pointersTo(&words);
  const std::vector<char *> envp = pointersTo(&environment);
  const int64_t cron = cronProcess();
  const pid_t pid = fork();
  if (pid == 0) becomeProgram(argv.data(), envp.data(), tell, copy, cron);
  const int reason = errno;
  close(tell.writing);
  if (copy.writing >= 0) close(copy.writing);
  if (pid < 0) {
    throw Failure("cannot run " + titleOf(task) + ": " + std::strerror(reason));
  }
  const int status = waitFor(pid);
  if (status == kNoProgram) throw Failure("cannot start " + words.front());
  if (status == 0) return;
  forgetError();
  while (listen(std::chrono::milliseconds(-1))) {
  }
  throw failedTo("run " + titleOf(task));
}

StartedRun::~StartedRun() {
  if (telling_ >= 0) close(telling_);
  if (output_ >= 0) close(output_);
}

bool StartedRun::listen(std::chrono::milliseconds time) {
  if (telling_ < 0) return false;
  pollfd wanted{telling_, POLLIN, 0};
  const int ready = poll(&wanted, 1, static_cast<int>(time.count()));
  if (ready <= 0) return ready == 0;
  std::array<char, 4096> buffer;
  const ssize_t count = read(telling_, buffer.data(), buffer.size());
  if (count < 0 && errno == EINTR) return false;
  if (count <= 0) {
    close(telling_);
    telling_ = -1;
    return false;
  }
  line_.append(buffer.data(), static_cast<size_t>(count));
  for (size_t end; (end = line_.find('\n')) != std::string::npos;) {
    events_.take(line_.substr(0, end));
    line_.erase(0, end + 1);
  }
  return true;
}
