#include "runs/process_tree.h"

#include <signal.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <vector>

#include "runs/processes.h"

namespace {

// Whatever appears faster than it is found.
constexpr int kMostRounds = 1000;

int send(int file, int number) {
  return static_cast<int>(syscall(SYS_pidfd_send_signal, file, number, nullptr, 0));
}

bool isEnded(const ProcessStat &stat) {
  return stat.state == 'Z' || stat.state == 'X' || stat.state == '\0';
}

}  // namespace

ProcessTree::ProcessTree(pid_t root, std::set<pid_t> spared)
    : ProcessTree(root, std::move(spared), {}) {}

ProcessTree::ProcessTree(pid_t root, std::set<pid_t> spared, std::set<pid_t> passedOver)
    : root_(root), spared_(std::move(spared)), passedOver_(std::move(passedOver)) {}

ProcessTree::~ProcessTree() {
  for (const auto &[pid, held] : held_) close(held.file);
}

void ProcessTree::forget(pid_t pid) {
  const auto found = held_.find(pid);
  if (found == held_.end()) return;
  close(found->second.file);
  held_.erase(found);
  signalled_.erase(pid);
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
      pending.push_back(pid);
      if (passedOver_.count(pid) == 0 && !isEnded(all.at(pid))) there.insert(pid);
    }
  }
  // One that its parent has left to somebody else is not below the root any more, but ours still.
  for (auto held = held_.begin(); held != held_.end();) {
    const auto found = all.find(held->first);
    const bool isThere = found != all.end() && found->second.started == held->second.started &&
                         !isEnded(found->second);
    const pid_t pid = held->first;
    ++held;
    if (!isThere) forget(pid);
  }
  for (const pid_t pid : there) {
    if (held_.count(pid) != 0) continue;
    const int file = static_cast<int>(syscall(SYS_pidfd_open, pid, 0));
    if (file < 0) continue;
    // It may be another one by now.
    const unsigned long long started = all.at(pid).started;
    if (statOf(pid).started == started) {
      held_[pid] = {file, started};
    } else {
      close(file);
    }
  }
  return held_.size();
}

void ProcessTree::signal(int number) {
  signalled_.clear();
  for (int round = 0; round < kMostRounds && signalNew(number) > 0; ++round) {
  }
}

size_t ProcessTree::signalNew(int number) {
  look();
  size_t count = 0;
  for (const auto &[pid, held] : held_) {
    if (!signalled_.insert(pid).second) continue;
    send(held.file, number);
    ++count;
  }
  return count;
}

void ProcessTree::killAll() {
  signal(SIGSTOP);
  signal(SIGKILL);
}
