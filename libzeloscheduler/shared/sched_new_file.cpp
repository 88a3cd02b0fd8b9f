#include "sched_new_file.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>

namespace {

bool sync(const char *szPath, int flags) {
  const int descriptor = open(szPath, O_RDONLY | O_CLOEXEC | flags);
  if (descriptor < 0) {
    return false;
  }
  const bool isSynced = fsync(descriptor) == 0;
  close(descriptor);
  return isSynced;
}

}  // namespace

bool schedSyncFile(const char *szPath) {
  return sync(szPath, 0);
}

bool schedSyncDirectory(const char *szPath) {
  return sync(szPath, O_DIRECTORY);
}

SchedNewFile::SchedNewFile(const char *szBeside) {
  const int length = snprintf(path_, sizeof(path_), "%s.XXXXXX", szBeside);
  if (length < 0 || static_cast<size_t>(length) >= sizeof(path_)) {
    path_[0] = '\0';  // which mkostemp refuses
  }
}

SchedNewFile::~SchedNewFile() {
  stream_.reset();
  if (isMade_) {
    unlink(path_);
  }
}

bool SchedNewFile::open() {
  const int descriptor = mkostemp(path_, O_CLOEXEC);
  if (descriptor < 0) {
    return false;
  }
  isMade_ = true;
  stream_.reset(fdopen(descriptor, "w"));
  if (stream_ == nullptr) {
    close(descriptor);
    return false;
  }
  return true;
}

bool SchedNewFile::write(std::string_view bytes) {
  return fwrite(bytes.data(), 1, bytes.size(), stream_.get()) == bytes.size();
}

bool SchedNewFile::finish(const struct stat &like) {
  constexpr mode_t kModeBits = 0xFFF;
  FILE *stream = stream_.get();
  const int descriptor = fileno(stream);
  return fflush(stream) == 0 && fsync(descriptor) == 0 &&
         fchown(descriptor, like.st_uid, like.st_gid) == 0 &&
         fchmod(descriptor, like.st_mode & kModeBits) == 0 && fclose(stream_.release()) == 0;
}

bool SchedNewFile::rename(const char *szPath) {
  if (::rename(path_, szPath) != 0) {
    return false;
  }
  isMade_ = false;
  return true;
}
