#include "json/json_in.h"

#include <json/json.h>

#include <algorithm>
#include <memory>
#include <sstream>
#include <string_view>

#include "json/json_out.h"
#include "terminal/failure.h"

namespace {

Json::Value parse(const Json::CharReaderBuilder &builder, const std::string &text,
                  std::string *errors) {
  const std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
  Json::Value value;
  try {
    if (reader->parse(text.data(), text.data() + text.size(), &value, errors)) return value;
  } catch (const Json::Exception &error) {
    *errors = error.what();
  }
  if (errors->empty()) *errors = "it holds nothing";
  return {};
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

}  // namespace

std::string firstError(const std::string &errors) {
  std::istringstream lines(errors);
  std::string where;
  std::string what;
  std::getline(lines, where);
  std::getline(lines, what);
  const size_t word = where.find_first_not_of("* ");
  const size_t sentence = what.find_first_not_of(' ');
  constexpr size_t kLongest = 200;  // the parser quotes the faulty text, however long
  return (word == std::string::npos ? "" : where.substr(word)) +
         (sentence == std::string::npos ? "" : ": " + what.substr(sentence, kLongest));
}

void requireFewValues(const std::string &whole) {
  constexpr size_t kMostMembers = 64;  // twice as many as a task has
  if (whole.find('\0') != std::string::npos) throw Failure("it holds a zero byte");
  std::string_view text = whole;
  size_t left = kMostTasks * kMostMembers;
  while (!text.empty()) {
    const bool isNext = text.front() == ',' || text.front() == '[' || text.front() == '{';
    if (isNext && left-- == 0) {
      throw Failure("it holds more values than " + std::to_string(kMostTasks) + " tasks have");
    }
    text.remove_prefix(tokenLength(text));
  }
}

Json::Value parseJson(const std::string &text, std::string *errors) {
  Json::CharReaderBuilder builder;
  builder["collectComments"] = false;
  builder["failIfExtra"] = true;
  errors->clear();
  return parse(builder, text, errors);
}

Json::Value parseStrictJson(const std::string &text) {
  requireFewValues(text);
  if (!isUtf8(text)) throw Failure("it is not UTF-8");
  Json::CharReaderBuilder builder;
  Json::CharReaderBuilder::strictMode(&builder.settings_);
  std::string errors;
  Json::Value value = parse(builder, text, &errors);
  if (!errors.empty()) throw Failure("it is no JSON: " + firstError(errors));
  return value;
}
