// The results of the checks.
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
  const char *kind;         // identifies the kind of finding for programs
  std::string text;         // a sentence
  std::string remedy = {};  // what helps against it
  int64_t task = 0;         // the task that it is about, or 0
  std::string taskName = {};
  std::optional<RunRecord> run = {};  // the run that it is about
  std::optional<int64_t> due = {};    // the moment that was missed
  std::string machine = {};           // "off" or "on" at that moment, or empty if unknown
};
using Findings = std::vector<Finding>;

// The text with the remedy.
std::string sentenceOf(const Finding &finding);

// "ok", "unknown", "warning" or "critical".
const char *nameOf(Severity severity);

// The worst of them; kUnknown only where nothing is known to be wrong.
Severity worstOf(const Findings &findings);
