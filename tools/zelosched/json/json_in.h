// Reading JSON texts.
#pragma once

#include <cstddef>
#include <string>

namespace Json {
class Value;
}

// Comments may stand in it, and any value may be the whole. What is wrong is in `errors`.
Json::Value parseJson(const std::string &text, std::string *errors);

// "Line 3, Column 5: Missing ',' ..." of what the reader says in several lines.
std::string firstError(const std::string &errors);

// So many tasks can be read at once.
inline constexpr size_t kMostTasks = 10000;

// No more values than so many tasks have: each that the reader makes takes a hundred bytes, also
// where its text is "0,". Throws Failure, also for a zero byte, which it would take for the end.
void requireFewValues(const std::string &text);

// An object or an array, as the standard has it, in UTF-8, without two members of one name. Throws
// Failure.
Json::Value parseStrictJson(const std::string &text);
