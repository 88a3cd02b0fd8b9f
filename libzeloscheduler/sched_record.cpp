// Task records: single ones, and slabs of them for long lists.
#include "sched_record.h"

#include <sys/mman.h>

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <cstring>

#include "sched_parm_table.h"

namespace {

constexpr size_t kLongestPlainList = 8;
constexpr size_t kHugePage = size_t{2} << 20;
constexpr size_t kMostSlabSize = 4 * kHugePage;

#if defined(__SANITIZE_ADDRESS__)
constexpr bool kSlabsAllowed = false;  // each record is watched by itself then
#else
constexpr bool kSlabsAllowed = true;
#endif

// How far the records of a slab are apart, where the last byte of one ends, and whether a list of
// them fills huge pages.
struct Layout {
  size_t stride;
  size_t end;
  bool fillsHugePages;
};

constexpr Layout kWholeLayout = {sizeof(ZELO_SCHED_TASK), sizeof(ZELO_SCHED_TASK), true};

// A schedule is the fields before the name and those behind the next trigger time. The two texts
// are not used, so that other records' fields may lie there, if only no two records share a byte.
constexpr size_t kHeadEnd = offsetof(ZELO_SCHED_TASK, Name);
constexpr size_t kTailBegin = offsetof(ZELO_SCHED_TASK, State);
constexpr size_t kTailEnd = offsetof(ZELO_SCHED_TASK, LastWorkHour) + sizeof(uint32_t);
constexpr Layout kScheduleLayout = {128, kTailEnd, false};
static_assert(kTailBegin % kScheduleLayout.stride >= kHeadEnd);
static_assert(kTailBegin % kScheduleLayout.stride + (kTailEnd - kTailBegin) <=
              kScheduleLayout.stride);
static_assert(kScheduleLayout.stride % alignof(ZELO_SCHED_TASK) == 0);

constexpr Layout layoutOf(SchedRecordExtent extent) {
  return extent == SchedRecordExtent::kWhole ? kWholeLayout : kScheduleLayout;
}

}  // namespace

// Stands at the front of its memory; the records follow.
struct SchedSlab {
  SchedSlab *next;
  size_t size;  // in bytes, with this
  bool isMapped;
  size_t stride;
  size_t unused;   // records not handed out yet, from the first on
  size_t holders;  // records in use, and the source that still takes from it

  uintptr_t begin() const { return reinterpret_cast<uintptr_t>(this); }
  bool holds(const ZELO_SCHED_TASK *pTask) const {
    const auto address = reinterpret_cast<uintptr_t>(pTask);
    return address >= begin() && address < begin() + size;
  }
  ZELO_SCHED_TASK *record(size_t index) const {
    return reinterpret_cast<ZELO_SCHED_TASK *>(begin() + sizeof(*this) + index * stride);
  }
};
static_assert(sizeof(SchedSlab) % alignof(ZELO_SCHED_TASK) == 0);

