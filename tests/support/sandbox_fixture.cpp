#include "sandbox_fixture.h"

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <iomanip>
#include <iostream>
#include <sstream>
#include <stdexcept>

#include "captured_log.h"
#include "failing_calls.h"
#include "fake_clock.h"
#include "status_db.h"
#include "zelocore.h"

namespace support {
namespace {

void removeSharedFiles() {
  for (const auto &entry : std::filesystem::directory_iterator("/tmp")) {
    const std::string name = entry.path().filename();
    for (const char *prefix :
         {"scheduled_tasks", "sched_status.sqlite", "zeloschedtask", "zeloscheduler."}) {
      if (name.starts_with(prefix)) std::filesystem::remove_all(entry.path());
    }
  }
}

}  // namespace

std::ostream &operator<<(std::ostream &out, const ErrorRecord &record) {
  return out << "[0x" << std::hex << std::setw(4) << std::setfill('0') << record.code << std::dec
             << " " << record.file << "]";
}

std::string readFile(const std::string &path) {
  std::ifstream file(path, std::ios::binary);
  std::ostringstream text;
  text << file.rdbuf();
  return text.str();
}

void writeFile(const std::string &path, const std::string &text, mode_t mode) {
  std::filesystem::create_directories(std::filesystem::path(path).parent_path());
  std::ofstream file(path, std::ios::binary | std::ios::trunc);
  file << text;
  file.close();
  if (!file) throw std::runtime_error("cannot write " + path);
  std::filesystem::permissions(path, static_cast<std::filesystem::perms>(mode));
}

bool fileExists(const std::string &path) {
  return std::filesystem::exists(std::filesystem::symlink_status(path));
}

std::vector<std::string> linesOf(const std::string &text) {
  std::vector<std::string> lines;
  std::istringstream stream(text);
  for (std::string line; std::getline(stream, line);) lines.push_back(line);
  return lines;
}

std::vector<std::string> crontabLines() {
  const std::vector<std::string> plain = linesOf(kPlainCrontab);
  std::vector<std::string> lines = linesOf(readFile(kCrontab));
  std::erase_if(lines, [&](const std::string &line) {
    return std::find(plain.begin(), plain.end(), line) != plain.end();
  });
  return lines;
}

ErrorRecord errorRecord() {
  return {QLIBCErrGet(), QLIBCErrorGetFile()};
}

bool otherUsersExist() {
  std::istringstream map(readFile("/proc/self/uid_map"));
  unsigned inside = 0;
  unsigned outside = 0;
  unsigned count = 0;
  while (map >> inside >> outside >> count) {
    if (inside > 0 || count > 1) return true;
  }
  return false;
}

bool hasStoredTasks() {
  const std::vector<std::string> lines = linesOf(readFile(kStore));
  return std::any_of(lines.begin(), lines.end(),
                     [](const std::string &line) { return line.starts_with("["); });
}

std::string movedAway(const std::string &path) {
  const std::filesystem::path name = std::filesystem::path(path).filename();
  for (const auto &entry : std::filesystem::directory_iterator("/tmp")) {
    const bool isOurs = entry.path().filename().string().starts_with("zeloscheduler.");
    if (isOurs && fileExists(entry.path() / name)) return entry.path() / name;
  }
  return "";
}

void cleanWorld() {
  resetFailingCalls();
  waitForChildRuns();
  removeSharedFiles();
  for (const char *path : {kPersistentStore, kLastGoodStore, kPowerSchedule, kLockDirectory,
                           kCronPidFile, kPluginDirectory}) {
    std::filesystem::remove_all(path);
  }
  std::filesystem::remove_all(kCrontab);
  writeFile(kCrontab, kPlainCrontab);
  setZone("UTC");
  realClock();
  resetFailingCalls();
  clearLog();
  QLIBCErrSetEx(0, "", 0);
}

void SandboxTest::SetUp() {
  cleanWorld();
}

void SandboxTest::TearDown() {
  if (!HasFailure()) return;
  std::cout << "Logged in this test:\n";
  for (const std::string &line : loggedRaw()) std::cout << "  " << line << "\n";
}

}  // namespace support
