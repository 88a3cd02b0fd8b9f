#include "json/wire_json.h"

#include <json/json.h>
#include <zelocore.h>
#include <zelosdk.h>

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <sstream>

#include "check/task_check.h"
#include "json/json_in.h"
#include "json/json_out.h"
#include "store/platform_guards.h"
#include "terminal/failure.h"
#include "terminal/number.h"
#include "terminal/text.h"

namespace {

constexpr int kHashCapacity = 64;
constexpr char kCommandKey[] = "cmd";
constexpr char kCommandBase64Key[] = "cmd base64";

// The keys whose values are numbers, with the ranges of their fields; all others are texts.
struct NumberKey {
  const char *key;
  int64_t least;
  int64_t most;
};
constexpr NumberKey signedKey(const char *key) {
  return {key, INT32_MIN, INT32_MAX};
}
constexpr NumberKey unsignedKey(const char *key) {
  return {key, 0, UINT32_MAX};
}
constexpr NumberKey kNumberKeys[] = {
    signedKey("id"),
    signedKey("can edit owner"),
    signedKey("can edit name"),
    signedKey("listable"),
    signedKey("can run from ui"),
    signedKey("can delete from ui"),
    signedKey("can edit from ui"),
    signedKey("can run app same time"),
    signedKey("can run task same time"),
    signedKey("simple edit form"),
    unsignedKey("owner"),
    unsignedKey("start year"),
    unsignedKey("start month"),
    unsignedKey("start day"),
    unsignedKey("run hour"),
    unsignedKey("run min"),
    unsignedKey("repeat hour"),
    unsignedKey("last work hour"),
};

const NumberKey *numberKey(std::string_view key) {
  const auto *found = std::find_if(std::begin(kNumberKeys), std::end(kNumberKeys),
                                   [&](const NumberKey &known) { return known.key == key; });
  return found != std::end(kNumberKeys) ? found : nullptr;
}

// The text of a member that is itself encoded as JSON.
bool decodeTwice(const Json::Value &member, std::string *text) {
  if (!member.isString()) return false;
  std::string errors;
  const Json::Value inner = parseJson(member.asString(), &errors);
  if (!inner.isString()) return false;
  *text = inner.asString();
  return true;
}

bool isWireForm(const Json::Value &object) {
  std::string text;
  return !object.empty() &&
         std::all_of(object.begin(), object.end(),
                     [&](const Json::Value &member) { return decodeTwice(member, &text); });
}

// A number that does not fit would wrap around: 4294967296 to uid 0.
void requireNumber(const std::string &key, const std::string &text) {
  const NumberKey *known = numberKey(key);
  if (known == nullptr) return;
  const std::optional<int64_t> number = parseNumber(text);
  if (!number) throw Failure("\"" + key + "\" is no whole number");
  if (*number < known->least || *number > known->most) {
    throw Failure("\"" + key + "\" is " + printable(text) + ", and must be from " +
                  std::to_string(known->least) + " to " + std::to_string(known->most));
  }
}

std::string memberText(const std::string &key, const Json::Value &member, bool isWire) {
  std::string text;
  if (isWire) {
    decodeTwice(member, &text);
  } else if (member.isString()) {
    text = member.asString();
  } else if (member.isInt64()) {
    text = std::to_string(member.asInt64());
  } else {
    throw Failure("\"" + printable(key) + "\" is neither a text nor a whole number");
  }
  if (text.find('\0') != std::string::npos) {
    throw Failure("\"" + printable(key) + "\" holds a zero byte");
  }
  requireNumber(key, text);
  return text;
}

// Refuses a command that would be cut off. Invalid Base64 is left to the conversion.
void requireWholeCommand(const std::string &encoded) {
  std::string command(encoded.size() + 1, '\0');
  size_t length = command.size();
  if (ZELOEncodingBase64Decode(encoded.data(), encoded.size(), command.data(), &length) == 0)
    return;
  if (command.find('\0') < length) throw Failure("\"cmd\" holds a zero byte");
  if (length > kMostCommandBytes) {
    throw Failure("\"cmd\" is " + std::to_string(length) + " bytes long, and only " +
                  std::to_string(kMostCommandBytes) + " can be stored: put it into a script");
  }
}

struct Names {
  const char *key;
  std::vector<std::string> names;
};

// The conversion ignores an unknown name, which would leave another value.
void checkName(const std::string &key, const std::string &text) {
  static const Names kEnumerations[] = {
      {"state", {"disabled", "enabled"}},
      {"type", {"once", "daily", "weekly", "monthly", "yearly"}},
  };
  for (const Names &known : kEnumerations) {
    if (key != known.key) continue;
    if (std::find(known.names.begin(), known.names.end(), text) == known.names.end()) {
      throw Failure("\"" + key + "\" is '" + printable(text) + "', which it cannot be");
    }
  }
}

struct Field {
  const char *key;
  size_t capacity;
};
constexpr Field kTextFields[] = {
    {"name", sizeof(ZELO_SCHED_TASK::Name)},
    {"edit form", sizeof(ZELO_SCHED_TASK::EditForm)},
    {"edit dialog", sizeof(ZELO_SCHED_TASK::EditDialog)},
    {"app", sizeof(ZELO_SCHED_TASK::App)},
    {"app name", sizeof(ZELO_SCHED_TASK::AppName)},
    {"app args", sizeof(ZELO_SCHED_TASK::AppArgs)},
    {"action", sizeof(ZELO_SCHED_TASK::Action)},
    {"week", sizeof(ZELO_SCHED_TASK::Week)},
};

void checkLength(const std::string &key, const std::string &text) {
  for (const Field &field : kTextFields) {
    if (key == field.key && text.size() >= field.capacity) {
      throw Failure("\"" + key + "\" is longer than " + std::to_string(field.capacity - 1) +
                    " bytes");
    }
  }
}

constexpr const char *kRequiredKeys[] = {"run hour", "run min", "name",  "app", "app name",
                                         "action",   "cmd",     "state", "type"};

// The keys that a schedule needs; for a missing one the library would take a default.
constexpr struct {
  const char *type;
  const char *key;
} kScheduleKeys[] = {
    {"once", "start year"},  {"once", "start month"},  {"once", "start day"},
    {"weekly", "week"},      {"monthly", "start day"}, {"yearly", "start month"},
    {"yearly", "start day"},
};

void require(PSZHASH hash, const char *key) {
  if (QLIBCSzHashGetValue(hash, key) == nullptr) {
    throw Failure(std::string("\"") + key + "\" is missing");
  }
}

void checkRequired(PSZHASH hash) {
  for (const char *key : kRequiredKeys) require(hash, key);
  const std::string type = QLIBCSzHashGetValue(hash, "type");
  for (const auto &needed : kScheduleKeys) {
    if (type == needed.type) require(hash, needed.key);
  }
}

std::vector<Json::Value> requireFewTasks(std::vector<Json::Value> objects) {
  if (objects.size() <= kMostTasks) return objects;
  throw Failure("it holds " + std::to_string(objects.size()) + " tasks, and at most " +
                std::to_string(kMostTasks) + " can be read at once: divide them");
}

}  // namespace

