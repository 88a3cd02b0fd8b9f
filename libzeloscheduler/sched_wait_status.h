// How backends report the end of a run.
#ifndef SCHED_WAIT_STATUS_H
#define SCHED_WAIT_STATUS_H

#include <zelosched.h>

#include <cstdio>

// Converts the wait status of the shell into the status code, and the exit code or the signal as
// the comment. Either has at most three digits.
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
