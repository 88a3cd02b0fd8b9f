#include "runs/processes.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <optional>
#include <sstream>
#include <string>

#include "store/directory.h"
#include "terminal/failure.h"
#include "terminal/number.h"

namespace {

// Empty when reading fails, as it does for a process that has just ended.
std::string textOf(const std::string &path) {
  constexpr size_t kEnough = 4096;  // for a status page
  const int file = open(path.c_str(), O_RDONLY | O_CLOEXEC);
  if (file < 0) return "";
  std::string text(kEnough, '\0');
  const ssize_t size = read(file, text.data(), text.size());
  close(file);
  text.resize(static_cast<size_t>(std::max<ssize_t>(size, 0)));
  return text;
}

}  // namespace

ProcessStat statOf(pid_t pid) {
  constexpr int kFieldsBetween = 17;  // between the parent and the start in /proc/PID/stat
  const std::string text = textOf("/proc/" + std::to_string(pid) + "/stat");
  const size_t name = text.rfind(')');  // the name before it may have any character
  if (name == std::string::npos) return {};
  std::istringstream fields(text.substr(name + 1));
  ProcessStat stat;
  std::string skipped;
  fields >> stat.state >> stat.parent;
  for (int i = 0; i < kFieldsBetween; ++i) fields >> skipped;
  fields >> stat.started;
  return stat;
}

std::map<pid_t, ProcessStat> processes() {
  std::map<pid_t, ProcessStat> found;
  const Directory directory(opendir("/proc"));
  if (directory == nullptr) throw Failure(std::string("cannot read /proc: ") + strerror(errno));
  while (const dirent *entry = readdir(directory.get())) {
    const std::optional<int64_t> pid = parseNumber(entry->d_name);
    if (!pid) continue;
    const auto process = static_cast<pid_t>(*pid);
    found[process] = statOf(process);
  }
  return found;
}

std::map<pid_t, ProcessStat> children() {
  std::map<pid_t, ProcessStat> found = processes();
  std::erase_if(found, [](const auto &process) { return process.second.parent != getpid(); });
  return found;
}

std::vector<pid_t> childrenOf(pid_t pid) {
  std::vector<pid_t> found;
  const std::string number = std::to_string(pid);
  const std::string list = "/proc/" + number + "/task/" + number + "/children";
  if (access(list.c_str(), F_OK) == 0) {
    std::istringstream numbers(textOf(list));
    for (pid_t child; numbers >> child;) found.push_back(child);
    return found;
  }
  const std::map<pid_t, ProcessStat> all = processes();
  for (const auto &[child, stat] : all) {
    if (stat.parent == pid) found.push_back(child);
  }
  std::stable_sort(found.begin(), found.end(), [&](pid_t one, pid_t other) {
    return all.at(one).started < all.at(other).started;
  });
  return found;
}

bool hasChild(pid_t pid) {
  return !childrenOf(pid).empty();
}

bool isOfRoot(pid_t pid) {
  std::istringstream status(textOf("/proc/" + std::to_string(pid) + "/status"));
  const std::string label = "Uid:";
  std::string line;  // the first has a name that the process chooses
  while (std::getline(status, line) && !line.starts_with(label)) {
  }
  std::istringstream ids(line.substr(std::min(label.size(), line.size())));
  int64_t real = -1;
  int64_t effective = -1;
  int64_t saved = -1;
  return ids >> real >> effective >> saved && saved == 0;
}

bool isOver(pid_t pid) {
  return statOf(pid).state == 'Z';
}

bool isOfSameProgram(pid_t pid, pid_t other) {
  struct stat one = {};
  struct stat two = {};
  const auto programOf = [](pid_t process) { return "/proc/" + std::to_string(process) + "/exe"; };
  if (stat(programOf(pid).c_str(), &one) != 0) return errno == EACCES || errno == EPERM;
  return stat(programOf(other).c_str(), &two) == 0 && one.st_dev == two.st_dev &&
         one.st_ino == two.st_ino;
}

bool isOfOurProgram(pid_t pid) {
  return isOfSameProgram(pid, getpid());
}
