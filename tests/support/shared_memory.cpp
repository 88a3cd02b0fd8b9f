#include "shared_memory.h"

#include <sys/mman.h>
#include <unistd.h>

#include <atomic>
#include <cstdint>
#include <cstring>

namespace support {

void *sharedMemory(size_t size) {
  void *memory = mmap(nullptr, size, PROT_READ | PROT_WRITE,
                      MAP_SHARED | MAP_ANONYMOUS | MAP_NORESERVE, -1, 0);
  if (memory == MAP_FAILED) __builtin_trap();
  return memory;
}

namespace {

struct Header {
  int32_t number;
  uint32_t length;
  pid_t process;
};

constexpr size_t kAlignment = alignof(Header);

size_t recordSize(size_t length) {
  return (sizeof(Header) + length + kAlignment - 1) / kAlignment * kAlignment;
}

}  // namespace

struct SharedLines::Area {
  std::atomic<size_t> reserved;
  alignas(kAlignment) char records[1];
};

SharedLines::SharedLines(size_t capacity)
    : area_(static_cast<Area *>(sharedMemory(sizeof(Area) + capacity))), capacity_(capacity) {}

void SharedLines::append(int number, std::string_view text) {
  const size_t size = recordSize(text.size());
  const size_t start = area_->reserved.fetch_add(size);
  if (start + size > capacity_) {
    area_->reserved.fetch_sub(size);
    return;
  }
  const Header header{number, static_cast<uint32_t>(text.size()), getpid()};
  std::memcpy(area_->records + start + sizeof(header), text.data(), text.size());
  std::memcpy(area_->records + start, &header, sizeof(header));
}

std::vector<SharedLines::Line> SharedLines::lines() const {
  std::vector<Line> lines;
  const size_t end = area_->reserved.load();
  for (size_t at = 0; at < end;) {
    Header header;
    std::memcpy(&header, area_->records + at, sizeof(header));
    lines.push_back(
        {header.number, {area_->records + at + sizeof(header), header.length}, header.process});
    at += recordSize(header.length);
  }
  return lines;
}

std::vector<std::string> SharedLines::texts() const {
  std::vector<std::string> texts;
  for (Line &line : lines()) texts.push_back(std::move(line.text));
  return texts;
}

void SharedLines::clear() {
  area_->reserved.store(0);
}

}  // namespace support
