#include "run_program.h"

#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <stdexcept>

#include "sandbox_fixture.h"

namespace support {
namespace {

constexpr char kOutput[] = "/tmp/run_program.out";
constexpr char kErrors[] = "/tmp/run_program.err";
constexpr int kSignalStatus = 128;

}  // namespace

Outcome runProgram(const std::vector<std::string> &arguments) {
  constexpr int kFlags = O_WRONLY | O_CREAT | O_TRUNC;
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_addopen(&actions, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
  posix_spawn_file_actions_addopen(&actions, STDOUT_FILENO, kOutput, kFlags, kPlainFileMode);
  posix_spawn_file_actions_addopen(&actions, STDERR_FILENO, kErrors, kFlags, kPlainFileMode);

  std::vector<std::string> copies = arguments;
  std::vector<char *> argv;
  for (std::string &argument : copies) argv.push_back(argument.data());
  argv.push_back(nullptr);
  pid_t pid = 0;
  const int error = posix_spawn(&pid, argv[0], &actions, nullptr, argv.data(), environ);
  posix_spawn_file_actions_destroy(&actions);
  if (error != 0) throw std::runtime_error("cannot start " + arguments.at(0));

  int status = 0;
  if (waitpid(pid, &status, 0) != pid) throw std::runtime_error("lost " + arguments.at(0));
  return {WIFEXITED(status) ? WEXITSTATUS(status) : kSignalStatus + WTERMSIG(status),
          readFile(kOutput), readFile(kErrors)};
}

}  // namespace support
