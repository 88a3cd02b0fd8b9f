#include "keeper.h"

#include <fcntl.h>
#include <malloc.h>
#include <poll.h>
#include <signal.h>
#include <sys/ioctl.h>
#include <sys/prctl.h>
#include <sys/signalfd.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <syslog.h>
#include <unistd.h>
#include <zelocore.h>
#include <zelosched.h>

#include <algorithm>
#include <cerrno>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <fstream>

#include "runs/history.h"
#include "runs/notices.h"
#include "runs/output_file.h"
#include "runs/process_tree.h"
#include "runs/processes.h"
#include "runs/result_text.h"
#include "runs/run_events.h"
#include "runs/runs.h"
#include "runs/settings.h"
#include "runs/status_row.h"
#include "runs/stop_run.h"
#include "runs/task_notes.h"
#include "runs/time_units.h"
#include "store/owner.h"
#include "store/task_list.h"
#include "terminal/failure.h"

namespace {

// So that the task's owner can open /dev/stdout and /dev/stderr for writing.
constexpr mode_t kPipeMode = 0622;
constexpr size_t kMostAtOnce = size_t{64} << 10;  // the usual capacity of a pipe

// Milliseconds between two polls of /proc and of the databases: at first, and at most.
constexpr int kFirstLook = 5;
constexpr int kLook = 200;
constexpr double kWaitsAfter = 0.1;  // seconds without a command after which a run may be waiting
constexpr double kTurnPause = 2;     // seconds between two queries for the conflicting run
constexpr int kStatusPatience = 50;  // milliseconds: the pipe must not fill up meanwhile
constexpr int kLastPatience = 10000;
constexpr std::chrono::milliseconds kHistoryPatience(50);
constexpr double kSavePause = 0.2;    // seconds
constexpr double kRetryPause = 5;     // seconds, after an error other than a busy database
constexpr double kSaveAtEnd = 60;     // seconds for which writing the end of a run is retried
constexpr double kFirstWait = 3;      // seconds: the library's shortest wait for a conflicting run
constexpr double kDrain = 60.0 * 60;  // seconds for which pipes are served after the run
constexpr double kGrace = 10;         // seconds from SIGTERM to SIGKILL
constexpr int kMostKills = 1000;      // against processes that fork as fast as they are killed

double seconds() {
  timespec now{};
  clock_gettime(CLOCK_BOOTTIME, &now);
  constexpr double kNano = 1e-9;
  return static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec) * kNano;
}

int millisecondsUntil(double moment) {
  constexpr double kMilli = 1000;
  return static_cast<int>(std::max(moment - seconds(), 0.0) * kMilli) + 1;
}

// When the process was started, by the same clock, rounded down to a clock tick.
std::optional<double> beganAt(pid_t pid) {
  const unsigned long long ticks = statOf(pid).started;
  if (ticks == 0) return std::nullopt;
  return static_cast<double>(ticks) / static_cast<double>(sysconf(_SC_CLK_TCK));
}

// ---- what the caller learns ---------------------------------------------------------------------

struct Report {
  int result;
  int code;
  int line;
  char file[64];
};

Report reportOf(int result) {
  Report report{};
  report.result = result;
  report.code = QLIBCErrGet();
  report.line = QLIBCErrorGetLine();
  std::snprintf(report.file, sizeof report.file, "%s", QLIBCErrorGetFile());
  return report;
}

int startRun(const RunOrder &order) {
  return ZELOSchedTaskRun(order.task, order.isAnyTime ? 0 : 1, order.isDisabledSkipped ? 1 : 0);
}

// ---- leaving the caller -------------------------------------------------------------------------

void closeAllBut(std::vector<int> kept) {
  std::sort(kept.begin(), kept.end());
  unsigned first = STDERR_FILENO + 1;
  for (const int descriptor : kept) {
    if (descriptor < static_cast<int>(first)) continue;
    const auto number = static_cast<unsigned>(descriptor);
    if (number > first) close_range(first, number - 1, 0);
    first = number + 1;
  }
  close_range(first, ~0U, 0);
}

