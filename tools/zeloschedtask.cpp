// zeloschedtask - the program that cron starts. The lines that the library keeps in /etc/crontab
// start it as root at a task's minutes. The library checks whether the task is due and enabled,
// since a crontab line cannot say it all (a year, for one). A process of its own starts the run and
// waits for its end (keeper/keeper.h).
#include <fcntl.h>
#include <syslog.h>
#include <unistd.h>

#include <charconv>
#include <climits>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <optional>
#include <string_view>
#include <system_error>
#include <utility>

#include "keeper.h"
#include "zelocore.h"

namespace {

constexpr char kProgram[] = "zeloschedtask";
constexpr int kExitUsage = 2;

constexpr char kUsageText[] =
    "usage: zeloschedtask --run id=ID\n"
    "       zeloschedtask --run id=ID --now [--trigger=manual|catch-up] [--due=SECONDS]\n"
    "                     [--skip-disabled] [--tell=FD] [--copy=FD]\n"
    "       zeloschedtask --keep run=RUN\n"
    "       zeloschedtask --help | --version\n";

constexpr char kHelp[] =
    "\n"
    "Runs the scheduled task ID when the current minute is one of its minutes and it\n"
    "is enabled; otherwise does nothing, successfully. The run goes on in a process\n"
    "of its own: how it went is in the history ('zelosched history') and in the system\n"
    "log, and what it printed is shown by 'zelosched log'.\n"
    "\n"
    "The other options are for zelosched, and for root alone: --now runs the task\n"
    "whatever its times say, and --keep looks after a run whose keeper was killed.\n"
    "\n"
    "Exit status: 0 when the run was started or there was nothing to do, 1 when it\n"
    "could not be started, 2 when the arguments are wrong.\n";

int usage() {
  std::fputs(kUsageText, stderr);
  return kExitUsage;
}

// The flush reports a full disk or a closed pipe if the writes before it did not.
int show(const char *text, const char *more) {
  const bool shown =
      std::fputs(text, stdout) >= 0 && std::fputs(more, stdout) >= 0 && std::fflush(stdout) == 0;
  return shown ? EXIT_SUCCESS : EXIT_FAILURE;
}

// After the prefix: decimal digits with an optional minus, and nothing else.
std::optional<int64_t> parseNumber(std::string_view argument, std::string_view prefix) {
  if (!argument.starts_with(prefix)) return std::nullopt;
  const std::string_view digits = argument.substr(prefix.size());
  const char *end = digits.data() + digits.size();
  int64_t number = 0;
  const auto [parsed, error] = std::from_chars(digits.data(), end, number);
  if (error != std::errc{} || parsed != end) return std::nullopt;
  return number;
}

int run(const RunOrder &order) {
  openlog(kProgram, LOG_PID, LOG_CRON);
  if (runWithKeeper(order) == 0) return EXIT_SUCCESS;
  if (order.tellTo >= 0) {
    dprintf(order.tellTo, "failed %d %d %s\n", QLIBCErrGet(), QLIBCErrorGetLine(),
            QLIBCErrorGetFile());
  }
  std::fprintf(stderr, "%s: cannot run task %ld: 0x%04X %s:%d\n", kProgram, order.task,
               static_cast<unsigned>(QLIBCErrGet()), QLIBCErrorGetFile(), QLIBCErrorGetLine());
  return EXIT_FAILURE;
}

// A file descriptor that the caller passed. The task's command must not inherit it.
bool takeDescriptor(std::string_view argument, std::string_view prefix, int *descriptor) {
  const std::optional<int64_t> number = parseNumber(argument, prefix);
  if (!number || *number <= STDERR_FILENO || *number > INT_MAX) return false;
  *descriptor = static_cast<int>(*number);
  return fcntl(*descriptor, F_SETFD, FD_CLOEXEC) == 0;
}

bool takeOption(std::string_view argument, RunOrder *order) {
  if (argument == "--skip-disabled") {
    order->isDisabledSkipped = true;
  } else if (argument == "--trigger=manual") {
    order->trigger = Trigger::kManual;
  } else if (argument == "--trigger=catch-up") {
    order->trigger = Trigger::kCatchUp;
  } else if (argument.starts_with("--due=")) {
    order->due = parseNumber(argument, "--due=");
    return order->due.has_value();
  } else {
    return takeDescriptor(argument, "--tell=", &order->tellTo) ||
           takeDescriptor(argument, "--copy=", &order->copyTo);
  }
  return true;
}

// The options from "--now" on are for root alone, which main checks.
std::optional<RunOrder> orderOf(int argc, char **argv) {
  constexpr int kFirstMore = 3;
  if (argc < kFirstMore || std::strcmp(argv[1], "--run") != 0) return std::nullopt;
  const std::optional<int64_t> id = parseNumber(argv[2], "id=");
  if (!id || !std::in_range<int32_t>(*id)) return std::nullopt;
  RunOrder order;
  order.task = static_cast<long>(*id);
  if (argc == kFirstMore) return order;
  if (std::strcmp(argv[kFirstMore], "--now") != 0) return std::nullopt;
  order.isAnyTime = true;
  order.isDisabledSkipped = false;
  order.trigger = Trigger::kManual;
  for (int i = kFirstMore + 1; i < argc; ++i) {
    if (!takeOption(argv[i], &order)) return std::nullopt;
  }
  return order;
}

int refuseRights() {
  std::fprintf(stderr, "%s: that takes root's rights\n", kProgram);
  return EXIT_FAILURE;
}

}  // namespace

int main(int argc, char **argv) {
  if (argc == 2 && std::strcmp(argv[1], "--help") == 0) return show(kUsageText, kHelp);
  if (argc == 2 && std::strcmp(argv[1], "--version") == 0) {
    return show(kProgram, " " ZELO_VERSION "\n");
  }
  if (const std::optional<RunOrder> order = orderOf(argc, argv)) {
    return order->isAnyTime && geteuid() != 0 ? refuseRights() : run(*order);
  }
  if (argc == 3 && std::strcmp(argv[1], "--keep") == 0) {
    if (const std::optional<int64_t> number = parseNumber(argv[2], "run=")) {
      return geteuid() != 0 ? refuseRights() : keepOn(*number);
    }
  }
  return usage();
}
