// The memory that a list takes at its peak, beside its records and twice its file.
#include <fcntl.h>
#include <malloc.h>
#include <sys/wait.h>
#include <unistd.h>
#include <zelosched.h>

#include <cstdlib>
#include <cstring>
#include <string>

#include "support/row.h"
#include "support/stored_tasks.h"

namespace {

int awaited;
size_t atPeak;

// Page by page: the numbers that the kernel keeps of a process are some hundred KiB behind.
size_t residentBytes() {
  constexpr char kLabel[] = "Rss:";
  constexpr size_t kKiB = 1024;
  static char text[4096];
  const int file = open("/proc/self/smaps_rollup", O_RDONLY | O_CLOEXEC);
  const ssize_t size = read(file, text, sizeof(text) - 1);
  orDie(size > 0 && close(file) == 0, "/proc/self/smaps_rollup");
  text[size] = '\0';
  const char *line = strstr(text, kLabel);
  orDie(line != nullptr, "finding the resident pages");
  return strtoul(line + strlen(kLabel), nullptr, 10) * kKiB;
}

// At the last task nothing that a list takes has been given back.
int lookAtPeak(const ZELO_SCHED_TASK *) {
  if (--awaited == 0) {
    atPeak = residentBytes();
  }
  return 1;
}

void list(int count) {
  ZELO_SCHED_TASK *tasks = nullptr;
  awaited = count;
  orDie(ZELOSchedTaskListGet(&tasks, lookAtPeak) == count, "ZELOSchedTaskListGet");
  ZELOSchedTaskListFree(&tasks);
}

size_t peakOfList(int count) {
  list(count);  // what the process needs but once
  forgetStore();
  malloc_trim(0);
  const size_t before = residentBytes();
  list(count);
  return atPeak - before;
}

// In a process of its own, which has not grown before.
size_t inChild(size_t (*measure)(int), int count) {
  int result[2];
  orDie(pipe(result) == 0, "pipe");
  const pid_t child = fork();
  size_t bytes = 0;
  if (child == 0) {
    bytes = measure(count);
    _exit(write(result[1], &bytes, sizeof(bytes)) == sizeof(bytes) ? EXIT_SUCCESS : EXIT_FAILURE);
  }
  int status = 0;
  orDie(child > 0 && close(result[1]) == 0 &&
            read(result[0], &bytes, sizeof(bytes)) == sizeof(bytes) && close(result[0]) == 0 &&
            waitpid(child, &status, 0) == child,
        "measuring in a process of its own");
  return bytes;
}

void compareMemory(int count) {
  const auto peak = [count] {
    fillStore(count);
    return inChild(peakOfList, count);
  };
  const auto recordsAndFile = [count] {
    fillStore(count);
    return static_cast<size_t>(count) * sizeof(ZELO_SCHED_TASK) + 2 * readStore();
  };
  const std::string tasks = ", " + std::to_string(count) + " tasks";
  Row("peak of ZELOSchedTaskListGet" + tasks, Footprint{peak})
      .atMost(1, "the records and twice the file" + tasks, Footprint{recordsAndFile});
}

}  // namespace

void makeRows() {
  for (const int count : {10, 100, 1000, 10000}) {
    compareMemory(count);
  }
}
