// Users by name and by number.
#pragma once

#include <sys/types.h>

#include <optional>
#include <string>

// The user of that name, else of that number; nothing when there is neither.
std::optional<uid_t> findUser(const std::string &nameOrNumber);

// The user of that name.
std::optional<uid_t> findUserByName(const std::string &name);

bool userExists(uid_t uid);

// The user's name, or the uid as a text where there is no such user.
std::string userName(uid_t uid);
