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
#include <optional>
#include <sstream>
#include <string_view>
#include <vector>

#include "commands/command.h"
#include "commands/options.h"
#include "json/json_out.h"
#include "runs/notices.h"
#include "store/place_file.h"
#include "store/task_program.h"
#include "terminal/failure.h"
#include "terminal/text.h"

namespace {

constexpr Option kMailOptions[] = {{"to", Option::kValue}, {"to-owners"}, {"json"}};
constexpr char kSettings[] = "/etc/default/zelosched-mail";
constexpr char kUsualProgram[] = "/usr/share/zelosched/mail-on-failure";
constexpr char kAddress[] = "MAIL_TO=";
constexpr mode_t kDirectoryMode = 0755;

// Relative to where this program is installed.
std::string mailProgram() {
  const std::string own = ownProgram();
  const std::string beside =
      own.substr(0, own.rfind('/') + 1) + "../share/zelosched/mail-on-failure";
  char whole[PATH_MAX];
  return realpath(beside.c_str(), whole) != nullptr ? whole : kUsualProgram;
}

// A user of this machine, or user and host. No character that is special to a shell, as root's
// shell reads the settings.
bool isAddress(const std::string &text) {
  constexpr size_t kLongest = 254;
  const auto isWord = [](char c) {
    return std::isalnum(static_cast<unsigned char>(c)) != 0 || c == '_';
  };
  const auto isPart = [&](std::string_view part) {
    return !part.empty() && isWord(part.front()) && isWord(part.back()) &&
           std::all_of(part.begin(), part.end(), [&](char c) {
             return isWord(c) || std::string_view(".+-").find(c) != std::string_view::npos;
           });
  };
  const std::string_view whole = text;
  const size_t at = whole.find('@');
  return whole.size() <= kLongest && isPart(whole.substr(0, at)) &&
         (at == whole.npos || isPart(whole.substr(at + 1)));
}

// The address in the settings. A shell reads this file; here, only the form of line that this
// command writes is understood, also with quotes.
struct MailSettings {
  std::vector<std::string> others;  // all other lines
  std::string address;              // empty: to the owners
  std::string fault;                // why the address is not known
  mode_t mode = 0644;
};

bool takeAddress(const std::string &line, MailSettings *settings) {
  if (line.compare(0, strlen(kAddress), kAddress) != 0) return false;
  std::string value = line.substr(strlen(kAddress));
  const bool isQuoted = value.size() > 1 && value.front() == value.back() &&
                        (value.front() == '"' || value.front() == '\'');
  if (isQuoted) value = value.substr(1, value.size() - 2);
  if (!value.empty() && !isAddress(value)) return false;
  settings->address = value;
  return true;
}

bool isComment(const std::string &line) {
  const size_t first = line.find_first_not_of(" \t");
  return first != std::string::npos && line[first] == '#';
}

MailSettings readMailSettings() {
  MailSettings settings;
  struct stat info {};
  if (lstat(kSettings, &info) != 0) return settings;
  settings.mode = info.st_mode & ALLPERMS;
  if (!S_ISREG(info.st_mode)) {
    settings.fault = std::string(kSettings) + " is no regular file";
    return settings;
  }
  try {
    std::istringstream lines(contentsOf(kSettings));
    for (std::string line; std::getline(lines, line);) {
      if (takeAddress(line, &settings)) continue;
      settings.others.push_back(line);
      if (line.find("MAIL_TO") != std::string::npos && !isComment(line)) {
        settings.fault = std::string(kSettings) + " sets MAIL_TO in a way of its own";
      }
    }
  } catch (const Failure &failure) {
    settings.fault = failure.what();
  }
  return settings;
}

// The file's other lines and its mode stay.
void setAddress(const std::string &text) {
  const MailSettings settings = readMailSettings();
  if (!settings.fault.empty()) throw Failure(settings.fault + ": set the address there by hand");
  std::ostringstream contents;
  for (const std::string &line : settings.others) contents << line << '\n';
  if (!text.empty()) contents << kAddress << text << '\n';
  placeFile(kSettings, contents.str(), settings.mode);
}

// Why the program is not run, or an empty text when it is; nothing where it is not there.
std::optional<std::string> faultOfProgram() {
  for (const NoticeProgram &program : noticePrograms()) {
    if (program.path == kNoticeDirectory || program.path == kMailProgram) {
      return program.fault.empty() ? "" : program.path + " " + program.fault;
    }
  }
  return std::nullopt;
}

bool isOn() {
  const std::optional<std::string> fault = faultOfProgram();
  return fault && fault->empty();
}

// The command makes and removes a link only, not a file.
void requireLinkOrNothing() {
  struct stat info {};
  if (lstat(kMailProgram, &info) != 0 || S_ISLNK(info.st_mode)) return;
  throw Failure(std::string(kMailProgram) +
                " is no link but a program of your own: move it away, or change its mode");
}

void switchOn() {
  if (isOn()) return;
  const std::string directory = kNoticeDirectory;
  mkdir(directory.substr(0, directory.rfind('/')).c_str(), kDirectoryMode);
  mkdir(kNoticeDirectory, kDirectoryMode);
  unlink(kMailProgram);  // a link whose program is missing or not run
  if (symlink(mailProgram().c_str(), kMailProgram) < 0) {
    throw Failure(std::string("cannot make ") + kMailProgram + ": " + std::strerror(errno));
  }
  const std::optional<std::string> fault = faultOfProgram();
  if (fault && !fault->empty()) throw Failure("failures are not mailed: " + *fault);
}

void switchOff() {
  if (unlink(kMailProgram) == 0 || errno == ENOENT) return;
  throw Failure(std::string("cannot remove ") + kMailProgram + ": " + std::strerror(errno));
}

void tell(bool asJson) {
  const MailSettings settings = readMailSettings();
  if (asJson) {
    Json::Value top = topObject();
    top["mail"]["is_on"] = isOn();
    top["mail"]["to"] = jsonTextOrNull(settings.address);
    top["mail"]["fault"] = jsonTextOrNull(settings.fault);
    top["mail"]["has_mailer"] = hasMailer();
    printTop(top);
    return;
  }
  if (!isOn()) {
    std::puts("failures are not mailed");
    return;
  }
  const std::string to = !settings.fault.empty()    ? "; to whom is not known: " + settings.fault
                         : settings.address.empty() ? " to the owners of the tasks"
                                                    : " to " + settings.address;
  std::printf("failures are mailed%s\n", printable(to).c_str());
  if (!hasMailer()) {
    complain(std::string("there is no ") + kMailer + ": install a package that sends mail");
  }
}

int runMail(int argc, char **argv) {
  const Arguments arguments(argc, argv, kMailOptions);
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
  if (!words.empty()) requireLinkOrNothing();
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
