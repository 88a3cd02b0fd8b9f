#include "read_file.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>

namespace zelo {
namespace {

// Far above any file of the platform.
constexpr off_t kMostFileBytes = off_t{1} << 30;

bool sameTime(const timespec &a, const timespec &b) noexcept {
  return a.tv_sec == b.tv_sec && a.tv_nsec == b.tv_nsec;
}

}  // namespace

bool readAll(int fd, size_t expected, std::string *contents) {
  constexpr size_t kLeastStep = 4096;
  contents->resize(expected + 1);  // one byte more, so that the end is seen without growing
  for (size_t size = 0;;) {
    if (size == contents->size()) {
      contents->resize(size + size / 2 + kLeastStep);
    }
    const ssize_t count = read(fd, contents->data() + size, contents->size() - size);
    if (count < 0 && errno == EINTR) {
      continue;
    }
    if (count < 0 || size > static_cast<size_t>(kMostFileBytes)) {
      return false;
    }
    if (count == 0) {
      contents->resize(size);
      return true;
    }
    size += static_cast<size_t>(count);
  }
}

bool sameContents(const struct stat &a, const struct stat &b) noexcept {
  return a.st_dev == b.st_dev && a.st_ino == b.st_ino && a.st_size == b.st_size &&
         sameTime(a.st_mtim, b.st_mtim) && sameTime(a.st_ctim, b.st_ctim);
}

int readFile(const std::string &path, int flags, FileContents *file, SourceLocation where) {
  // O_NONBLOCK, as opening a FIFO would block.
  const Descriptor opened(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY | flags));
  if (!opened.valid()) {
    return fail(QLIBC_ERR_OPEN, where);
  }
  if (fstat(opened.get(), &file->status) != 0) {
    return fail(QLIBC_ERR_IO, where);
  }
  if (!S_ISREG(file->status.st_mode)) {
    return fail(QLIBC_ERR_OPEN, where);
  }
  struct stat after;
  if (file->status.st_size > kMostFileBytes ||
      !readAll(opened.get(), static_cast<size_t>(file->status.st_size), &file->text) ||
      fstat(opened.get(), &after) != 0) {
    return fail(QLIBC_ERR_IO, where);
  }
  file->steady = sameContents(file->status, after);
  return 0;
}

}  // namespace zelo
