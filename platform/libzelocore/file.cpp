// Files as a whole: whether one is there, and making an empty one.
#include <fcntl.h>
#include <sys/stat.h>

#include <cerrno>

#include "support.h"

namespace {

// Not writable by others, whatever the caller's umask: commands in these files are run with the
// rights of their tasks' owners.
constexpr mode_t kNewFileMode = 0644;
// A FIFO must not block the open, and a terminal must not become the controlling one.
constexpr int kOpenFlags = O_WRONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC;

// Two steps, because the kernel may refuse O_CREAT on another user's file in a sticky directory,
// even one that may be written (fs.protected_regular).
int openOrCreate(const char *path) {
  const int fd = open(path, kOpenFlags | O_CREAT | O_EXCL, kNewFileMode);
  return fd < 0 && errno == EEXIST ? open(path, kOpenFlags) : fd;
}

}  // namespace

// A file that stat cannot examine may exist: it must not be taken for missing and made anew.
int QLIBCFileExist(const char *szPath) {
  struct stat status;
  if (szPath == nullptr) {
    return 0;
  }
  return stat(szPath, &status) == 0 || (errno != ENOENT && errno != ENOTDIR) ? 1 : 0;
}

int QLIBCFileTouch(const char *szPath) {
  if (szPath == nullptr) {
    return zelo::fail(QLIBC_ERR_BAD_PARAMETER);
  }
  const zelo::Descriptor file(openOrCreate(szPath));
  struct stat status;
  if (!file.valid() || fstat(file.get(), &status) != 0 || !S_ISREG(status.st_mode) ||
      futimens(file.get(), nullptr) != 0) {
    return zelo::fail(QLIBC_ERR_OPEN);
  }
  return 0;
}
