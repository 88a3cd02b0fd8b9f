// One step for each of several tasks. One that fails does not stop the others.
#pragma once

#include "terminal/failure.h"

// Returns the exit status.
template <class Items, class Step>
int forEach(const Items &items, Step step) {
  int status = kDone;
  for (const auto &item : items) {
    try {
      step(item);
    } catch (const Failure &failure) {
      status = complain(failure.what());
    }
  }
  return status;
}
