// A task from a hash with any texts under its keys, and back: what was read is written the same.
#include <zelocore.h>
#include <zelosched.h>

#include "fuzz_input.h"

namespace {

constexpr const char *kKeys[] = {
    "id",  "run hour", "run min", "name", "app",        "state",       "app name", "action",
    "cmd", "type",     "owner",   "week", "start year", "repeat hour", "app args", "listable"};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  FuzzInput input(data, size);
  PSZHASH hash = QLIBCSzHashAlloc(64);
  for (const char *key : kKeys) {
    QLIBCSzHashSetValue(&hash, key, input.text().c_str());
  }
  static ZELO_SCHED_TASK first;
  static ZELO_SCHED_TASK second;
  first = {};
  second = {};
  if (ZELOSchedInitTaskFromHash(&first, hash) == 0) {
    require(ZELOSchedInitHashFromTask(&hash, &first) == 0);
    require(ZELOSchedInitTaskFromHash(&second, hash) == 0);
    require(second.ID == first.ID && second.Owner == first.Owner);
    require(std::strcmp(second.App, first.App) == 0 || std::strchr(first.App, '\n') != nullptr);
  }
  QLIBCSzHashFree(hash);
  return 0;
}
