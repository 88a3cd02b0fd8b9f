/*
 * SipHash-2-4 of Aumasson and Bernstein: a hash that nobody without the key can
 * choose collisions for.
 */
#ifndef ZELOCORE_SIPHASH_H
#define ZELOCORE_SIPHASH_H

#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string_view>

namespace zelo {

struct SipKey {
  uint64_t first;
  uint64_t second;
};

class SipHash {
 public:
  static uint64_t Of(const SipKey &key, std::string_view text) noexcept {
    SipHash state(key);
    const char *at = text.data();
    size_t left = text.size();
    for (; left >= kWord; at += kWord, left -= kWord) {
      state.Take(Load(at, kWord));
    }
    constexpr int kLengthShift = 56;
    state.Take(Load(at, left) | uint64_t{text.size()} << kLengthShift);
    return state.Finish();
  }

 private:
  static constexpr size_t kWord = sizeof(uint64_t);
  static_assert(std::endian::native == std::endian::little, "words are little-endian");

  /* Of a whole word the copy is one instruction. */
  static uint64_t Load(const char *at, size_t size) noexcept {
    uint64_t word = 0;
    if (size == kWord) {
      std::memcpy(&word, at, kWord);
    } else if (size > 0) {
      std::memcpy(&word, at, size);
    }
    return word;
  }

  explicit SipHash(const SipKey &key) noexcept
      : v0_(key.first ^ 0x736F6D6570736575U),
        v1_(key.second ^ 0x646F72616E646F6DU),
        v2_(key.first ^ 0x6C7967656E657261U),
        v3_(key.second ^ 0x7465646279746573U) {}

  void Round() noexcept {
    v0_ += v1_;
    v2_ += v3_;
    v1_ = std::rotl(v1_, 13) ^ v0_;
    v3_ = std::rotl(v3_, 16) ^ v2_;
    v0_ = std::rotl(v0_, 32);
    v2_ += v1_;
    v0_ += v3_;
    v1_ = std::rotl(v1_, 17) ^ v2_;
    v3_ = std::rotl(v3_, 21) ^ v0_;
    v2_ = std::rotl(v2_, 32);
  }

  void Take(uint64_t word) noexcept {
    v3_ ^= word;
    Round();
    Round();
    v0_ ^= word;
  }

  uint64_t Finish() noexcept {
    constexpr uint64_t kEnd = 0xFF;
    v2_ ^= kEnd;
    Round();
    Round();
    Round();
    Round();
    return v0_ ^ v1_ ^ v2_ ^ v3_;
  }

  uint64_t v0_, v1_, v2_, v3_;
};

}  // namespace zelo

#endif
