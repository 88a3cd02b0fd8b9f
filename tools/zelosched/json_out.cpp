#include "json_out.h"

#include <zelocore.h>
#include <zelosdk.h>

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <memory>
#include <sstream>

#include "failure.h"
#include "options.h"
#include "sched_utf8.h"
#include "task_check.h"
#include "text.h"

namespace {

constexpr int kHashCapacity = 64;
constexpr char kCommandKey[] = "cmd";
constexpr char kCommandBase64Key[] = "cmd base64";
constexpr char kReplacement[] = "\xEF\xBF\xBD";

struct FreeHash {
  void operator()(QLIBC_SZHASH *hash) const { QLIBCSzHashFree(hash); }
};
struct FreeList {
  void operator()(QLIBC_SZLIST *list) const { QLIBCSzListFree(list); }
};

// The keys whose values are numbers, with what their fields hold; each of the others is a text.
struct NumberKey {
  const char *key;
  long least;
  long most;
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

struct Pair {
  std::string key;
  std::string value;
};

std::vector<Pair> hashOf(const ZELO_SCHED_TASK &task) {
  forgetError();
  PSZHASH rawHash = QLIBCSzHashAlloc(kHashCapacity);
  PSZLIST rawKeys = QLIBCSzListAlloc(kHashCapacity);
  const bool filled = rawHash != nullptr && rawKeys != nullptr &&
                      ZELOSchedInitHashFromTask(&rawHash, &task) == 0 &&
                      QLIBCSzHashEnumKey(rawHash, &rawKeys) >= 0;
  const std::unique_ptr<QLIBC_SZHASH, FreeHash> hash(rawHash);
  const std::unique_ptr<QLIBC_SZLIST, FreeList> keys(rawKeys);
  if (!filled) throw failedTo("convert task " + std::to_string(task.ID));
  std::vector<Pair> pairs;
  for (int i = 0; i < QLIBCSzListCount(keys.get()); ++i) {
    const char *key = QLIBCSzListGet(keys.get(), i);
    pairs.push_back({key, QLIBCSzHashGetValue(hash.get(), key)});
  }
  return pairs;
}

std::string base64(std::string_view bytes) {
  constexpr size_t kGroup = 3;
  constexpr size_t kEncodedGroup = 4;
  std::string text((bytes.size() / kGroup + 1) * kEncodedGroup + 1, '\0');
  if (SzBase64EncodeFull(bytes.data(), bytes.size(), text.data(), text.size(), 1) != 1) {
    throw failedTo("encode a command");
  }
  text.resize(std::strlen(text.c_str()));
  return text;
}

std::string valid(std::string_view text, bool *isWhole) {
  std::string out;
  *isWhole = true;
  while (!text.empty()) {
    const size_t bytes = schedFirstCharacter(text).bytes;
    *isWhole = *isWhole && bytes > 0;
    out += bytes > 0 ? std::string(text.substr(0, bytes)) : kReplacement;
    text.remove_prefix(std::max<size_t>(bytes, 1));
  }
  return out;
}

bool isUtf8(std::string_view text) {
  bool isWhole = true;
  static_cast<void>(valid(text, &isWhole));
  return isWhole;
}

Json::Value parse(const std::string &text, std::string *errors) {
  Json::CharReaderBuilder builder;
  builder["collectComments"] = false;
  builder["failIfExtra"] = true;
  const std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
  Json::Value value;
  try {
    if (reader->parse(text.data(), text.data() + text.size(), &value, errors)) return value;
  } catch (const Json::Exception &error) {
    *errors = error.what();
  }
  return {};
}

// The text that a member of the doubly encoded form holds.
bool decodeTwice(const Json::Value &member, std::string *text) {
  if (!member.isString()) return false;
  std::string errors;
  const Json::Value inner = parse(member.asString(), &errors);
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

// One that does not fit would become another number: uid 0 of 4294967296.
void requireNumber(const std::string &key, const std::string &text) {
  const NumberKey *known = numberKey(key);
  if (known == nullptr) return;
  const std::optional<long> number = parseNumber(text);
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

// Half a command is another command. What is no Base64 is left to the conversion.
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

// What the hash form passes over must not become some other value.
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

// What a schedule cannot do without; the library would take a default of its own.
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

// "Line 3, Column 5: Missing ',' ..." of what the reader says in several lines.
std::string firstError(const std::string &errors) {
  std::istringstream lines(errors);
  std::string where;
  std::string what;
  std::getline(lines, where);
  std::getline(lines, what);
  const size_t word = where.find_first_not_of("* ");
  const size_t sentence = what.find_first_not_of(' ');
  constexpr size_t kLongest = 200;  // it quotes what it does not like, however long that is
  return (word == std::string::npos ? "" : where.substr(word)) +
         (sentence == std::string::npos ? "" : ": " + what.substr(sentence, kLongest));
}

// How many bytes of the text are the string or the comment that it begins with; 1 for anything
// else.
size_t tokenLength(std::string_view text) {
  size_t end = 1;
  if (text.front() == '"') {
    while (end < text.size() && text[end] != '"') end += text[end] == '\\' ? 2 : 1;
    ++end;
  } else if (text.substr(0, 2) == "/*") {
    end = text.find("*/", 2);
    end += end == std::string_view::npos ? 0 : 2;
  } else if (text.substr(0, 2) == "//") {
    end = text.find('\n');
  }
  return std::min(end, text.size());
}

// Each value that the reader makes takes a hundred bytes, also where its text is "0,".
void requireFewValues(std::string_view text) {
  constexpr size_t kMostMembers = 64;  // twice as many as a task has
  size_t left = kMostTasks * kMostMembers;
  while (!text.empty()) {
    const bool isNext = text.front() == ',' || text.front() == '[' || text.front() == '{';
    if (isNext && left-- == 0) {
      throw Failure("it holds more values than " + std::to_string(kMostTasks) + " tasks have");
    }
    text.remove_prefix(tokenLength(text));
  }
}

std::vector<Json::Value> requireFewTasks(std::vector<Json::Value> objects) {
  if (objects.size() <= kMostTasks) return objects;
  throw Failure("it holds " + std::to_string(objects.size()) + " tasks, and at most " +
                std::to_string(kMostTasks) + " can be read at once: divide them");
}

}  // namespace

Json::Value jsonText(std::string_view text) {
  bool isWhole = true;
  return {valid(text, &isWhole)};
}

std::vector<std::string> lossyKeysOf(const ZELO_SCHED_TASK &task) {
  std::vector<std::string> keys;
  for (const Pair &pair : hashOf(task)) {
    if (!isUtf8(pair.value)) keys.push_back(pair.key);
  }
  return keys;
}

Json::Value jsonOf(const ZELO_SCHED_TASK &task) {
  Json::Value object(Json::objectValue);
  for (const Pair &pair : hashOf(task)) {
    if (pair.key == kCommandKey) continue;
    if (numberKey(pair.key) != nullptr) {
      object[pair.key] = Json::Int64(parseNumber(pair.value).value_or(0));
    } else {
      object[pair.key] = jsonText(pair.value);
    }
  }
  if (isUtf8(task.Command)) {
    object[kCommandKey] = jsonText(task.Command);
  } else {
    object[kCommandBase64Key] = base64(task.Command);
  }
  object["backend"] = task.Backend;
  object["next trigger time"] = jsonText(task.NextTriggerTime);
  return object;
}

void fillFromJson(const Json::Value &object, ZELO_SCHED_TASK *task) {
  if (!object.isObject()) throw Failure("it is no JSON object");
  const bool isWire = isWireForm(object);
  PSZHASH raw = QLIBCSzHashAlloc(kHashCapacity);
  if (raw == nullptr) throw failedTo("read a task");
  std::unique_ptr<QLIBC_SZHASH, FreeHash> hash(raw);
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
  // The reader would take what is before it for the whole.
  if (text.find('\0') != std::string::npos) throw Failure("it holds a zero byte");
  requireFewValues(text);
  std::string errors;
  const Json::Value whole = parse(text, &errors);
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
    Json::Value object = parse(line, &errors);
    if (!object.isObject()) {
      throw Failure(objects.empty() ? "it is no JSON: " + wholeError
                                    : "line " + std::to_string(number) + " is no JSON object");
    }
    objects.push_back(std::move(object));
  }
  return requireFewTasks(std::move(objects));
}

std::string onOneLine(const Json::Value &value) {
  Json::StreamWriterBuilder builder;
  builder["indentation"] = "";
  builder["emitUTF8"] = false;  // nothing that could upset a terminal
  return Json::writeString(builder, value);
}

void printJson(const std::vector<Json::Value> &objects) {
  std::fputs("[", stdout);
  for (size_t i = 0; i < objects.size(); ++i) {
    std::printf("%s\n%s", i == 0 ? "" : ",", onOneLine(objects[i]).c_str());
  }
  std::fputs("\n]\n", stdout);
}
