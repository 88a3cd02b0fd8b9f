// The implementation of a text list, for units that append texts without a terminating zero.
#ifndef ZELOCORE_SZLIST_H
#define ZELOCORE_SZLIST_H

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

#include "zelocore.h"

struct QLIBC_SZLIST {
 public:
  explicit QLIBC_SZLIST(size_t capacity);

  // The text may be of this very list. Throws when memory is short, with the list as it was.
  void push(std::string_view text);
  // Removes all texts but the first `count`.
  void truncate(size_t count) noexcept;

  size_t count() const noexcept { return starts_.size(); }
  const char *at(size_t index) const noexcept { return arena_.c_str() + starts_[index]; }

 private:
  std::string arena_;
  std::vector<size_t> starts_;
};

#endif
