#include "runs/start_run.h"

#include <fcntl.h>
#include <sqlite3.h>
#include <unistd.h>

#include <cstdio>
#include <iterator>

#include "store/task_list.h"
#include "terminal/failure.h"

namespace {

constexpr int kFirstOwnDescriptor = STDERR_FILENO + 1;

int openNowhere(int access) {
  return open("/dev/null", access | O_CLOEXEC);
}

// While one of these lives, standard output and error lead there, and standard input leads nowhere.
class LentStreams {
 public:
  explicit LentStreams(int output) {
    for (size_t i = 0; i < std::size(kept_); ++i) {
      kept_[i] = fcntl(static_cast<int>(i), F_DUPFD_CLOEXEC, kFirstOwnDescriptor);
    }
    const int nowhere = openNowhere(O_RDONLY);
    dup2(nowhere, STDIN_FILENO);
    close(nowhere);
    dup2(output, STDOUT_FILENO);
    dup2(output, STDERR_FILENO);
  }
  ~LentStreams() {
    for (size_t i = 0; i < std::size(kept_); ++i) {
      dup2(kept_[i], static_cast<int>(i));
      close(kept_[i]);
    }
  }
  LentStreams(const LentStreams &) = delete;
  LentStreams &operator=(const LentStreams &) = delete;

 private:
  int kept_[kFirstOwnDescriptor];
};

// A run that cannot be recorded ends at once, which only the system log says.
void requireRecords() {
  forgetError();
  sqlite3 *const database = ZELOSchedDBInit();
  if (database == nullptr) throw failedTo("record a run in /tmp/sched_status.sqlite");
  sqlite3_close(database);
}

}  // namespace

void startRun(const ZELO_SCHED_TASK &task, int output, Disabled disabled) {
  std::fflush(stdout);
  const LentStreams streams(output);
  requireRecords();
  forgetError();
  constexpr int kAnyTime = 0;
  if (ZELOSchedTaskRun(task.ID, kAnyTime, static_cast<int>(disabled)) < 0) {
    throw failedTo("run " + titleOf(task));
  }
}

void startRunUnseen(const ZELO_SCHED_TASK &task, Disabled disabled) {
  const int nowhere = openNowhere(O_WRONLY);
  try {
    startRun(task, nowhere, disabled);
  } catch (...) {
    close(nowhere);
    throw;
  }
  close(nowhere);
}
