// The inside of a text hash, for the units that fill one or write one out without going through
// zero-terminated texts.
#ifndef ZELOCORE_SZHASH_H
#define ZELOCORE_SZHASH_H

#include <cstddef>
#include <map>
#include <memory_resource>
#include <string>
#include <string_view>

#include "zelocore.h"

// Most keys differ in their length, and need no comparison of texts then.
struct ShorterFirst {
  using is_transparent = void;
  bool operator()(std::string_view a, std::string_view b) const noexcept {
    return a.size() != b.size() ? a.size() < b.size() : a < b;
  }
};

// Ordered: keys come from outside (members of a JSON text, say), and nobody can choose any that
// take longer to find than others. One block of memory serves for all entries of a task, and is
// given back when the hash is emptied.
struct QLIBC_SZHASH {
 public:
  // The texts may lie in this very hash. Throws std::bad_alloc, and leaves the hash as it was
  // then.
  void set(std::string_view key, std::string_view value);
  void clear() noexcept;

  const auto &entries() const noexcept { return entries_; }

 private:
  static constexpr size_t kBlock = 8192;

  std::pmr::monotonic_buffer_resource memory_{kBlock};
  std::pmr::map<std::pmr::string, std::pmr::string, ShorterFirst> entries_{&memory_};
};

#endif
