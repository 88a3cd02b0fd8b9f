#include "runs/processes.h"

#include <dirent.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <fstream>
#include <iterator>
#include <optional>
#include <sstream>
#include <string>

#include "terminal/number.h"

namespace {

ProcessStat statOf(const std::string &pid) {
  constexpr int kFieldsBetween = 17;  // between the parent and the start in /proc/PID/stat
  std::ifstream file("/proc/" + pid + "/stat");
  const std::string text(std::istreambuf_iterator<char>(file), {});
  const size_t name = text.rfind(')');  // the name before it may hold anything
  if (name == std::string::npos) return {};
  std::istringstream fields(text.substr(name + 1));
  ProcessStat stat;
  std::string skipped;
  fields >> stat.state >> stat.parent;
  for (int i = 0; i < kFieldsBetween; ++i) fields >> skipped;
  fields >> stat.started;
  return stat;
}

}  // namespace

ProcessStat statOf(pid_t pid) {
  return statOf(std::to_string(pid));
}

std::map<pid_t, ProcessStat> processes() {
  std::map<pid_t, ProcessStat> found;
  DIR *directory = opendir("/proc");
  if (directory == nullptr) return found;
  while (const dirent *entry = readdir(directory)) {
    const std::optional<long> pid = parseNumber(entry->d_name);
    if (!pid) continue;
    found[static_cast<pid_t>(*pid)] = statOf(entry->d_name);
  }
  closedir(directory);
  return found;
}

std::map<pid_t, ProcessStat> children() {
  std::map<pid_t, ProcessStat> found = processes();
  std::erase_if(found, [](const auto &process) { return process.second.parent != getpid(); });
  return found;
}

bool isOfRoot(pid_t pid) {
  std::ifstream status("/proc/" + std::to_string(pid) + "/status");
  const std::string label = "Uid:";
  std::string line;  // the first one has a name that the process chooses
  while (std::getline(status, line) && !line.starts_with(label)) {
  }
  std::istringstream ids(line.substr(std::min(label.size(), line.size())));
  long real = -1;
  long effective = -1;
  long saved = -1;
  return ids >> real >> effective >> saved && saved == 0;
}

bool isOver(pid_t pid) {
  return statOf(std::to_string(pid)).state == 'Z';
}

bool isOfOurProgram(pid_t pid) {
  struct stat ours = {};
  struct stat theirs = {};
  const std::string directory = "/proc/" + std::to_string(pid);
  if (stat((directory + "/exe").c_str(), &theirs) != 0) return errno == EACCES || errno == EPERM;
  return stat("/proc/self/exe", &ours) == 0 && ours.st_dev == theirs.st_dev &&
         ours.st_ino == theirs.st_ino;
}
