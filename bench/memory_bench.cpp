// The peak memory of a list, compared with the size of its records and twice its file.
#include <dlfcn.h>
#include <fcntl.h>
#include <malloc.h>
#include <sys/wait.h>
#include <unistd.h>
#include <zelocore.h>
#include <zelosched.h>

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <string>

#include "support/row.h"
#include "support/stored_tasks.h"

namespace {

size_t atPeak;

// Counted page by page: the counters in /proc/self/status lag by some hundred KiB.
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

size_t peakOfList(int count) {
  list(count);  // allocates what a process allocates once
  forgetStore();
  malloc_trim(0);
  const size_t before = residentBytes();
  atPeak = before;
  list(count);
  return atPeak - before;
}

// In a child process, so that no measurement affects the heap of the next.
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

// The first thing that a list frees is the last section's hash, when it has allocated all its
// records.
extern "C" __attribute__((visibility("default"))) void QLIBCSzHashFree(PSZHASH pHash) {
  static const auto real =
      reinterpret_cast<decltype(&QLIBCSzHashFree)>(dlsym(RTLD_NEXT, "QLIBCSzHashFree"));
  atPeak = std::max(atPeak, residentBytes());
  real(pHash);
}

void makeRows() {
  for (const int count : {10, 100, 1000, 10000}) {
    compareMemory(count);
  }
}
