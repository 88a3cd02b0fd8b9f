#include "store/place_file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "terminal/failure.h"

namespace {

constexpr uid_t kRoot = 0;
constexpr gid_t kRootsGroup = 0;
constexpr size_t kMostBytes = 256 << 20;  // far above every store: what is larger is none

Failure cannot(const char *what, const std::string &path) {
  const int reason = errno;
  return Failure(std::string("cannot ") + what + " " + path + ": " + std::strerror(reason));
}

class Descriptor {
 public:
  explicit Descriptor(int file) : file_(file) {}
  ~Descriptor() {
    if (file_ >= 0) close(file_);
  }
  Descriptor(const Descriptor &) = delete;
  Descriptor &operator=(const Descriptor &) = delete;
  int get() const { return file_; }

 private:
  int file_;
};

void syncDirectoryOf(const std::string &path) {
  const std::string directory = path.substr(0, path.rfind('/'));
  const Descriptor file(open(directory.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (file.get() < 0 || fsync(file.get()) != 0) throw cannot("write", directory);
}

void requireFile(int file, const std::string &path) {
  struct stat info {};
  if (fstat(file, &info) != 0) throw cannot("examine", path);
  if (!S_ISREG(info.st_mode)) throw Failure(path + " is no regular file");
}

}  // namespace

ScratchFile::ScratchFile(const std::string &path)
    : path_(path + ".XXXXXX"), file_(mkostemp(path_.data(), O_CLOEXEC)) {
  if (file_ < 0) throw cannot("make a file beside", path);
}

ScratchFile::~ScratchFile() {
  close(file_);
  if (!isPlaced_) unlink(path_.c_str());
}

void ScratchFile::fill(const std::string &contents, mode_t mode) {
  size_t done = 0;
  while (done < contents.size()) {
    const ssize_t written = write(file_, contents.data() + done, contents.size() - done);
    if (written < 0 && errno == EINTR) continue;
    if (written <= 0) throw cannot("write", path_);
    done += static_cast<size_t>(written);
  }
  if (fchown(file_, kRoot, kRootsGroup) != 0 || fchmod(file_, mode) != 0 || fsync(file_) != 0) {
    throw cannot("write", path_);
  }
}

void ScratchFile::moveTo(const std::string &path) {
  if (rename(path_.c_str(), path.c_str()) != 0) throw cannot("replace", path);
  isPlaced_ = true;
}

std::string contentsOf(const std::string &path) {
  // Not blocking, for a FIFO would hang the open.
  const Descriptor file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY));
  if (file.get() < 0) throw cannot("open", path);
  requireFile(file.get(), path);
  std::string contents;
  char block[1 << 16];
  for (;;) {
    const ssize_t count = read(file.get(), block, sizeof block);
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) throw cannot("read", path);
    if (count == 0) return contents;
    contents.append(block, static_cast<size_t>(count));
    if (contents.size() > kMostBytes) throw Failure(path + " is too large");
  }
}

void placeFile(const std::string &path, const std::string &contents, mode_t mode) {
  ScratchFile scratch(path);
  scratch.fill(contents, mode);
  scratch.moveTo(path);
  syncDirectoryOf(path);
}
