#include "runs/notices.h"

#include <fcntl.h>
#include <signal.h>
#include <spawn.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdlib>
#include <cstring>

#include "runs/moment_text.h"
#include "store/directory.h"
#include "store/place_file.h"
#include "terminal/failure.h"
#include "terminal/text.h"

namespace {

constexpr std::chrono::seconds kPatience(30);
constexpr useconds_t kLook = 20000;
constexpr char kRunDirectory[] = "/run/zelosched";
constexpr char kFaults[] = "/run/zelosched/notices";
constexpr char kOutputPattern[] = "/run/zelosched/told.XXXXXX";

// Whether only root can change it. The directory is checked too, as its entries may be links.
bool isRootsAlone(const struct stat &info) {
  return info.st_uid == 0 && (info.st_mode & (S_IWGRP | S_IWOTH)) == 0;
}

bool isBackup(const std::string &name) {
  return name.front() == '.' || name.back() == '~';
}

std::vector<std::string> namesIn(const char *directory) {
  std::vector<std::string> names;
  const Directory entries(opendir(directory));
  if (entries == nullptr) return names;
  while (const dirent *entry = readdir(entries.get())) {
    if (!isBackup(entry->d_name)) names.emplace_back(entry->d_name);
  }
  std::sort(names.begin(), names.end());
  return names;
}

// The programs that can be run. Logs why the others cannot.
std::vector<std::string> programs() {
  std::vector<std::string> found;
  for (const NoticeProgram &program : noticePrograms()) {
    if (program.fault.empty()) {
      found.push_back(program.path);
    } else {
      syslog(LOG_WARNING, "%s %s", printable(program.path).c_str(), program.fault.c_str());
    }
  }
  return found;
}

// The file that has the fault of a program; /run is empty after a boot.
std::string markOf(const std::string &program) {
  return kFaults + program.substr(program.rfind('/'));
}

void noteFault(const std::string &program, const std::string &fault) {
  if (fault.empty()) {
    unlink(markOf(program).c_str());
    return;
  }
  syslog(LOG_WARNING, "%s %s", printable(program).c_str(), fault.c_str());
  mkdir(kRunDirectory, S_IRWXU);
  mkdir(kFaults, S_IRWXU);
  try {
    placeFile(markOf(program), fault + "\n", S_IRUSR | S_IWUSR);
  } catch (const Failure &failure) {
    syslog(LOG_WARNING, "%s", failure.what());
  }
}

// A temporary file with what was printed, and a line in place of what was not kept.
class OutputOnDisk {
 public:
  explicit OutputOnDisk(const Output &output) {
    std::string text = output.head;
    if (output.leftOut > 0) {
      text += "\n[" + std::to_string(output.leftOut) + " bytes are left out here]\n";
    }
    text += output.tail;
    mkdir(kRunDirectory, S_IRWXU);
    const int file = mkostemp(path_, O_CLOEXEC);
    if (file < 0) {
      path_[0] = '\0';
      return;
    }
    static_cast<void>(write(file, text.data(), text.size()) < 0);
    close(file);
  }
  ~OutputOnDisk() {
    if (path_[0] != '\0') unlink(path_);
  }
  OutputOnDisk(const OutputOnDisk &) = delete;
  OutputOnDisk &operator=(const OutputOnDisk &) = delete;

  const char *path() const { return path_; }

 private:
  char path_[sizeof kOutputPattern] = "/run/zelosched/told.XXXXXX";
};

class Environment {
 public:
  void set(const char *name, const std::string &value) {
    const std::string begin = std::string(name) + "=";
    std::erase_if(entries_, [&](const std::string &entry) { return entry.starts_with(begin); });
    entries_.push_back(begin + value.substr(0, value.find('\0')));
  }
  void set(const char *name, std::optional<int64_t> value) {
    set(name, value ? std::to_string(*value) : std::string());
  }
  std::vector<char *> pointers() {
    std::vector<char *> all;
    for (std::string &entry : entries_) all.push_back(entry.data());
    all.push_back(nullptr);
    return all;
  }

