// zelosched mail
#include <json/json.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <sstream>

#include "commands/command.h"
#include "commands/options.h"
#include "json/json_out.h"
#include "runs/notices.h"
#include "store/place_file.h"
#include "store/task_program.h"
#include "terminal/failure.h"
#include "terminal/text.h"

namespace {

constexpr Option kOptions[] = {{"to", Option::kValue}, {"to-owners"}, {"json"}};
constexpr char kSettings[] = "/etc/default/zelosched-mail";
constexpr char kUsualProgram[] = "/usr/share/zelosched/mail-on-failure";
constexpr char kAddress[] = "MAIL_TO=";

// Beside where this program is installed.
std::string mailProgram() {
  const std::string own = ownProgram();
  const std::string beside =
      own.substr(0, own.rfind('/') + 1) + "../share/zelosched/mail-on-failure";
  char whole[PATH_MAX];
  return realpath(beside.c_str(), whole) != nullptr ? whole : kUsualProgram;
}

// It is a line of a file that root's shell reads: nothing that means something to that.
bool isAddress(const std::string &text) {
  constexpr size_t kLongest = 254;
  return !text.empty() && text.size() <= kLongest && text.front() != '-' &&
         std::all_of(text.begin(), text.end(), [](unsigned char c) {
           return std::isalnum(c) != 0 || std::strchr("@._+-", c) != nullptr;
         });
}

bool isAddressLine(const std::string &line) {
  return line.compare(0, strlen(kAddress), kAddress) == 0;
}

std::vector<std::string> settingsLines() {
  std::ifstream file(kSettings);
  std::vector<std::string> lines;
  for (std::string line; std::getline(file, line);) lines.push_back(line);
  return lines;
}

// Empty when the mails go to the owners.
std::string address() {
  std::string found;
  for (const std::string &line : settingsLines()) {
    if (isAddressLine(line)) found = line.substr(strlen(kAddress));
  }
  return found;
}

void setAddress(const std::string &text) {
  std::ostringstream contents;
  for (const std::string &line : settingsLines()) {
    if (!isAddressLine(line)) contents << line << '\n';
  }
  if (!text.empty()) contents << kAddress << text << '\n';
  constexpr mode_t kMode = 0644;
  placeFile(kSettings, contents.str(), kMode);
}

bool isOn() {
  return access(kMailProgram, X_OK) == 0;
}

void switchOn() {
  if (isOn()) return;
  unlink(kMailProgram);  // a link that leads nowhere
  if (symlink(mailProgram().c_str(), kMailProgram) < 0) {
    throw Failure(std::string("cannot make ") + kMailProgram + ": " + std::strerror(errno));
  }
}

void switchOff() {
  if (unlink(kMailProgram) == 0 || errno == ENOENT) return;
  throw Failure(std::string("cannot remove ") + kMailProgram + ": " + std::strerror(errno));
}

void tell(bool asJson) {
  const std::string to = address();
  if (asJson) {
    Json::Value top = topObject();
    top["mail"]["is_on"] = isOn();
    top["mail"]["to"] = jsonTextOrNull(to);
    top["mail"]["has_mailer"] = hasMailer();
    printTop(top);
    return;
  }
  std::printf("failures are %s\n", !isOn()      ? "not mailed"
                                   : to.empty() ? "mailed to the owners of the tasks"
                                                : ("mailed to " + printable(to)).c_str());
  if (isOn() && !hasMailer()) {
    complain(std::string("there is no ") + kMailer + ": install a package that sends mail");
  }
}

int runMail(int argc, char **argv) {
  const Arguments arguments(argc, argv, kOptions);
  arguments.requireNoCommand();
  const std::vector<std::string> &words = arguments.operands();
  const std::optional<std::string> to = arguments.value("to");
  const bool hasOn = words == std::vector<std::string>{"on"};
  if (!words.empty() && !hasOn && words != std::vector<std::string>{"off"}) {
    throw UsageError("on or off? Without either it tells how it is");
  }
  if ((to || arguments.has("to-owners")) && !hasOn) throw UsageError("'--to' goes with 'on'");
  if (to && arguments.has("to-owners")) throw UsageError("give one of --to and --to-owners");
  if (to && !isAddress(*to)) {
    throw UsageError("'" + printable(*to) + "' is no address: write it as you@example.org");
  }
  if (!words.empty() && geteuid() != 0) throw Failure("switching the mails takes root's rights");
  if (hasOn) {
    if (to || arguments.has("to-owners")) setAddress(to.value_or(""));
    switchOn();
  } else if (!words.empty()) {
    switchOff();
  }
  tell(arguments.has("json"));
  return kDone;
}

}  // namespace

const Command kMailCommand = {
    "mail", "[on [--to ADDRESS | --to-owners] | off] [--json]", "mail failures, or stop doing so",
    "Switches on or off that a run which did not end well is mailed, and that its task runs\n"
    "well again; without on or off it tells how that stands. A task is mailed of once an\n"
    "hour at most. It takes a package that has /usr/sbin/sendmail.\n"
    "\n"
    "  --to ADDRESS                   all to this address\n"
    "  --to-owners                    each to the owner of its task\n"
    "  --json                         as JSON: see zelosched-json(5)\n",
    runMail};
