// zeloschedtask - cron's way into the scheduler. The lines that the library keeps in /etc/crontab
// start it as root at a task's minutes. It decides nothing by itself: whether the task is due and
// enabled is the library's business, since a crontab line cannot say it all (a year, for one).
#include <syslog.h>

#include <charconv>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <optional>
#include <string_view>
#include <system_error>

#include "zelocore.h"
#include "zelosched.h"

namespace {

constexpr char kProgram[] = "zeloschedtask";
constexpr int kExitUsage = 2;

constexpr char kUsage[] =
    "usage: zeloschedtask --run id=ID\n"
    "       zeloschedtask --help | --version\n";

constexpr char kHelp[] =
    "\n"
    "Runs the scheduled task ID when the current minute is one of its minutes and it\n"
    "is enabled; otherwise does nothing, successfully. The run goes on in a process\n"
    "of its own: how it went is in the status database and in the system log.\n"
    "\n"
    "Exit status: 0 when the run was started or there was nothing to do, 1 when it\n"
    "could not be started, 2 when the arguments are wrong.\n";

int usage() {
  std::fputs(kUsage, stderr);
  return kExitUsage;
}

// A full disk or a closed pipe shows at the flush at the latest.
int show(const char *text, const char *more) {
  const bool shown =
      std::fputs(text, stdout) >= 0 && std::fputs(more, stdout) >= 0 && std::fflush(stdout) == 0;
  return shown ? EXIT_SUCCESS : EXIT_FAILURE;
}

// Decimal digits with an optional minus, nothing before, between or after, within a long.
std::optional<long> parseId(std::string_view argument) {
  constexpr std::string_view kPrefix = "id=";
  if (!argument.starts_with(kPrefix)) return std::nullopt;
  const std::string_view digits = argument.substr(kPrefix.size());
  const char *end = digits.data() + digits.size();
  long id = 0;
  const auto [parsed, error] = std::from_chars(digits.data(), end, id);
  if (error != std::errc{} || parsed != end) return std::nullopt;
  return id;
}

int run(long id) {
  constexpr int kCheckRunTime = 1;
  constexpr int kSkipDisabled = 1;
  openlog(kProgram, LOG_PID, LOG_CRON);
  if (ZELOSchedTaskRun(id, kCheckRunTime, kSkipDisabled) == 0) return EXIT_SUCCESS;
  std::fprintf(stderr, "%s: cannot run task %ld: 0x%04X %s:%d\n", kProgram, id,
               static_cast<unsigned>(QLIBCErrGet()), QLIBCErrorGetFile(), QLIBCErrorGetLine());
  return EXIT_FAILURE;
}

}  // namespace

int main(int argc, char **argv) {
  if (argc == 2 && std::strcmp(argv[1], "--help") == 0) return show(kUsage, kHelp);
  if (argc == 2 && std::strcmp(argv[1], "--version") == 0) {
    return show(kProgram, " " ZELO_VERSION "\n");
  }
  if (argc == 3 && std::strcmp(argv[1], "--run") == 0) {
    if (const std::optional<long> id = parseId(argv[2])) return run(*id);
  }
  return usage();
}
