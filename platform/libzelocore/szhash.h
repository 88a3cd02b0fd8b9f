/*
 * The inside of a text hash, for the units that fill one or write one out
 * without going through zero-terminated texts.
 */
#ifndef ZELOCORE_SZHASH_H
#define ZELOCORE_SZHASH_H

#include <array>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "zelocore.h"

/* One hash serves thousands of small sections in turn, nearly all with the same
 * keys in the same order, which are asked for in the same order too. Emptying it
 * therefore keeps the keys: one that comes where it came last time is neither hashed
 * nor stored again, and one that is asked for where it was asked for last time is not
 * searched. The values lie in one arena that is wound back. After the largest section
 * nothing is allocated any more. */
struct QLIBC_SZHASH {
 public:
  struct Entry {
    uint32_t hash;
    uint32_t slot; /* where slots_ refers to this entry */
    size_t key;
    size_t key_size;
    size_t value;
    size_t value_size;
    size_t value_room;
  };

  explicit QLIBC_SZHASH(size_t capacity);

  /* The views may lie in this very hash. Throws std::bad_alloc, and leaves the
   * hash as it was then. */
  void Set(std::string_view key, std::string_view value);
  const char *Find(std::string_view key) const noexcept;
  void Clear() noexcept;

  std::span<const Entry> entries() const noexcept { return {entries_.data(), count_}; }
  std::string_view Key(const Entry &entry) const noexcept {
    return {keys_.data() + entry.key, entry.key_size};
  }
  std::string_view Value(const Entry &entry) const noexcept {
    return {arena_.get() + entry.value, entry.value_size};
  }

 private:
  static constexpr size_t kRememberedQuestions = 64;

  bool IsRemembered(std::string_view key) const noexcept;
  uint32_t Search(std::string_view key) const noexcept;
  void ForgetRemembered() noexcept;
  uint32_t FindSlot(std::string_view key, uint32_t hash) const noexcept;
  void Add(std::string_view key, uint32_t hash, uint32_t slot, std::string_view value);
  void Replace(Entry &entry, std::string_view value);
  void GrowTable();
  bool HasRoom(size_t size) const noexcept { return size <= arena_room_ - arena_used_; }
  std::unique_ptr<char[]> MakeRoom(size_t size);
  void StoreValue(Entry &entry, std::string_view value);
  void Place(Entry &entry, std::string_view value) noexcept;

  std::vector<Entry> entries_;  /* the present ones, then those remembered */
  size_t count_ = 0;            /* of the present ones */
  std::vector<uint32_t> slots_; /* index of the entry plus one; 0 is free */
  std::string keys_;            /* each ended by a zero, in the order of the entries */
  std::unique_ptr<char[]> arena_;
  size_t arena_room_ = 0;
  size_t arena_used_ = 0;
  /* Of the n-th question since the hash was emptied, the place of the answer plus one. */
  mutable std::array<uint32_t, kRememberedQuestions> answers_{};
  mutable size_t questions_ = 0;
};

#endif
