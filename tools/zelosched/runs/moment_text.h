// Moments as other programs read them.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

// "2026-11-22T10:15:00+01:00"
std::string momentText(int64_t moment);

// That, "2026-11-22", "2026-11-22 10:15", "10:15" (the last time it was so late), or "3h", "2d",
// "90m" for so long ago.
std::optional<int64_t> parseMoment(std::string_view text, int64_t now);