std::vector<StoredMember> storedMembersOf(const ZELO_SCHED_TASK &task) {
  forgetError();
  PSZHASH rawHash = QLIBCSzHashAlloc(kHashCapacity);
  PSZLIST rawKeys = QLIBCSzListAlloc(kHashCapacity);
  const bool filled = rawHash != nullptr && rawKeys != nullptr &&
                      ZELOSchedInitHashFromTask(&rawHash, &task) == 0 &&
                      QLIBCSzHashEnumKey(rawHash, &rawKeys) >= 0;
  const Hash hash(rawHash);
  const List keys(rawKeys);
  if (!filled) throw failedTo("convert task " + std::to_string(task.ID));
  std::vector<StoredMember> members;
  for (int i = 0; i < QLIBCSzListCount(keys.get()); ++i) {
    const char *key = QLIBCSzListGet(keys.get(), i);
    members.push_back({key, QLIBCSzHashGetValue(hash.get(), key)});
  }
  return members;
}

std::vector<std::string> lossyKeysOf(const ZELO_SCHED_TASK &task) {
  std::vector<std::string> keys;
  for (const StoredMember &member : storedMembersOf(task)) {
    if (!isUtf8(member.value)) keys.push_back(member.key);
  }
  return keys;
}

void fillFromJson(const Json::Value &object, ZELO_SCHED_TASK *task) {
  if (!object.isObject()) throw Failure("it is no JSON object");
  const bool isWire = isWireForm(object);
  PSZHASH raw = QLIBCSzHashAlloc(kHashCapacity);
  if (raw == nullptr) throw failedTo("read a task");
  Hash hash(raw);
  const auto set = [&](const std::string &key, const std::string &value) {
    PSZHASH handle = hash.release();
    const int result = QLIBCSzHashSetValue(&handle, key.c_str(), value.c_str());
    hash.reset(handle);
    if (result < 0) throw failedTo("read a task");
  };
  set("id", std::to_string(ZELO_SCHED_ID_NEW));
  for (const std::string &key : object.getMemberNames()) {
    if (key.empty() || key.find('\0') != std::string::npos) throw Failure("a member has no name");
    const std::string text = memberText(key, object[key], isWire);
    checkName(key, text);
    checkLength(key, text);
    if (key != kCommandKey && key != kCommandBase64Key) {
      set(key, text);
      continue;
    }
    const std::string encoded = !isWire && key == kCommandKey ? base64(text) : text;
    requireWholeCommand(encoded);
    set(kCommandKey, encoded);
  }
  if (object.isMember(kCommandKey) && object.isMember(kCommandBase64Key)) {
    throw Failure("give one of \"cmd\" and \"cmd base64\"");
  }
  checkRequired(hash.get());
  forgetError();
  if (ZELOSchedInitTaskFromHash(task, hash.get()) < 0) {
    throw Failure("it is no task: " + errorInWords());
  }
}

std::vector<Json::Value> parseObjects(const std::string &text) {
  requireFewValues(text);
  std::string errors;
  const Json::Value whole = parseJson(text, &errors);
  if (whole.isArray()) return requireFewTasks({whole.begin(), whole.end()});
  if (whole.isObject()) return {whole};
  if (errors.empty()) throw Failure("it is neither an object nor an array");
  const std::string wholeError = firstError(errors);
  const size_t first = text.find_first_not_of(" \t\r\n");
  if (first == std::string::npos) throw Failure("it holds no task");
  if (text[first] == '[') throw Failure("it is no JSON: " + wholeError);
  std::vector<Json::Value> objects;
  std::istringstream lines(text);
  std::string line;
  for (size_t number = 1; std::getline(lines, line); ++number) {
    if (line.find_first_not_of(" \t\r") == std::string::npos) continue;
    Json::Value object = parseJson(line, &errors);
    if (!object.isObject()) {
      throw Failure(objects.empty() ? "it is no JSON: " + wholeError
                                    : "line " + std::to_string(number) + " is no JSON object");
    }
    objects.push_back(std::move(object));
  }
  return requireFewTasks(std::move(objects));
}
