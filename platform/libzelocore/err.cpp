// The process-wide error record.
#include <algorithm>
#include <cstring>

#include "zelocore.h"

namespace {

// Enough for the names of source files. A longer one is cut, as setting the record must not
// allocate memory.
constexpr size_t kFileRoom = 256;

struct ErrorRecord {
  int code;
  int line;
  char file[kFileRoom];
};

ErrorRecord gRecord;

}  // namespace

void QLIBCErrSetEx(int code, const char *szFile, int line) {
  const char *file = szFile != nullptr ? szFile : "";
  const size_t size = std::min(std::strlen(file), kFileRoom - 1);

  gRecord.code = code;
  gRecord.line = line;
  // A caller may hand the record's own text back.
  std::memmove(gRecord.file, file, size);
  gRecord.file[size] = '\0';
}

int QLIBCErrGet(void) {
  return gRecord.code;
}

const char *QLIBCErrorGetFile(void) {
  return gRecord.file;
}

int QLIBCErrorGetLine(void) {
  return gRecord.line;
}
