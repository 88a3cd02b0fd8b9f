// zelosched run
#include <signal.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <optional>
#include <thread>

#include "commands/command.h"
#include "commands/expected_task.h"
#include "commands/for_each.h"
#include "commands/options.h"
#include "runs/history_keep.h"
#include "runs/result_text.h"
#include "runs/run_output.h"
#include "runs/start_run.h"
#include "runs/stop_run.h"
#include "store/save.h"
#include "store/task_list.h"
#include "terminal/terminal.h"
#include "terminal/text.h"

namespace {

constexpr Option kRunOptions[] = {
    {"wait", Option::kNone, 'w'}, {"output"}, {"force"}, EXPECTED_TASK_OPTIONS};
constexpr std::chrono::milliseconds kWaitPause(50);
constexpr std::chrono::seconds kPatience(2);  // for the first events of a new keeper
constexpr char kClearLine[] = "\r\033[K";

using Clock = std::chrono::steady_clock;

// ---- waiting --------------------------------------------------------------------------------

// An interrupt clears the progress line, and cancels a run that has not begun.
volatile sig_atomic_t interruptedBy = 0;
constexpr int kInterrupts[] = {SIGINT, SIGTERM, SIGHUP};

void noteInterrupt(int signal) {
  interruptedBy = signal;
}

// Without SA_RESTART, so that blocking calls return. A second signal ends us at once.
void catchInterrupts() {
  struct sigaction action = {};
  action.sa_handler = noteInterrupt;
  action.sa_flags = static_cast<int>(SA_RESETHAND);
  for (const int signal : kInterrupts) {
    struct sigaction former = {};
    sigaction(signal, nullptr, &former);
    if (former.sa_handler != SIG_IGN) sigaction(signal, &action, nullptr);
  }
}

// One line that is overwritten, on a terminal only.
class Progress {
 public:
  explicit Progress(std::string title) : title_(std::move(title)) {}
  ~Progress() { clear(); }
  Progress(const Progress &) = delete;
  Progress &operator=(const Progress &) = delete;

  void show(const std::string &what) {
    const std::optional<size_t> columns = terminalColumns();
    const auto seconds =
        std::chrono::duration_cast<std::chrono::seconds>(Clock::now() - start_).count();
    if (!columns || seconds == shown_) return;
    shown_ = seconds;
    const std::string line = title_ + " " + what + ", " + std::to_string(seconds) + " s";
    std::printf("%s%s", kClearLine, fitted(line, *columns - 1).c_str());
    std::fflush(stdout);
  }

  void clear() {
    if (shown_ < 0) return;
    std::fputs(kClearLine, stdout);
    std::fflush(stdout);
    shown_ = -1;
  }

