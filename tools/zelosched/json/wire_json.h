// Tasks in the library's own JSON form: one object a task, its members the keys of the hash form.
#pragma once

#include <zelosched.h>

#include <string>
#include <vector>

namespace Json {
class Value;
}

// A key of the hash form of a task, and its value.
struct StoredMember {
  std::string key;
  std::string value;
  bool operator==(const StoredMember &) const = default;
};
std::vector<StoredMember> storedMembersOf(const ZELO_SCHED_TASK &task);

// The keys whose texts have bytes that JSON cannot carry.
std::vector<std::string> lossyKeysOf(const ZELO_SCHED_TASK &task);

// From the form of ZELOSchedTaskConvertToJson, whose members are JSON texts themselves, or from one
// of plain texts and numbers, with the command as "cmd" or in Base64 as "cmd base64". Unknown
// members are ignored; missing optional keys have the defaults of the hash form. Throws Failure.
void fillFromJson(const Json::Value &object, ZELO_SCHED_TASK *task);

// The objects of a text: an array, one object, or one a line. Throws Failure, also for more of them
// than kMostTasks, or more values than so many have.
std::vector<Json::Value> parseObjects(const std::string &text);
