// Task records: single ones, and slabs of them for lists.
#include "sched_record.h"

#include <sys/mman.h>

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <cstring>

#include "sched_parm_table.h"

#if defined(__SANITIZE_ADDRESS__)
#define IS_ADDRESS_SANITIZED true
#elif defined(__has_feature)
#define IS_ADDRESS_SANITIZED __has_feature(address_sanitizer)
#else
#define IS_ADDRESS_SANITIZED false
#endif

namespace {

constexpr size_t kHugePage = size_t{2} << 20;
// Also the most that one record which is kept can keep of a list.
constexpr size_t kLargestMapping = 4 * kHugePage;

constexpr bool kSlabsAllowed = !IS_ADDRESS_SANITIZED;  // which watches each record by itself

// How far the records of a slab are apart, and where the last byte of one ends.
struct Layout {
  size_t stride;
  size_t end;
};

constexpr Layout kWholeLayout = {sizeof(ZELO_SCHED_TASK), sizeof(ZELO_SCHED_TASK)};

// A schedule is the link and the id, before the name, and the fields behind the next trigger time.
// The two texts are not used, so that other records' fields may lie there, if only no two records
// share a byte.
constexpr size_t kHeadEnd = offsetof(ZELO_SCHED_TASK, Name);
constexpr size_t kTailBegin = offsetof(ZELO_SCHED_TASK, State);
constexpr size_t kTailEnd = offsetof(ZELO_SCHED_TASK, LastWorkHour) + sizeof(uint32_t);
constexpr Layout kScheduleLayout = {64, kTailEnd};
static_assert(kTailBegin % kScheduleLayout.stride >= kHeadEnd);
static_assert(kTailBegin % kScheduleLayout.stride + (kTailEnd - kTailBegin) <=
              kScheduleLayout.stride);
static_assert(kScheduleLayout.stride % alignof(ZELO_SCHED_TASK) == 0);

}  // namespace

// Stands at the front of its memory; the records follow.
struct SchedSlab {
  SchedSlab *next;
  size_t size;  // in bytes, with this
  bool isMapped;
  size_t stride;
  size_t room;     // in records
  size_t taken;    // of them, from the first on
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

// Every slab, the one made or asked for last in front: lists are mostly freed in order. Nobody
// holds so many lists that going through them would be long.
SchedSlab *slabs = nullptr;

constexpr size_t recordsIn(size_t slabSize, const Layout &layout) {
  const size_t least = sizeof(SchedSlab) + layout.end;
  return slabSize < least ? 0 : (slabSize - least) / layout.stride + 1;
}

size_t sizeOf(size_t records, const Layout &layout) {
  return sizeof(SchedSlab) + (records - 1) * layout.stride + layout.end;
}

// Whole huge pages, and no more of them than the records fill: memory that nobody asked for would
// be taken otherwise. 0 when there are too few records for one.
size_t mappedSizeFor(size_t records) {
  size_t size = kLargestMapping;
  while (size > 0 && recordsIn(size, kWholeLayout) > records) {
    size -= kHugePage;
  }
  return size;
}

// The kernel zeroes a huge page towards the byte that is touched first. Towards the last one it
// goes upwards through memory, in about half the time that it needs downwards.
void touchEnds(volatile char *pages, size_t size) {
  for (size_t end = kHugePage; end <= size; end += kHugePage) {
    pages[end - 1] = 0;
  }
}

// A huge page must begin at a multiple of its size, so what is mapped too much is cut off.
void *mapHugePages(size_t size) {
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
  void *pages = reinterpret_cast<void *>(aligned);
  if (after > 0) {
    munmap(static_cast<char *>(pages) + size, after);
  }
  madvise(pages, size, MADV_HUGEPAGE);  // a kernel without them is only slower
  touchEnds(static_cast<volatile char *>(pages), size);
  return pages;
}

// Null when memory is short. What is too small for huge pages comes from the allocator: it keeps a
// block that is freed at hand for the next list, but gives the pages of as many single records back
// to the kernel. Schedules come from there in any case, and so lie in one piece.
SchedSlab *newSlab(size_t records, SchedRecordExtent extent) {
  const Layout &layout = extent == SchedRecordExtent::kWhole ? kWholeLayout : kScheduleLayout;
  const size_t mapped = extent == SchedRecordExtent::kWhole ? mappedSizeFor(records) : 0;
  const size_t size = mapped > 0 ? mapped : sizeOf(records, layout);
  auto *slab = static_cast<SchedSlab *>(mapped > 0 ? mapHugePages(size) : calloc(1, size));
  if (slab == nullptr) {
    return nullptr;
  }
  slab->size = size;
  slab->isMapped = mapped > 0;
  slab->stride = layout.stride;
  slab->room = recordsIn(size, layout);
  slab->taken = 0;
  slab->holders = 1;
  slab->next = slabs;
  slabs = slab;
  return slab;
}

void freeSlab(SchedSlab *slab) {
  if (slab->isMapped) {
    munmap(slab, slab->size);
  } else {
    free(slab);
  }
}

// Out of the chain, from where the link to it is.
SchedSlab *unlinked(SchedSlab **link) {
  SchedSlab *slab = *link;
  *link = slab->next;
  return slab;
}

SchedSlab *slabOf(const ZELO_SCHED_TASK *pTask) {
  for (SchedSlab **link = &slabs; *link != nullptr; link = &(*link)->next) {
    if ((*link)->holds(pTask)) {
      SchedSlab *slab = unlinked(link);
      slab->next = slabs;
      slabs = slab;
      return slab;
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
  freeSlab(unlinked(link));
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

void schedRecordCopySchedule(ZELO_SCHED_TASK *pTo, const ZELO_SCHED_TASK &from) {
  pTo->ID = from.ID;
  memcpy(reinterpret_cast<char *>(pTo) + kTailBegin,
         reinterpret_cast<const char *>(&from) + kTailBegin, kTailEnd - kTailBegin);
}

SchedRecordSource::SchedRecordSource(SchedRecordCount count, int records, SchedRecordExtent extent)
    : count_(count), extent_(extent), left_(static_cast<size_t>(std::max(records, 0))) {}

SchedRecordSource::~SchedRecordSource() {
  if (slab_ != nullptr) {
    unhold(slab_);
  }
}

size_t SchedRecordSource::roomOfNextSlab() const {
  constexpr size_t kBelowHugePage = recordsIn(kHugePage, kWholeLayout) - 1;
  return count_ == SchedRecordCount::kExpected
             ? left_
             : std::min(left_, std::max(kBelowHugePage, 2 * taken_));
}

TaskGuard SchedRecordSource::take() {
  if (slab_ != nullptr && slab_->taken == slab_->room) {
    unhold(slab_);
    slab_ = nullptr;
  }
  if (slab_ == nullptr && kSlabsAllowed && roomOfNextSlab() > 1) {
    slab_ = newSlab(roomOfNextSlab(), extent_);
  }
  left_ -= std::min<size_t>(left_, 1);
  ++taken_;
  if (slab_ == nullptr) {
    return schedRecordAlloc();  // where there may still be room for a single one
  }
  ++slab_->holders;
  return TaskGuard(slab_->record(slab_->taken++));
}
