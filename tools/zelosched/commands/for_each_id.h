// One step for each of several tasks: one that fails does not keep the others from being done.
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
