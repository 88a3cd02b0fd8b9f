// Users and groups of the sandbox's own user database.
//
//   class OwnerTest : public support::UsersTest {};  restores both files after each test
//   addUser("owner", 4242, 4343, "/tmp/home");
//   addGroup("group", 4444, "owner");
#pragma once

#include <sys/types.h>

#include <fstream>
#include <string>

#include "sandbox_fixture.h"

namespace support {

inline constexpr char kUserDatabase[] = "/etc/passwd";
inline constexpr char kGroupDatabase[] = "/etc/group";

// Unlike nobody's, its user id and its group id differ.
inline constexpr char kOwnerName[] = "zeloowner";
inline constexpr uid_t kOwner = 4242;
inline constexpr gid_t kOwnerGroup = 4343;
inline constexpr char kSecondGroupName[] = "zelogroup";
inline constexpr gid_t kSecondGroup = 4444;

inline void addUser(const std::string &name, uid_t uid, gid_t gid, const std::string &home,
                    const std::string &shell = "/bin/sh") {
  std::ofstream(kUserDatabase, std::ios::app)
      << name << ":x:" << uid << ":" << gid << "::" << home << ":" << shell << "\n";
}

inline void addGroup(const std::string &name, gid_t gid, const std::string &members) {
  std::ofstream(kGroupDatabase, std::ios::app) << name << ":x:" << gid << ":" << members << "\n";
}

class UsersTest : public SandboxTest {
 protected:
  void SetUp() override {
    SandboxTest::SetUp();
    users_ = readFile(kUserDatabase);
    groups_ = readFile(kGroupDatabase);
  }

  void TearDown() override {
    writeFile(kUserDatabase, users_);
    writeFile(kGroupDatabase, groups_);
    SandboxTest::TearDown();
  }

  static void addOwner(const std::string &home = "/nonexistent",
                       const std::string &shell = "/bin/sh") {
    addUser(kOwnerName, kOwner, kOwnerGroup, home, shell);
    addGroup("zeloowners", kOwnerGroup, "");
    addGroup(kSecondGroupName, kSecondGroup, kOwnerName);
  }

 private:
  std::string users_;
  std::string groups_;
};

}  // namespace support
