// zelosched - the administrator's command line for the scheduled tasks.
#include <fcntl.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <clocale>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <exception>

#include "commands/command.h"
#include "commands/options.h"
#include "terminal/text.h"

namespace {

constexpr char kUsageLine[] = "usage: zelosched COMMAND [ARGUMENT...]\n";

// A file that is opened later would get the descriptor of a closed stream, and be printed to. Each
// is opened in the wrong direction, so that its use fails.
void occupyStandardStreams() {
  constexpr int kWays[] = {O_WRONLY, O_RDONLY, O_RDONLY};
  for (int stream = STDIN_FILENO; stream <= STDERR_FILENO; ++stream) {
    if (fcntl(stream, F_GETFD) < 0 && errno == EBADF) {
      static_cast<void>(open("/dev/null", kWays[stream]));
    }
  }
}

void printHelp() {
  std::fputs(kUsageLine, stdout);
  std::fputs("\nLooks after the scheduled tasks of the appliance.\n\nCommands:\n", stdout);
  for (const Command *command : commands()) {
    std::printf("  %-12s %s\n", command->name, command->summary);
  }
  std::fputs(
      "\n"
      "zelosched COMMAND --help tells more of a command; zelosched --version tells the version.\n"
      "\n"
      "Exit status: 0 done, 1 failed, 2 the arguments are wrong; of 'status' and\n"
      "'apply' also others.\n",
      stdout);
}

int usageError(const char *said, const char *argument) {
  if (argument != nullptr) {
    std::fprintf(stderr, "zelosched: %s: %s\n", said, printable(argument).c_str());
  }
  std::fprintf(stderr, "%sTry 'zelosched --help'.\n", kUsageLine);
  return kUsage;
}

int runCommand(int argc, char **argv) {
  if (argc < 2) return usageError(nullptr, nullptr);
  if (std::strcmp(argv[1], "--help") == 0 || std::strcmp(argv[1], "-h") == 0) {
    printHelp();
    return kDone;
  }
  if (std::strcmp(argv[1], "--version") == 0) {
    std::puts("zelosched " ZELO_VERSION);
    return kDone;
  }
  const Command *command = findCommand(argv[1]);
  if (command == nullptr) return usageError("there is no such command", argv[1]);
  return runWithOptions(*command, argc - 1, argv + 1);
}

// The flush reports a full disk or a closed pipe if the writes before it did not.
int afterPrinting(int status) {
  const bool flushed = std::fflush(stdout) == 0;
  const int reason = errno;
  if (flushed && std::ferror(stdout) == 0) return status;
  std::fprintf(stderr, "zelosched: cannot write the output: %s\n",
               flushed ? "it is not whole" : std::strerror(reason));
  return status == kDone ? kFailed : status;
}

}  // namespace

int main(int argc, char **argv) {
  occupyStandardStreams();
  std::setlocale(LC_ALL, "");
  openlog("zelosched", LOG_PID, LOG_CRON);
  unsetenv("POSIXLY_CORRECT");  // options may stand behind ids
  try {
    return afterPrinting(runCommand(argc, argv));
  } catch (const std::exception &error) {
    return complain(error.what());
  }
}
