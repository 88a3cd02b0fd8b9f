// One task as JSON, as a program that shows a form has it.
#pragma once

#include <zelosched.h>

#include <string>

#include "json/task_json.h"

// Takes a file with one task and sets what it names, on the defaults or on a stored task, of which
// nothing need be named, as fillTask does. Throws Failure for what is no JSON at all.
void fillFromText(const std::string &text, ZELO_SCHED_TASK *task, JsonFaults *faults);

// The same for who saves: every fault is told, and thrown as one Failure.
void fillFromText(const std::string &text, ZELO_SCHED_TASK *task);

// No fault is in the schedule, or in what says where the task is.
bool isScheduleSound(const JsonFaults &faults);

inline constexpr char kPlaceOfOnceDate[] = "tasks[0].schedule.date";
