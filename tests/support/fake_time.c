/*
 * To be preloaded into a program: the clock stands where FAKE_TIME (seconds since
 * the epoch) says, the machine was started FAKE_UPTIME seconds before that (or, when
 * it is not set, when FAKE_STARTED says, or at the beginning of November 2026), and
 * with FAKE_PATIENCE set, waiting takes no time: sleeps return at once, and each look
 * at the monotonic clock finds it ten seconds later.
 */
#include <dlfcn.h>
#include <stdlib.h>
#include <time.h>
#include <unistd.h>

time_t time(time_t *result) {
  const char *fake = getenv("FAKE_TIME");
  struct timespec now;
  time_t seconds;
  clock_gettime(CLOCK_REALTIME, &now);
  seconds = fake != NULL ? (time_t)strtoll(fake, NULL, 10) : now.tv_sec;
  if (result != NULL) *result = seconds;
  return seconds;
}

/* The first look at it finds this; it goes on from there. */
static time_t fake_uptime(const char *fake) {
  const char *uptime = getenv("FAKE_UPTIME");
  const char *started = getenv("FAKE_STARTED");
  if (uptime != NULL) return (time_t)strtoll(uptime, NULL, 10);
  if (started == NULL) started = "1793491200"; /* 2026-11-01 */
  return (time_t)strtoll(fake, NULL, 10) - (time_t)strtoll(started, NULL, 10);
}

int clock_gettime(clockid_t clock, struct timespec *now) {
  static int (*real)(clockid_t, struct timespec *);
  static time_t later;
  static time_t first;
  const char *fake = getenv("FAKE_TIME");
  int result;
  if (real == NULL) *(void **)&real = dlsym(RTLD_NEXT, "clock_gettime");
  result = real(clock, now);
  if (clock == CLOCK_BOOTTIME && fake != NULL) {
    if (first == 0) first = now->tv_sec;
    now->tv_sec += fake_uptime(fake) - first;
  }
  if (clock == CLOCK_MONOTONIC && getenv("FAKE_PATIENCE") != NULL) {
    later += 10;
    now->tv_sec += later;
  }
  return result;
}

int usleep(useconds_t microseconds) {
  static int (*real)(useconds_t);
  if (getenv("FAKE_PATIENCE") != NULL) return 0;
  if (real == NULL) *(void **)&real = dlsym(RTLD_NEXT, "usleep");
  return real(microseconds);
}

unsigned sleep(unsigned seconds) {
  static unsigned (*real)(unsigned);
  if (getenv("FAKE_PATIENCE") != NULL) return 0;
  if (real == NULL) *(void **)&real = dlsym(RTLD_NEXT, "sleep");
  return real(seconds);
}

int nanosleep(const struct timespec *wanted, struct timespec *left) {
  static int (*real)(const struct timespec *, struct timespec *);
  if (getenv("FAKE_PATIENCE") != NULL) return 0;
  if (real == NULL) *(void **)&real = dlsym(RTLD_NEXT, "nanosleep");
  return real(wanted, left);
}
