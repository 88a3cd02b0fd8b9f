// Times that differ from machine to machine, so that thousands of them that have the same task do
// not begin it in the same minute.
#pragma once

#include <zelosched.h>

#include <cstdint>
#include <string>
#include <string_view>

// The minutes of "30m" or "2h", up to a day. Throws UsageError.
uint32_t minutesOfWindow(const std::string &text);

// Moves the task to a minute of the window that begins with its own: always the same one for a
// machine, an application and a name. A run never leaves its day: where the window reaches beyond
// midnight, it ends there. Throws Failure where the machine has no id.
void stagger(uint32_t window, ZELO_SCHED_TASK *task);

// A minute from 0 to `window` - 1.
uint32_t placeInWindow(std::string_view machine, std::string_view app, std::string_view name,
                       uint32_t window);
