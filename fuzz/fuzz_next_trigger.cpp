// The next trigger time of any record: it ends at once, with a text that ends.
#include <zelosched.h>

#include "fuzz_input.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  FuzzInput input(data, size);
  ZELO_SCHED_TASK *task = anyTask(&input);
  if (ZELOSchedNextTriggerTime(task) == 0) {
    const size_t length = strnlen(task->NextTriggerTime, sizeof(task->NextTriggerTime));
    require(length >= 3 && length < 64);
  }
  return 0;
}
