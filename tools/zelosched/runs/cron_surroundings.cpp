#include "runs/cron_surroundings.h"

#include <sys/resource.h>
#include <unistd.h>
#include <zelocore.h>

#include <algorithm>
#include <cstdint>
#include <fstream>
#include <map>

#include "terminal/number.h"
#include "terminal/text.h"

namespace {

constexpr char kCronPidFile[] = "/var/run/crond.pid";
constexpr char kCrontab[] = "/etc/crontab";
// As cron's PAM configuration names them.
constexpr const char *kLocaleFiles[] = {"/etc/environment", "/etc/default/locale"};

using Variables = std::map<std::string, std::string>;

std::string withoutQuotes(std::string_view text) {
  const bool isQuoted = text.size() >= 2 && (text.front() == '"' || text.front() == '\'') &&
                        text.back() == text.front();
  return std::string(isQuoted ? text.substr(1, text.size() - 2) : text);
}

bool isName(const std::string &text) {
  return !text.empty() && std::all_of(text.begin(), text.end(), [](unsigned char c) {
    return std::isalnum(c) != 0 || c == '_';
  });
}

bool isOfLocale(const std::string &name) {
  return name == "TZ" || name.starts_with("LANG") || name.starts_with("LC_");
}

Variables ownVariables() {
  Variables variables;
  for (char **entry = environ; *entry != nullptr; ++entry) {
    const std::string text = *entry;
    const size_t sign = text.find('=');
    if (sign == std::string::npos || isOfLocale(text.substr(0, sign))) continue;
    variables[text.substr(0, sign)] = text.substr(sign + 1);
  }
  return variables;
}

// Reads the lines NAME=value of a file, and ignores others.
void addVariables(const char *path, Variables *variables) {
  std::ifstream file(path);
  std::string line;
  while (std::getline(file, line)) {
    std::string text(trimmed(line));
    constexpr char kExport[] = "export ";
    if (text.starts_with(kExport)) text = trimmed(text.substr(sizeof kExport - 1));
    const size_t sign = text.find('=');
    if (sign == std::string::npos) continue;
    const std::string name = withoutQuotes(trimmed(text.substr(0, sign)));
    if (isName(name)) (*variables)[name] = withoutQuotes(trimmed(text.substr(sign + 1)));
  }
}

std::string firstWord(const std::string &path) {
  std::string word;
  std::ifstream(path) >> word;
  return word;
}

}  // namespace

std::vector<std::string> environmentOfCron() {
  Variables variables = ownVariables();
  for (const char *path : kLocaleFiles) addVariables(path, &variables);
  variables["PATH"] = "/usr/bin:/bin";
  variables["SHELL"] = "/bin/sh";
  addVariables(kCrontab, &variables);
  variables["HOME"] = "/root";
  variables["LOGNAME"] = "root";
  std::vector<std::string> environment;
  for (const auto &[name, value] : variables) environment.push_back(name + "=" + value);
  return environment;
}

int64_t cronProcess() {
  constexpr int kAlive = 1;
  const std::optional<int64_t> pid = parseNumber(firstWord(kCronPidFile));
  const bool isThere =
      pid && *pid > 0 && *pid <= INT32_MAX && QLIBCProcAlive(static_cast<pid_t>(*pid)) == kAlive;
  if (!isThere) return 0;
  // The pid in the file may be another program's by now.
  const std::string name = firstWord("/proc/" + std::to_string(*pid) + "/comm");
  return name.find("cron") == std::string::npos ? 0 : *pid;
}

void takeLimitsOfCron(int64_t cron) {
  if (cron == 0) return;
  for (int resource = 0; resource < RLIM_NLIMITS; ++resource) {
    const auto which = static_cast<__rlimit_resource>(resource);
    rlimit limit{};
    if (prlimit(static_cast<pid_t>(cron), which, nullptr, &limit) == 0) setrlimit(which, &limit);
  }
}
