// Reads values of different types from the bytes of a fuzz target.
#ifndef FUZZ_INPUT_H
#define FUZZ_INPUT_H

#include <zelosched.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string>

class FuzzInput {
 public:
  FuzzInput(const uint8_t *data, size_t size) : data_(data), left_(size) {}

  template <class Number>
  Number number() {
    Number value{};
    const size_t count = std::min(left_, sizeof(value));
    if (count > 0) {
      std::memcpy(&value, data_, count);
    }
    skip(count);
    return value;
  }

  // Up to its zero byte.
  std::string text() {
    const auto *begin = reinterpret_cast<const char *>(data_);
    const size_t length = strnlen(begin, left_);
    std::string value(begin, length);
    skip(std::min(left_, length + 1));
    return value;
  }

  template <size_t capacity>
  void fill(char (&field)[capacity]) {
    snprintf(field, capacity, "%s", text().c_str());
  }

 private:
  void skip(size_t count) {
    data_ += count;
    left_ -= count;
  }

  const uint8_t *data_;
  size_t left_;
};

// A record with any values in its id, owner, state and schedule, and in some of its texts.
inline ZELO_SCHED_TASK *anyTask(FuzzInput *input) {
  static ZELO_SCHED_TASK task;
  task = {};
  for (int32_t *field : {&task.ID, &task.State, &task.Type, &task.CanRunAppSameTime}) {
    *field = input->number<int32_t>();
  }
  for (uint32_t *field : {&task.Owner, &task.StartYear, &task.StartMonth, &task.StartDay,
                          &task.RunHour, &task.RunMin, &task.RepeatHour, &task.LastWorkHour}) {
    *field = input->number<uint32_t>();
  }
  for (char &day : task.Week) {
    day = input->number<char>();
  }
  task.Week[sizeof(task.Week) - 1] = '\0';
  input->fill(task.Name);
  input->fill(task.App);
  input->fill(task.AppArgs);
  input->fill(task.Command);
  return &task;
}

// Traps when a condition does not hold, so that the fuzzer keeps the input.
inline void require(bool holds) {
  if (!holds) {
    __builtin_trap();
  }
}

#endif