void leaveSignals() {
  struct sigaction action = {};
  action.sa_handler = SIG_DFL;
  for (int signal = 1; signal < NSIG; ++signal) sigaction(signal, &action, nullptr);
  // The caller's terminal may hang up, and a reader of our pipes may exit.
  action.sa_handler = SIG_IGN;
  for (const int signal : {SIGHUP, SIGINT, SIGQUIT, SIGPIPE, SIGTSTP, SIGTTOU}) {
    sigaction(signal, &action, nullptr);
  }
  sigset_t none;
  sigemptyset(&none);
  sigprocmask(SIG_SETMASK, &none, nullptr);
}

void leadToNothing(std::initializer_list<int> streams) {
  const int nothing = open("/dev/null", O_RDWR | O_CLOEXEC);
  for (const int stream : streams) {
    if (nothing >= 0) {
      dup2(nothing, stream);
    } else {
      close(stream);
    }
  }
  if (nothing > STDERR_FILENO) close(nothing);
}

void leaveCaller(const std::vector<int> &kept) {
  setsid();
  leaveSignals();
  static_cast<void>(chdir("/") < 0);
  leadToNothing({STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO});
  closelog();
  closeAllBut(kept);
}

// The read end. The other one becomes standard output and error, and is open for reading too: so
// processes of the run get no SIGPIPE when the keeper is killed.
int makePipe() {
  int ends[2];
  if (pipe2(ends, O_CLOEXEC) != 0) return -1;
  fchmod(ends[1], kPipeMode);
  // The command can read from the pipe too, and may take bytes that poll() has announced to us.
  fcntl(ends[0], F_SETFL, O_NONBLOCK);
  const std::string name = "/proc/self/fd/" + std::to_string(ends[1]);
  const int both = open(name.c_str(), O_RDWR | O_CLOEXEC);
  const int lent = both >= 0 ? both : ends[1];
  dup2(lent, STDOUT_FILENO);
  dup2(lent, STDERR_FILENO);
  if (both >= 0) close(both);
  close(ends[1]);
  return ends[0];
}

// ---- the run's process --------------------------------------------------------------------------

std::vector<pid_t> ownChildren() {
  std::vector<pid_t> found;
  std::ifstream file("/proc/thread-self/children");
  for (pid_t pid; file >> pid;) found.push_back(pid);
  if (!found.empty()) return found;
  for (const auto &[pid, stat] : children()) found.push_back(pid);
  return found;
}

// The child that is the run's process. As a subreaper we also get orphans of its command, later in
// the list. A process that exits has no executable before it is a zombie, hence the retries.
pid_t runsProcess() {
  constexpr int kLooks = 1000;
  constexpr useconds_t kPause = 1000;
  for (int i = 0; i < kLooks; ++i) {
    const std::vector<pid_t> all = ownChildren();
    if (all.empty()) return 0;
    for (const pid_t pid : all) {
      if (isOver(pid) || (isOfRoot(pid) && isOfOurProgram(pid))) return pid;
    }
    usleep(kPause);
  }
  return 0;
}

void keepFromOutOfMemory() {
  const int score = open("/proc/self/oom_score_adj", O_WRONLY | O_CLOEXEC);
  if (score < 0) return;
  constexpr char kScore[] = "-500";
  static_cast<void>(write(score, kScore, sizeof kScore - 1) < 0);
  close(score);
}

// ---- the keeper ---------------------------------------------------------------------------------

class Keeper {
 public:
  explicit Keeper(const RunOrder &order) : order_(order) {}
  // Starts the run, reports that, and stays until its end.
  void start(int report);
  // Takes over a run whose keeper was killed.
  bool adopt(int64_t run);

 private:
  void keep();
  void learnOfTask();
  void pump(int milliseconds);
  size_t readOnce(size_t most);
  void passRest();
  void passOn(std::string_view bytes);
  void copyOn();
  void closeCopy();
  bool isCopyHeldUp() const { return !uncopied_.empty(); }
  void tell(const std::string &line);
  void reap();
  void lookWhetherItRuns();
  void lookForTurn();
  void readStatus();
  bool isCancelled() const;
  void measure();
  bool save(bool isEnd);
  void saveWhenDue();
  void saveEnd();
  bool isLeftToSweep() const { return !isStored_ && run_.run != 0; }
  void judge(KeptRun *run) const;
  void logEnd() const;
  void tellPrograms();
  void endWhatIsLeft();
  void drain();

