// JSON texts: what one can contain, and how it is written.
#pragma once

#include <ctime>
#include <string>
#include <string_view>
#include <vector>

namespace Json {
class Value;
}

// The version of the format that zelosched-json(5) describes; each top object has it.
inline constexpr int kJsonVersion = 1;

bool isUtf8(std::string_view text);

// The text as JSON can carry it: each byte that is no UTF-8 becomes U+FFFD.
Json::Value jsonText(std::string_view text);

// The Base64 of any bytes. Throws Failure.
std::string base64(std::string_view bytes);

// Null for an empty one.
Json::Value jsonTextOrNull(std::string_view text);

// "2026-12-24T18:30:00+01:00", in local time; null after the year 9999, where this form ends.
Json::Value jsonTime(time_t moment);

// {"version": 1}, to which lists are added.
Json::Value topObject();

// The names of an object's members, in the order of the output.
std::vector<std::string> namesOf(const Json::Value &object);

Json::Value jsonList(const std::vector<Json::Value> &values);

// Prints a top object, with each element of its lists on a line.
void printTop(const Json::Value &top);

// The same, indented, so that two outputs can be compared line by line.
void printIndented(const Json::Value &top);

// An array to the standard output, an object a line.
void printJson(const std::vector<Json::Value> &objects);
std::string onOneLine(const Json::Value &value);
