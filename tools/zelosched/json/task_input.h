// One task as JSON, as a program with a form passes it by --stdin or --preview.
#pragma once

#include <zelosched.h>

#include <string>

#include "json/task_json.h"

// Reads a text with one task and sets the members that it has, as fillTask does. For a stored task
// no member is required. Throws Failure for what is not JSON.
void fillFromText(const std::string &text, ZELO_SCHED_TASK *task, JsonFaults *faults);

// The same before a save: reports every fault, and throws one Failure.
void fillFromText(const std::string &text, ZELO_SCHED_TASK *task);

// Whether every fault is in a member of the task other than its schedule.
bool isScheduleSound(const JsonFaults &faults);

inline constexpr char kPlaceOfOnceDate[] = "tasks[0].schedule.date";