  RunOrder order_;
  Settings settings_;
  KeptRun run_;
  Task task_;
  OutputFile output_;
  std::string uncopied_;  // bytes that could not be written to the copy yet
  int pipe_ = -1;
  int signals_ = -1;
  int processFile_ = -1;  // pidfd of a run that is not our child
  double began_ = 0;
  double ended_ = 0;
  std::optional<double> started_;
  bool isOver_ = false;
  std::optional<int> waitStatus_;
  bool hasWaited_ = false;
  std::optional<int64_t> toldOf_;
  bool isDirty_ = true;
  int pause_ = kFirstLook;
  double nextTurnLook_ = 0;
  double nextSave_ = 0;
  bool isGivenUp_ = false;
  bool isRecovered_ = false;
  bool isSaved_ = false;   // as far as that could be done
  bool isStored_ = false;  // its end is in the history
  pid_t teller_ = 0;
};

void Keeper::start(int report) {
  leaveCaller({report, order_.tellTo, order_.copyTo});
  // O_NONBLOCK affects every writer to this pipe; we are the only one.
  if (order_.copyTo >= 0) fcntl(order_.copyTo, F_SETFL, O_NONBLOCK);
  prctl(PR_SET_CHILD_SUBREAPER, 1);
  openlog("zeloschedtask", LOG_PID, LOG_CRON);
  forgetError();
  pipe_ = makePipe();
  began_ = seconds();
  run_.queued = time(nullptr);
  const int result = startRun(order_);
  const Report told = reportOf(result);
  leadToNothing({STDOUT_FILENO, STDERR_FILENO});
  if (result < 0) {
    static_cast<void>(write(report, &told, sizeof told) < 0);
    return;
  }
  const pid_t process = runsProcess();
  run_.process = processNamed(process);
  static_cast<void>(write(report, &told, sizeof told) < 0);
  close(report);
  if (process == 0) return;  // the task is not due, or disabled
  sigset_t children;
  sigemptyset(&children);
  sigaddset(&children, SIGCHLD);
  sigprocmask(SIG_BLOCK, &children, nullptr);
  signals_ = signalfd(-1, &children, SFD_CLOEXEC | SFD_NONBLOCK);
  keepFromOutOfMemory();
  tell("process " + std::to_string(run_.process.pid) + " " + std::to_string(run_.process.born));
  run_.task = order_.task;
  run_.trigger = order_.trigger;
  run_.due = order_.due;
  if (!run_.due && run_.trigger == Trigger::kSchedule) run_.due = *run_.queued / kMinute * kMinute;
  SettingsFaults faults;
  settings_ = readSettings(&faults);
  output_ = OutputFile::make(run_.process, settings_.outputFirst, settings_.outputLast);
  reap();
  learnOfTask();
  for (const std::string &fault : faults) {
    syslog(LOG_WARNING, "%s: the usual value holds", fault.c_str());
  }
  keep();
}

bool Keeper::adopt(int64_t number) {
  leaveCaller({});
  openlog("zelosched", LOG_PID, LOG_CRON);
  try {
    const KeptDatabase kept(KeptDatabase::kChange);
    Transaction transaction(kept);
    RunFilter filter;
    filter.run = number;
    filter.underWay = true;
    const std::vector<KeptRun> found = runsOf(kept, filter);
    if (found.empty() || isAlive(found.front().keeper)) return false;
    run_ = found.front();
    processFile_ = static_cast<int>(syscall(SYS_pidfd_open, run_.process.pid, 0));
    if (processFile_ < 0 || !isAlive(run_.process)) return false;
    run_.keeper = processNamed(getpid());
    saveRun(kept, &run_);
    transaction.commit();
  } catch (const Failure &failure) {
    syslog(LOG_WARNING, "%s", failure.what());
    return false;
  }
  order_.task = static_cast<long>(run_.task);
  const std::string output = "/proc/" + std::to_string(run_.process.pid) + "/fd/1";
  struct stat info {};
  if (stat(output.c_str(), &info) == 0 && S_ISFIFO(info.st_mode)) {
    pipe_ = open(output.c_str(), O_RDONLY | O_CLOEXEC | O_NOCTTY | O_NONBLOCK);
  }
  SettingsFaults faults;
  settings_ = readSettings(&faults);
  output_ = OutputFile::open(run_.process);
  if (!output_.isOpen()) {
    output_ = OutputFile::make(run_.process, settings_.outputFirst, settings_.outputLast);
  }
  run_.outputBytes = output_.total();
  began_ = seconds();
  isDirty_ = false;
  task_ = findTask(run_.task);
  keep();
  return true;
}

