// Guards that release hashes, lists, memory and records at the end of a scope.
#ifndef SCHED_GUARDS_H
#define SCHED_GUARDS_H

#include <zelocore.h>
#include <zelosched.h>

#include <cstdlib>
#include <memory>

#include "sched_record.h"

struct HashDeleter {
  void operator()(QLIBC_SZHASH *hash) const { QLIBCSzHashFree(hash); }
};
struct ListDeleter {
  void operator()(QLIBC_SZLIST *list) const { QLIBCSzListFree(list); }
};
struct MemoryDeleter {
  void operator()(void *memory) const { free(memory); }
};

// The platform may move a hash or a list when it grows, so its calls take the address of the
// handle, which handle() returns. Some platforms do not accept null for freeing.
template <class Handle, class Deleter>
class PlatformHandle {
 public:
  explicit PlatformHandle(Handle handle) : handle_(handle) {}
  ~PlatformHandle() {
    if (handle_ != nullptr) {
      Deleter()(handle_);
    }
  }
  PlatformHandle(const PlatformHandle &) = delete;
  PlatformHandle &operator=(const PlatformHandle &) = delete;

  explicit operator bool() const { return handle_ != nullptr; }
  Handle get() const { return handle_; }
  Handle *handle() { return &handle_; }

 private:
  Handle handle_;
};

using HashGuard = PlatformHandle<PSZHASH, HashDeleter>;
using ListGuard = PlatformHandle<PSZLIST, ListDeleter>;

// A chain of records that is freed unless it is released.
class TaskChain {
 public:
  TaskChain() = default;
  ~TaskChain() { ZELOSchedTaskListFree(&head_); }
  TaskChain(const TaskChain &) = delete;
  TaskChain &operator=(const TaskChain &) = delete;

  void pushFront(TaskGuard task) {
    task->next = head_;
    head_ = task.release();
  }
  void appendTo(ZELO_SCHED_TASK **pTaskList) {
    while (*pTaskList != nullptr) {
      pTaskList = &(*pTaskList)->next;
    }
    *pTaskList = release();
  }
  ZELO_SCHED_TASK *release() {
    ZELO_SCHED_TASK *head = head_;
    head_ = nullptr;
    return head;
  }
  ZELO_SCHED_TASK *head() const { return head_; }
  ZELO_SCHED_TASK **handle() { return &head_; }

 private:
  ZELO_SCHED_TASK *head_ = nullptr;
};

#endif
