// The crontab line of any record: at most one line is added, and the others stay as they were.
#include <fcntl.h>
#include <unistd.h>
#include <zelocore.h>
#include <zelosched.h>

#include <fstream>
#include <sstream>
#include <string>

#include "fuzz_input.h"

namespace {

constexpr char kOther[] = "17 * * * * root /bin/true\n";

void writeText(const char *path, const std::string &text) {
  std::ofstream(path, std::ios::trunc) << text;
}

std::string readText(const char *path) {
  std::stringstream text;
  text << std::ifstream(path).rdbuf();
  return text.str();
}

}  // namespace

extern "C" int nanosleep(const timespec *, timespec *) {
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  FuzzInput input(data, size);
  ZELO_SCHED_TASK *task = anyTask(&input);
  task->State = ZELO_SCHED_STATE_ENABLED;
  PSZHASH hash = QLIBCSzHashAlloc(64);
  require(ZELOSchedInitHashFromTask(&hash, task) == 0);
  unlink("/tmp/scheduled_tasks");
  require(QLIBCFileAddSection("/tmp/scheduled_tasks", "1", hash, 0) == 1);
  QLIBCSzHashFree(hash);
  writeText("/etc/crontab", kOther);
  ZELOSchedTaskSync();
  const std::string crontab = readText("/etc/crontab");
  require(crontab.starts_with(kOther));
  const std::string added = crontab.substr(sizeof(kOther) - 1);
  require(added.empty() || added.find('\n') == added.size() - 1);
  return 0;
}
