// Backends made by a test, which stand in the library's table for as long as a FakeBackends lives.
// Each offers every operation; a test empties slots and sets ids in SchedBackends itself.
//
//   FakeBackends fakes(2);                    entries 0 and 1, ids -2 and -3
//   SchedBackends[1].edit = nullptr;
//   fakes[0].create = -7;                     what the operation gives; below 0 it also leaves
//                                             kFakeError of kFakeFile in the error record
//   fakes[0].tasks = {"a", "b"};              what list_get adds, filtered
//   fakes.calls()                             "create 0 id 5", "sync 1", "get_by_id 0 id 7", ...
//
//   failBackendInit(2);                       the second ZELOSchedBackendInit from now on fails
//
// A test program that uses this names support/fake_backends.cpp among its SOURCES.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "zelosched.h"

namespace support {

inline constexpr int kFakeError = 0x4321;
inline constexpr char kFakeFile[] = "fake.cpp";
inline constexpr size_t kMostFakes = 4;

struct FakeBackend {
  int sync = 0;
  int create = 0;
  int edit = 0;
  int remove = 1;
  int get_default = 0;
  int owns_id = 1;
  int get_by_id = 0;  // 1 fills the record: the entry's id, the id asked for, "stored by N"
  int list_get = 0;   // below 0: fails; else the number of tasks is given
  std::vector<std::string> tasks;
};

class FakeBackends {
 public:
  explicit FakeBackends(size_t count);
  ~FakeBackends();
  FakeBackends(const FakeBackends &) = delete;
  FakeBackends &operator=(const FakeBackends &) = delete;

  FakeBackend &operator[](size_t index);
  const std::vector<std::string> &calls() const;

 private:
  ZELO_SCHED_BACKEND saved_[sizeof(SchedBackends) / sizeof(SchedBackends[0])];
  uint32_t savedCount_;
};

// Until the next cleanup of a FakeBackends, and in every process forked meanwhile.
void failBackendInit(unsigned nth = 1);

// Zero-filled but for these.
ZELO_SCHED_TASK taskOf(int32_t backend, int32_t id);

}  // namespace support
