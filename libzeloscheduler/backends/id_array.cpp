#include "id_array.h"

#include <algorithm>
#include <cstdlib>

namespace {

constexpr size_t kFirstCapacity = 1024;

}  // namespace

IdArray::~IdArray() {
  free(ids_);
}

void IdArray::add(long id) {
  if (id < 1) {
    return;
  }
  if (count_ < capacity_ || grow()) {
    ids_[count_] = id;
  }
  ++count_;
}

long IdArray::smallestFree() {
  if (count_ == 0) {
    return 1;
  }
  std::sort(ids_, ids_ + count_);
  if (ids_[0] >= 2) {
    return 1;
  }
  for (size_t i = 1; i < count_; ++i) {
    if (ids_[i] - ids_[i - 1] >= 2) {
      return ids_[i - 1] + 1;
    }
  }
  return ids_[count_ - 1] + 1;
}

bool IdArray::grow() {
  if (count_ > capacity_) {
    return false;
  }
  const size_t wanted = capacity_ == 0 ? kFirstCapacity : 2 * capacity_;
  auto *grown = static_cast<long *>(calloc(wanted, sizeof(long)));
  if (grown == nullptr) {
    return false;
  }
  std::copy(ids_, ids_ + count_, grown);
  free(ids_);
  ids_ = grown;
  capacity_ = wanted;
  return true;
}
