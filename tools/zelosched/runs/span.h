// Spans of time, as options give them.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

// The seconds of "90m", "12h" or "2d"; nothing for what is none, or longer than `most` seconds.
std::optional<int64_t> parseSpan(const std::string &text, int64_t most);