// A task that has been removed since is known by its number alone.
void Keeper::learnOfTask() {
  run_.boot = bootId();
  run_.keeper = processNamed(getpid());
  try {
    task_ = findTask(order_.task);
  } catch (const Failure &) {
    task_.reset();
  }
  if (!task_) return;
  run_.taskName = task_->Name;
  run_.app = task_->App;
  run_.owner = userName(task_->Owner);
}

void Keeper::keep() {
  while (!isOver_) {
    if (run_.state == RunState::kWaiting) lookWhetherItRuns();
    saveWhenDue();
    malloc_trim(0);
    const bool isSettled = run_.state != RunState::kWaiting && (!isDirty_ || isGivenUp_);
    pump(!isSettled ? pause_ : isDirty_ ? millisecondsUntil(nextSave_) : -1);
    pause_ = std::min(2 * pause_, kLook);
  }
  ended_ = seconds();
  run_.end = time(nullptr);
  passRest();
  readStatus();
  saveEnd();
  logEnd();
  tell(endLine(run_));
  if (order_.tellTo >= 0) close(order_.tellTo);
  order_.tellTo = -1;
  copyOn();
  if (!isLeftToSweep()) {
    tellPrograms();
    output_.remove();
  }
  output_ = OutputFile();
  task_.reset();
  endWhatIsLeft();
  drain();
}

// ---- what it prints

void Keeper::passOn(std::string_view bytes) {
  output_.append(bytes);
  run_.outputBytes += static_cast<int64_t>(bytes.size());
  if (order_.copyTo < 0) return;
  uncopied_ += bytes;
  copyOn();
}

void Keeper::copyOn() {
  while (isCopyHeldUp()) {
    const ssize_t count = write(order_.copyTo, uncopied_.data(), uncopied_.size());
    if (count >= 0) {
      uncopied_.erase(0, static_cast<size_t>(count));
    } else if (errno == EAGAIN) {
      return;
    } else if (errno != EINTR) {  // its reader has closed it
      closeCopy();
    }
  }
  if (isSaved_) closeCopy();  // nothing more is copied
}

void Keeper::closeCopy() {
  uncopied_ = std::string();
  if (order_.copyTo >= 0) close(order_.copyTo);
  order_.copyTo = -1;
}

size_t Keeper::readOnce(size_t most) {
  static char buffer[kMostAtOnce];
  ssize_t count;
  do {
    count = read(pipe_, buffer, std::min(most, sizeof buffer));
  } while (count < 0 && errno == EINTR);
  if (count > 0) {
    if (!isSaved_) passOn(std::string_view(buffer, static_cast<size_t>(count)));
    return static_cast<size_t>(count);
  }
  if (count < 0 && errno == EAGAIN) return 0;
  close(pipe_);
  pipe_ = -1;
  return 0;
}

// What is in the pipe now. Processes that the run has left behind may go on writing.
void Keeper::passRest() {
  int left = 0;
  if (pipe_ < 0 || ioctl(pipe_, FIONREAD, &left) != 0) return;
  while (left > 0) {
    const size_t count = readOnce(static_cast<size_t>(left));
    if (count == 0) return;
    left -= static_cast<int>(count);
  }
}

// Waits so long for events, and handles them. While the copy's pipe is full, the run's pipe is not
// read, so that the run blocks as in a shell's pipeline; the keeper does not block.
void Keeper::pump(int milliseconds) {
  const bool isRead = !isCopyHeldUp() || isSaved_;
  pollfd wanted[] = {{isRead ? pipe_ : -1, POLLIN, 0},
                     {signals_, POLLIN, 0},
                     {isOver_ ? -1 : processFile_, POLLIN, 0},
                     {isCopyHeldUp() ? order_.copyTo : -1, POLLOUT, 0}};
  if (poll(wanted, std::size(wanted), milliseconds) <= 0) return;
  if (wanted[1].revents != 0) reap();
  if (wanted[2].revents != 0) isOver_ = true;
  if (wanted[3].revents != 0) copyOn();
  if (wanted[0].revents != 0) readOnce(kMostAtOnce);
}

void Keeper::tell(const std::string &line) {
  if (order_.tellTo < 0) return;
  const std::string text = line + "\n";
  static_cast<void>(write(order_.tellTo, text.data(), text.size()) < 0);
}

