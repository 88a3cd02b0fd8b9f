/*
 * The process-wide error record.
 */
#include <algorithm>
#include <cstring>

#include "zelocore.h"

namespace {

/* Base names of source files; a longer text is cut, since setting the record
 * must work when memory is short. */
constexpr size_t kFileRoom = 256;

struct ErrorRecord {
  int code;
  int line;
  char file[kFileRoom];
};

ErrorRecord g_record;

}  // namespace

void QLIBCErrSetEx(int code, const char *szFile, int line) {
  const char *file = szFile != nullptr ? szFile : "";
  const size_t size = std::min(std::strlen(file), kFileRoom - 1);

  g_record.code = code;
  g_record.line = line;
  /* A caller may hand the record's own text back. */
  std::memmove(g_record.file, file, size);
  g_record.file[size] = '\0';
}

int QLIBCErrGet(void) {
  return g_record.code;
}

const char *QLIBCErrorGetFile(void) {
  return g_record.file;
}

int QLIBCErrorGetLine(void) {
  return g_record.line;
}
