// One step for each of several tasks. One that fails does not stop the others.
#pragma once

#include <cstdint>
#include <vector>

#include "commands/command.h"
#include "terminal/failure.h"

template <class Step>
int forEachId(const std::vector<int64_t> &ids, Step step) {
  int status = kDone;
  for (const int64_t id : ids) {
    try {
      step(id);
    } catch (const Failure &failure) {
      status = complain(failure.what());
    }
  }
  return status;
}
