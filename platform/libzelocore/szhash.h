/*
 * The inside of a text hash, for the units that fill one or write one out
 * without going through zero-terminated texts.
 */
#ifndef ZELOCORE_SZHASH_H
#define ZELOCORE_SZHASH_H

#include <algorithm>
#include <array>
#include <cassert>
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
  void Set(std::string_view key, std::string_view value) {
    if (IsRemembered(key)) {
      StoreValue(entries_[count_], value);
      ++count_;
    } else {
      SetElsewhere(key, value);
    }
  }
  /* Takes over a text that values of new entries lie in: those whose keys come where
   * they came last time need not be copied one by one. What is set between this and
   * the last SetTaken must fit into the text altogether. */
  void Take(std::string_view text) {
    const size_t room = 2 * (text.size() + 1);
    const auto left = HasRoom(room) ? nullptr : MakeRoom(room);
    taken_ = arena_used_;
    std::copy(text.begin(), text.end(), arena_.get() + taken_);
    arena_used_ += text.size() + 1;
  }
  /* Set, of the `size` bytes at `at` of the text. The byte behind them is lost. */
  void SetTaken(std::string_view key, size_t at, size_t size) {
    assert(taken_ + at + size < arena_used_);
    if (IsRemembered(key)) {
      Lay(entries_[count_], taken_ + at, size);
      ++count_;
    } else {
      SetElsewhere(key, {arena_.get() + taken_ + at, size});
    }
  }
  const char *Find(const char *key) const noexcept;
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

  /* The present keys are those before it, so one that is remembered there is not
   * among them. */
  bool IsRemembered(std::string_view key) const noexcept {
    return count_ < entries_.size() && Key(entries_[count_]) == key;
  }
  void SetElsewhere(std::string_view key, std::string_view value);
  uint32_t Search(std::string_view key) const noexcept;
  void ForgetRemembered() noexcept;
  uint32_t FindSlot(std::string_view key, uint32_t hash) const noexcept;
  void Add(std::string_view key, uint32_t hash, uint32_t slot, std::string_view value);
  void Replace(Entry &entry, std::string_view value);
  void GrowTable();
  bool HasRoom(size_t size) const noexcept { return size <= arena_room_ - arena_used_; }
  std::unique_ptr<char[]> MakeRoom(size_t size);
  void StoreValue(Entry &entry, std::string_view value) {
    const auto left = HasRoom(value.size() + 1) ? nullptr : MakeRoom(value.size() + 1);
    Place(entry, value);
  }
  /* There is room for it. */
  void Place(Entry &entry, std::string_view value) noexcept {
    std::copy(value.begin(), value.end(), arena_.get() + arena_used_);
    Lay(entry, arena_used_, value.size());
    arena_used_ += value.size() + 1;
  }
  void Lay(Entry &entry, size_t at, size_t size) noexcept {
    arena_[at + size] = '\0';
    entry.value = at;
    entry.value_size = size;
    entry.value_room = size;
  }

  std::vector<Entry> entries_;  /* the present ones, then those remembered */
  size_t count_ = 0;            /* of the present ones */
  std::vector<uint32_t> slots_; /* index of the entry plus one; 0 is free */
  std::string keys_;            /* each ended by a zero, in the order of the entries */
  std::unique_ptr<char[]> arena_;
  size_t arena_room_ = 0;
  size_t arena_used_ = 0;
  size_t taken_ = 0; /* where the text that was taken last begins */
  /* Of the n-th question since the hash was emptied, the place of the answer plus one;
   * before it has been asked, that of the n-th key. */
  mutable std::array<uint32_t, kRememberedQuestions> answers_;
  mutable size_t questions_ = 0;
};

#endif
