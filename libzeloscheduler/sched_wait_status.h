// How a run ended, as every backend reports it.
#ifndef SCHED_WAIT_STATUS_H
#define SCHED_WAIT_STATUS_H

#include <zelosched.h>

#include <cstdio>

// What the wait status of the shell means: the code, and in the comment the exit code or the
// signal. Three digits hold either.
inline void schedReportWaitStatus(int status, int *pStatusCode, char *szComment) {
  constexpr size_t kCommentCapacity = 4;
  constexpr int kStoppedByte = 0x7F;
  const int lowByte = status & 0xFF;
  const int lowBits = status & 0x7F;
  const int highByte = (status >> 8) & 0xFF;
  const auto report = [&](int code, int number) {
    *pStatusCode = code;
    snprintf(szComment, kCommentCapacity, "%d", number);
  };
  if (status == 0) {
    *pStatusCode = ZELO_SCHED_STATUS_FINISHED;
  } else if (status == -1) {
    *pStatusCode = ZELO_SCHED_STATUS_NOT_STARTED;
  } else if (lowBits == 0 || lowBits == kStoppedByte) {
    report(ZELO_SCHED_STATUS_EXIT_NONZERO, highByte);
  } else if (lowByte == kStoppedByte) {
    report(ZELO_SCHED_STATUS_STOPPED, highByte);
  } else {
    report(ZELO_SCHED_STATUS_KILLED, lowBits);
  }
}

#endif
