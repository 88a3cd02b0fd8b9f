// Calls that are refused for one of their arguments.
//
//   expectRefused("sched_enum.cpp", {
//       {"((void *)0) != enum_list", [] { return ZELOSchedEnumToValue(nullptr, nullptr); }},
//       {"NULL != szName", [] { return ZELOSchedEnumToValue(kStates, nullptr); }},
//   });
#pragma once

#include <functional>
#include <string>
#include <vector>

namespace support {

struct RefusedCall {
  std::string condition;  // the one that does not hold
  std::function<int()> call;
};

// Each gives -1, tells which condition does not hold and nothing else, as an error, and records the
// code 0x0D00 of that unit.
void expectRefused(const std::string &unit, const std::vector<RefusedCall> &calls);

}  // namespace support
