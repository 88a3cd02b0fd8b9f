// Allocating and freeing task records.
#ifndef SCHED_RECORD_H
#define SCHED_RECORD_H

#include <zelosched.h>

#include <cstddef>
#include <memory>

void schedRecordFree(ZELO_SCHED_TASK *pTask);

struct TaskDeleter {
  void operator()(ZELO_SCHED_TASK *pTask) const { schedRecordFree(pTask); }
};
using TaskGuard = std::unique_ptr<ZELO_SCHED_TASK, TaskDeleter>;

// One zeroed record; null, with errno set, when memory is short.
TaskGuard schedRecordAlloc();

struct SchedBlock;

// The records of one list, taken from blocks. If each were allocated by itself, the allocator
// would return their memory to the kernel after each list, and page faults would take most of the
// time of the next. A block is freed with the last of its records, in whatever order they are
// freed.
class SchedRecordSource {
 public:
  explicit SchedRecordSource(int mostRecords);
  ~SchedRecordSource();
  SchedRecordSource(const SchedRecordSource &) = delete;
  SchedRecordSource &operator=(const SchedRecordSource &) = delete;

  // As schedRecordAlloc.
  TaskGuard take();

 private:
  size_t left_;  // that may still be taken
  SchedBlock *block_ = nullptr;
};

#endif
