// Where task records come from and go back to.
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

// The records of one list. The allocator gives the memory of records that were taken one by one
// back to the kernel after each list, and the page faults of the next one are then most of its
// time. They are therefore taken from blocks of a few; a block is freed with the last of its
// records, in whatever order they are freed.
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
