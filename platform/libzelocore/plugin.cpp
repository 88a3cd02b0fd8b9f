// Plugins: programs that root installed, run before and after a change.
#include <dirent.h>
#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdint>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

#include "child.h"
#include "support.h"

// The header of glibc 2.36 lacks the extern "C".
extern "C" {
#include <sys/pidfd.h>
}

namespace {

using Clock = std::chrono::steady_clock;

constexpr const char *kPluginRoot = "/usr/zelo/libexec/plugins/";
constexpr const char *kPluginSuffix = ".d";
// Plugins run as root, so nothing of the caller's environment reaches them.
constexpr const char *kPathVariable = "PATH";
constexpr const char *kPathValue = "/usr/sbin:/usr/bin:/sbin:/bin";
constexpr auto kMostTime = std::chrono::seconds(30);

constexpr size_t kWordContext = 0;
constexpr size_t kWordMark = 1;
constexpr size_t kWordReserved = 2;
// Tells the words of a live context from words that were never cleared.
constexpr uintptr_t kMark = 0x5a50'4c47;

struct Context {
  std::string directory;
  std::string action;
  std::map<std::string, std::string> arguments;
};

void *markOf(const void *context) noexcept {
  return reinterpret_cast<void *>(reinterpret_cast<uintptr_t>(context) ^ kMark);
}

// The live context, or null with 0x0D00.
Context *contextOf(void **words,
                   zelo::SourceLocation where = zelo::SourceLocation::here()) noexcept {
  if (words == nullptr || words[kWordContext] == nullptr ||
      words[kWordMark] != markOf(words[kWordContext])) {
    zelo::fail(QLIBC_ERR_BAD_PARAMETER, where);
    return nullptr;
  }
  return static_cast<Context *>(words[kWordContext]);
}

void clearWords(void **words) noexcept {
  words[kWordContext] = words[kWordMark] = words[kWordReserved] = nullptr;
}

// A single path component, which cannot lead out of the plugins' directory.
bool isPluginName(const char *name) noexcept {
  const std::string_view text = name != nullptr ? name : "";
  return !text.empty() && text.front() != '.' && text.find('/') == std::string_view::npos;
}

// The name of an environment variable, but not PATH or one of the dynamic linker's.
bool isArgumentKey(std::string_view key) noexcept {
  constexpr std::string_view kLetters = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz_";
  constexpr std::string_view kDigits = "0123456789";
  const auto isPart = [&](char c) {
    return kLetters.find(c) != std::string_view::npos || kDigits.find(c) != std::string_view::npos;
  };
  return !key.empty() && kDigits.find(key.front()) == std::string_view::npos &&
         std::all_of(key.begin(), key.end(), isPart) && key != kPathVariable &&
         !key.starts_with("LD_");
}

// ---- finding them ----

bool onlyRootWrites(const struct stat &status) noexcept {
  return status.st_uid == 0 && (status.st_mode & (S_IWGRP | S_IWOTH)) == 0;
}

bool isPlugin(const struct stat &status) noexcept {
  return S_ISREG(status.st_mode) && onlyRootWrites(status) &&
         (status.st_mode & (S_IXUSR | S_IXGRP | S_IXOTH)) != 0;
}

struct DirectoryCloser {
  void operator()(DIR *directory) const noexcept { closedir(directory); }
};

// The plugins' paths in name order; 0, also when there is no directory, or -1 (0x0900) for one in
// which others could put programs for root to run. As only root can change the directory, what was
// checked is what is run.
int findPlugins(const std::string &directory, std::vector<std::string> *paths) {
  zelo::Descriptor opened(open(directory.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  if (!opened.valid()) {
    return errno == ENOENT ? 0 : zelo::fail(QLIBC_ERR_OPEN);
  }
  struct stat status;
  if (fstat(opened.get(), &status) != 0 || !onlyRootWrites(status)) {
    return zelo::fail(QLIBC_ERR_OPEN);
  }
  const int listed = fcntl(opened.get(), F_DUPFD_CLOEXEC, 0);
  const std::unique_ptr<DIR, DirectoryCloser> entries(listed < 0 ? nullptr : fdopendir(listed));
  if (entries == nullptr) {
    zelo::Descriptor unused(listed);
    return zelo::fail(QLIBC_ERR_OPEN);
  }
  std::vector<std::string> names;
  while (const dirent *entry = readdir(entries.get())) {
    if (entry->d_name[0] != '.' &&
        fstatat(opened.get(), entry->d_name, &status, AT_SYMLINK_NOFOLLOW) == 0 &&
        isPlugin(status)) {
      names.emplace_back(entry->d_name);
    }
  }
  std::sort(names.begin(), names.end());
  for (const std::string &name : names) {
    paths->push_back(directory + "/" + name);
  }
  return 0;
}

// ---- running them ----

// The polling interval where no pidfd can be opened, as with a full descriptor table.
constexpr auto kAskingPause = std::chrono::milliseconds(10);

bool hasEnded(pid_t pid) noexcept {
  siginfo_t info{};
  return waitid(P_PID, static_cast<id_t>(pid), &info, WEXITED | WNOHANG | WNOWAIT) != 0 ||
         info.si_pid == pid;
}

bool endsByAsking(pid_t pid, Clock::time_point deadline) {
  while (!hasEnded(pid)) {
    if (Clock::now() >= deadline) {
      return false;
    }
    std::this_thread::sleep_for(kAskingPause);
  }
  return true;
}

// Whether the child ended in time. Its status is left for the caller.
bool endsInTime(pid_t pid) {
  const Clock::time_point deadline = Clock::now() + kMostTime;
  const zelo::Descriptor child(pidfd_open(pid, 0));
  if (!child.valid()) {
    return endsByAsking(pid, deadline);
  }
  for (;;) {
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(deadline - Clock::now()).count();
    pollfd event{child.get(), POLLIN, 0};
    const int ready = poll(&event, 1, static_cast<int>(std::max<int64_t>(left, 0)));
    if (ready >= 0 || errno != EINTR) {
      return ready > 0;
    }
  }
}

std::vector<char *> pointers(std::vector<std::string> &texts) {
  std::vector<char *> pointers;
  pointers.reserve(texts.size() + 1);
  for (std::string &text : texts) {
    pointers.push_back(text.data());
  }
  pointers.push_back(nullptr);
  return pointers;
}

bool runPlugin(const std::string &path, const Context &context, const char *stage) {
  std::vector<std::string> arguments{path, context.action, stage};
  std::vector<std::string> variables{std::string(kPathVariable) + "=" + kPathValue};
  for (const auto &[key, value] : context.arguments) {
    variables.push_back(key + "=" + value);
  }
  const std::vector<char *> argv = pointers(arguments);
  const std::vector<char *> envp = pointers(variables);

  zelo::Launch launch;
  // A process group of its own, so that what it started can be killed with it. Its output is
  // discarded: the caller's may be an answer to a browser.
  launch.inOwnGroup();
  launch.open(STDIN_FILENO, "/dev/null", O_RDONLY);
  launch.open(STDOUT_FILENO, "/dev/null", O_WRONLY);
  launch.open(STDERR_FILENO, "/dev/null", O_WRONLY);
  launch.closeFrom(STDERR_FILENO + 1);
  launch.changeDirectory("/");
  const pid_t pid = launch.start(path.c_str(), argv.data(), envp.data());
  if (pid < 0) {
    return false;
  }
  if (!endsInTime(pid)) {
    kill(-pid, SIGKILL);
    kill(pid, SIGKILL);  // it may have left its group
  }
  int status = 0;
  return zelo::waitForChild(pid, &status) && zelo::exitCode(status) == 0;
}

int runPlugins(const Context &context, const char *stage) {
  std::vector<std::string> paths;
  if (findPlugins(context.directory, &paths) < 0) {
    return -1;
  }
  const zelo::ChildStatusGuard guard;
  bool allSucceeded = true;
  for (const std::string &path : paths) {
    allSucceeded = runPlugin(path, context, stage) && allSucceeded;
  }
  return allSucceeded ? 0 : zelo::fail(QLIBC_ERR_SYSTEM);
}

}  // namespace

int QLIBPluginInit(const char *szPlugin, const char *szAction, void **ppContext) {
  if (ppContext == nullptr) {
    return zelo::fail(QLIBC_ERR_BAD_PARAMETER);
  }
  clearWords(ppContext);
  if (!isPluginName(szPlugin) || szAction == nullptr || *szAction == '\0') {
    return zelo::fail(QLIBC_ERR_BAD_PARAMETER);
  }
  return zelo::atBoundary(-1, [&] {
    auto context = std::make_unique<Context>();
    context->directory = std::string(kPluginRoot) + szPlugin + kPluginSuffix;
    context->action = szAction;
    ppContext[kWordMark] = markOf(context.get());
    ppContext[kWordContext] = context.release();
    return 0;
  });
}

int QLIBPluginSetArg(void **ppContext, const char *szKey, const char *szValue) {
  Context *context = contextOf(ppContext);
  if (context == nullptr) {
    return -1;
  }
  if (szKey == nullptr || szValue == nullptr || !isArgumentKey(szKey)) {
    return zelo::fail(QLIBC_ERR_BAD_PARAMETER);
  }
  return zelo::atBoundary(-1, [&] {
    context->arguments.insert_or_assign(szKey, szValue);
    return 0;
  });
}

int QLIBPluginSetArgByInt(void **ppContext, const char *szKey, int value) {
  return zelo::atBoundary(
      -1, [&] { return QLIBPluginSetArg(ppContext, szKey, std::to_string(value).c_str()); });
}

int QLIBPluginAction(int stage, void **ppContext) {
  const Context *context = contextOf(ppContext);
  if (context == nullptr) {
    return -1;
  }
  if (stage != QLIBPLUGIN_PRE && stage != QLIBPLUGIN_POST) {
    return zelo::fail(QLIBC_ERR_BAD_PARAMETER);
  }
  return zelo::atBoundary(
      -1, [&] { return runPlugins(*context, stage == QLIBPLUGIN_PRE ? "pre" : "post"); });
}

int QLIBPluginExit(void **ppContext) {
  Context *context = contextOf(ppContext);
  if (context == nullptr) {
    return -1;
  }
  delete context;
  clearWords(ppContext);
  return 0;
}
