// What every unit of the library shares: reporting a failure, stopping exceptions at the C
// boundary, and the guard of a file descriptor.
#ifndef ZELOCORE_SUPPORT_H
#define ZELOCORE_SUPPORT_H

#include <unistd.h>

#include <cstring>
#include <exception>
#include <utility>

#include "zelocore.h"

namespace zelo {

// A line of the source. As a default argument, here() gives the line of the call.
struct SourceLocation {
  const char *file;
  int line;

  static constexpr SourceLocation here(const char *file = __builtin_FILE(),
                                       int line = __builtin_LINE()) noexcept {
    return {file, line};
  }
};

// Sets the error record, with the caller's file and line. Always -1, so that a failing function
// can return it.
inline int fail(int code, SourceLocation where = SourceLocation::here()) noexcept {
  const char *slash = std::strrchr(where.file, '/');
  QLIBCErrSetEx(code, slash != nullptr ? slash + 1 : where.file, where.line);
  return -1;
}

// Runs the body of an exported function. The containers throw only when memory is short
// (bad_alloc, length_error), hence the one code.
template <typename Result, typename Body>
Result atBoundary(Result failed, Body &&body,
                  SourceLocation where = SourceLocation::here()) noexcept {
  try {
    return std::forward<Body>(body)();
  } catch (const std::exception &) {
    fail(QLIBC_ERR_OUT_OF_MEMORY, where);
    return failed;
  }
}

class Descriptor {
 public:
  explicit Descriptor(int fd) noexcept : fd_(fd) {}
  Descriptor(const Descriptor &) = delete;
  Descriptor &operator=(const Descriptor &) = delete;
  ~Descriptor() { close(); }

  bool valid() const noexcept { return fd_ >= 0; }
  int get() const noexcept { return fd_; }

  // Writers check it: some file systems report a full disk only here.
  bool close() noexcept { return fd_ < 0 || ::close(std::exchange(fd_, -1)) == 0; }

 private:
  int fd_;
};

}  // namespace zelo

#endif
