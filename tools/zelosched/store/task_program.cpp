#include "store/task_program.h"

#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstdlib>
#include <cstring>

#include "terminal/failure.h"

namespace {

constexpr char kTaskProgramName[] = "zeloschedtask";
constexpr char kUsualDirectory[] = "/usr/sbin/";
constexpr char kServiceManager[] = "/run/systemd/system";

}  // namespace

std::string ownProgram() {
  char self[PATH_MAX];
  const ssize_t length = readlink("/proc/self/exe", self, sizeof self);
  return std::string(self, static_cast<size_t>(std::max<ssize_t>(length, 0)));
}

bool isUnit() {
  return getenv("INVOCATION_ID") != nullptr && access(kServiceManager, F_OK) == 0;
}

std::string installedTaskProgram() {
  const std::string own = ownProgram();
  const std::string directory = own.substr(0, own.rfind('/') + 1);
  const std::string beside = directory + kTaskProgramName;
  const bool isBeside = !directory.empty() && access(beside.c_str(), F_OK) == 0;
  return isBeside ? beside : std::string(kUsualDirectory) + kTaskProgramName;
}

void startDetached(const std::string &program, const std::vector<std::string> &arguments) {
  std::vector<std::string> words;
  if (isUnit()) words = {"systemd-run", "--quiet", "--collect", "--no-block", "--"};
  words.push_back(program);
  words.insert(words.end(), arguments.begin(), arguments.end());
  std::vector<char *> argv;
  for (std::string &word : words) argv.push_back(word.data());
  argv.push_back(nullptr);
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  for (const int stream : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO}) {
    posix_spawn_file_actions_addopen(&actions, stream, "/dev/null",
                                     stream == STDIN_FILENO ? O_RDONLY : O_WRONLY, 0);
  }
  pid_t pid = 0;
  const int error = posix_spawnp(&pid, argv[0], &actions, nullptr, argv.data(), environ);
  posix_spawn_file_actions_destroy(&actions);
  if (error != 0) throw Failure("cannot start " + words.front() + ": " + std::strerror(error));
  while (waitpid(pid, nullptr, 0) < 0 && errno == EINTR) {
  }
}
