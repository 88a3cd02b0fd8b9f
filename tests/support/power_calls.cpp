#include "power_calls.h"

#include <dlfcn.h>

#include <algorithm>
#include <map>

#include "zelocore.h"

namespace support {
namespace {

struct Plan {
  std::string beginning;
  FailPlan plan;
  unsigned matched = 0;
};

struct State {
  std::vector<std::string> calls;
  std::vector<Plan> plans;
  std::map<int, Entries> lists;
  bool takeAny = false;
  Entries last;
};

State &state() {
  static State value;
  return value;
}

// Records the call; whether a plan fails it, and then with what.
bool isPlanned(std::string call, int *result) {
  for (Plan &plan : state().plans) {
    if (!call.starts_with(plan.beginning)) continue;
    const unsigned nth = ++plan.matched;
    if (nth < plan.plan.from || nth - plan.plan.from >= plan.plan.times) continue;
    if (plan.plan.code != 0) QLIBCErrSetEx(plan.plan.code, kInjectedFile, kInjectedLine);
    *result = static_cast<int>(plan.plan.result.value_or(-1));
    state().calls.push_back(std::move(call));
    return true;
  }
  state().calls.push_back(std::move(call));
  return false;
}

template <class Make>
bool fails(const char *name, Make make, int *result) {
  *result = -1;
  {
    const OwnWork own;
    if (isPlanned(make(), result)) return true;
  }
  return failsInStep(name);
}

template <typename Function>
Function *next(const char *name) {
  return reinterpret_cast<Function *>(dlsym(RTLD_NEXT, name));
}

std::string number(long value) {
  return " " + std::to_string(value);
}

}  // namespace

std::vector<std::string> powerCalls() {
  return state().calls;
}

void failPowerCall(const std::string &beginning, const FailPlan &plan) {
  state().plans.push_back({beginning, plan});
}

void giveList(int list, const Entries &entries) {
  state().lists[list] = entries;
}

void takeAnyList() {
  state().takeAny = true;
}

Entries lastList() {
  return state().last;
}

void resetPowerCalls() {
  state() = {};
}

}  // namespace support

using support::fails;
using support::next;
using support::number;

extern "C" {
#pragma GCC visibility push(default)

int ZELOAutoPowerConfGet(int list, int capacity, ZELO_AUTOPOWER *entries) {
  int result = 0;
  if (fails(
          "ZELOAutoPowerConfGet", [&] { return "ConfGet" + number(list) + number(capacity); },
          &result))
    return result;
  const auto given = support::state().lists.find(list);
  if (given != support::state().lists.end()) {
    const auto count = std::min(given->second.size(), static_cast<size_t>(capacity));
    std::copy_n(given->second.begin(), count, entries);
    return static_cast<int>(count);
  }
  return next<decltype(ZELOAutoPowerConfGet)>("ZELOAutoPowerConfGet")(list, capacity, entries);
}

int ZELOAutoPowerConfSet(int list, int count, const ZELO_AUTOPOWER *entries) {
  int result = 0;
  if (fails(
          "ZELOAutoPowerConfSet", [&] { return "ConfSet" + number(list) + number(count); },
          &result))
    return result;
  {
    const support::OwnWork own;
    support::state().last.assign(entries, entries + count);
  }
  if (support::state().takeAny) return 0;
  return next<decltype(ZELOAutoPowerConfSet)>("ZELOAutoPowerConfSet")(list, count, entries);
}

int ZELOAutoPoweronSet(void) {
  int result = 0;
  if (fails(
          "ZELOAutoPoweronSet", [] { return "PoweronSet"; }, &result))
    return result;
  return next<decltype(ZELOAutoPoweronSet)>("ZELOAutoPoweronSet")();
}

int QLIBCFileSetLine(const char *path, const char *key, const char *value, int flags) {
  int result = 0;
  const auto call = [&] {
    return std::string("SetLine ") + path + " " + key +
           (value != nullptr ? std::string(" ") + value : "") + (flags != 0 ? number(flags) : "");
  };
  if (fails("QLIBCFileSetLine", call, &result)) return result;
  return next<decltype(QLIBCFileSetLine)>("QLIBCFileSetLine")(path, key, value, flags);
}

int ZELOUpdateCrontab(const char *command, int stop, int reload) {
  int result = 0;
  if (fails(
          "ZELOUpdateCrontab",
          [&] { return std::string("UpdateCrontab ") + command + number(stop) + number(reload); },
          &result)) {
    return result;
  }
  return next<decltype(ZELOUpdateCrontab)>("ZELOUpdateCrontab")(command, stop, reload);
}

int ZELOScheduleSet(const ZELO_SCHEDULE *schedule, int enabled) {
  int result = 0;
  const auto call = [&] {
    return "ScheduleSet" + number(schedule->weekdays) + number(schedule->hour) +
           number(schedule->repeat) + number(schedule->lastHour) + number(schedule->minute) +
           number(schedule->reserved) + " " + schedule->szCommand + number(enabled);
  };
  if (fails("ZELOScheduleSet", call, &result)) return result;
  return next<decltype(ZELOScheduleSet)>("ZELOScheduleSet")(schedule, enabled);
}

#pragma GCC visibility pop
}
