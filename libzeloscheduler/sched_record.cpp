// Task records: single ones, and blocks of them for lists.
#include "sched_record.h"

#include <algorithm>
#include <cstdint>
#include <cstdlib>

// The head of a block of memory; the records follow it.
struct SchedBlock {
  SchedBlock *next;
  size_t room;     // in records
  size_t taken;    // of them, from the first on
  size_t holders;  // records in use, and the source that still takes from it

  ZELO_SCHED_TASK *records() { return reinterpret_cast<ZELO_SCHED_TASK *>(this + 1); }
  bool holds(const ZELO_SCHED_TASK *pTask) {
    const auto begin = reinterpret_cast<uintptr_t>(records());
    const auto address = reinterpret_cast<uintptr_t>(pTask);
    return begin <= address && address < begin + room * sizeof(ZELO_SCHED_TASK);
  }
};
static_assert(sizeof(SchedBlock) % alignof(ZELO_SCHED_TASK) == 0);

namespace {

// A record that is not freed keeps its whole block, of a little over 2 MB at most.
constexpr size_t kMostInBlock = 64;

// The newest first: the records of a list are mostly freed in that order.
SchedBlock *blocks = nullptr;

SchedBlock *newBlock(size_t room) {
  auto *block =
      static_cast<SchedBlock *>(calloc(1, sizeof(SchedBlock) + room * sizeof(ZELO_SCHED_TASK)));
  if (block != nullptr) {
    *block = {.next = blocks, .room = room, .taken = 0, .holders = 1};
    blocks = block;
  }
  return block;
}

// Drops a reference to the block that the record is in. False for a record that was allocated by
// itself.
bool release(const ZELO_SCHED_TASK *pTask) {
  for (SchedBlock **link = &blocks; *link != nullptr; link = &(*link)->next) {
    SchedBlock *block = *link;
    if (!block->holds(pTask)) {
      continue;
    }
    if (--block->holders == 0) {
      *link = block->next;
      free(block);
    }
    return true;
  }
  return false;
}

}  // namespace

void schedRecordFree(ZELO_SCHED_TASK *pTask) {
  if (!release(pTask)) {
    free(pTask);
  }
}

TaskGuard schedRecordAlloc() {
  return TaskGuard(static_cast<ZELO_SCHED_TASK *>(calloc(1, sizeof(ZELO_SCHED_TASK))));
}

SchedRecordSource::SchedRecordSource(int mostRecords)
    : left_(static_cast<size_t>(std::max(mostRecords, 1))) {}

SchedRecordSource::~SchedRecordSource() {
  if (block_ != nullptr) {
    release(block_->records());
  }
}

TaskGuard SchedRecordSource::take() {
  if (block_ != nullptr && block_->taken == block_->room) {
    release(block_->records());
    block_ = nullptr;
  }
  if (block_ == nullptr) {
    block_ = newBlock(std::min(left_, kMostInBlock));
  }
  left_ -= left_ > 1 ? 1 : 0;
  if (block_ == nullptr) {
    return schedRecordAlloc();  // there may still be memory for a single one
  }
  ++block_->holders;
  return TaskGuard(block_->records() + block_->taken++);
}
