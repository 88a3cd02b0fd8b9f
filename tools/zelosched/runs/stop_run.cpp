#include "runs/stop_run.h"

#include <poll.h>
#include <signal.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <ctime>
#include <thread>

#include "runs/history_keep.h"
#include "runs/process_tree.h"
#include "runs/processes.h"
#include "runs/runs.h"
#include "terminal/failure.h"

namespace {

using Clock = std::chrono::steady_clock;
constexpr std::chrono::milliseconds kStopPause(10);
constexpr std::chrono::milliseconds kStopPatience(2000);
constexpr int kMostKills = 1000;     // against processes that fork as fast as they are killed
constexpr int kStatusPatience = 20;  // milliseconds: the stopped process may hold the lock

// A pidfd of a process, so that no signal reaches another one that reuses its pid.
class Held {
 public:
  explicit Held(const ProcessName &process)
      : file_(static_cast<int>(syscall(SYS_pidfd_open, process.pid, 0))) {
    if (file_ < 0 || isAlive(process)) return;
    close(file_);
    file_ = -1;
  }
  ~Held() {
    if (file_ >= 0) close(file_);
  }
  Held(const Held &) = delete;
  Held &operator=(const Held &) = delete;

  bool isThere() const { return file_ >= 0; }
  bool send(int number) const {
    return syscall(SYS_pidfd_send_signal, file_, number, nullptr, 0) == 0;
  }
  bool waitForEnd(std::chrono::milliseconds time) const {
    pollfd wanted{file_, POLLIN, 0};
    return poll(&wanted, 1, static_cast<int>(std::max<int64_t>(time.count(), 0))) > 0;
  }

 private:
  int file_;
};

bool hasStopped(pid_t pid) {
  constexpr int kLooks = 200;
  for (int i = 0; i < kLooks; ++i) {
    const char state = statOf(pid).state;
    if (state == 'T') return true;
    if (state == 'Z' || state == '\0') return false;
    std::this_thread::sleep_for(kStopPause / 2);
  }
  return false;
}

bool hasRow(pid_t pid) {
  const std::vector<Run> running = RunDatabase(kStatusPatience).running();
  return std::any_of(running.begin(), running.end(),
                     [&](const Run &run) { return run.pid == pid; });
}

// The run's own process may have been stopped, and would not go on by itself.
void endOwn(const Held &own) {
  own.send(SIGCONT);
  if (own.waitForEnd(kStopPatience)) return;
  own.send(SIGKILL);
  own.waitForEnd(kStopPatience);
}

Stopped endTree(ProcessTree *tree, const Held &own, std::chrono::milliseconds grace) {
  const Clock::time_point until = Clock::now() + grace;
  own.send(SIGCONT);
  tree->signal(SIGTERM);
  while (Clock::now() < until) {
    const auto left = std::chrono::duration_cast<std::chrono::milliseconds>(until - Clock::now());
    const bool isOver = own.waitForEnd(std::min(left, kStopPause * 5));
    // A command that was about to start appears after the first signal.
    tree->signalNew(SIGTERM);
    if (isOver && tree->look() == 0) return Stopped::kEnded;
  }
  for (int i = 0; i < kMostKills && tree->look() > 0; ++i) {
    tree->killAll();
    own.waitForEnd(kStopPause);
  }
  if (!own.waitForEnd(kStopPatience)) endOwn(own);
  const bool isOver = own.waitForEnd(std::chrono::milliseconds(0)) && tree->look() == 0;
  return isOver ? Stopped::kKilled : Stopped::kNot;
}

// Such a row is ignored, as it may be out of date: a run whose process was killed leaves one that
// says running, and its pid may be that of another process by now, even of another run.
bool isInHistory(const Run &row) {
  const KeptDatabase kept(KeptDatabase::kRead);
  if (!kept.isThere()) return false;
  RunFilter filter;
  filter.underWay = true;
  const std::vector<KeptRun> underWay = runsOf(kept, filter);
  return isKnown(kept, row) ||
         std::any_of(underWay.begin(), underWay.end(),
                     [&](const KeptRun &run) { return run.process.pid == row.pid; });
}

}  // namespace

bool cancelWaiting(const ProcessName &process) {
  constexpr int kTries = 200;
  const Held own(process);
  const auto pid = static_cast<pid_t>(process.pid);
  for (int i = 0; own.isThere() && i < kTries; ++i) {
    if (!own.send(SIGSTOP) || !hasStopped(pid)) break;
    try {
      if (hasChild(pid) || hasRow(pid)) break;
      own.send(i == 0 ? kSignalOfCancelling : SIGKILL);
      own.send(SIGCONT);
      if (own.waitForEnd(i == 0 ? kStopPause * 20 : std::chrono::milliseconds(10000))) return true;
    } catch (const Failure &) {  // it was just about to write its row
      own.send(SIGCONT);
      std::this_thread::sleep_for(kStopPause);
    }
  }
  if (own.isThere()) own.send(SIGCONT);
  return false;
}

Stopped stopRun(const KeptRun &run, std::chrono::milliseconds grace) {
  if (run.state == RunState::kWaiting && cancelWaiting(run.process)) return Stopped::kCancelled;
  const Held own(run.process);
  if (!own.isThere()) return Stopped::kWasOver;
  const auto pid = static_cast<pid_t>(run.process.pid);
  if (isAlive(run.keeper) && statOf(pid).parent == run.keeper.pid) {
    ProcessTree tree(static_cast<pid_t>(run.keeper.pid), {}, {pid});
    return endTree(&tree, own, grace);
  }
  ProcessTree tree(pid);
  return endTree(&tree, own, grace) == Stopped::kNot ? Stopped::kNot : Stopped::kPartly;
}

std::vector<KeptRun> runsToStop(int64_t task) {
  attempt([] { sweepRuns(); });
  RunFilter filter;
  filter.task = task;
  filter.underWay = true;
  std::vector<KeptRun> runs;
  attempt([&] { runs = keptRuns(filter); });
  std::erase_if(runs, [](const KeptRun &run) { return !isAlive(run.process); });
  for (const Run &row : RunDatabase().running()) {
    if (row.taskId != task || isInHistory(row)) continue;
    KeptRun run;
    run.task = row.taskId;
    run.statusId = row.statusId;
    run.process = processOf(row);
    run.start = row.start;
    run.state = RunState::kRunning;
    if (isAlive(run.process)) runs.push_back(std::move(run));
  }
  return runs;
}

void noteStop(std::vector<KeptRun> *runs) {
  const auto now = static_cast<int64_t>(time(nullptr));
  attempt([&] {
    const KeptDatabase kept(KeptDatabase::kChange);
    Transaction transaction(kept);
    Query note(kept, "UPDATE run SET stop_asked = ? WHERE run = ? AND state < 2");
    for (const KeptRun &run : *runs) note.with(now).with(run.run).run();
    transaction.commit();
  });
}
