// The processes of a run: those below its keeper, or below its own process.
#pragma once

#include <sys/types.h>

#include <map>
#include <set>

// A process is identified by its pid and its start time, so that no signal reaches another one that
// reuses the pid. Each call throws Failure where the processes cannot be listed.
class ProcessTree {
 public:
  // Those below `root`, without it, without `spared` ones and what is below these.
  explicit ProcessTree(pid_t root, std::set<pid_t> spared = {});
  // For a keeper: without the run's own process and the notice programs, but with the processes
  // below the former.
  ProcessTree(pid_t root, std::set<pid_t> spared, std::set<pid_t> passedOver);

  // Lists the processes again. Returns how many there are.
  size_t look();
  // Sends a signal to each, also to those that appear meanwhile.
  void signal(int number);
  // Sends it to those that have appeared since. Returns how many these are.
  size_t signalNew(int number);
  // Kills all, after stopping them, so that none starts another one.
  void killAll();

 private:
  bool isOfKeeper(pid_t pid) const;

  pid_t root_;
  std::set<pid_t> spared_;
  std::set<pid_t> passedOver_;
  std::map<pid_t, unsigned long long> found_;  // and when each was started
  std::set<pid_t> signalled_;
};
