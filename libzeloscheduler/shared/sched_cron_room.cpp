#include "sched_cron_room.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>

namespace {

constexpr char kCrontab[] = "/etc/crontab";

size_t countLines(int descriptor) {
  char block[1 << 14];
  size_t lines = 0;
  bool isEnded = true;
  ssize_t count = 0;
  while ((count = read(descriptor, block, sizeof(block))) > 0) {
    lines += static_cast<size_t>(std::count(block, block + count, '\n'));
    isEnded = block[count - 1] == '\n';
  }
  if (count < 0) {
    return 0;
  }
  return isEnded ? lines : lines + 1;
}

}  // namespace

size_t schedCountCronLines() {
  const int descriptor = open(kCrontab, O_RDONLY | O_CLOEXEC);
  if (descriptor < 0) {
    return 0;
  }
  const size_t lines = countLines(descriptor);
  close(descriptor);
  return lines;
}

bool schedHasCronRoom(size_t lines) {
  return lines == 0 || schedCountCronLines() + lines <= kSchedMostFilledCronLines;
}