 private:
  std::vector<std::string> entries_;
};

std::string momentOrNothing(std::optional<int64_t> moment) {
  return moment ? momentText(*moment) : std::string();
}

Environment environmentOf(const RunRecord &run, const char *outputPath, bool isRecovered) {
  Environment all;
  all.set("PATH", std::string("/usr/local/sbin:/usr/local/bin:/usr/sbin:/usr/bin:/sbin:/bin"));
  all.set("HOME", std::string("/root"));
  all.set("LC_ALL", std::string("C.UTF-8"));
  all.set("ZELO_RUN", std::optional<int64_t>(run.run));
  all.set("ZELO_RUN_TASK", std::optional<int64_t>(run.task));
  all.set("ZELO_RUN_TASK_NAME", run.taskName);
  all.set("ZELO_RUN_APP", run.app);
  all.set("ZELO_RUN_OWNER", run.owner);
  all.set("ZELO_RUN_TRIGGER", std::string(nameOf(run.trigger)));
  all.set("ZELO_RUN_OUTCOME", std::string(nameOf(run.outcome)));
  all.set("ZELO_RUN_EXIT_CODE",
          run.exitCode ? std::optional<int64_t>(*run.exitCode) : std::nullopt);
  all.set("ZELO_RUN_SIGNAL", run.signal ? std::optional<int64_t>(*run.signal) : std::nullopt);
  all.set("ZELO_RUN_DUE", momentOrNothing(run.due));
  all.set("ZELO_RUN_QUEUED", momentOrNothing(run.queued));
  all.set("ZELO_RUN_START", momentOrNothing(run.start));
  all.set("ZELO_RUN_END", momentOrNothing(run.end));
  all.set("ZELO_RUN_DURATION_SECONDS",
          run.duration ? std::to_string(*run.duration) : std::string());
  all.set("ZELO_RUN_OUTPUT_BYTES", std::optional<int64_t>(run.outputBytes));
  all.set("ZELO_RUN_OUTPUT", std::string(outputPath));
  all.set("ZELO_RUN_RECOVERED", std::string(isRecovered ? "1" : ""));
  return all;
}

// The pid; 0, and the fault, when it could not be started.
pid_t start(const std::string &program, Environment environment, std::string *fault) {
  posix_spawnattr_t attributes;
  posix_spawn_file_actions_t actions;
  posix_spawnattr_init(&attributes);
  posix_spawn_file_actions_init(&actions);
  sigset_t all;
  sigset_t none;
  sigfillset(&all);
  sigemptyset(&none);
  posix_spawnattr_setsigdefault(&attributes, &all);
  posix_spawnattr_setsigmask(&attributes, &none);
  posix_spawnattr_setpgroup(&attributes, 0);
  posix_spawnattr_setflags(&attributes,
                           POSIX_SPAWN_SETPGROUP | POSIX_SPAWN_SETSIGDEF | POSIX_SPAWN_SETSIGMASK);
  posix_spawn_file_actions_addopen(&actions, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
  posix_spawn_file_actions_addopen(&actions, STDOUT_FILENO, "/dev/null", O_WRONLY, 0);
  posix_spawn_file_actions_addopen(&actions, STDERR_FILENO, "/dev/null", O_WRONLY, 0);
  std::string name = program;
  char *argv[] = {name.data(), nullptr};
  pid_t pid = 0;
  const int error = posix_spawn(&pid, program.c_str(), &actions, &attributes, argv,
                                environment.pointers().data());
  posix_spawn_file_actions_destroy(&actions);
  posix_spawnattr_destroy(&attributes);
  if (error == 0) return pid;
  *fault = std::string("could not be started: ") + std::strerror(error);
  return 0;
}

// False when it ran for too long. Polls: a pidfd can be refused, and the wait must have an end.
bool waitForEnd(pid_t pid) {
  const auto until = std::chrono::steady_clock::now() + kPatience;
  for (;;) {
    siginfo_t info = {};
    const int result = waitid(P_PID, static_cast<id_t>(pid), &info, WEXITED | WNOHANG | WNOWAIT);
    if (result != 0 || info.si_pid != 0) return true;
    if (std::chrono::steady_clock::now() >= until) return false;
    usleep(kLook);
  }
}

std::string faultOf(int status) {
  if (WIFSIGNALED(status)) return "was ended by signal " + std::to_string(WTERMSIG(status));
  if (WEXITSTATUS(status) == 0) return "";
  return "failed with exit code " + std::to_string(WEXITSTATUS(status));
}

// How it failed; empty when it did not.
std::string faultOfRun(const std::string &program, const Environment &environment) {
  std::string fault;
  const pid_t pid = start(program, environment, &fault);
  if (pid == 0) return fault;
  const bool isDone = waitForEnd(pid);
  // The process group, whose id is valid until its leader is waited for. Background processes of a
  // program that ended in time, such as a mail delivery, go on.
  if (!isDone) kill(-pid, SIGKILL);
  int status = 0;
  while (waitpid(pid, &status, 0) < 0 && errno == EINTR) {
  }
  return isDone ? faultOf(status) : "was ended after 30 seconds";
}

void run(const std::string &program, const Environment &environment) {
  noteFault(program, faultOfRun(program, environment));
}

}  // namespace

bool hasMailer() {
  return access(kMailer, X_OK) == 0;
}

std::vector<NoticeProgram> noticePrograms() {
  struct stat directory {};
  if (stat(kNoticeDirectory, &directory) != 0) return {};
  if (!isRootsAlone(directory)) return {{kNoticeDirectory, "is not root's alone: nobody is told"}};
  std::vector<NoticeProgram> found;
  for (const std::string &name : namesIn(kNoticeDirectory)) {
    const std::string path = std::string(kNoticeDirectory) + "/" + name;
    struct stat info {};
    if (stat(path.c_str(), &info) != 0 || !S_ISREG(info.st_mode)) continue;
    if ((info.st_mode & S_IXUSR) == 0) continue;
    found.push_back({path, isRootsAlone(info) ? "" : "is not root's alone: it is not run"});
  }
  return found;
}

std::string lastFaultOf(const NoticeProgram &program) {
  const std::string mark = markOf(program.path);
  if (access(mark.c_str(), F_OK) != 0) return "";
  std::string fault = contentsOf(mark);
  while (!fault.empty() && fault.back() == '\n') fault.pop_back();
  return fault;
}

bool isAnybodyToBeTold() {
  return !programs().empty();
}

void tellOfEnd(const RunRecord &record, const Output &output, bool isRecovered) {
  const std::vector<std::string> all = programs();
  if (all.empty()) return;
  const OutputOnDisk file(output);
  const Environment environment = environmentOf(record, file.path(), isRecovered);
  for (const std::string &program : all) run(program, environment);
}

void tellOfMissed(const RunRecord &record) {
  Environment environment = environmentOf(record, "", false);
  environment.set("ZELO_RUN_OUTCOME", std::string("missed"));
  for (const std::string &program : programs()) run(program, environment);
}
