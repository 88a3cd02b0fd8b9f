// Commands of zelosched with 1,000 tasks, from start to exit, compared with the library's list of
// these tasks, which each of them needs; with 100,000 runs kept, with a fixed time.
#include <fcntl.h>
#include <spawn.h>
#include <sqlite3.h>
#include <sys/wait.h>
#include <unistd.h>
#include <zelosched.h>

#include <cstdio>
#include <string>
#include <vector>

#include "support/row.h"
#include "support/stored_tasks.h"

namespace {

constexpr int kTasks = 1000;
constexpr char kHistory[] = "/usr/zelo/var/history.sqlite";
constexpr char kManyRuns[] = "/usr/zelo/var/many_runs.sqlite";
constexpr const char *kNoRuns = nullptr;
constexpr int kCritical = 4;  // the exit status of status, as no cron runs in the sandbox

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
            waitpid(pid, &status, 0) == pid && WIFEXITED(status) &&
            (WEXITSTATUS(status) == 0 || WEXITSTATUS(status) == kCritical),
        "zelosched");
  posix_spawn_file_actions_destroy(&actions);
}

// The history that the commands measured next read; none for null.
void takeHistory(const char *history) {
  unlink(kHistory);
  if (history != nullptr) orDie(link(history, kHistory) == 0, "taking a history");
}

Work command(const std::vector<std::string> &words) {
  return {[words] { run(words); }, [] { takeHistory(kNoRuns); }};
}

Work commandWithRuns(const std::vector<std::string> &words) {
  return {[words] { run(words); }, [] { takeHistory(kManyRuns); }};
}

void fillStoreAndCrontab() {
  fillStore(kTasks);
  orDie(ZELOSchedTaskSync() == 0, "ZELOSchedTaskSync");
  growOld();
}

// One run of each task on each of the last hundred days.
void fillHistory() {
  run({"zelosched", "history", "--keep"});  // creates the database
  run({"zelosched", "history", "--keep"});  // enters the tasks
  sqlite3 *db = nullptr;
  constexpr char kInsert[] =
      "WITH day(n) AS (SELECT 1 UNION ALL SELECT n + 1 FROM day WHERE n < 100)"
      " INSERT INTO run(task, generation, task_name, app, owner, started_by, due, start, ended,"
      " duration, state, outcome, exit_code, output_bytes, moment, boot, status_id, pid, told)"
      " SELECT task, generation, name, app, 'root', 0, t, t, t + 5, 5.0, 2, 1, 0, 0, t, '', n,"
      " task, 1 FROM (SELECT task, generation, name, app, n, unixepoch() - n * 86400 AS t"
      " FROM task, day)";
  orDie(sqlite3_open(kHistory, &db) == SQLITE_OK &&
            sqlite3_exec(db, kInsert, nullptr, nullptr, nullptr) == SQLITE_OK &&
            sqlite3_total_changes(db) == kTasks * 100 && sqlite3_close(db) == SQLITE_OK,
        "filling the history");
  orDie(rename(kHistory, kManyRuns) == 0, "moving the history");
}

}  // namespace

void makeRows() {
  constexpr double kMost = 5;
  constexpr double kMostOfMany = 33;
  constexpr char kList[] = "ZELOSchedTaskListGet, 1000 tasks";
  fillStoreAndCrontab();
  fillHistory();
  Row(kList, Work{[] { list(kTasks); }, nullptr, forgetStore});
  Row("zelosched list", command({"zelosched", "list"})).atMost(kMost, kList);
  Row("zelosched next", command({"zelosched", "next"})).atMost(kMost, kList);
  Row("zelosched status", command({"zelosched", "status"})).atMost(kMost, kList);
  Row("zelosched next -n 10000", command({"zelosched", "next", "-n", "10000"}))
      .atMost(kMostOfMany, kList);
  Row("zelosched list, 100000 runs kept", commandWithRuns({"zelosched", "list"}))
      .atMost(1, "30 ms", Work{[] { usleep(30000); }});
}
