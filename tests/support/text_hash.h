// A hash of the platform, as tests want it.
//
//   TextHash hash(Entries{{"id", "7"}, {"name", "a"}});
//   hash.get(), hash.handle()                what the library's calls take
//   std::map<...> entries = hash.entries();  all that it holds
#pragma once

#include <map>
#include <stdexcept>
#include <string>

#include "zelocore.h"

namespace support {

using Entries = std::map<std::string, std::string>;

class TextHash {
 public:
  explicit TextHash(const Entries &entries = {}) : hash_(QLIBCSzHashAlloc(kCapacity)) {
    for (const auto &[key, value] : entries) {
      if (QLIBCSzHashSetValue(&hash_, key.c_str(), value.c_str()) < 0) {
        throw std::runtime_error("cannot set " + key);
      }
    }
  }
  ~TextHash() { QLIBCSzHashFree(hash_); }
  TextHash(const TextHash &) = delete;
  TextHash &operator=(const TextHash &) = delete;

  PSZHASH get() const { return hash_; }
  PSZHASH *handle() { return &hash_; }

  Entries entries() const {
    PSZLIST keys = QLIBCSzListAlloc(kCapacity);
    QLIBCSzHashEnumKey(hash_, &keys);
    Entries found;
    for (int i = 0; i < QLIBCSzListCount(keys); ++i) {
      const char *key = QLIBCSzListGet(keys, i);
      found[key] = QLIBCSzHashGetValue(hash_, key);
    }
    QLIBCSzListFree(keys);
    return found;
  }

 private:
  static constexpr int kCapacity = 32;
  PSZHASH hash_;
};

}  // namespace support
