#include "runs/run_events.h"

#include <zelocore.h>

#include <sstream>

namespace {

constexpr char kNoNumber[] = "-";

template <class Number>
std::string textOf(const std::optional<Number> &number) {
  return number ? std::to_string(*number) : kNoNumber;
}

template <class Number>
std::optional<Number> next(std::istringstream *words) {
  std::string word;
  *words >> word;
  std::istringstream number(word);
  Number value{};
  return number >> value ? std::optional<Number>(value) : std::nullopt;
}

}  // namespace

void RunEvents::take(std::string_view text) {
  std::istringstream words{std::string(text)};
  std::string what;
  words >> what;
  if (what == "run") {
    words >> run.run;
  } else if (what == "process") {
    words >> run.process.pid >> run.process.born;
    isKnown = true;
  } else if (what == "waiting") {
    isWaiting = true;
    words >> waitsFor;
  } else if (what == "running") {
    isWaiting = false;
    isRunning = true;
    run.state = RunState::kRunning;
  } else if (what == "failed") {
    static std::string file;
    int code = 0;
    int line = 0;
    words >> code >> line >> file;
    QLIBCErrSetEx(code, file.c_str(), line);
  } else if (what == "ended") {
    int64_t outcome = 0;
    words >> outcome;
    run.outcome = static_cast<Outcome>(outcome);
    run.duration = next<double>(&words);
    run.exitCode = next<int>(&words);
    run.signal = next<int>(&words);
    run.state = RunState::kEnded;
    isEnded = true;
  }
}

std::string endLine(const RunRecord &run) {
  return "ended " + std::to_string(static_cast<int>(run.outcome)) + " " + textOf(run.duration) +
         " " + textOf(run.exitCode) + " " + textOf(run.signal);
}
