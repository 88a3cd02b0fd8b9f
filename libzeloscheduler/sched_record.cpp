// Task records: single ones, and slabs of them for long lists.
#include "sched_record.h"

#include <sys/mman.h>

#include <cstdlib>

namespace {

constexpr int kLongestPlainList = 16;
constexpr size_t kRecordsOfSlab = 240;  // 8 MiB: three huge pages and more, wherever it begins

#if defined(__SANITIZE_ADDRESS__)
constexpr bool kSlabsAllowed = false;  // each record is watched by itself then
#else
constexpr bool kSlabsAllowed = true;
#endif

}  // namespace

struct SchedSlab {
  SchedSlab *next;
  size_t unused;   // records not handed out yet, from the first on
  size_t holders;  // records in use, and the source that still takes from it
  ZELO_SCHED_TASK records[kRecordsOfSlab];

  bool holds(const ZELO_SCHED_TASK *pTask) const {
    return pTask >= records && pTask < records + kRecordsOfSlab;
  }
};

namespace {

// Every slab, the one used last in front: lists are mostly freed in order.
SchedSlab *slabs = nullptr;

// Mapped rather than allocated: the pages come zeroed, and go back at once when the list is freed.
SchedSlab *newSlab() {
  void *memory = mmap(nullptr, sizeof(SchedSlab), PROT_READ | PROT_WRITE,
                      MAP_PRIVATE | MAP_ANONYMOUS | MAP_NORESERVE, -1, 0);
  if (memory == MAP_FAILED) {
    return nullptr;
  }
  madvise(memory, sizeof(SchedSlab), MADV_HUGEPAGE);  // a kernel without them is only slower
  auto *slab = static_cast<SchedSlab *>(memory);
  slab->unused = kRecordsOfSlab;
  slab->holders = 1;
  slab->next = slabs;
  slabs = slab;
  return slab;
}

SchedSlab *moveToFront(SchedSlab **link) {
  SchedSlab *slab = *link;
  *link = slab->next;
  slab->next = slabs;
  slabs = slab;
  return slab;
}

SchedSlab *slabOf(const ZELO_SCHED_TASK *pTask) {
  for (SchedSlab **link = &slabs; *link != nullptr; link = &(*link)->next) {
    if ((*link)->holds(pTask)) {
      return moveToFront(link);
    }
  }
  return nullptr;
}

void unhold(SchedSlab *slab) {
  if (--slab->holders > 0) {
    return;
  }
  SchedSlab **link = &slabs;
  while (*link != slab) {
    link = &(*link)->next;
  }
  *link = slab->next;
  munmap(slab, sizeof(*slab));
}

}  // namespace

void schedRecordFree(ZELO_SCHED_TASK *pTask) {
  SchedSlab *slab = slabOf(pTask);
  if (slab != nullptr) {
    unhold(slab);
  } else {
    free(pTask);
  }
}

TaskGuard schedRecordAlloc() {
  return TaskGuard(static_cast<ZELO_SCHED_TASK *>(calloc(1, sizeof(ZELO_SCHED_TASK))));
}

SchedRecordSource::SchedRecordSource(int expectedRecords)
    : usesSlabs_(kSlabsAllowed && expectedRecords > kLongestPlainList) {}

SchedRecordSource::~SchedRecordSource() {
  if (slab_ != nullptr) {
    unhold(slab_);
  }
}

TaskGuard SchedRecordSource::take() {
  if (!usesSlabs_) {
    return schedRecordAlloc();
  }
  if (slab_ != nullptr && slab_->unused == 0) {
    unhold(slab_);
    slab_ = nullptr;
  }
  if (slab_ == nullptr && (slab_ = newSlab()) == nullptr) {
    return schedRecordAlloc();  // there may still be room for a single one
  }
  // From the end on: a list that is built from its end then lies in memory as it is linked.
  ++slab_->holders;
  return TaskGuard(&slab_->records[--slab_->unused]);
}
