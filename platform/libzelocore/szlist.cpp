// Text lists: the texts in one arena, and the offset of each.
#include "szlist.h"

#include <algorithm>

#include "support.h"

namespace {

// A caller's guess at the capacity reserves no more than this.
constexpr size_t kMostReserved = 64;
constexpr size_t kExpectedTextSize = 16;

}  // namespace

QLIBC_SZLIST::QLIBC_SZLIST(size_t capacity) {
  const size_t reserved = std::min(capacity, kMostReserved);
  starts_.reserve(reserved);
  arena_.reserve(kExpectedTextSize * reserved);
}

void QLIBC_SZLIST::push(std::string_view text) {
  const size_t start = arena_.size();
  starts_.push_back(start);
  try {
    arena_.append(text);
    arena_.push_back('\0');
  } catch (...) {
    arena_.resize(start);
    starts_.pop_back();
    throw;
  }
}

void QLIBC_SZLIST::truncate(size_t count) noexcept {
  if (count < starts_.size()) {
    arena_.resize(starts_[count]);
    starts_.resize(count);
  }
}

PSZLIST QLIBCSzListAlloc(int capacity) {
  return zelo::atBoundary<PSZLIST>(
      nullptr, [&] { return new QLIBC_SZLIST(capacity > 0 ? static_cast<size_t>(capacity) : 1); });
}

int QLIBCSzListPush(PSZLIST *ppList, const char *szText) {
  if (ppList == nullptr || *ppList == nullptr || szText == nullptr) {
    return zelo::fail(QLIBC_ERR_BAD_PARAMETER);
  }
  return zelo::atBoundary(-1, [&] {
    (*ppList)->push(szText);
    return static_cast<int>((*ppList)->count());
  });
}

const char *QLIBCSzListGet(PSZLIST pList, int index) {
  if (pList == nullptr || index < 0 || static_cast<size_t>(index) >= pList->count()) {
    return nullptr;
  }
  return pList->at(static_cast<size_t>(index));
}

int QLIBCSzListCount(PSZLIST pList) {
  return pList == nullptr ? 0 : static_cast<int>(pList->count());
}

void QLIBCSzListFree(PSZLIST pList) {
  delete pList;
}

int QLIBCStrSep(const char *szText, const char *szSep, PSZLIST *ppList) {
  if (szText == nullptr || szSep == nullptr || ppList == nullptr || *ppList == nullptr) {
    return zelo::fail(QLIBC_ERR_BAD_PARAMETER);
  }
  QLIBC_SZLIST &list = **ppList;
  const size_t before = list.count();
  const int pieces = zelo::atBoundary(-1, [&] {
    // A copy, since the text may be one of the list's own, whose arena moves.
    const std::string text(szText);
    size_t start = text.find_first_not_of(szSep);
    while (start != std::string::npos) {
      const size_t end = std::min(text.find_first_of(szSep, start), text.size());
      list.push(std::string_view(text).substr(start, end - start));
      start = text.find_first_not_of(szSep, end);
    }
    return static_cast<int>(list.count() - before);
  });
  if (pieces < 0) {
    list.truncate(before);
  }
  return pieces;
}
