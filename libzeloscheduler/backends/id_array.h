// The ids of the tasks, and the smallest free one.
#ifndef ID_ARRAY_H
#define ID_ARRAY_H

#include <cstddef>

// In memory from calloc, as no exception may be thrown. When memory is short it only counts, for
// the log.
class IdArray {
 public:
  IdArray() = default;
  ~IdArray();
  IdArray(const IdArray &) = delete;
  IdArray &operator=(const IdArray &) = delete;

  // An id below 1, which another program has written, is ignored.
  void add(long id);
  int count() const { return static_cast<int>(count_); }
  bool isWhole() const { return count_ <= capacity_; }

  // The smallest id, from 1 on, that no task has.
  long smallestFree();

 private:
  bool grow();

  long *ids_ = nullptr;
  size_t count_ = 0;
  size_t capacity_ = 0;
};

#endif
