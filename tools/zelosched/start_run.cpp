#include "start_run.h"

#include <fcntl.h>
#include <sqlite3.h>
#include <unistd.h>

#include <cstdio>
#include <iterator>

#include "failure.h"
#include "task_list.h"

namespace {

// While one of these lives, the standard streams lead nowhere.
class NoStreams {
 public:
  NoStreams() {
    const int nowhere = open("/dev/null", O_RDWR | O_CLOEXEC);
    for (size_t i = 0; i < std::size(kept_); ++i) {
      const int stream = static_cast<int>(i);
      kept_[i] = fcntl(stream, F_DUPFD_CLOEXEC, STDERR_FILENO + 1);
      dup2(nowhere, stream);
    }
    close(nowhere);
  }
  ~NoStreams() {
    for (size_t i = 0; i < std::size(kept_); ++i) {
      dup2(kept_[i], static_cast<int>(i));
      close(kept_[i]);
    }
  }
  NoStreams(const NoStreams &) = delete;
  NoStreams &operator=(const NoStreams &) = delete;

 private:
  int kept_[STDERR_FILENO + 1];
};

// A run that cannot be recorded ends at once, which only the system log says.
void requireRecords() {
  forgetError();
  sqlite3 *const database = ZELOSchedDBInit();
  if (database == nullptr) throw failedTo("record a run in /tmp/sched_status.sqlite");
  sqlite3_close(database);
}

}  // namespace

void startRun(const ZELO_SCHED_TASK &task, Disabled disabled) {
  requireRecords();
  // The run's process begins as a copy of this one.
  std::fflush(stdout);
  forgetError();
  constexpr int kAnyTime = 0;
  if (ZELOSchedTaskRun(task.ID, kAnyTime, static_cast<int>(disabled)) < 0) {
    throw failedTo("run " + titleOf(task));
  }
}

void startRunUnseen(const ZELO_SCHED_TASK &task, Disabled disabled) {
  std::fflush(stdout);
  const NoStreams nowhere;
  startRun(task, disabled);
}
