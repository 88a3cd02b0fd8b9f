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

// Sets all numbers to 0 and all texts to "". What lies behind the texts' ends stays, which spares a
// record that is filled over and over most of its bytes; none that a caller gets is made this way.
void schedRecordEmpty(ZELO_SCHED_TASK *pTask);

// Copies the id, the state and what says when the task runs.
void schedRecordCopySchedule(ZELO_SCHED_TASK *pTo, const ZELO_SCHED_TASK &from);

// How much of a record there is: all of it, or what schedRecordCopySchedule copies. The rest, its
// largest part, must then not be touched: the next records lie in it.
enum class SchedRecordExtent { kWhole, kSchedule };

// What is known beforehand of the number of a list's records: that there will hardly be fewer, or
// only that there will not be more.
enum class SchedRecordCount { kExpected, kAtMost };

struct SchedSlab;

// The records of one list. A record is large and mostly empty, and of many records taken one by one
// it is the page faults that a list costs most. They are therefore taken from slabs, those of long
// lists of huge pages; a slab is freed with the last of its records, in whatever order they are
// freed. Within a slab they lie in the order in which they were taken, schedules in one slab. Where
// it is not known how many there will be, slabs begin below a huge page and grow with what is
// taken.
class SchedRecordSource {
 public:
  SchedRecordSource(SchedRecordCount count, int records, SchedRecordExtent extent);
  ~SchedRecordSource();
  SchedRecordSource(const SchedRecordSource &) = delete;
  SchedRecordSource &operator=(const SchedRecordSource &) = delete;

  // As schedRecordAlloc.
  TaskGuard take();

 private:
  size_t roomOfNextSlab() const;  // in records

  SchedRecordCount count_;
  SchedRecordExtent extent_;
  size_t left_;  // that may still be taken
  size_t taken_ = 0;
  SchedSlab *slab_ = nullptr;
};

#endif
