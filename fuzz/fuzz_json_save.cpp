// Saving a task from any JSON text.
#include <zelosched.h>

#include <string>

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  const std::string text(reinterpret_cast<const char *>(data), size);
  ZELOSchedTaskSaveFromJson(text.c_str(), static_cast<int>(size % 2));
  return 0;
}
