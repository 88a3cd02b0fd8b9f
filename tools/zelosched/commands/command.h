// One sub-command of zelosched, and the table of all of them.
#pragma once

#include <span>
#include <string_view>

#include "terminal/exit_status.h"

struct Command {
  const char *name;
  const char *synopsis;  // what follows the name on the usage line
  const char *summary;   // one line of the list that `zelosched --help` shows
  const char *help;  // what follows the usage line; each option begins a line of its own, as the
                     // shell completion reads them from here
  int (*run)(int argc, char **argv);  // argv[0] is the sub-command's name
};

// In the order in which `zelosched --help` shows them.
std::span<const Command *const> commands();

// Null when there is none of that name.
const Command *findCommand(std::string_view name);

// Each is defined in the unit of its name, kDisableCommand in enable.cpp.
extern const Command kListCommand;
extern const Command kShowCommand;
extern const Command kNextCommand;
extern const Command kHistoryCommand;
extern const Command kLogCommand;
extern const Command kStatusCommand;
extern const Command kMailCommand;
extern const Command kMetricsCommand;
extern const Command kAddCommand;
extern const Command kEditCommand;
extern const Command kEnableCommand;
extern const Command kDisableCommand;
extern const Command kRemoveCommand;
extern const Command kRunCommand;
extern const Command kStopCommand;
extern const Command kSyncCommand;
extern const Command kRestoreCommand;
extern const Command kCatchUpCommand;
extern const Command kOwnersCommand;
extern const Command kPowerCommand;
extern const Command kExportCommand;
extern const Command kApplyCommand;
extern const Command kImportCommand;
extern const Command kCompletionCommand;
