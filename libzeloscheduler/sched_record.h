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

// How much of a record there is: all of it, or what says who is started when. The rest of a record,
// its largest part, must then not be touched: the next records lie in it.
enum class SchedRecordExtent { kWhole, kSchedule };

struct SchedSlab;

// The records of one list. A record is large and mostly empty, and of many records taken one by one
// it is the page faults that a list costs most. All but the shortest lists therefore take them from
// slabs, the long ones from slabs of huge pages; a slab is freed with the last of its records, in
// whatever order they are freed.
class SchedRecordSource {
 public:
  explicit SchedRecordSource(int expectedRecords,
                             SchedRecordExtent extent = SchedRecordExtent::kWhole);
  ~SchedRecordSource();
  SchedRecordSource(const SchedRecordSource &) = delete;
  SchedRecordSource &operator=(const SchedRecordSource &) = delete;

  // As schedRecordAlloc.
  TaskGuard take();

 private:
  size_t expectedRecords_;  // that have not been taken yet
  bool usesSlabs_;
  SchedRecordExtent extent_;
  SchedSlab *slab_ = nullptr;
};

#endif
