#include "store/place_file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
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

void requireFile(int file, const std::string &path) {
  struct stat info {};
  if (fstat(file, &info) != 0) throw cannot("examine", path);
  if (!S_ISREG(info.st_mode)) throw Failure(path + " is no regular file");
}

std::string directoryOf(const std::string &path) {
  const size_t slash = path.rfind('/');
  if (slash == std::string::npos) return ".";
  return slash == 0 ? "/" : path.substr(0, slash);
}

std::string withoutSuffix(const std::string &path) {
  return path.substr(0, path.rfind('.'));
}

}  // namespace

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

std::string contentsIfReadable(const std::string &path) {
  try {
    return contentsOf(path);
  } catch (const Failure &) {
    return "";
  }
}

void fill(SchedNewFile *file, const std::string &contents, mode_t mode) {
  if (!file->open()) throw cannot("make a file beside", withoutSuffix(file->path()));
  struct stat like {};
  like.st_uid = kRoot;
  like.st_gid = kRootsGroup;
  like.st_mode = mode;
  if (!file->write(contents) || !file->finish(like)) throw cannot("write", file->path());
}

void placeFile(const std::string &path, const std::string &contents, mode_t mode) {
  SchedNewFile file(path.c_str());
  fill(&file, contents, mode);
  if (!file.rename(path.c_str())) throw cannot("replace", path);
  const std::string directory = directoryOf(path);
  if (!schedSyncDirectory(directory.c_str())) throw cannot("write", directory);
}
