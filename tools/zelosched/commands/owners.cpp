// zelosched owners
#include <json/json.h>
#include <pwd.h>

#include <algorithm>
#include <cstring>
#include <string>
#include <vector>

#include "commands/command.h"
#include "commands/options.h"
#include "json/json_out.h"
#include "terminal/table.h"

namespace {

constexpr Option kOwnersOptions[] = {{"json"}};
constexpr uid_t kNobody = 65534;
constexpr uid_t kFirstPerson = 1000;  // on Debian; lower ones are of programs

struct Owner {
  uid_t uid;
  std::string name;
  std::string fullName;
  bool isPerson;
};

// The first field of the GECOS text.
std::string fullNameOf(const passwd &entry) {
  const std::string all = entry.pw_gecos != nullptr ? entry.pw_gecos : "";
  return all.substr(0, all.find(','));
}

// Those that getpwent() lists; a directory service may know more.
std::vector<Owner> owners() {
  std::vector<Owner> found;
  setpwent();
  while (const passwd *entry = getpwent()) {
    const bool isPerson = entry->pw_uid >= kFirstPerson && entry->pw_uid != kNobody;
    found.push_back({entry->pw_uid, entry->pw_name, fullNameOf(*entry), isPerson});
  }
  endpwent();
  std::stable_sort(found.begin(), found.end(),
                   [](const Owner &a, const Owner &b) { return a.uid < b.uid; });
  return found;
}

void printTable(const std::vector<Owner> &all) {
  Table table({{"UID", Column::kRight}, {"OWNER"}, {"FULL NAME", Column::kLeft, true}});
  for (const Owner &owner : all) {
    table.add({{std::to_string(owner.uid)}, {owner.name}, {owner.fullName}});
  }
  table.print();
}

void printAsJson(const std::vector<Owner> &all) {
  Json::Value top = topObject();
  Json::Value &list = top["owners"] = Json::Value(Json::arrayValue);
  for (const Owner &owner : all) {
    Json::Value object;
    object["owner"] = jsonText(owner.name);
    object["owner_uid"] = owner.uid;
    object["full_name"] = jsonTextOrNull(owner.fullName);
    object["is_person"] = owner.isPerson;
    list.append(std::move(object));
  }
  printTop(top);
}

int runOwners(int argc, char **argv) {
  const Arguments arguments(argc, argv, kOwnersOptions);
  arguments.requireNoOperands();
  arguments.requireNoCommand();
  if (arguments.has("json")) {
    printAsJson(owners());
  } else {
    printTable(owners());
  }
  return kDone;
}

}  // namespace

const Command kOwnersCommand = {
    "owners", "[--json]", "list the users under whose rights tasks can run",
    "Lists the users of the machine, by their numbers: root, those of programs, and people.\n"
    "\n"
    "  --json                         as JSON: see zelosched-json(5)\n",
    runOwners};
