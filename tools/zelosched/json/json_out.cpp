#include "json/json_out.h"

#include <json/json.h>
#include <zelosdk.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <unordered_map>
#include <utility>

#include "runs/moment_text.h"
#include "sched_utf8.h"
#include "terminal/failure.h"

namespace {

constexpr char kReplacement[] = "\xEF\xBF\xBD";

// The order of members in the output; others follow, by their names.
constexpr const char *kOrder[] = {"version",      "dry_run",
                                  "severity",     "kind",
                                  "text",         "id",
                                  "run",          "task",
                                  "name",         "task_name",
                                  "app",          "app_name",
                                  "app_args",     "action",
                                  "change",       "owner",
                                  "owner_uid",    "power",
                                  "enabled",      "schedule",
                                  "type",         "date",
                                  "days",         "month",
                                  "day",          "at",
                                  "every_hours",  "until_hour",
                                  "from",         "command",
                                  "time_limit",   "overlap",
                                  "trigger",      "due",
                                  "queued",       "start",
                                  "end",          "duration_seconds",
                                  "state",        "outcome",
                                  "exit_code",    "signal",
                                  "output_bytes", "ui",
                                  "next_run",     "last_run",
                                  "running",      "problems",
                                  "member",       "before",
                                  "after",        "differences"};

size_t rankOf(const std::string &name) {
  static const auto ranks = [] {
    std::unordered_map<std::string_view, size_t> made;
    for (const char *known : kOrder) made.emplace(known, made.size());
    return made;
  }();
  const auto found = ranks.find(name);
  return found == ranks.end() ? ranks.size() : found->second;
}

// Quoted, with control characters and all beyond ASCII escaped.
std::string quoted(const std::string &text) {
  return Json::valueToQuotedString(text.c_str());
}

bool isFlat(const Json::Value &value) {
  return std::none_of(value.begin(), value.end(), [](const Json::Value &member) {
    return (member.isArray() || member.isObject()) && !member.empty();
  });
}

// When indented, the items of a value that holds a non-empty list or object have a line each; every
// other value is on one line.
class Writer {
 public:
  enum Form { kOneLine, kIndented };
  explicit Writer(Form form) : form_(form) {}

  std::string text(const Json::Value &value) {
    write(value, 0);
    return std::move(out_);
  }

 private:
  void write(const Json::Value &value, size_t depth) {
    if (value.isObject()) {
      writeMembers(value, depth);
    } else if (value.isArray()) {
      writeElements(value, depth);
    } else {
      writeLeaf(value);
    }
  }

  void writeLeaf(const Json::Value &value) {
    switch (value.type()) {
      case Json::nullValue:
        out_ += "null";
        return;
      case Json::stringValue:
        out_ += quoted(value.asString());
        return;
      case Json::realValue:  // seconds, to a millisecond
        out_ += Json::valueToString(value.asDouble(), 3, Json::PrecisionType::decimalPlaces);
        return;
      default:
        out_ += value.asString();  // an integer, true or false
    }
  }

  void writeMembers(const Json::Value &object, size_t depth) {
    const bool isLong = form_ == kIndented && !isFlat(object);
    const char *separator = "";
    out_ += '{';
    for (const std::string &name : namesOf(object)) {
      out_ += separator;
      startItem(isLong, depth + 1);
      out_.append(quoted(name)).append(": ");
      write(object[name], depth + 1);
      separator = isLong ? "," : ", ";
    }
    if (isLong) startItem(true, depth);
    out_ += '}';
  }

  void writeElements(const Json::Value &list, size_t depth) {
    const bool isLong = form_ == kIndented && !isFlat(list);
    const char *separator = "";
    out_ += '[';
    for (const Json::Value &value : list) {
      out_ += separator;
      startItem(isLong, depth + 1);
      write(value, depth + 1);
      separator = isLong ? "," : ", ";
    }
    if (isLong) startItem(true, depth);
    out_ += ']';
  }

  void startItem(bool isLong, size_t depth) {
    constexpr size_t kStep = 2;
    if (isLong) out_ += '\n' + std::string(depth * kStep, ' ');
  }

  Form form_;
  std::string out_;
};

void printList(const Json::Value &list) {
  std::fputs("[", stdout);
  const char *before = "\n";
  for (const Json::Value &value : list) {
    std::printf("%s%s", before, onOneLine(value).c_str());
    before = ",\n";
  }
  std::fputs(list.empty() ? "]" : "\n]", stdout);
}

}  // namespace

std::vector<std::string> namesOf(const Json::Value &object) {
  std::vector<std::pair<size_t, std::string>> ranked;
  for (std::string &name : object.getMemberNames()) {
    const size_t rank = rankOf(name);
    ranked.emplace_back(rank, std::move(name));
  }
  std::sort(ranked.begin(), ranked.end());
  std::vector<std::string> names;
  for (auto &[rank, name] : ranked) names.push_back(std::move(name));
  return names;
}

bool isUtf8(std::string_view text) {
  while (!text.empty()) {
    const size_t bytes = schedFirstCharacter(text).bytes;
    if (bytes == 0) return false;
    text.remove_prefix(bytes);
  }
  return true;
}

Json::Value jsonText(std::string_view text) {
  if (isUtf8(text)) return {std::string(text)};
  std::string out;
  while (!text.empty()) {
    const size_t bytes = schedFirstCharacter(text).bytes;
    out += bytes > 0 ? std::string(text.substr(0, bytes)) : kReplacement;
    text.remove_prefix(std::max<size_t>(bytes, 1));
  }
  return {out};
}

std::string base64(std::string_view bytes) {
  constexpr size_t kGroup = 3;
  constexpr size_t kEncodedGroup = 4;
  std::string text((bytes.size() / kGroup + 1) * kEncodedGroup + 1, '\0');
  if (SzBase64EncodeFull(bytes.data(), bytes.size(), text.data(), text.size(), 1) != 1) {
    throw failedTo("encode bytes");
  }
  text.resize(std::strlen(text.c_str()));
  return text;
}

Json::Value jsonTextOrNull(std::string_view text) {
  return text.empty() ? Json::Value() : jsonText(text);
}

Json::Value jsonTime(time_t moment) {
  constexpr int kLastYear = 9999 - 1900;  // the last one in this form
  tm fields{};
  localtime_r(&moment, &fields);
  if (fields.tm_year > kLastYear) return {};
  return {momentText(moment)};
}

Json::Value topObject() {
  Json::Value top(Json::objectValue);
  top["version"] = kJsonVersion;
  return top;
}

Json::Value jsonList(const std::vector<Json::Value> &values) {
  Json::Value list(Json::arrayValue);
  for (const Json::Value &value : values) list.append(value);
  return list;
}

void printTop(const Json::Value &top) {
  const char *separator = "{";
  for (const std::string &name : namesOf(top)) {
    std::printf("%s%s: ", separator, quoted(name).c_str());
    separator = ",\n";
    if (top[name].isArray()) {
      printList(top[name]);
    } else {
      std::fputs(onOneLine(top[name]).c_str(), stdout);
    }
  }
  std::puts("}");
}

void printIndented(const Json::Value &top) {
  std::puts(Writer(Writer::kIndented).text(top).c_str());
}

void printJson(const std::vector<Json::Value> &objects) {
  printList(jsonList(objects));
  std::puts("");
}

std::string onOneLine(const Json::Value &value) {
  return Writer(Writer::kOneLine).text(value);
}
