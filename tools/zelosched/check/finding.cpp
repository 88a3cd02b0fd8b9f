#include "check/finding.h"

#include <algorithm>

std::string sentenceOf(const Finding &finding) {
  return finding.remedy.empty() ? finding.text : finding.text + ": " + finding.remedy;
}

const char *nameOf(Severity severity) {
  constexpr const char *kNames[] = {"ok", "unknown", "warning", "critical"};
  return kNames[static_cast<size_t>(severity)];
}

Severity worstOf(const Findings &findings) {
  Severity worst = Severity::kOk;
  for (const Finding &finding : findings) worst = std::max(worst, finding.severity);
  return worst;
}
