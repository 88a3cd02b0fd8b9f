#include "owner.h"

#include <pwd.h>
#include <zelosdk.h>

#include <climits>
#include <cstdint>
#include <memory>

#include "options.h"

namespace {

struct FreeUser {
  void operator()(ZELOUSER *user) const { ZELOUserFree(user); }
};
using User = std::unique_ptr<ZELOUSER, FreeUser>;

User lookUp(uid_t uid) {
  PZELOUSER user = nullptr;
  return User(ZELOUserGetByUID(uid, &user) == 0 ? user : nullptr);
}

}  // namespace

std::optional<uid_t> findUser(const std::string &nameOrNumber) {
  if (const passwd *entry = getpwnam(nameOrNumber.c_str())) return entry->pw_uid;
  const std::optional<long> number = parseNumber(nameOrNumber);
  if (!number || *number < 0 || *number > UINT32_MAX) return std::nullopt;
  const auto uid = static_cast<uid_t>(*number);
  if (!userExists(uid)) return std::nullopt;
  return uid;
}

bool userExists(uid_t uid) {
  return lookUp(uid) != nullptr;
}

std::string userName(uid_t uid) {
  const User user = lookUp(uid);
  return user != nullptr ? user->szName : std::to_string(uid);
}
