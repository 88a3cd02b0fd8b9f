/*
 * The inside of a text hash, for the units that fill one or write one out
 * without going through zero-terminated texts.
 */
#ifndef ZELOCORE_SZHASH_H
#define ZELOCORE_SZHASH_H

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string_view>
#include <vector>

#include "zelocore.h"

/* One hash serves thousands of small sections in turn. All texts therefore lie
 * in one arena, and emptying the hash only winds it back: after the largest
 * section nothing is allocated any more. */
struct QLIBC_SZHASH {
 public:
  struct Entry {
    uint32_t hash;
    uint32_t slot; /* where slots_ refers to this entry, so that Clear touches only these */
    uint32_t key;
    uint32_t key_size;
    uint32_t value;
    uint32_t value_size;
    uint32_t value_room;
  };

  explicit QLIBC_SZHASH(size_t capacity);

  /* The views may lie in this very hash. Throws std::bad_alloc, and leaves the
   * hash as it was then. */
  void Set(std::string_view key, std::string_view value);
  const char *Find(std::string_view key) const noexcept;
  void Clear() noexcept;

  const std::vector<Entry> &entries() const noexcept { return entries_; }
  std::string_view Key(const Entry &entry) const noexcept {
    return {arena_.get() + entry.key, entry.key_size};
  }
  std::string_view Value(const Entry &entry) const noexcept {
    return {arena_.get() + entry.value, entry.value_size};
  }

 private:
  uint32_t FindSlot(std::string_view key, uint32_t hash) const noexcept;
  void Replace(Entry &entry, std::string_view value);
  void GrowTable();
  std::unique_ptr<char[]> MakeRoom(size_t size);
  uint32_t Store(std::string_view text) noexcept;

  std::vector<Entry> entries_;
  std::vector<uint32_t> slots_; /* index of the entry plus one; 0 is free */
  std::unique_ptr<char[]> arena_;
  size_t arena_room_ = 0;
  size_t arena_used_ = 0;
};

#endif
