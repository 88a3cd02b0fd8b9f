// The options of add and edit that describe a task.
#pragma once

#include <zelosched.h>

#include "commands/options.h"

// The options that both have. A macro, since one array cannot be part of another one's initializer.
#define TASK_OPTIONS                                                                              \
  {"once", Option::kValue}, {"daily", Option::kValue}, {"weekly", Option::kTwoValues},            \
      {"monthly", Option::kTwoValues}, {"yearly", Option::kTwoValues}, {"every", Option::kValue}, \
      {"until", Option::kValue}, {"start", Option::kValue}, {"name", Option::kValue, 'n'},        \
      {"owner", Option::kValue, 'o'}, {"app", Option::kValue}, {"app-name", Option::kValue},      \
      {"app-args", Option::kValue}, {"action", Option::kValue}, {"overlap", Option::kValue},      \
      {"app-overlap", Option::kValue}, {                                                          \
    "time-limit", Option::kValue                                                                  \
  }

// What --help says of them.
#define TASK_OPTIONS_HELP                                                                        \
  "When (one of these; local time):\n"                                                           \
  "  --once 2026-12-24T18:30        on that day only\n"                                          \
  "  --daily 08:30\n"                                                                            \
  "  --weekly mon,wed,fri 08:30     also mon-fri, weekdays, weekend, all\n"                      \
  "  --monthly 15 08:30             on that day of the months that have it\n"                    \
  "  --yearly 02-29 08:30           month and day\n"                                             \
  "and with them:\n"                                                                             \
  "  --every 2h                     again every so many hours; off for one run a day\n"          \
  "  --until 18                     last hour of the day at which a repeated run may start\n"    \
  "  --start 2026-12-24             no run before that day\n"                                    \
  "\n"                                                                                           \
  "What and who:\n"                                                                              \
  "  -n, --name NAME                what lists show; \"Task N\" unless given\n"                  \
  "  -o, --owner USER               name or uid of the user under whose rights it runs; root\n"  \
  "  --app APP                      application that it belongs to\n"                            \
  "  --app-name NAME                its name for lists\n"                                        \
  "  --app-args TEXT                its arguments\n"                                             \
  "  --action TEXT                  what the task does, for display\n"                           \
  "  --overlap yes|no               may a run begin while one of the same task goes on? no\n"    \
  "  --app-overlap yes|no           and while one of the same application does? yes\n"           \
  "  --time-limit 2h                end a run that goes on for longer: 90s, 30m, 2h, 1d; none\n" \
  "  -- COMMAND...                  one word is a shell command line as it is; several words\n"  \
  "                                 are quoted, so that the shell sees just these words\n"

// Whether an option says when the task runs.
bool hasSchedule(const Arguments &arguments);
bool hasTaskOption(const Arguments &arguments);

// Throws UsageError when a task is to be read from the standard input and described by options too.
void requireOneSource(const Arguments &arguments);

// Sets what the arguments name. Throws UsageError and Failure.
void applyTaskOptions(const Arguments &arguments, ZELO_SCHED_TASK *task);

// The words after "--" as a text for the shell.
std::string commandLine(const std::vector<std::string> &words);
