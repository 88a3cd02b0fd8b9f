// Tasks as JSON for other programs: one object a task, its members the keys of the hash form, with
// numbers as numbers and the command in plain text.
#pragma once

#include <zelosched.h>

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

namespace Json {
class Value;
}

// The text as JSON can carry it: each byte that is no UTF-8 becomes U+FFFD.
Json::Value jsonText(std::string_view text);

// With "backend" and "next trigger time" beside the keys of the hash form. A command that is not
// UTF-8 stands in Base64, as "cmd base64" in place of "cmd".
Json::Value jsonOf(const ZELO_SCHED_TASK &task);

// The keys whose texts lost bytes that JSON cannot carry.
std::vector<std::string> lossyKeysOf(const ZELO_SCHED_TASK &task);

// The way back, also from the form of ZELOSchedTaskConvertToJson, which is told by its members
// being JSON texts themselves. Members that are no key are passed over; keys that are missing have
// the defaults of the hash form. Throws Failure.
void fillFromJson(const Json::Value &object, ZELO_SCHED_TASK *task);

// So many tasks can be read at once.
inline constexpr size_t kMostTasks = 10000;

// The objects of a text: an array, one object, or one a line. Throws Failure, also for more of them
// than kMostTasks, or more values than so many have.
std::vector<Json::Value> parseObjects(const std::string &text);

// An array to the standard output, an object a line.
void printJson(const std::vector<Json::Value> &objects);
std::string onOneLine(const Json::Value &value);
