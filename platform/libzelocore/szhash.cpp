/*
 * Text hashes: open addressing over an arena of texts.
 */
#include "szhash.h"

#include <sys/auxv.h>
#include <sys/random.h>

#include <algorithm>
#include <bit>
#include <cstring>
#include <new>
#include <numeric>
#include <string>

#include "siphash.h"
#include "support.h"

namespace {

/* A caller's guess at the capacity reserves no more than this; a hash grows past
 * it like any other. Guesses are mostly far above what comes, and many hashes live
 * no longer than one call. */
constexpr size_t kMostReserved = 64;
constexpr size_t kLeastArena = 2048;
constexpr size_t kExpectedKeySize = 16;

/* Keys come from outside: members of a JSON text, say. Whoever knew the key of the hash
 * could make all of them fall into one slot, so each process has one of its own. */
zelo::SipKey RandomKey() noexcept {
  zelo::SipKey key;
  if (getrandom(&key, sizeof(key), GRND_NONBLOCK) == static_cast<ssize_t>(sizeof(key))) {
    return key;
  }
  /* Early at boot, or on a kernel without the call. Every program is given some bytes. */
  std::memcpy(&key, reinterpret_cast<const void *>(getauxval(AT_RANDOM)), sizeof(key));
  return key;
}

uint32_t HashText(std::string_view text) noexcept {
  static const zelo::SipKey key = RandomKey();
  return static_cast<uint32_t>(zelo::SipHash::Of(key, text));
}

}  // namespace

QLIBC_SZHASH::QLIBC_SZHASH(size_t capacity) {
  const size_t reserved = std::clamp<size_t>(capacity, 1, kMostReserved);
  entries_.reserve(reserved);
  keys_.reserve(kExpectedKeySize * reserved);
  slots_.resize(std::bit_ceil(2 * reserved));
  std::iota(answers_.begin(), answers_.end(), 1U);
}

uint32_t QLIBC_SZHASH::FindSlot(std::string_view key, uint32_t hash) const noexcept {
  const auto mask = static_cast<uint32_t>(slots_.size() - 1);
  uint32_t slot = hash & mask;
  while (slots_[slot] != 0) {
    const Entry &entry = entries_[slots_[slot] - 1];
    if (entry.hash == hash && Key(entry) == key) {
      break;
    }
    slot = (slot + 1) & mask;
  }
  return slot;
}

/* The place of the entry plus one, or 0. A remembered key is none until it is set
 * again. */
uint32_t QLIBC_SZHASH::Search(std::string_view key) const noexcept {
  const uint32_t place = slots_[FindSlot(key, HashText(key))];
  return place <= count_ ? place : 0;
}

const char *QLIBC_SZHASH::Find(const char *key) const noexcept {
  uint32_t &answer = answers_[questions_++ % kRememberedQuestions];
  if (answer == 0 || answer > count_ || std::strcmp(Key(entries_[answer - 1]).data(), key) != 0) {
    answer = Search(key);
  }
  return answer == 0 ? nullptr : arena_.get() + entries_[answer - 1].value;
}

void QLIBC_SZHASH::Clear() noexcept {
  count_ = 0;
  arena_used_ = 0;
  questions_ = 0;
}

/* What was added last is on nobody's way through the slots. */
void QLIBC_SZHASH::ForgetRemembered() noexcept {
  for (size_t i = count_; i < entries_.size(); ++i) {
    slots_[entries_[i].slot] = 0;
  }
  keys_.resize(entries_[count_].key);
  entries_.resize(count_);
}

void QLIBC_SZHASH::GrowTable() {
  std::vector<uint32_t> wider(slots_.size() * 2);
  const auto mask = static_cast<uint32_t>(wider.size() - 1);
  for (size_t i = 0; i < entries_.size(); ++i) {
    uint32_t slot = entries_[i].hash & mask;
    while (wider[slot] != 0) {
      slot = (slot + 1) & mask;
    }
    wider[slot] = static_cast<uint32_t>(i + 1);
    entries_[i].slot = slot;
  }
  slots_.swap(wider);
}

/* Moves to a larger arena, leaving replaced values behind. The arena that was left
 * is handed to the caller, who may still be reading a text in it. */
