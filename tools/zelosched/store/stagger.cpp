#include "store/stagger.h"

#include <algorithm>
#include <cctype>
#include <cstdio>
#include <fstream>

#include "runs/time_limit.h"
#include "runs/time_units.h"
#include "schedule_shift.h"
#include "terminal/failure.h"
#include "terminal/text.h"

namespace {

constexpr char kMachineId[] = "/etc/machine-id";
constexpr size_t kIdLength = 32;

// Machines without an id have the same word in its place.
bool isId(const std::string &text) {
  return text.size() == kIdLength && text.find_first_not_of('0') != std::string::npos &&
         std::all_of(text.begin(), text.end(),
                     [](unsigned char c) { return std::isxdigit(c) != 0; });
}

std::string machineId() {
  std::string id;
  std::getline(std::ifstream(kMachineId), id);
  if (isId(id)) return id;
  throw Failure(std::string(kMachineId) +
                " holds no id, by which --stagger tells this machine from others (machine-id(5))");
}

// FNV-1a with a final mixing step. It must not change: with another hash, the next version would
// move the tasks.
uint64_t hashOf(std::string_view text) {
  constexpr uint64_t kOffset = 14695981039346656037U;
  constexpr uint64_t kPrime = 1099511628211U;
  constexpr uint64_t kMix = 0xFF51AFD7ED558CCDU;
  constexpr unsigned kHalf = 32;
  uint64_t hash = kOffset;
  for (const char c : text) hash = (hash ^ static_cast<unsigned char>(c)) * kPrime;
  hash = (hash ^ hash >> kHalf) * kMix;
  return hash ^ hash >> kHalf;
}

}  // namespace

uint32_t minutesOfWindow(const std::string &text) {
  const int64_t seconds = secondsOfLimit(text).value_or(0);
  if (seconds < kMinute || seconds > kDay || seconds % kMinute != 0) {
    throw UsageError("'--stagger' takes 30m, 2h or the like, up to 24h, not '" + printable(text) +
                     "'");
  }
  return static_cast<uint32_t>(seconds / kMinute);
}

uint32_t placeInWindow(std::string_view machine, std::string_view app, std::string_view name,
                       uint32_t window) {
  std::string text(machine);
  text.append(1, '\0').append(app).append(1, '\0').append(name);
  return static_cast<uint32_t>(hashOf(text) % window);
}

void stagger(uint32_t window, ZELO_SCHED_TASK *task) {
  const uint32_t minutes = std::min(window, schedMostShift(*task) + 1);
  schedShift(task, placeInWindow(machineId(), task->App, task->Name, minutes));
}
