#include "runs/run_record.h"

#include <iterator>

namespace {

constexpr const char *kTriggers[] = {"schedule", "manual", "catch-up", "other"};
constexpr const char *kStates[] = {"waiting", "running", "ended"};
constexpr const char *kOutcomes[] = {
    "",           "finished", "failed",    "killed",  "not-started",
    "time-limit", "gave-up",  "cancelled", "stopped", "lost"};
static_assert(std::size(kOutcomes) == static_cast<size_t>(Outcome::kLost) + 1);

}  // namespace

const char *nameOf(Trigger trigger) {
  return kTriggers[static_cast<size_t>(trigger)];
}

const char *nameOf(RunState state) {
  return kStates[static_cast<size_t>(state)];
}

const char *nameOf(Outcome outcome) {
  return kOutcomes[static_cast<size_t>(outcome)];
}
