// Which ids tasks have, and which is free.
#ifndef ID_ARRAY_H
#define ID_ARRAY_H

#include <cstddef>

// In plain memory: no exception may arise here. It goes on counting when memory is short, for the
// report.
class IdArray {
 public:
  IdArray() = default;
  ~IdArray();
  IdArray(const IdArray &) = delete;
  IdArray &operator=(const IdArray &) = delete;

  // Ids are positive. One that is not was written by another program, and is nobody's neighbour.
  void add(long id);
  int count() const { return static_cast<int>(count_); }
  bool isWhole() const { return count_ <= capacity_; }

  // The smallest from 1 on that no task has.
  long smallestFree();

 private:
  bool grow();

  long *ids_ = nullptr;
  size_t count_ = 0;
  size_t capacity_ = 0;
};

#endif
