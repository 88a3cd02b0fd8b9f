// Checking arguments and reporting failures. These are macros so that each log line has the file
// and the line of the failure.
#ifndef SCHED_REPORT_H
#define SCHED_REPORT_H

#include <syslog.h>
#include <zelocore.h>

#include <cerrno>
#include <cstring>

#include "sched_text.h"

enum SchedError : int {
  kErrArrayAlloc = 0x0100,
  kErrRecordAlloc = 0x0200,
  kErrLock = 0x0400,
  kErrUnlock = 0x0500,
  kErrOpen = 0x0900,
  kErrIo = 0x0B00,
  kErrBadArgument = 0x0D00,
  kErrNotFound = 0x2000,
  kErrStat = 0x2700,
  kErrRename = 0x2800,
  kErrSystem = 0x2A00,
  kErrMalformed = 0x4000,
};

// A source location, for a shared routine that reports failures at its caller's line.
struct SchedSourceLocation {
  constexpr SchedSourceLocation(const char *szFile, int lineNumber)
      : file(szFile), line(lineNumber) {}
  const char *file;
  int line;
};

#define SCHED_HERE SchedSourceLocation(__FILE_NAME__, __LINE__)

#define SCHED_LOG_AT(location, format, ...) \
  syslog(LOG_ERR, "%s:%d " format, (location).file, (location).line __VA_OPT__(, ) __VA_ARGS__)

#define SCHED_LOG(format, ...) SCHED_LOG_AT(SCHED_HERE, format __VA_OPT__(, ) __VA_ARGS__)

// For a failed call of the C library: the line ends with the text of errno.
#define SCHED_LOG_ERRNO(format, ...) \
  SCHED_LOG(format "%s" __VA_OPT__(, ) __VA_ARGS__, strerror(errno))

// On some platforms it is null before the first failure.
inline const char *schedErrorFile() {
  const char *szFile = QLIBCErrorGetFile();
  return szFile != nullptr ? szFile : "";
}

// For a failure passed up from a callee: its error record is appended to the line and stays as it
// is. `format` ends with the text before the bracket.
#define SCHED_LOG_CALLEE_AT(location, format, ...)                           \
  SCHED_LOG_AT(location, format "[0x%04X %s:%d]" __VA_OPT__(, ) __VA_ARGS__, \
               static_cast<unsigned>(QLIBCErrGet()), schedErrorFile(), QLIBCErrorGetLine())

#define SCHED_LOG_CALLEE(format, ...) \
  SCHED_LOG_CALLEE_AT(SCHED_HERE, format __VA_OPT__(, ) __VA_ARGS__)

#define SCHED_SET_ERROR(code) QLIBCErrSetEx((code), __FILE_NAME__, __LINE__)

// Saves the error record of a failure, to restore it after calls that may set another.
class SchedErrorRecord {
 public:
  SchedErrorRecord() : code_(QLIBCErrGet()), line_(QLIBCErrorGetLine()) {
    copyText(file_, schedErrorFile());
  }
  void restore() const { QLIBCErrSetEx(code_, file_, line_); }

 private:
  int code_;
  int line_;
  char file_[256];
};

#define SCHED_REPORT_BAD_ARGUMENT(text)                 \
  do {                                                  \
    SCHED_LOG("Invaild Argument (%s)=[%d]\n", text, 0); \
    SCHED_SET_ERROR(kErrBadArgument);                   \
  } while (0)

// `text` is the condition as the interface has it in the log, where programs match on it; it need
// not be that of the code.
#define SCHED_CHECK_ARG(condition, text, result) \
  do {                                           \
    if (!(condition)) {                          \
      SCHED_REPORT_BAD_ARGUMENT(text);           \
      return result;                             \
    }                                            \
  } while (0)

#endif
