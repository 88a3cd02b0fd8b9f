#include "replace_file.h"

#include <fcntl.h>
#include <stdlib.h>

#include <cerrno>
#include <cstdio>

#include "support.h"

namespace zelo {
namespace {

constexpr mode_t kNewFileMode = 0644;
constexpr mode_t kModeBits = 07777;

// The file being written; removed unless it was renamed.
class Temporary {
 public:
  explicit Temporary(const std::string &beside)
      : name_(beside + ".XXXXXX"), file_(mkostemp(name_.data(), O_CLOEXEC)) {
    exists_ = file_.valid();
  }
  Temporary(const Temporary &) = delete;
  Temporary &operator=(const Temporary &) = delete;
  ~Temporary() {
    if (exists_) {
      unlink(name_.c_str());
    }
  }

  bool exists() const noexcept { return exists_; }
  Descriptor &file() noexcept { return file_; }

  bool renameTo(const std::string &path) noexcept {
    if (std::rename(name_.c_str(), path.c_str()) != 0) {
      return false;
    }
    exists_ = false;
    return true;
  }

 private:
  std::string name_;
  Descriptor file_;
  bool exists_ = false;
};

bool writeAll(int fd, std::string_view contents) noexcept {
  while (!contents.empty()) {
    const ssize_t written = write(fd, contents.data(), contents.size());
    if (written < 0 && errno == EINTR) {
      continue;
    }
    if (written <= 0) {
      return false;
    }
    contents.remove_prefix(static_cast<size_t>(written));
  }
  return true;
}

// The umask can only be read by setting it; a strict one is set for that moment.
mode_t currentMask() noexcept {
  constexpr mode_t kStrict = 0077;
  const mode_t mask = umask(kStrict);
  umask(mask);
  return mask;
}

// The owner is set first: changing it clears mode bits.
bool takeOver(int fd, const struct stat *old) noexcept {
  if (old == nullptr) {
    return fchmod(fd, kNewFileMode & ~currentMask()) == 0;
  }
  struct stat made;
  if (fstat(fd, &made) != 0) {
    return false;
  }
  const bool sameOwner = made.st_uid == old->st_uid && made.st_gid == old->st_gid;
  return (sameOwner || fchown(fd, old->st_uid, old->st_gid) == 0) &&
         fchmod(fd, old->st_mode & kModeBits) == 0;
}

std::string directoryOf(const std::string &path) {
  const size_t slash = path.rfind('/');
  if (slash == std::string::npos) {
    return ".";
  }
  return slash == 0 ? "/" : path.substr(0, slash);
}

bool syncDirectoryOf(const std::string &path) {
  const Descriptor directory(open(directoryOf(path).c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  return directory.valid() && fsync(directory.get()) == 0;
}

}  // namespace

int replaceFile(const std::string &path, std::string_view contents, const struct stat *old,
                Durability durability) {
  const bool synced = durability == Durability::kSynced;
  Temporary temporary(path);
  if (!temporary.exists()) {
    return fail(QLIBC_ERR_OPEN);
  }
  const int fd = temporary.file().get();
  if (!takeOver(fd, old) || !writeAll(fd, contents) || (synced && fsync(fd) != 0) ||
      !temporary.file().close()) {
    return fail(QLIBC_ERR_IO);
  }
  if (!temporary.renameTo(path)) {
    return fail(QLIBC_ERR_RENAME);
  }
  if (synced && !syncDirectoryOf(path)) {
    return fail(QLIBC_ERR_IO);
  }
  return 0;
}

}  // namespace zelo
