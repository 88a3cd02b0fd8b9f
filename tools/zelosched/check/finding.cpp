#include "check/finding.h"

#include <algorithm>

const char *nameOf(Severity severity) {
  constexpr const char *kNames[] = {"ok", "unknown", "warning", "critical"};
  return kNames[static_cast<size_t>(severity)];
}

Severity worstOf(const Findings &findings) {
  Severity worst = Severity::kOk;
  for (const Finding &finding : findings) worst = std::max(worst, finding.severity);
  return worst;
}
