#include "runs/settings.h"

#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <optional>
#include <sstream>
#include <string_view>

#include "store/place_file.h"
#include "terminal/failure.h"
#include "terminal/number.h"
#include "terminal/text.h"

namespace {

constexpr char kSettingsPath[] = "/etc/zelosched.conf";
constexpr size_t kLongestLine = 1000;

enum class Kind { kNumber, kBytes, kPercent };

struct Setting {
  const char *name;
  int64_t Settings::*member;
  Kind kind;
  int64_t least;
  int64_t most;
};

// A keeper's output file is in memory (/run), hence the bounds on its size.
constexpr Setting kSettings[] = {
    {"output-first", &Settings::outputFirst, Kind::kBytes, 0, int64_t{16} << 20},
    {"output-last", &Settings::outputLast, Kind::kBytes, 0, int64_t{16} << 20},
    {"output-runs", &Settings::outputRuns, Kind::kNumber, 0, 100000},
    {"output-total", &Settings::outputTotal, Kind::kBytes, 0, int64_t{64} << 30},
    {"output-free", &Settings::outputFreePercent, Kind::kPercent, 0, 100},
    {"runs-of-task", &Settings::runsOfTask, Kind::kNumber, 1, 100000000},
    {"runs-total", &Settings::runsTotal, Kind::kNumber, 1, 100000000},
    {"runs-days", &Settings::runsDays, Kind::kNumber, 0, 36500},
};

// "64K", "16M", "1G", or a number alone.
std::optional<int64_t> valueOf(std::string_view text, Kind kind) {
  int64_t unit = 1;
  if (!text.empty() && kind == Kind::kBytes) {
    constexpr std::string_view kUnits = "KMG";
    constexpr int kShift = 10;
    const size_t place = kUnits.find(text.back());
    if (place != std::string_view::npos) {
      unit = int64_t{1} << (kShift * (static_cast<int>(place) + 1));
      text.remove_suffix(1);
    }
  }
  if (kind == Kind::kPercent && !text.empty() && text.back() == '%') text.remove_suffix(1);
  const std::optional<int64_t> number = parseNumber(trimmed(text));
  constexpr int64_t kMostCount = int64_t{1} << 32;  // times the greatest unit still fits
  if (!number || *number < 0 || *number > kMostCount) return std::nullopt;
  return *number * unit;
}

// What is wrong with the line; empty when nothing is.
std::string take(std::string_view line, Settings *settings) {
  const std::string_view text = trimmed(line.substr(0, line.find('#')));
  if (text.empty()) return "";
  const size_t sign = text.find('=');
  if (sign == std::string_view::npos) return "'" + printable(text) + "' has no '='";
  const std::string_view name = trimmed(text.substr(0, sign));
  const std::string_view value = trimmed(text.substr(sign + 1));
  const auto *const setting =
      std::find_if(std::begin(kSettings), std::end(kSettings),
                   [&](const Setting &candidate) { return name == candidate.name; });
  if (setting == std::end(kSettings)) return "there is no setting '" + printable(name) + "'";
  const std::optional<int64_t> number = valueOf(value, setting->kind);
  if (!number || *number < setting->least || *number > setting->most) {
    return std::string(setting->name) + " is a number from " + std::to_string(setting->least) +
           " to " + std::to_string(setting->most) + ", not '" + printable(value) + "'";
  }
  settings->*setting->member = *number;
  return "";
}

}  // namespace

Settings readSettings(SettingsFaults *faults) {
  Settings settings;
  if (access(kSettingsPath, F_OK) != 0 && errno == ENOENT) return settings;
  std::istringstream file;
  try {
    file.str(contentsOf(kSettingsPath));
  } catch (const Failure &failure) {
    faults->push_back(failure.what());
    return settings;
  }
  std::string line;
  for (int number = 1; std::getline(file, line); ++number) {
    const std::string fault = line.size() > kLongestLine ? "it is too long" : take(line, &settings);
    if (fault.empty()) continue;
    faults->push_back(std::string(kSettingsPath) + ", line " + std::to_string(number) + ": " +
                      fault);
  }
  return settings;
}

Settings settingsOrComplaints() {
  SettingsFaults faults;
  Settings settings = readSettings(&faults);
  for (const std::string &fault : faults) complain(fault + ": the usual value holds");
  return settings;
}
