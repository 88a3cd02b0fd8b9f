// What the platform allocates, freed at the end of its scope.
#pragma once

#include <zelocore.h>

#include <memory>

struct FreeHash {
  void operator()(QLIBC_SZHASH *hash) const { QLIBCSzHashFree(hash); }
};
struct FreeList {
  void operator()(QLIBC_SZLIST *list) const { QLIBCSzListFree(list); }
};

using Hash = std::unique_ptr<QLIBC_SZHASH, FreeHash>;
using List = std::unique_ptr<QLIBC_SZLIST, FreeList>;
