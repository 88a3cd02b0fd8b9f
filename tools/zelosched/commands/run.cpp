// zelosched run
#include <signal.h>
#include <sqlite3.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <map>
#include <thread>

#include "commands/command.h"
#include "commands/for_each_id.h"
#include "commands/options.h"
#include "runs/processes.h"
#include "runs/result_text.h"
#include "runs/run_output.h"
#include "runs/runs.h"
#include "runs/start_run.h"
#include "store/save.h"
#include "store/task_list.h"
#include "terminal/terminal.h"
#include "terminal/text.h"

namespace {

constexpr Option kOptions[] = {{"wait", Option::kNone, 'w'}, {"output"}, {"force"}};
constexpr std::chrono::milliseconds kPause(50);
constexpr char kClearLine[] = "\r\033[K";

using Clock = std::chrono::steady_clock;

// ---- the process of a run -------------------------------------------------------------------
// The library leaves its process to itself. As the one that takes in orphans we become its parent,
// learn of its end at once, and tell its row in the status database from those of other runs.

// The run's own process is older than whatever its command has left to us by now.
pid_t newChild(const std::map<pid_t, ProcessStat> &before) {
  pid_t oldest = 0;
  unsigned long long started = 0;
  for (const auto &[pid, stat] : children()) {
    if (before.count(pid) != 0 || !isOfRoot(pid)) continue;
    if (!isOfOurProgram(pid) && !isOver(pid)) continue;
    if (oldest == 0 || stat.started < started) {
      oldest = pid;
      started = stat.started;
    }
  }
  return oldest;
}

// ---- waiting --------------------------------------------------------------------------------

// Whoever has waited long enough shall not find the shell's prompt behind a line of ours.
void clearLineAndEnd(int signal) {
  static_cast<void>(write(STDOUT_FILENO, kClearLine, sizeof(kClearLine) - 1) < 0);
  raise(signal);  // which ends the process by now
}

void catchInterrupts() {
  struct sigaction action = {};
  action.sa_handler = clearLineAndEnd;
  action.sa_flags = static_cast<int>(SA_RESETHAND);
  for (const int signal : {SIGINT, SIGTERM}) {
    struct sigaction former = {};
    sigaction(signal, nullptr, &former);
    if (former.sa_handler != SIG_IGN) sigaction(signal, &action, nullptr);
  }
}

// One line that is written over, on a terminal only.
class Progress {
 public:
  explicit Progress(std::string title) : title_(std::move(title)) {}
  ~Progress() { clear(); }
  Progress(const Progress &) = delete;
  Progress &operator=(const Progress &) = delete;

  void show(const char *what) {
    const std::optional<size_t> columns = terminalColumns();
    const auto seconds =
        std::chrono::duration_cast<std::chrono::seconds>(Clock::now() - start_).count();
    if (!columns || seconds == shown_) return;
    if (shown_ < 0) catchInterrupts();
    shown_ = seconds;
    const std::string line = title_ + " " + what + ", " + std::to_string(seconds) + " s";
    std::printf("%s%s", kClearLine, fitted(line, *columns - 1).c_str());
    std::fflush(stdout);
  }

 private:
  void clear() const {
    if (shown_ < 0) return;
    std::fputs(kClearLine, stdout);
    std::fflush(stdout);
  }

  std::string title_;
  Clock::time_point start_ = Clock::now();
  long shown_ = -1;
};

bool hasEnded(pid_t process) {
  return waitpid(process, nullptr, WNOHANG) != 0;
}

void showUntilEnd(pid_t process, RunOutput *output) {
  while (!hasEnded(process)) output->pass(kPause);
  output->passRest();
}

void waitForEnd(pid_t process, long lastStatusId, const RunDatabase &database, Progress *progress) {
  bool isRecorded = false;
  while (!hasEnded(process)) {
    isRecorded = isRecorded || database.runOfProcess(process, lastStatusId).has_value();
    progress->show(isRecorded ? "is running" : "waits for its turn");
    std::this_thread::sleep_for(kPause);
  }
}

void runAndWait(const ZELO_SCHED_TASK &task, bool showsOutput) {
  // Makes the database when it is missing, lest it appear unseen.
  forgetError();
  sqlite3_close(ZELOSchedDBInit());
  const RunDatabase database;
  const long lastStatusId = database.lastStatusId();
  const std::map<pid_t, ProcessStat> before = children();
  std::optional<RunOutput> output;
  if (showsOutput) {
    output.emplace();
    startRun(task, output->descriptorOfRun());
    output->runHasBegun();
  } else {
    startRunUnseen(task);
  }
  const pid_t process = newChild(before);
  if (process == 0)
    throw Failure(titleOf(task) + " was started, but its process is not to be found");
  if (output) {
    showUntilEnd(process, &*output);
  } else {
    Progress progress(titleOf(task));
    waitForEnd(process, lastStatusId, database, &progress);
  }
  const std::optional<Run> run = database.runOfProcess(process, lastStatusId);
  if (!run) {
    throw Failure(titleOf(task) +
                  " did not run: it could not be recorded, or other runs were in its way for too "
                  "long (the system log says which)");
  }
  const std::string result = titleOf(task) + " " + resultInWords(run->statusCode, run->comment);
  if (output && !output->fault().empty()) {
    throw Failure(result + ", and what it printed could not be written: " + output->fault());
  }
  if (run->statusCode != ZELO_SCHED_STATUS_FINISHED) throw Failure(result);
  std::puts(result.c_str());
}

void runOne(long id, const Arguments &arguments) {
  const Task task = loadTask(id);
  requirePermission(*task, task->CanRunFromUI, "run", arguments.has("force"));
  if (arguments.has("wait") || arguments.has("output")) {
    runAndWait(*task, arguments.has("output"));
  } else {
    startRunUnseen(*task);
    std::printf("%s started\n", titleOf(*task).c_str());
  }
}

int runRun(int argc, char **argv) {
  const Arguments arguments(argc, argv, kOptions);
  arguments.requireNoCommand();
  const std::vector<long> ids = parseIds(arguments.operands());
  // What a plain user's run leaves in /tmp would be in the way of everybody's.
  if (geteuid() != 0) throw Failure("running tasks takes root's rights");
  prctl(PR_SET_CHILD_SUBREAPER, 1);
  return forEachId(ids, [&](long id) { runOne(id, arguments); });
}

}  // namespace

const Command kRunCommand = {
    "run", "ID... [--wait] [--output] [--force]", "run tasks now",
    "Runs the tasks now, whatever their times say and also when they are disabled. A run\n"
    "waits for others that must not overlap with it, as always.\n"
    "\n"
    "Without --wait the run goes on by itself, and 'zelosched history' tells how it\n"
    "ended. With --wait several tasks run one after the other; an interrupt ends the\n"
    "waiting and leaves out the tasks behind, and a run that has begun goes on.\n"
    "\n"
    "  -w, --wait                     wait for the end and tell the result; the exit status\n"
    "                                 is 0 only when the command exited with 0\n"
    "  --output                       wait, and show what the command prints, with control\n"
    "                                 characters made visible on a terminal; else that is\n"
    "                                 seen by nobody\n"
    "  --force                        even if its application does not let it be run\n",
    runRun};
