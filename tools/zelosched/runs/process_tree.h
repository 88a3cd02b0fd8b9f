// The processes of a run: those below its keeper, or below its own process.
#pragma once

#include <sys/types.h>

#include <map>
#include <set>

// A process is known by its number and by when it was started, so that no signal meets another one
// that has got its number. Each call throws Failure where the processes cannot be listed.
class ProcessTree {
 public:
  // Those below `root`, without it, without `spared` ones and what is below these.
  explicit ProcessTree(pid_t root, std::set<pid_t> spared = {});
  // Of a keeper: without the run's own process, but with what is below it, and without what the
  // keeper has started to tell of the run's end.
  ProcessTree(pid_t root, std::set<pid_t> spared, std::set<pid_t> passedOver);

  // How many there are by now.
  size_t look();
  // To each that there is, also to those that appear meanwhile.
  void signal(int number);
  // To those that have appeared since. To how many it went.
  size_t signalNew(int number);
  // Ends all: first none may start another one any more.
  void killAll();

 private:
  bool isOfKeeper(pid_t pid) const;

  pid_t root_;
  std::set<pid_t> spared_;
  std::set<pid_t> passedOver_;
  std::map<pid_t, unsigned long long> found_;  // and when each was started
  std::set<pid_t> signalled_;
};
