// Text hashes.
#include "szhash.h"

#include "support.h"

void QLIBC_SZHASH::set(std::string_view key, std::string_view value) {
  const auto at = entries_.lower_bound(key);
  if (at != entries_.end() && at->first == key) {
    at->second.assign(value);
  } else {
    entries_.emplace_hint(at, key, value);
  }
}

void QLIBC_SZHASH::clear() noexcept {
  entries_.clear();
  memory_.release();
}

PSZHASH QLIBCSzHashAlloc(int /*capacity*/) {
  return zelo::atBoundary<PSZHASH>(nullptr, [] { return new QLIBC_SZHASH; });
}

int QLIBCSzHashSetValue(PSZHASH *ppHash, const char *szKey, const char *szValue) {
  if (ppHash == nullptr || *ppHash == nullptr || szKey == nullptr || szValue == nullptr) {
    return zelo::fail(QLIBC_ERR_BAD_PARAMETER);
  }
  return zelo::atBoundary(-1, [&] {
    (*ppHash)->set(szKey, szValue);
    return 0;
  });
}

const char *QLIBCSzHashGetValue(PSZHASH pHash, const char *szKey) {
  if (pHash == nullptr || szKey == nullptr) {
    zelo::fail(QLIBC_ERR_BAD_PARAMETER);
    return nullptr;
  }
  const auto found = pHash->entries().find(std::string_view(szKey));
  return found == pHash->entries().end() ? nullptr : found->second.c_str();
}

void QLIBCHashRemoveAll(PSZHASH pHash) {
  if (pHash != nullptr) {
    pHash->clear();
  }
}

int QLIBCSzHashEnumKey(PSZHASH pHash, PSZLIST *ppList) {
  if (pHash == nullptr || ppList == nullptr || *ppList == nullptr) {
    return zelo::fail(QLIBC_ERR_BAD_PARAMETER);
  }
  for (const auto &[key, value] : pHash->entries()) {
    if (QLIBCSzListPush(ppList, key.c_str()) < 0) {
      return -1;
    }
  }
  return static_cast<int>(pHash->entries().size());
}

void QLIBCSzHashFree(PSZHASH pHash) {
  delete pHash;
}
