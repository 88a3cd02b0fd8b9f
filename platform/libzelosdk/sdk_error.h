/*
 * Reporting a failure of this library in the platform's error record.
 */
#ifndef ZELOSDK_SDK_ERROR_H
#define ZELOSDK_SDK_ERROR_H

#include <zelocore.h>

#include <cstring>
#include <source_location>

namespace zelo {

/* Sets the error record to the caller's own file and line, and returns what
 * the failing function returns. */
inline int FailWith(int result, int code,
                    std::source_location where = std::source_location::current()) noexcept {
  const char *slash = std::strrchr(where.file_name(), '/');
  QLIBCErrSetEx(code, slash != nullptr ? slash + 1 : where.file_name(),
                static_cast<int>(where.line()));
  return result;
}

}  // namespace zelo

#endif
