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

// By the members of a file of tasks, in their order. Null stands for no task, of which all members
// are null.
std::vector<MemberDifference> differencesOf(const ZELO_SCHED_TASK *before,
                                            const ZELO_SCHED_TASK *after);

// Whether a file can tell them apart, or bytes that a file cannot hold do.
bool areAlike(const ZELO_SCHED_TASK &one, const ZELO_SCHED_TASK &other);
