// In which members two tasks differ.
#pragma once

#include <json/value.h>
#include <zelosched.h>

#include <string>
#include <vector>

struct MemberDifference {
  std::string member;  // "schedule.at"
  Json::Value before;
  Json::Value after;
};

// By the members of a file of tasks, in their order. A null pointer stands for no task: all of its
// members are null.
std::vector<MemberDifference> differencesOf(const ZELO_SCHED_TASK *before,
                                            const ZELO_SCHED_TASK *after);

// Whether a file says the same of both, and the same members have bytes that are not UTF-8.
bool areAlike(const ZELO_SCHED_TASK &one, const ZELO_SCHED_TASK &other);
