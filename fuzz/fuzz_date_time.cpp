// Dates and times as texts.
#include <zelosched.h>

#include "fuzz_input.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  const std::string text(reinterpret_cast<const char *>(data), size);
  ZELO_SCHED_DATE date = {};
  if (ZELOSchedDateParse(text.c_str(), &date) == 0) {
    require(date.year <= 9999 && date.month <= 99 && date.day <= 999);
  }
  if (ZELOSchedTimeParse(text.c_str(), &date) == 0) {
    require(date.hour <= 9999 && date.minute <= 9999);
  }
  ZELOSchedDateNormalize(&date);
  return 0;
}
