#include "fake_backends.h"

#include <dlfcn.h>

#include <algorithm>
#include <cstdlib>
#include <iterator>
#include <stdexcept>
#include <utility>

#include "tasks.h"
#include "zelocore.h"

namespace support {
namespace {

constexpr int kFakeLine = 5;
constexpr int kFound = 1;

FakeBackend fakes[kMostFakes];
std::vector<std::string> recordedCalls;
unsigned failingInit = 0;
unsigned inits = 0;

std::string withId(const char *operation, size_t index, long id) {
  return std::string(operation) + " " + std::to_string(index) + " id " + std::to_string(id);
}

int answer(const std::string &call, int result) {
  recordedCalls.push_back(call);
  if (result < 0) QLIBCErrSetEx(kFakeError, kFakeFile, kFakeLine);
  return result;
}

ZELO_SCHED_TASK *listedTask(const std::string &name, int32_t backend) {
  auto *task = static_cast<ZELO_SCHED_TASK *>(std::calloc(1, sizeof(ZELO_SCHED_TASK)));
  if (task == nullptr) throw std::bad_alloc();
  setText(task->Name, name);
  task->Backend = backend;
  return task;
}

template <size_t N>
struct Operations {
  static int sync() { return answer("sync " + std::to_string(N), fakes[N].sync); }
  static int create(ZELO_SCHED_TASK *task) {
    return answer(withId("create", N, task->ID), fakes[N].create);
  }
  static int edit(ZELO_SCHED_TASK *task) {
    return answer(withId("edit", N, task->ID), fakes[N].edit);
  }
  static int remove(long id) { return answer(withId("remove", N, id), fakes[N].remove); }
  static int get_default(ZELO_SCHED_TASK *task) {
    return answer(withId("get_default", N, task->ID), fakes[N].get_default);
  }
  static int owns_id(long id) { return answer(withId("owns_id", N, id), fakes[N].owns_id); }
  static int get_by_id(long id, ZELO_SCHED_TASK *task) {
    const int result = answer(withId("get_by_id", N, id), fakes[N].get_by_id);
    if (result == kFound) {
      task->Backend = SchedBackends[N].id;
      task->ID = static_cast<int32_t>(id);
      setText(task->Name, "stored by " + std::to_string(N));
    }
    return result;
  }
  static int list_get(ZELO_SCHED_TASK **list, ZELO_SCHED_TASK_FILTER filter) {
    if (answer("list_get " + std::to_string(N), fakes[N].list_get) < 0) return fakes[N].list_get;
    while (*list != nullptr) list = &(*list)->next;
    int added = 0;
    for (const std::string &name : fakes[N].tasks) {
      ZELO_SCHED_TASK *task = listedTask(name, SchedBackends[N].id);
      if (filter != nullptr && filter(task) == 0) {
        std::free(task);
        continue;
      }
      *list = task;
      list = &task->next;
      ++added;
    }
    return added;
  }

  static void fill(ZELO_SCHED_BACKEND *entry) {
    *entry = {};
    entry->id = ZELO_SCHED_BACKEND_SCHEDULE - static_cast<int32_t>(N);
    entry->szName = "fake";
    entry->sync = sync;
    entry->create = create;
    entry->edit = edit;
    entry->remove = remove;
    entry->get_default = get_default;
    entry->owns_id = owns_id;
    entry->get_by_id = get_by_id;
    entry->list_get = list_get;
  }
};

template <size_t... N>
void fillEntries(std::index_sequence<N...>) {
  (Operations<N>::fill(&SchedBackends[N]), ...);
}

void forget() {
  for (FakeBackend &fake : fakes) fake = {};
  recordedCalls.clear();
  failingInit = 0;
}

}  // namespace

FakeBackends::FakeBackends(size_t count) {
  if (count > kMostFakes) throw std::invalid_argument("too many fake backends");
  if (ZELOSchedBackendInit() != 0) throw std::runtime_error("cannot register the backends");
  std::copy(std::begin(SchedBackends), std::end(SchedBackends), saved_);
  savedCount_ = cBackend;
  forget();
  fillEntries(std::make_index_sequence<kMostFakes>());
  cBackend = static_cast<uint32_t>(count);
}

FakeBackends::~FakeBackends() {
  std::copy(std::begin(saved_), std::end(saved_), SchedBackends);
  cBackend = savedCount_;
  forget();
}

FakeBackend &FakeBackends::operator[](size_t index) {
  return fakes[index];
}

const std::vector<std::string> &FakeBackends::calls() const {
  return recordedCalls;
}

void failBackendInit(unsigned nth) {
  failingInit = nth;
  inits = 0;
}

ZELO_SCHED_TASK taskOf(int32_t backend, int32_t id) {
  ZELO_SCHED_TASK task = {};
  task.Backend = backend;
  task.ID = id;
  return task;
}

}  // namespace support

// Before the library's own, for the library's calls too.
extern "C" __attribute__((visibility("default"))) int ZELOSchedBackendInit(void) {
  if (++support::inits == support::failingInit) return -1;
  static const auto real = reinterpret_cast<int (*)()>(dlsym(RTLD_NEXT, "ZELOSchedBackendInit"));
  return real();
}
