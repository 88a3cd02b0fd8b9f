// Commands of zelosched with 1,000 tasks, from their start to their end, beside the library's list
// of these tasks, which each of them needs.
#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>
#include <zelosched.h>

#include <string>
#include <vector>

#include "support/row.h"
#include "support/stored_tasks.h"

namespace {

constexpr int kTasks = 1000;
constexpr int kWrong = 1;  // no cron runs in the sandbox, which status says

void run(std::vector<std::string> words) {
  std::vector<char *> arguments;
  for (std::string &word : words) {
    arguments.push_back(word.data());
  }
  arguments.push_back(nullptr);
  posix_spawn_file_actions_t actions;
  orDie(
      posix_spawn_file_actions_init(&actions) == 0 &&
          posix_spawn_file_actions_addopen(&actions, STDOUT_FILENO, "/dev/null", O_WRONLY, 0) == 0,
      "preparing a command");
  pid_t pid = 0;
  int status = 0;
  orDie(posix_spawn(&pid, ZELO_BIN_DIR "/zelosched", &actions, nullptr, arguments.data(),
                    environ) == 0 &&
            waitpid(pid, &status, 0) == pid && WIFEXITED(status) && WEXITSTATUS(status) <= kWrong,
        "zelosched");
  posix_spawn_file_actions_destroy(&actions);
}

Work command(const std::vector<std::string> &words) {
  return {[words] { run(words); }};
}

void fillStoreAndCrontab() {
  fillStore(kTasks);
  orDie(ZELOSchedTaskSync() == 0, "ZELOSchedTaskSync");
  growOld();
}

}  // namespace

void makeRows() {
  constexpr double kMost = 5;
  constexpr double kMostOfMany = 33;
  constexpr char kList[] = "ZELOSchedTaskListGet, 1000 tasks";
  fillStoreAndCrontab();
  Row(kList, Work{[] { list(kTasks); }, nullptr, forgetStore});
  Row("zelosched list", command({"zelosched", "list"})).atMost(kMost, kList);
  Row("zelosched next", command({"zelosched", "next"})).atMost(kMost, kList);
  Row("zelosched status", command({"zelosched", "status"})).atMost(kMost, kList);
  Row("zelosched next -n 10000", command({"zelosched", "next", "-n", "10000"}))
      .atMost(kMostOfMany, kList);
}
