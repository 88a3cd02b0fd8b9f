#include "runs/output_file.h"

#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <utility>

namespace {

constexpr char kOutputDirectory[] = "/run/zelosched";
constexpr mode_t kOutputDirectoryMode = 0700;  // only root may read what commands print
constexpr mode_t kOutputMode = 0600;
constexpr char kMagic[8] = {'z', 'e', 'l', 'o', 'o', 'u', 't', '1'};

std::string pathOf(const ProcessName &process) {
  return std::string(kOutputDirectory) + "/output." + std::to_string(process.pid) + "." +
         std::to_string(process.born);
}

bool isDirectoryOurs() {
  if (mkdir(kOutputDirectory, kOutputDirectoryMode) != 0 && errno != EEXIST) return false;
  struct stat info {};
  return lstat(kOutputDirectory, &info) == 0 && S_ISDIR(info.st_mode) && info.st_uid == geteuid() &&
         (info.st_mode & (S_IWGRP | S_IWOTH)) == 0;
}

void writeAt(int file, const void *bytes, size_t size, int64_t place) {
  const char *next = static_cast<const char *>(bytes);
  while (size > 0) {
    const ssize_t count = pwrite(file, next, size, place);
    if (count < 0 && errno == EINTR) continue;
    if (count <= 0) return;  // no room: it stays as it was
    next += count;
    size -= static_cast<size_t>(count);
    place += count;
  }
}

}  // namespace

OutputFile OutputFile::make(const ProcessName &process, int64_t first, int64_t last) {
  OutputFile made;
  if (isDirectoryOurs()) {
    made.path_ = pathOf(process);
    unlink(made.path_.c_str());
    made.file_ =
        ::open(made.path_.c_str(), O_RDWR | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, kOutputMode);
  }
  if (made.file_ < 0) {
    made.path_.clear();
    made.file_ = memfd_create("output", MFD_CLOEXEC);
  }
  std::memcpy(made.header_.magic, kMagic, sizeof kMagic);
  made.header_.first = first;
  made.header_.last = last;
  if (made.isOpen()) writeAt(made.file_, &made.header_, sizeof made.header_, 0);
  return made;
}

OutputFile OutputFile::open(const ProcessName &process) {
  OutputFile found;
  if (process.pid <= 0 || !isDirectoryOurs()) return found;
  found.path_ = pathOf(process);
  found.file_ = ::open(found.path_.c_str(), O_RDWR | O_NOFOLLOW | O_CLOEXEC);
  if (found.isOpen() && !found.readHeader(&found.header_)) {
    close(found.file_);
    found.file_ = -1;
  }
  return found;
}

OutputFile::~OutputFile() {
  if (isOpen()) close(file_);
}

OutputFile::OutputFile(OutputFile &&other) noexcept {
  *this = std::move(other);
}

OutputFile &OutputFile::operator=(OutputFile &&other) noexcept {
  std::swap(file_, other.file_);
  std::swap(path_, other.path_);
  std::swap(header_, other.header_);
  return *this;
}

bool OutputFile::readHeader(Header *header) const {
  return pread(file_, header, sizeof *header, 0) == static_cast<ssize_t>(sizeof *header) &&
         std::memcmp(header->magic, kMagic, sizeof kMagic) == 0 && header->first >= 0 &&
         header->last >= 0 && header->total >= 0;
}

// The first bytes are at the beginning, the last ones in a ring buffer behind them.
void OutputFile::append(std::string_view bytes) {
  if (!isOpen()) return;
  const auto size = static_cast<int64_t>(bytes.size());
  const int64_t end = header_.total + size;
  int64_t from = header_.total;
  if (from < header_.first) {
    const int64_t count = std::min(header_.first - from, size);
    writeAt(file_, bytes.data(), static_cast<size_t>(count),
            static_cast<int64_t>(sizeof header_) + from);
    from += count;
  }
  from = std::max(from, end - header_.last);
  while (from < end) {
    const int64_t place = (from - header_.first) % header_.last;
    const int64_t count = std::min(end - from, header_.last - place);
    writeAt(file_, bytes.data() + (from - header_.total), static_cast<size_t>(count),
            static_cast<int64_t>(sizeof header_) + header_.first + place);
    from += count;
  }
  header_.total = end;
  writeAt(file_, &header_, sizeof header_, 0);
}

void OutputFile::remove() {
  if (!path_.empty()) unlink(path_.c_str());
}

int64_t OutputFile::total() const {
  Header header{};
  return isOpen() && readHeader(&header) ? header.total : 0;
}

// A range of the first bytes, or of the last ones that are still in the ring buffer.
std::string OutputFile::read(const Header &header, int64_t from, int64_t to) const {
  std::string bytes;
  while (from < to) {
    int64_t place = from;
    int64_t count = std::min<int64_t>(to, header.first) - from;
    if (from >= header.first) {
      const int64_t within = (from - header.first) % header.last;
      place = header.first + within;
      count = std::min<int64_t>(to - from, header.last - within);
    }
    const size_t old = bytes.size();
    bytes.resize(old + static_cast<size_t>(count));
    const ssize_t got = pread(file_, &bytes[old], static_cast<size_t>(count),
                              static_cast<int64_t>(sizeof header) + place);
    if (got != count) {
      bytes.resize(old + static_cast<size_t>(std::max<ssize_t>(got, 0)));
      break;
    }
    from += count;
  }
  return bytes;
}

Output OutputFile::contents() const {
  Output output;
  Header header{};
  if (!isOpen() || !readHeader(&header)) return output;
  const int64_t headEnd = std::min(header.first, header.total);
  const int64_t tailStart = std::max(headEnd, header.total - header.last);
  output.head = read(header, 0, headEnd);
  output.tail = read(header, tailStart, header.total);
  output.leftOut = tailStart - headEnd;
  return output;
}

std::string OutputFile::since(int64_t from, int64_t *lost) const {
  *lost = 0;
  Header header{};
  if (!isOpen() || !readHeader(&header) || from >= header.total) return "";
  const int64_t headEnd = std::min(header.first, header.total);
  std::string bytes = from < headEnd ? read(header, from, headEnd) : "";
  const int64_t next = std::max(from, headEnd);
  const int64_t tailStart = std::max(next, header.total - header.last);
  *lost = tailStart - next;
  return bytes + read(header, tailStart, header.total);
}
