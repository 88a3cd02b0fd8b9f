// Users of the system's user database, with a guard that frees them.
#ifndef SCHED_USER_H
#define SCHED_USER_H

#include <zelosdk.h>

#include <memory>

#include "sched_report.h"

struct UserDeleter {
  void operator()(ZELOUSER *user) const { ZELOUserFree(user); }
};
using UserGuard = std::unique_ptr<ZELOUSER, UserDeleter>;

// Null, with the reason logged under `location`, when there is no such user.
inline UserGuard schedLookUpUser(uid_t uid, SchedSourceLocation location) {
  PZELOUSER user = nullptr;
  if (ZELOUserGetByUID(uid, &user) < 0) {
    SCHED_LOG_CALLEE_AT(location, "Get uid [%u] failed. ", uid);
    return nullptr;
  }
  return UserGuard(user);
}

#endif
