// The implementation of a text hash, for units that fill or write one without zero-terminated
// texts.
#ifndef ZELOCORE_SZHASH_H
#define ZELOCORE_SZHASH_H

#include <cstddef>
#include <map>
#include <memory_resource>
#include <string>
#include <string_view>

#include "zelocore.h"

// Most keys differ in length, so that their texts need no comparison.
struct ShorterFirst {
  using is_transparent = void;
  bool operator()(std::string_view a, std::string_view b) const noexcept {
    return a.size() != b.size() ? a.size() < b.size() : a < b;
  }
};

// A tree, since keys come from outside (members of a JSON text, say) and could be chosen to
// collide in a hash table. Memory is taken in blocks, and freed when the hash is emptied.
struct QLIBC_SZHASH {
 public:
  // The texts may be of this very hash. Throws std::bad_alloc, with the hash as it was.
  void set(std::string_view key, std::string_view value);
  void clear() noexcept;

  const auto &entries() const noexcept { return entries_; }

 private:
  static constexpr size_t kBlock = 8192;

  std::pmr::monotonic_buffer_resource memory_{kBlock};
  std::pmr::map<std::pmr::string, std::pmr::string, ShorterFirst> entries_{&memory_};
};

#endif