 private:
  std::string title_;
  Clock::time_point start_ = Clock::now();
  int64_t shown_ = -1;
};

std::string titleOfTask(int64_t id) {
  try {
    const Task task = findTask(id);
    if (task) return titleOf(*task);
  } catch (const Failure &) {  // the id is shown instead
  }
  return "task " + std::to_string(id);
}

std::string whatItDoes(const RunEvents &events) {
  if (!events.isWaiting) return "is running";
  return events.waitsFor == 0 ? "waits for its turn"
                              : "waits for " + titleOfTask(events.waitsFor) + " to end";
}

[[noreturn]] void endInterrupted(StartedRun *run, const std::string &title, Progress *progress) {
  progress->clear();
  const RunEvents &events = run->events();
  const Clock::time_point until = Clock::now() + kPatience;
  while (!events.isKnown && !run->isSilent() && Clock::now() < until) run->listen(kWaitPause);
  if (events.isKnown && !events.isRunning && cancelWaiting(events.run.process)) {
    std::printf("%s will not run: it was waiting for its turn\n", title.c_str());
    std::fflush(stdout);
  }
  signal(interruptedBy, SIG_DFL);
  raise(interruptedBy);
  _exit(kFailed);  // where the signal is blocked
}

// Its keeper was killed: the run goes on, and its row says how it ends.
RunRecord waitWithoutKeeper(const RunEvents &events) {
  while (isAlive(events.run.process) && interruptedBy == 0) std::this_thread::sleep_for(kWaitPause);
  sweepRuns();
  RunFilter filter;
  filter.run = events.run.run;
  const std::vector<KeptRun> runs = events.run.run == 0 ? std::vector<KeptRun>() : keptRuns(filter);
  if (!runs.empty()) return runs.front();
  RunRecord lost;
  lost.state = RunState::kEnded;
  lost.outcome = Outcome::kLost;
  return lost;
}

RunRecord waitForEnd(StartedRun *run, const std::string &title, RunOutput *output) {
  Progress progress(title);
  bool isOutputOpen = output != nullptr;
  while (!run->isSilent()) {
    if (interruptedBy != 0) endInterrupted(run, title, &progress);
    if (isOutputOpen) {
      isOutputOpen = output->pass(kWaitPause);
      run->listen(std::chrono::milliseconds(0));
    } else {
      run->listen(kWaitPause);
    }
    if (output == nullptr && run->events().isKnown) progress.show(whatItDoes(run->events()));
  }
  while (isOutputOpen && interruptedBy == 0) isOutputOpen = output->pass(kWaitPause);
  if (output != nullptr) output->finish();
  if (interruptedBy != 0) endInterrupted(run, title, &progress);
  if (run->events().isEnded) return run->events().run;
  return waitWithoutKeeper(run->events());
}

void runAndWait(const ZELO_SCHED_TASK &task, bool showsOutput) {
  RunRequest request;
  request.wantsOutput = showsOutput;
  catchInterrupts();
  StartedRun run(task, request);
  std::optional<RunOutput> output;
  if (showsOutput) output.emplace(run.output());
  const RunRecord ended = waitForEnd(&run, titleOf(task), output ? &*output : nullptr);
  const std::string result = titleOf(task) + " " + resultInWords(ended);
  if (output && !output->fault().empty()) {
    throw Failure(result + ", and what it printed could not be written: " + output->fault());
  }
  if (ended.outcome != Outcome::kFinished) throw Failure(result);
  std::puts(result.c_str());
}

// Waits only until it is known whether the run waits for its turn.
void runUnseen(const ZELO_SCHED_TASK &task) {
  StartedRun run(task, {});
  const Clock::time_point until = Clock::now() + kPatience;
  const RunEvents &events = run.events();
  while (!events.isWaiting && !events.isRunning && !events.isEnded && Clock::now() < until) {
    if (!run.listen(kWaitPause)) break;
  }
  if (events.isWaiting) {
    std::printf("%s %s\n", titleOf(task).c_str(), whatItDoes(events).c_str());
  } else {
    std::printf("%s started\n", titleOf(task).c_str());
  }
}

void runOne(int64_t id, const Arguments &arguments) {
  const Task task = loadTask(id);
  ExpectedTask(arguments).require(*task);
  requirePermission(*task, task->CanRunFromUI, "run", arguments.has("force"));
  if (arguments.has("wait") || arguments.has("output")) {
    runAndWait(*task, arguments.has("output"));
  } else {
    runUnseen(*task);
  }
}

int runRun(int argc, char **argv) {
  const Arguments arguments(argc, argv, kRunOptions);
  arguments.requireNoCommand();
  const std::vector<int64_t> ids = parseIds(arguments.operands());
  // Files of a plain user's run in /tmp would block the runs of others.
  if (geteuid() != 0) throw Failure("running tasks takes root's rights");
  return forEach(ids, [&](int64_t id) { runOne(id, arguments); });
}

}  // namespace

const Command kRunCommand = {
    "run", "TASK... [--wait] [--output] [--force] [OPTION...]", "run tasks now",
    "Runs the tasks now, whatever their times say and also when they are disabled, with\n"
    "the limits, the locale and the time zone that cron gives them. A run waits for others\n"
    "that must not overlap with it, as always, and it is said for which.\n"
    "\n"
    "Without --wait the run goes on by itself, and 'zelosched history' tells how it ended,\n"
    "'zelosched log' what it printed. With --wait several tasks run one after the other; an\n"
    "interrupt ends the waiting, leaves out the tasks behind, and cancels a run that waits\n"
    "for its turn, while one that has begun goes on.\n"
    "\n"
    "  -w, --wait                     wait for the end and tell the result; the exit status\n"
    "                                 is 0 only when the command exited with 0\n"
    "  --output                       wait, and show what the command prints, with control\n"
    "                                 characters made visible on a terminal\n"
    "  --force                        even if its application does not let it be "
    "run\n" EXPECTED_TASK_HELP,
    runRun};
