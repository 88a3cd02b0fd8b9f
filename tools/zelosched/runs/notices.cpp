#include "runs/notices.h"

#include <dirent.h>
#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <spawn.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdlib>
#include <cstring>

#include "runs/moment_text.h"
#include "terminal/text.h"

namespace {

constexpr char kDirectory[] = "/etc/zelosched/run-ended.d";
constexpr std::chrono::milliseconds kPatience(30000);
constexpr char kOutputPattern[] = "/run/zelosched/told.XXXXXX";

// Nobody else can change it, or what it leads to: the directory is root's too.
bool isRootsAlone(const struct stat &info) {
  return info.st_uid == 0 && (info.st_mode & (S_IWGRP | S_IWOTH)) == 0;
}

std::vector<std::string> programs() {
  std::vector<std::string> found;
  struct stat directory {};
  if (stat(kDirectory, &directory) != 0) return found;
  if (!isRootsAlone(directory)) {
    syslog(LOG_WARNING, "%s is not root's alone: nobody is told", kDirectory);
    return found;
  }
  DIR *const entries = opendir(kDirectory);
  if (entries == nullptr) return found;
  while (const dirent *entry = readdir(entries)) {
    const std::string name = entry->d_name;
    if (name.front() == '.' || name.back() == '~') continue;
    const std::string path = std::string(kDirectory) + "/" + name;
    struct stat info {};
    if (stat(path.c_str(), &info) != 0 || !S_ISREG(info.st_mode)) continue;
    if ((info.st_mode & S_IXUSR) == 0) continue;
    if (isRootsAlone(info)) {
      found.push_back(path);
    } else {
      syslog(LOG_WARNING, "%s is not root's alone: it is not run", printable(path).c_str());
    }
  }
  closedir(entries);
  std::sort(found.begin(), found.end());
  return found;
}

// What was printed, with a line in place of what was not kept. Gone with the object.
class OutputOnDisk {
 public:
  explicit OutputOnDisk(const Output &output) {
    std::string text = output.head;
    if (output.leftOut > 0) {
      text += "\n[" + std::to_string(output.leftOut) + " bytes are left out here]\n";
    }
    text += output.tail;
    mkdir("/run/zelosched", S_IRWXU);
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

pid_t start(const std::string &program, Environment environment) {
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
  syslog(LOG_WARNING, "%s could not be started: %s", printable(program).c_str(),
         std::strerror(error));
  return 0;
}

// False when it went on for too long.
bool waitForEnd(pid_t pid) {
  const int file = static_cast<int>(syscall(SYS_pidfd_open, pid, 0));
  if (file < 0) return true;
  pollfd wanted{file, POLLIN, 0};
  int ready;
  do {
    ready = poll(&wanted, 1, static_cast<int>(kPatience.count()));
  } while (ready < 0 && errno == EINTR);
  close(file);
  return ready != 0;
}

void run(const std::string &program, const Environment &environment) {
  const pid_t pid = start(program, environment);
  if (pid == 0) return;
  const bool isDone = waitForEnd(pid);
  // With all its group, which lives on as long as its leader has not been waited for. What a
  // program that ended in time has left in the background, such as a delivery, goes on.
  if (!isDone) kill(-pid, SIGKILL);
  int status = 0;
  while (waitpid(pid, &status, 0) < 0 && errno == EINTR) {
  }
  if (!isDone) {
    syslog(LOG_WARNING, "%s was ended after 30 seconds", printable(program).c_str());
  } else if (!WIFEXITED(status) || WEXITSTATUS(status) != 0) {
    syslog(LOG_WARNING, "%s failed", printable(program).c_str());
  }
}

}  // namespace

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