// ---- how it goes

void Keeper::reap() {
  signalfd_siginfo info{};
  while (read(signals_, &info, sizeof info) > 0) {
  }
  int status = 0;
  for (pid_t pid; (pid = waitpid(-1, &status, WNOHANG)) > 0;) {
    if (pid == run_.process.pid && !isOver_) {
      isOver_ = true;
      waitStatus_ = status;
    }
  }
}

// The command has begun when the run's process has a child. Its row would say so too; but reading
// the status database while the run writes to it delays the run by up to a second.
void Keeper::lookWhetherItRuns() {
  const std::vector<pid_t> commands = childrenOf(static_cast<pid_t>(run_.process.pid));
  if (commands.empty()) {
    if (seconds() - began_ > kWaitsAfter && seconds() >= nextTurnLook_) lookForTurn();
    return;
  }
  if (processFile_ < 0) {
    const double now = seconds();
    const double began = beganAt(commands.front()).value_or(hasWaited_ ? now : began_);
    started_ = std::clamp(began, std::min(began_, now), now);
  }
  run_.state = RunState::kRunning;
  run_.start = time(nullptr);  // until its row is read
  isDirty_ = true;
  tell("running");
}

void Keeper::lookForTurn() {
  nextTurnLook_ = seconds() + kTurnPause;
  if (!task_) return;
  const auto taskId =
      task_->CanRunTaskSameTime == 0 ? std::optional<int64_t>(run_.task) : std::nullopt;
  const auto app =
      task_->CanRunAppSameTime == 0 ? std::optional<std::string>(task_->App) : std::nullopt;
  std::optional<Run> other;
  try {
    other = RunDatabase(kStatusPatience).inTheWayOf(taskId, app, run_.process.pid);
  } catch (const Failure &) {  // it is asked again
  }
  if (!other && seconds() - began_ < kFirstWait) return;
  hasWaited_ = true;
  const int64_t whose = other ? other->taskId : 0;
  if (toldOf_ == whose) return;
  toldOf_ = whose;
  tell("waiting " + std::to_string(whose));
}

// Whether the row is of an earlier process with this pid, which its keeper has recorded.
bool isOfAnother(const Run &row, const KeptRun &run) {
  try {
    const KeptDatabase kept(KeptDatabase::kRead);
    if (!kept.isThere()) return false;
    Query query(kept,
                "SELECT 1 FROM run WHERE start = ? AND status_id = ? AND pid = ? AND"
                " task = ? AND app = ? AND run <> ? AND keeper <> 0");
    query.with(row.start).with(row.statusId).with(row.pid).with(row.taskId).with(row.app);
    return query.with(run.run).next();
  } catch (const Failure &) {
    return false;
  }
}

// After the end of the run's process: its row and its wait status give the outcome.
void Keeper::readStatus() {
  const bool isKilled = waitStatus_ && WIFSIGNALED(*waitStatus_);
  const bool isSeen = waitStatus_.has_value();
  const bool hasBegun = run_.state == RunState::kRunning;
  std::optional<Run> row;
  try {
    row = RunDatabase(kLastPatience).runOfProcess(run_.process.pid, 0);
  } catch (const Failure &failure) {
    syslog(LOG_WARNING, "%s", failure.what());
  }
  if (row && (row->taskId != run_.task || isOfAnother(*row, run_))) row.reset();
  if (row) {
    takeStatus(*row, &run_);
    // The row still says "running" where the process could not become the owner, for one.
    if (run_.outcome == Outcome::kNone || run_.outcome == Outcome::kLost) {
      run_.outcome = isKilled || !isSeen ? Outcome::kLost : Outcome::kNotStarted;
    }
  } else if (hasBegun) {
    run_.outcome = Outcome::kLost;
  } else {
    if (!isKilled && !hasWaited_) lookForTurn();
    run_.outcome = isCancelled() ? Outcome::kCancelled
                   : isKilled    ? Outcome::kLost
                   : hasWaited_  ? Outcome::kGaveUp
                                 : Outcome::kNotStarted;
  }
  run_.state = RunState::kEnded;
  if (row || hasBegun) measure();
}

// By 'stop', by the removal of its task, or by a 'run' that was interrupted.
bool Keeper::isCancelled() const {
  const bool isByUs =
      waitStatus_ && WIFSIGNALED(*waitStatus_) && WTERMSIG(*waitStatus_) == kSignalOfCancelling;
  return isByUs || run_.stopAsked.has_value();
}

