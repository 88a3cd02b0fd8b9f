// The table of sub-commands.
#include <algorithm>

#include "commands/command.h"

namespace {

constexpr const Command *kTable[] = {
    &kListCommand,    &kShowCommand,    &kNextCommand,    &kHistoryCommand,    &kLogCommand,
    &kStatusCommand,  &kMetricsCommand, &kAddCommand,     &kEditCommand,       &kEnableCommand,
    &kDisableCommand, &kRemoveCommand,  &kRunCommand,     &kStopCommand,       &kSyncCommand,
    &kPowerCommand,   &kOwnersCommand,  &kMailCommand,    &kExportCommand,     &kApplyCommand,
    &kImportCommand,  &kRestoreCommand, &kCatchUpCommand, &kCompletionCommand,
};

}  // namespace

std::span<const Command *const> commands() {
  return kTable;
}

const Command *findCommand(std::string_view name) {
  const auto *const found = std::find_if(std::begin(kTable), std::end(kTable),
                                         [&](const Command *entry) { return entry->name == name; });
  return found == std::end(kTable) ? nullptr : *found;
}
