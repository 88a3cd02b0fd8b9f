// Users, over the C library's user database.
#include <pwd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <memory>

#include "support.h"
#include "zelosdk.h"

namespace {

constexpr size_t kFirstRoom = 1024;
// Far above any real entry; a broken directory service may ask for more without end.
constexpr size_t kMostRoom = size_t{1} << 20;

struct Freer {
  void operator()(void *memory) const noexcept { std::free(memory); }
};
template <typename T>
using Owned = std::unique_ptr<T, Freer>;

// getpwuid_r reports a missing user by different codes, depending on the source of the entries.
bool meansNoSuchUser(int error) noexcept {
  return error == 0 || error == ENOENT || error == ESRCH || error == EBADF || error == EPERM;
}

const char *textOf(const char *text) noexcept {
  return text != nullptr ? text : "";
}

// Copies the text to `*at` and moves `*at` past it.
char *append(char **at, const char *text) noexcept {
  char *copy = *at;
  *at = stpcpy(copy, textOf(text)) + 1;
  return copy;
}

// One block holds the record and its texts.
Owned<ZELOUSER> makeUser(const passwd &entry) noexcept {
  const size_t texts = std::strlen(textOf(entry.pw_name)) + std::strlen(textOf(entry.pw_dir)) +
                       std::strlen(textOf(entry.pw_shell)) + 3;
  Owned<ZELOUSER> user(static_cast<ZELOUSER *>(std::malloc(sizeof(ZELOUSER) + texts)));
  if (user != nullptr) {
    char *at = reinterpret_cast<char *>(user.get() + 1);
    user->uid = entry.pw_uid;
    user->gid = entry.pw_gid;
    user->szName = append(&at, entry.pw_name);
    user->szHome = append(&at, entry.pw_dir);
    user->szShell = append(&at, entry.pw_shell);
  }
  return user;
}

// 0 with the user, or the code of the failure.
int lookUp(uid_t uid, Owned<ZELOUSER> *user) noexcept {
  int error = ERANGE;
  for (size_t room = kFirstRoom; error == ERANGE && room <= kMostRoom; room *= 2) {
    const Owned<char> texts(static_cast<char *>(std::malloc(room)));
    if (texts == nullptr) {
      return QLIBC_ERR_OUT_OF_MEMORY;
    }
    passwd entry{};
    passwd *found = nullptr;
    do {
      error = getpwuid_r(uid, &entry, texts.get(), room, &found);
    } while (error == EINTR);
    if (found != nullptr) {
      *user = makeUser(entry);
      return *user != nullptr ? 0 : QLIBC_ERR_OUT_OF_MEMORY;
    }
  }
  if (error == ENOMEM) {
    return QLIBC_ERR_OUT_OF_MEMORY;
  }
  return meansNoSuchUser(error) ? QLIBC_ERR_NOT_FOUND : QLIBC_ERR_SYSTEM;
}

}  // namespace

int ZELOUserGetByUID(uid_t uid, PZELOUSER *ppUser) {
  if (ppUser == nullptr) {
    return zelo::fail(QLIBC_ERR_BAD_PARAMETER);
  }
  Owned<ZELOUSER> user;
  const int code = lookUp(uid, &user);
  if (code != 0) {
    return zelo::fail(code);
  }
  *ppUser = user.release();
  return 0;
}

void ZELOUserFree(PZELOUSER pUser) {
  std::free(pUser);
}
