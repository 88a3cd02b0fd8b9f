// Numbers in texts.
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

// Decimal digits with an optional minus and nothing else; nothing when it is no such number or
// does not fit.
std::optional<int64_t> parseNumber(std::string_view text);
