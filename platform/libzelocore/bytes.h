/*
 * The contents of a file in memory.
 */
#ifndef ZELOCORE_BYTES_H
#define ZELOCORE_BYTES_H

#include <cstddef>
#include <memory>
#include <string_view>

namespace zelo {

/* A string would be filled with zeros before it is read into, which takes nearly
 * as long as the reading. */
struct Bytes {
  std::unique_ptr<char[]> data;
  size_t size = 0;

  std::string_view text() const noexcept { return {data.get(), size}; }
};

}  // namespace zelo

#endif
