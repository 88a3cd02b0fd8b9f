/*
 * What every unit of the library shares: reporting a failure, stopping
 * exceptions at the C boundary, and the guard of a file descriptor.
 */
#ifndef ZELOCORE_SUPPORT_H
#define ZELOCORE_SUPPORT_H

#include <unistd.h>

#include <cstring>
#include <exception>
#include <source_location>
#include <utility>

#include "zelocore.h"

namespace zelo {

/* Sets the error record to the caller's own file and line; always -1, so that
 * a failing function can return the call. */
inline int Fail(int code, std::source_location where = std::source_location::current()) noexcept {
  const char *slash = std::strrchr(where.file_name(), '/');
  QLIBCErrSetEx(code, slash != nullptr ? slash + 1 : where.file_name(),
                static_cast<int>(where.line()));
  return -1;
}

/* Runs the body of an exported function. The containers throw only for want of
 * memory (bad_alloc, length_error), hence the one code. */
template <typename Result, typename Body>
Result AtBoundary(Result failed, Body &&body,
                  std::source_location where = std::source_location::current()) noexcept {
  try {
    return std::forward<Body>(body)();
  } catch (const std::exception &) {
    Fail(QLIBC_ERR_OUT_OF_MEMORY, where);
    return failed;
  }
}

class Descriptor {
 public:
  explicit Descriptor(int fd) noexcept : fd_(fd) {}
  Descriptor(const Descriptor &) = delete;
  Descriptor &operator=(const Descriptor &) = delete;
  ~Descriptor() { Close(); }

  bool valid() const noexcept { return fd_ >= 0; }
  int get() const noexcept { return fd_; }

  int Take() noexcept { return std::exchange(fd_, -1); }

  /* For writers: some file systems report a full disk only here. */
  bool Close() noexcept { return fd_ < 0 || close(std::exchange(fd_, -1)) == 0; }

 private:
  int fd_;
};

}  // namespace zelo

#endif
