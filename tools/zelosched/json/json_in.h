// Reading JSON texts.
#pragma once

#include <cstddef>
#include <string>

namespace Json {
class Value;
}

// The text may have comments, and may be any value. Faults are described in `errors`.
Json::Value parseJson(const std::string &text, std::string *errors);

// "Line 3, Column 5: Missing ',' ..." of what the reader says in several lines.
std::string firstError(const std::string &errors);

// So many tasks can be read at once.
inline constexpr size_t kMostTasks = 10000;

// Limits the memory of the parser, in which a value takes far more than a text such as "0,". Throws
// Failure for more values than so many tasks have, or for a zero byte, where the parser would stop.
void requireFewValues(const std::string &text);

// An object or an array, as the standard has it, in UTF-8, without two members of one name. Throws
// Failure.
Json::Value parseStrictJson(const std::string &text);