void Keeper::measure() {
  constexpr double kMilli = 1000;
  if (!started_ && !hasWaited_ && processFile_ < 0) started_ = began_;
  if (started_) {
    run_.duration = std::round((ended_ - *started_) * kMilli) / kMilli;
  } else if (run_.start && *run_.end >= *run_.start) {
    run_.duration = static_cast<double>(*run_.end - *run_.start);  // no keeper saw it begin
  }
}

// ---- what is written

// The number of the run where the sweep recorded it before its keeper could: the keeper updates
// that row. 0 for none.
int64_t numberBySweep(const KeptDatabase &kept, const KeptRun &run) {
  Query query(kept,
              "SELECT run FROM run WHERE state < 2 AND pid = ?1 AND task = ?2 AND boot = ?3"
              " AND pid_born = ?4 AND keeper = 0 UNION ALL"
              " SELECT run FROM run WHERE start = ?5 AND status_id = ?6 AND pid = ?1 AND task = ?2"
              " AND app = ?7 AND keeper = 0");
  query.with(run.process.pid).with(run.task).with(run.boot).with(run.process.born);
  query.with(run.start).with(run.statusId).with(run.app);
  return query.next() ? query.number(0) : 0;
}

bool Keeper::save(bool isEnd) {
  try {
    const KeptDatabase kept(KeptDatabase::kChange, kHistoryPatience);
    Transaction transaction(kept);
    // run_ takes its number and generation from the history only after the commit.
    KeptRun written = run_;
    if (written.run == 0) written.run = numberBySweep(kept, written);
    RunFilter filter;
    filter.run = written.run;
    const std::vector<KeptRun> known =
        written.run != 0 ? runsOf(kept, filter) : std::vector<KeptRun>();
    if (!known.empty()) run_.stopAsked = written.stopAsked = known.front().stopAsked;
    if (task_ && !written.generation) written.generation = generationOf(kept, *task_);
    if (isEnd) {
      judge(&written);
      written.isTold = true;
    }
    saveRun(kept, &written);
    if (isEnd) {
      saveOutput(kept, written, output_.contents(), settings_);
      isRecovered_ = written.outcome == Outcome::kFinished && wasBadBefore(kept, written);
    }
    transaction.commit();
    if (run_.run != written.run) tell("run " + std::to_string(written.run));
    run_ = written;
    isDirty_ = false;
    isGivenUp_ = false;
    isStored_ = isEnd;
    return true;
  } catch (const DatabaseBusy &failure) {
    nextSave_ = seconds() + kSavePause;
    if (isEnd && seconds() - ended_ > kSaveAtEnd) {
      syslog(LOG_WARNING, "%s: the run of task %ld is not recorded", failure.what(),
             static_cast<long>(run_.task));
      judge(&run_);
      return true;
    }
    return false;
  } catch (const Failure &failure) {
    if (!isGivenUp_ || isEnd) {
      syslog(LOG_WARNING, "%s: the run of task %ld is not recorded%s", failure.what(),
             static_cast<long>(run_.task), isEnd ? "" : " yet");
    }
    isGivenUp_ = true;
    nextSave_ = seconds() + kRetryPause;
    if (isEnd) judge(&run_);
    return true;
  }
}

void Keeper::judge(KeptRun *run) const {
  judgeEnd(task_ ? task_->Command : "", run->stopAsked.has_value(), run);
}

void Keeper::saveWhenDue() {
  if (isDirty_ && seconds() >= nextSave_) save(false);
}

// What cannot be written is left to the sweep, with the output and the notices: the sweep writes
// the end of each run in the history whose keeper is gone.
void Keeper::saveEnd() {
  while (!save(true)) pump(kLook);
  isSaved_ = true;
}

void Keeper::logEnd() const {
  const std::string title = task_ ? titleOf(*task_) : "task " + std::to_string(run_.task);
  char duration[64] = "";
  if (run_.duration) std::snprintf(duration, sizeof duration, " after %.1f s", *run_.duration);
  openlog("zelosched", LOG_PID, LOG_CRON);
  syslog(isBad(run_) ? LOG_WARNING : LOG_INFO, "%s of %s: %s%s", title.c_str(),
         run_.owner.empty() ? "an unknown user" : run_.owner.c_str(), resultInWords(run_).c_str(),
         duration);
}

