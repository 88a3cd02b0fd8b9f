// One step for each of several tasks: one that fails does not keep the others from being done.
#pragma once

#include <vector>

#include "commands/command.h"
#include "terminal/failure.h"

template <class Step>
int forEachId(const std::vector<long> &ids, Step step) {
  int status = kDone;
  for (const long id : ids) {
    try {
      step(id);
    } catch (const Failure &failure) {
      status = complain(failure.what());
    }
  }
  return status;
}
