#include "json/task_diff.h"

#include <json/json.h>

#include "json/json_out.h"
#include "json/task_json.h"

namespace {

using Differences = std::vector<MemberDifference>;

// Compares the members of both; those of nested objects have places such as "schedule.at".
void compare(const std::string &place, const Json::Value &before, const Json::Value &after,
             Differences *differences) {
  if (before == after) return;
  if (!before.isObject() && !after.isObject()) {
    differences->push_back({place, before, after});
    return;
  }
  Json::Value both = before;
  for (const std::string &name :
       after.isObject() ? after.getMemberNames() : Json::Value::Members()) {
    both[name] = after[name];
  }
  const auto memberOf = [](const Json::Value &object, const std::string &name) {
    return object.isObject() ? object[name] : Json::Value();
  };
  for (const std::string &name : namesOf(both)) {
    compare(place.empty() ? name : place + "." + name, memberOf(before, name),
            memberOf(after, name), differences);
  }
}

}  // namespace

std::vector<MemberDifference> differencesOf(const ZELO_SCHED_TASK *before,
                                            const ZELO_SCHED_TASK *after) {
  Differences differences;
  compare("", before != nullptr ? settingsOf(*before) : Json::Value(),
          after != nullptr ? settingsOf(*after) : Json::Value(), &differences);
  return differences;
}

bool areAlike(const ZELO_SCHED_TASK &one, const ZELO_SCHED_TASK &other) {
  return lossyMembersOf(one) == lossyMembersOf(other) && settingsOf(one) == settingsOf(other);
}