std::unique_ptr<char[]> QLIBC_SZHASH::MakeRoom(size_t size) {
  size_t live = 0;
  for (const Entry &entry : entries()) {
    live += entry.value_size + 1;
  }
  const size_t room = std::max(kLeastArena, 2 * (live + size));
  auto left = std::make_unique_for_overwrite<char[]>(room);
  arena_.swap(left);
  arena_room_ = room;
  arena_used_ = 0;
  for (size_t i = 0; i < count_; ++i) {
    Place(entries_[i], {left.get() + entries_[i].value, entries_[i].value_size});
  }
  return left;
}

void QLIBC_SZHASH::Replace(Entry &entry, std::string_view value) {
  if (value.size() > entry.value_room) {
    StoreValue(entry, value);
    return;
  }
  /* The new text may be a part of the old one. */
  std::memmove(arena_.get() + entry.value, value.data(), value.size());
  arena_[entry.value + value.size()] = '\0';
  entry.value_size = value.size();
}

/* The key is stored after the value, which may be one of the keys. A key whose entry
 * finds no memory is nobody's, and does no harm where it lies. */
void QLIBC_SZHASH::Add(std::string_view key, uint32_t hash, uint32_t slot, std::string_view value) {
  const auto left = HasRoom(value.size() + 1) ? nullptr : MakeRoom(value.size() + 1);
  Entry entry{.hash = hash,
              .slot = slot,
              .key = keys_.size(),
              .key_size = key.size(),
              .value = 0,
              .value_size = 0,
              .value_room = 0};
  Place(entry, value);
  keys_.append(key).push_back('\0');
  entries_.push_back(entry);
  slots_[slot] = static_cast<uint32_t>(++count_);
}

void QLIBC_SZHASH::SetElsewhere(std::string_view key, std::string_view value) {
  const uint32_t hash = HashText(key);
  uint32_t slot = FindSlot(key, hash);
  if (slots_[slot] != 0 && slots_[slot] <= count_) {
    Replace(entries_[slots_[slot] - 1], value);
    return;
  }
  if (count_ < entries_.size()) {
    ForgetRemembered();
    slot = FindSlot(key, hash);
  }
  if (2 * (count_ + 1) > slots_.size()) {
    GrowTable();
    slot = FindSlot(key, hash);
  }
  Add(key, hash, slot, value);
}

PSZHASH QLIBCSzHashAlloc(int capacity) {
  return zelo::AtBoundary<PSZHASH>(
      nullptr, [&] { return new QLIBC_SZHASH(capacity > 0 ? static_cast<size_t>(capacity) : 1); });
}

int QLIBCSzHashSetValue(PSZHASH *ppHash, const char *szKey, const char *szValue) {
  if (ppHash == nullptr || *ppHash == nullptr || szKey == nullptr || szValue == nullptr) {
    return zelo::Fail(QLIBC_ERR_BAD_PARAMETER);
  }
  return zelo::AtBoundary(-1, [&] {
    (*ppHash)->Set(szKey, szValue);
    return 0;
  });
}

const char *QLIBCSzHashGetValue(PSZHASH pHash, const char *szKey) {
  if (pHash == nullptr || szKey == nullptr) {
    zelo::Fail(QLIBC_ERR_BAD_PARAMETER);
    return nullptr;
  }
  return pHash->Find(szKey);
}

void QLIBCHashRemoveAll(PSZHASH pHash) {
  if (pHash != nullptr) {
    pHash->Clear();
  }
}

int QLIBCSzHashEnumKey(PSZHASH pHash, PSZLIST *ppList) {
  if (pHash == nullptr || ppList == nullptr || *ppList == nullptr) {
    return zelo::Fail(QLIBC_ERR_BAD_PARAMETER);
  }
  for (const QLIBC_SZHASH::Entry &entry : pHash->entries()) {
    if (QLIBCSzListPush(ppList, pHash->Key(entry).data()) < 0) {
      return -1;
    }
  }
  return static_cast<int>(pHash->entries().size());
}

void QLIBCSzHashFree(PSZHASH pHash) {
  delete pHash;
}
