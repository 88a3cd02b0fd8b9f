#include "sched_new_file.h"

#include <fcntl.h>
#include <unistd.h>
#include <zelocore.h>

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

NewFile::NewFile(const char *szPath, SchedPlace place) : szPath_(szPath), place_(place) {
  snprintf(path_, sizeof(path_), "%s.XXXXXX", szPath);
}

NewFile::~NewFile() {
  stream_.reset();
  if (made_) {
    unlink(path_);
  }
}

int NewFile::fail(int code) const {
  QLIBCErrSetEx(code, place_.file, place_.line);
  return -1;
}

int NewFile::open() {
  const int descriptor = mkstemp(path_);
  if (descriptor < 0) {
    return fail(kErrOpen);
  }
  made_ = true;
  stream_.reset(fdopen(descriptor, "w"));
  if (stream_ == nullptr) {
    close(descriptor);
    return fail(kErrOpen);
  }
  return 0;
}

int NewFile::write(const char *bytes, size_t count) {
  if (fwrite(bytes, 1, count, stream_.get()) != count) {
    return fail(kErrIo);
  }
  endsLine_ = bytes[count - 1] == '\n';
  return 0;
}

int NewFile::writeAllOf(FILE *source) {
  char block[1 << 14];
  size_t count = 0;
  while ((count = fread(block, 1, sizeof(block), source)) > 0) {
    if (write(block, count) < 0) {
      return -1;
    }
  }
  return ferror(source) == 0 ? 0 : fail(kErrIo);
}

int NewFile::finish(const struct stat &old) {
  constexpr mode_t kModeBits = 0xFFF;
  FILE *stream = stream_.get();
  const int descriptor = fileno(stream);
  if (fflush(stream) != 0 || fsync(descriptor) != 0 ||
      fchown(descriptor, old.st_uid, old.st_gid) != 0 ||
      fchmod(descriptor, old.st_mode & kModeBits) != 0 || fclose(stream_.release()) != 0) {
    return fail(kErrIo);
  }
  return 0;
}

int NewFile::replaceOld() {
  if (rename(path_, szPath_) != 0) {
    return fail(kErrRename);
  }
  made_ = false;
  return 0;
}

FileState::FileState(const char *szPath) {
  stat(szPath, &info_);
}

bool FileState::isThatOf(const char *szPath) const {
  struct stat now = {};
  return stat(szPath, &now) == 0 && now.st_size == info_.st_size &&
         now.st_mtim.tv_sec == info_.st_mtim.tv_sec && now.st_mtim.tv_nsec == info_.st_mtim.tv_nsec;
}