namespace {

// Every slab, the one used last in front: lists are mostly freed in order.
SchedSlab *slabs = nullptr;

// Mapped rather than allocated: the pages come zeroed, and go back at once when the list is freed.
// A huge page must begin at a multiple of its size, so what is mapped too much is cut off.
void *mapSlab(size_t size) {
  const size_t mapped = size + kHugePage;
  void *memory = mmap(nullptr, mapped, PROT_READ | PROT_WRITE,
                      MAP_PRIVATE | MAP_ANONYMOUS | MAP_NORESERVE, -1, 0);
  if (memory == MAP_FAILED) {
    return nullptr;
  }
  const auto begin = reinterpret_cast<uintptr_t>(memory);
  const uintptr_t aligned = (begin + kHugePage - 1) / kHugePage * kHugePage;
  const size_t before = aligned - begin;
  const size_t after = mapped - size - before;
  if (before > 0) {
    munmap(memory, before);
  }
  void *slab = reinterpret_cast<void *>(aligned);
  if (after > 0) {
    munmap(static_cast<char *>(slab) + size, after);
  }
  return slab;
}

size_t recordsIn(size_t slabSize, const Layout &layout) {
  const size_t least = sizeof(SchedSlab) + layout.end;
  return slabSize < least ? 0 : (slabSize - least) / layout.stride + 1;
}

// Whole huge pages, and no more of them than the records fill: memory that nobody asked for would
// be taken otherwise. 0 when there are too few records for one.
size_t mappedSizeFor(size_t expectedRecords, const Layout &layout) {
  if (!layout.fillsHugePages) {
    return kMostSlabSize;
  }
  size_t size = kMostSlabSize;
  while (size > 0 && recordsIn(size, layout) > expectedRecords) {
    size -= kHugePage;
  }
  return size;
}

void *mapSlabFor(const Layout &layout, size_t size) {
  void *memory = size > 0 ? mapSlab(size) : nullptr;
  if (memory != nullptr) {  // a kernel without huge pages is only slower
    madvise(memory, size, layout.fillsHugePages ? MADV_HUGEPAGE : MADV_NOHUGEPAGE);
  }
  return memory;
}

SchedSlab *added(void *memory, size_t size, bool isMapped, const Layout &layout) {
  auto *slab = static_cast<SchedSlab *>(memory);
  slab->size = size;
  slab->isMapped = isMapped;
  slab->stride = layout.stride;
  slab->unused = recordsIn(size, layout);
  slab->holders = 1;
  slab->next = slabs;
  slabs = slab;
  return slab;
}

// The allocator keeps a block that is freed at hand for the next list, but gives the pages of as
// many single records back to the kernel.
SchedSlab *newBlock(const Layout &layout, size_t records) {
  const size_t size = sizeof(SchedSlab) + (records - 1) * layout.stride + layout.end;
  void *memory = calloc(1, size);
  return memory != nullptr ? added(memory, size, false, layout) : nullptr;
}

// Null when memory is short, or the records too few.
SchedSlab *newSlab(const Layout &layout, size_t expectedRecords) {
  const size_t size = mappedSizeFor(expectedRecords, layout);
  if (size == 0 && expectedRecords > kLongestPlainList) {
    return newBlock(layout, expectedRecords);
  }
  void *memory = mapSlabFor(layout, size);
  return memory != nullptr ? added(memory, size, true, layout) : nullptr;
}

void freeSlab(SchedSlab *slab) {
  if (slab->isMapped) {
    munmap(slab, slab->size);
  } else {
    free(slab);
  }
}

SchedSlab *moveToFront(SchedSlab **link) {
  SchedSlab *slab = *link;
  *link = slab->next;
  slab->next = slabs;
  slabs = slab;
  return slab;
}

// Which then stands in front.
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
  slabs = slabOf(slab->record(0))->next;
  freeSlab(slab);
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

void schedRecordEmpty(ZELO_SCHED_TASK *pTask) {
  pTask->next = nullptr;
  for (const SchedParm *parm = parm_table; parm->szKey != nullptr; ++parm) {
    memset(parm->fieldOf(pTask), 0, sizeof(int32_t));  // a number, or the beginning of a text
  }
}

SchedRecordSource::SchedRecordSource(int expectedRecords, SchedRecordExtent extent)
    : expectedRecords_(static_cast<size_t>(std::max(expectedRecords, 0))),
      usesSlabs_(kSlabsAllowed && expectedRecords_ > kLongestPlainList),
      extent_(extent) {}

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
  if (slab_ == nullptr) {
    slab_ = newSlab(layoutOf(extent_), expectedRecords_);
  }
  expectedRecords_ -= std::min<size_t>(expectedRecords_, 1);
  if (slab_ == nullptr) {
    return schedRecordAlloc();  // where there may still be room for a single one
  }
  // From the end on: a list that is built from its end then lies in memory as it is linked.
  ++slab_->holders;
  return TaskGuard(slab_->record(--slab_->unused));
}
