// What a look at the machine found.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "runs/run_record.h"

enum class Severity {
  kOk,
  kUnknown,   // this user may not see it
  kWarning,   // something is wrong, and other tasks run all the same
  kCritical,  // tasks do not run at all
};

struct Finding {
  Severity severity;
  const char *kind;         // a word by which programs tell it from others
  std::string text;         // a sentence
  std::string remedy = {};  // what helps against it
  int64_t task = 0;         // whose it is, when it is one task's
  std::string taskName = {};
  std::optional<RunRecord> run = {};  // when it is about one
  std::optional<int64_t> due = {};    // the moment that was missed
  std::string machine = {};           // how it was then, "off" or "on", where that is known
};
using Findings = std::vector<Finding>;

// For people who read nothing else: with the remedy.
std::string sentenceOf(const Finding &finding);

// "ok", "unknown", "warning" or "critical".
const char *nameOf(Severity severity);

// The worst of them; kUnknown only where nothing is known to be wrong.
Severity worstOf(const Findings &findings);
