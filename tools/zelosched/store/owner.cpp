#include "store/owner.h"

#include <pwd.h>
#include <zelosdk.h>

#include <climits>
#include <cstdint>
#include <map>
#include <memory>

#include "terminal/number.h"

namespace {

struct FreeUser {
  void operator()(ZELOUSER *user) const { ZELOUserFree(user); }
};
using User = std::unique_ptr<ZELOUSER, FreeUser>;

// The name; none for a uid without a user. Cached, as the tasks of a list have few owners, and a
// look-up reads a file.
const std::optional<std::string> &nameOf(uid_t uid) {
  static std::map<uid_t, std::optional<std::string>> known;
  const auto [found, isNew] = known.try_emplace(uid);
  if (isNew) {
    PZELOUSER record = nullptr;
    const bool isUser = ZELOUserGetByUID(uid, &record) == 0;
    const User user(isUser ? record : nullptr);
    if (isUser) found->second = user->szName;
  }
  return found->second;
}

}  // namespace

// A text that cannot be a name is not looked up: a zero byte would cut it off.
std::optional<uid_t> findUserByName(const std::string &name) {
  if (name.size() > LOGIN_NAME_MAX || name.find('\0') != std::string::npos) return std::nullopt;
  const passwd *entry = getpwnam(name.c_str());
  return entry != nullptr ? std::optional<uid_t>(entry->pw_uid) : std::nullopt;
}

std::optional<uid_t> findUser(const std::string &nameOrNumber) {
  if (const auto uid = findUserByName(nameOrNumber)) return uid;
  const std::optional<int64_t> number = parseNumber(nameOrNumber);
  if (!number || *number < 0 || *number > UINT32_MAX) return std::nullopt;
  const auto uid = static_cast<uid_t>(*number);
  if (!userExists(uid)) return std::nullopt;
  return uid;
}

bool userExists(uid_t uid) {
  return nameOf(uid).has_value();
}

std::string userName(uid_t uid) {
  return nameOf(uid).value_or(std::to_string(uid));
}
