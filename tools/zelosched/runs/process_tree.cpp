#include "runs/process_tree.h"

#include <signal.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <vector>

#include "runs/processes.h"

namespace {

// Against processes that appear faster than they are found.
constexpr int kMostRounds = 1000;

// No pidfd is kept open: a run may have more processes than we may open files.
void send(pid_t pid, unsigned long long started, int number) {
  const int file = static_cast<int>(syscall(SYS_pidfd_open, pid, 0));
  if (file < 0) return;
  if (statOf(pid).started == started) {
    syscall(SYS_pidfd_send_signal, file, number, nullptr, 0);
  }
  close(file);
}

bool isEnded(const ProcessStat &stat) {
  return stat.state == 'Z' || stat.state == 'X' || stat.state == '\0';
}

}  // namespace

ProcessTree::ProcessTree(pid_t root, std::set<pid_t> spared)
    : ProcessTree(root, std::move(spared), {}) {}

ProcessTree::ProcessTree(pid_t root, std::set<pid_t> spared, std::set<pid_t> passedOver)
    : root_(root), spared_(std::move(spared)), passedOver_(std::move(passedOver)) {}

// Whether it is a keeper's child that runs the notice programs.
bool ProcessTree::isOfKeeper(pid_t pid) const {
  return !passedOver_.empty() && passedOver_.count(pid) == 0 && isOfRoot(pid) &&
         isOfSameProgram(pid, root_);
}

size_t ProcessTree::look() {
  const std::map<pid_t, ProcessStat> all = processes();
  std::multimap<pid_t, pid_t> childrenOf;
  for (const auto &[pid, stat] : all) childrenOf.emplace(stat.parent, pid);
  std::vector<pid_t> pending = {root_};
  std::set<pid_t> there;
  while (!pending.empty()) {
    const pid_t parent = pending.back();
    pending.pop_back();
    const auto [first, last] = childrenOf.equal_range(parent);
    for (auto child = first; child != last; ++child) {
      const pid_t pid = child->second;
      if (spared_.count(pid) != 0 || pid == getpid()) continue;
      if (parent == root_ && isOfKeeper(pid)) continue;
      pending.push_back(pid);
      if (passedOver_.count(pid) == 0 && !isEnded(all.at(pid))) there.insert(pid);
    }
  }
  // A process that was reparented is not below the root any more, but still one of the run's.
  std::erase_if(found_, [&](const auto &known) {
    const auto now = all.find(known.first);
    const bool isThere =
        now != all.end() && now->second.started == known.second && !isEnded(now->second);
    if (!isThere) signalled_.erase(known.first);
    return !isThere;
  });
  for (const pid_t pid : there) found_[pid] = all.at(pid).started;
  return found_.size();
}

void ProcessTree::signal(int number) {
  signalled_.clear();
  for (int round = 0; round < kMostRounds && signalNew(number) > 0; ++round) {
  }
}

size_t ProcessTree::signalNew(int number) {
  look();
  size_t count = 0;
  for (const auto &[pid, started] : found_) {
    if (!signalled_.insert(pid).second) continue;
    send(pid, started, number);
    ++count;
  }
  return count;
}

void ProcessTree::killAll() {
  signal(SIGSTOP);
  signal(SIGKILL);
}
