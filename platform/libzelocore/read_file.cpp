#include "read_file.h"

#include <unistd.h>

#include <cerrno>

namespace zelo {

bool ReadAll(int fd, size_t expected, std::string *contents) {
  constexpr size_t kLeastStep = 4096;
  size_t filled = 0;
  contents->resize(expected + 1); /* the one more sees the end without another step */
  for (;;) {
    if (filled == contents->size()) {
      contents->resize(filled + filled / 2 + kLeastStep);
    }
    const ssize_t count = read(fd, contents->data() + filled, contents->size() - filled);
    if (count < 0 && errno == EINTR) {
      continue;
    }
    if (count < 0 || filled > static_cast<size_t>(kMostFileBytes)) {
      return false;
    }
    if (count == 0) {
      contents->resize(filled);
      return true;
    }
    filled += static_cast<size_t>(count);
  }
}

}  // namespace zelo
