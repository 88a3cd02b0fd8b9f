#include "read_file.h"

#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <utility>

namespace zelo {

namespace {

void Grow(Bytes *contents, size_t *room) {
  constexpr size_t kLeastStep = 4096;
  *room += *room / 2 + kLeastStep;
  auto wider = std::make_unique_for_overwrite<char[]>(*room);
  std::memcpy(wider.get(), contents->data.get(), contents->size);
  contents->data = std::move(wider);
}

}  // namespace

bool ReadAll(int fd, size_t expected, Bytes *contents) {
  size_t room = expected + 1; /* the one more sees the end without another step */
  contents->data = std::make_unique_for_overwrite<char[]>(room);
  contents->size = 0;
  for (;;) {
    if (contents->size == room) {
      Grow(contents, &room);
    }
    const ssize_t count = read(fd, contents->data.get() + contents->size, room - contents->size);
    if (count < 0 && errno == EINTR) {
      continue;
    }
    if (count < 0 || contents->size > static_cast<size_t>(kMostFileBytes)) {
      return false;
    }
    if (count == 0) {
      return true;
    }
    contents->size += static_cast<size_t>(count);
  }
}

}  // namespace zelo
