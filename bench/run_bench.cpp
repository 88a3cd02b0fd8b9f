// A run, from the call to the first instruction of its command, compared with a shell that is
// forked and does nothing.
#include <fcntl.h>
#include <pwd.h>
#include <spawn.h>
#include <sqlite3.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>
#include <zelocore.h>
#include <zelosched.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <iterator>
#include <sstream>
#include <string>
#include <vector>

#include "support/row.h"
#include "support/stored_tasks.h"

namespace {

constexpr char kStarted[] = "/tmp/started";
// Only shell built-ins: no other program is started.
constexpr char kCommand[] = ": > /tmp/started";
constexpr char kWithoutKeeper[] = "--without-keeper";
constexpr int kId = 1;
constexpr int kPatience = 1000;  // milliseconds, while a run closes the database

sqlite3 *db;

// Opening a FIFO blocks until its other end is opened too. The alarm kills this program when the
// command never starts.
void awaitCommand() {
  constexpr unsigned kMostSeconds = 60;
  alarm(kMostSeconds);
  const int started = open(kStarted, O_RDONLY | O_CLOEXEC);
  alarm(0);
  orDie(started >= 0 && close(started) == 0, "the command");
}

void run() {
  orDie(ZELOSchedTaskRun(kId, 0, 0) == 0, "ZELOSchedTaskRun");
  awaitCommand();
}

bool isRunning() {
  int statusCode = 0;
  const int found = ZELOSchedDBGetStatusByTaskID(db, kId, nullptr, &statusCode, nullptr, 0);
  orDie(found >= 0, "ZELOSchedDBGetStatusByTaskID");
  return found > 0 && statusCode == ZELO_SCHED_STATUS_RUNNING;
}

// A run that has not been recorded as ended conflicts with the next.
void awaitEnd() {
  constexpr useconds_t kPause = 200;
  while (isRunning()) {
    usleep(kPause);
  }
  orDie(sqlite3_exec(db, "DELETE FROM task_status", nullptr, nullptr, nullptr) == SQLITE_OK,
        "emptying the table");
}

void storeTask() {
  unlink(kStarted);
  orDie(mkfifo(kStarted, 0600) == 0, "mkfifo");
  fillStore(0);
  const Task task = newTask(kId);
  snprintf(task->Command, sizeof(task->Command), "%s", kCommand);
  orDie(ZELOSchedTaskCreate(task.get()) >= 0, "ZELOSchedTaskCreate");
  db = ZELOSchedDBInit();
  orDie(db != nullptr && sqlite3_busy_timeout(db, kPatience) == SQLITE_OK, "ZELOSchedDBInit");
}

// With the library's calls on the database, so that they count on both sides.
void recordStart() {
  sqlite3 *own = ZELOSchedDBInit();
  ZELO_SCHED_STATUS other = {};
  ZELO_SCHED_TASK task = {};
  task.ID = kId;
  const bool recorded = own != nullptr && ZELOSchedDBIsTaskRunning(own, kId, &other) == 0 &&
                        ZELOSchedDBAddRecord(own, &task, nullptr) == 0;
  orDie(recorded && sqlite3_close(own) == SQLITE_OK, "recording a start");
}

// What a run cannot do without: a detached child, the record of its start, the look-up of the
// owner and the shell.
void runWithoutTheRest() {
  const int side = QLIBCProcForkChildNoWait();
  orDie(side >= 0, "QLIBCProcForkChildNoWait");
  if (side == 0) {
    recordStart();
    orDie(getpwuid(geteuid()) != nullptr && system(kCommand) == 0, "system");
    _exit(EXIT_SUCCESS);
  }
  awaitCommand();
}

void forkShell() {
  const pid_t shell = fork();
  if (shell == 0) {
    execl("/bin/sh", "sh", "-c", "true", nullptr);
    _exit(EXIT_FAILURE);
  }
  int status = 0;
  orDie(shell > 0 && waitpid(shell, &status, 0) == shell && status == 0, "/bin/sh -c true");
}

// Until all processes of a run have ended, the keeper too: they would slow the next one down.
void awaitAll() {
  awaitEnd();
  while (waitpid(-1, nullptr, 0) > 0) {
  }
}

void startProgram(const std::vector<const char *> &words) {
  std::vector<char *> arguments;
  for (const char *word : words) {
    arguments.push_back(const_cast<char *>(word));
  }
  arguments.push_back(nullptr);
  pid_t pid = 0;
  int status = 0;
  orDie(posix_spawn(&pid, words.front(), nullptr, nullptr, arguments.data(), environ) == 0 &&
            waitpid(pid, &status, 0) == pid && status == 0,
        words.front());
}

// The command blocks on the FIFO until we open it; the keeper waits for its end.
void runWithKeeper() {
  startProgram({ZELO_BIN_DIR "/zeloschedtask", "--run", "id=1", "--now"});
  awaitCommand();
}

void runWithoutKeeper() {
  startProgram({"/proc/self/exe", kWithoutKeeper});
  awaitCommand();
}

// Empty when there is none.
std::string contentsOf(const std::string &path) {
  std::ifstream file(path);
  return {std::istreambuf_iterator<char>(file), {}};
}

// 0 for a process that has ended.
size_t anonymousBytes(const std::string &process) {
  constexpr char kLabel[] = "Anonymous:";
  constexpr size_t kKiB = 1024;
  const std::string memory = contentsOf("/proc/" + process + "/smaps_rollup");
  const size_t place = memory.find(kLabel);
  if (place == std::string::npos) return 0;
  return std::stoul(memory.substr(place + strlen(kLabel))) * kKiB;
}

// When zeloschedtask has ended, the keeper is left, as a child of this process (a subreaper).
size_t memoryOfKeeper() {
  awaitAll();
  startProgram({ZELO_BIN_DIR "/zeloschedtask", "--run", "id=1", "--now"});
  while (!isRunning()) {
  }
  const std::string self = std::to_string(getpid());
  std::istringstream children(contentsOf("/proc/self/task/" + self + "/children"));
  size_t most = 0;
  for (std::string child; children >> child;) most = std::max(most, anonymousBytes(child));
  orDie(most > 0, "finding the keeper");
  awaitCommand();
  awaitAll();
  return most;
}

// With kWithoutKeeper this program starts a run and exits.
__attribute__((constructor)) void startWhenAsked(int argc, char **argv) {
  if (argc == 2 && strcmp(argv[1], kWithoutKeeper) == 0) {
    _exit(ZELOSchedTaskRun(kId, 0, 0) == 0 ? EXIT_SUCCESS : EXIT_FAILURE);
  }
}

}  // namespace

void makeRows() {
  storeTask();
  prctl(PR_SET_CHILD_SUBREAPER, 1);
  Row("zeloschedtask to the command", Work{runWithKeeper, nullptr, awaitAll})
      .atMost(1.3, "the same without a keeper", Work{runWithoutKeeper, nullptr, awaitAll});
  Row("anonymous memory of a keeper", Footprint{memoryOfKeeper}).atMost(1, "1 MiB", Footprint{[] {
                                                                          return size_t{1} << 20;
                                                                        }});
  Row("ZELOSchedTaskRun to the command", Work{run, nullptr, awaitEnd})
      .atMost(2, "fork, /bin/sh -c true", Work{forkShell, nullptr, awaitEnd})
      .atMost(1.3, "two forks, the record, the owner, the shell",
              Work{runWithoutTheRest, nullptr, awaitEnd});
}