// In a process of its own: the pipe must be read meanwhile.
void Keeper::tellPrograms() {
  if (!isAnybodyToBeTold()) return;
  const Output output = output_.contents();
  teller_ = fork();
  if (teller_ != 0) return;
  if (pipe_ >= 0) close(pipe_);
  closeCopy();
  sigset_t none;
  sigemptyset(&none);
  sigprocmask(SIG_SETMASK, &none, nullptr);
  tellOfEnd(run_, output, isRecovered_);
  _exit(EXIT_SUCCESS);
}

// ---- afterwards

// After the time limit, or when the run's process was killed, its other processes are ended too:
// they could not be listed or stopped any more, and the next run would overlap with them.
void Keeper::endWhatIsLeft() {
  const bool isToEnd = run_.outcome == Outcome::kTimeLimit || run_.outcome == Outcome::kLost;
  if (!isToEnd || processFile_ >= 0) return;
  ProcessTree left(getpid(), {teller_});
  left.signal(SIGTERM);
  const double until = seconds() + kGrace;
  while (left.look() > 0 && seconds() < until) pump(kLook);
  for (int i = 0; i < kMostKills && left.look() > 0; ++i) {
    left.killAll();
    pump(kFirstLook);
  }
}

// The sweep passes over a run while its keeper is alive, so a child drains for a run left to it.
void Keeper::drain() {
  if (isLeftToSweep() && fork() > 0) return;
  const double until = seconds() + kDrain;
  malloc_trim(0);
  while ((pipe_ >= 0 || isCopyHeldUp()) && seconds() < until) {
    pump(millisecondsUntil(until));
  }
}

// ---- the caller's side --------------------------------------------------------------------------

bool readWhole(int file, Report *report) {
  size_t got = 0;
  while (got < sizeof *report) {
    const ssize_t count = read(file, reinterpret_cast<char *>(report) + got, sizeof *report - got);
    if (count < 0 && errno == EINTR) continue;
    if (count <= 0) return false;
    got += static_cast<size_t>(count);
  }
  return true;
}

// For a keeper that was killed before it reported: as its parent and a subreaper, we have become
// the parent of the run's process, if there is one. That has a session of its own at once.
bool hasRunBegun(pid_t keeper) {
  constexpr int kLooks = 1000;
  constexpr useconds_t kPause = 1000;
  for (int i = 0; i < kLooks; ++i) {
    siginfo_t info = {};
    if (waitid(P_ALL, 0, &info, WEXITED | WNOHANG | WNOWAIT) != 0) return false;  // no child
    for (const pid_t pid : ownChildren()) {
      if (pid != keeper && getsid(pid) == pid) return true;
    }
    if (info.si_pid != 0) {
      waitpid(info.si_pid, nullptr, 0);
    } else {
      usleep(kPause);
    }
  }
  return true;  // a child is left, perhaps the run
}

int passReportOn(const Report &report) {
  static char file[sizeof report.file];
  std::memcpy(file, report.file, sizeof file);
  QLIBCErrSetEx(report.code, file, report.line);
  return report.result;
}

}  // namespace

int runWithKeeper(const RunOrder &order) {
  int ends[2];
  if (pipe2(ends, O_CLOEXEC) != 0) return startRun(order);
  prctl(PR_SET_CHILD_SUBREAPER, 1);
  const pid_t keeper = fork();
  if (keeper == 0) {
    try {
      Keeper(order).start(ends[1]);
    } catch (const std::exception &error) {
      syslog(LOG_WARNING, "%s", error.what());
    }
    _exit(EXIT_SUCCESS);
  }
  close(ends[1]);
  Report report{};
  const bool isTold = keeper > 0 && readWhole(ends[0], &report);
  close(ends[0]);
  if (isTold) return passReportOn(report);
  if (keeper > 0 && hasRunBegun(keeper)) return 0;
  return startRun(order);
}

int keepOn(int64_t run) {
  const pid_t keeper = fork();
  if (keeper < 0) return EXIT_FAILURE;
  if (keeper > 0) return EXIT_SUCCESS;
  try {
    Keeper(RunOrder{}).adopt(run);
  } catch (const std::exception &error) {
    syslog(LOG_WARNING, "%s", error.what());
  }
  _exit(EXIT_SUCCESS);
}
