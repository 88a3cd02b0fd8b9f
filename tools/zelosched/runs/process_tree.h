// The processes of a run: those below its keeper, or below its own process.
#pragma once

#include <sys/types.h>

#include <map>
#include <set>

// A process is held by a descriptor, so that no signal meets another one that has got its number.
class ProcessTree {
 public:
  // Those below `root`, without it, without `spared` ones and what is below these.
  explicit ProcessTree(pid_t root, std::set<pid_t> spared = {});
  // Without these, but with what is below them.
  ProcessTree(pid_t root, std::set<pid_t> spared, std::set<pid_t> passedOver);
  ~ProcessTree();
  ProcessTree(const ProcessTree &) = delete;
  ProcessTree &operator=(const ProcessTree &) = delete;

  // How many there are by now.
  size_t look();
  // To each that there is, also to those that appear meanwhile.
  void signal(int number);
  // To those that have appeared since. To how many it went.
  size_t signalNew(int number);
  // Ends all: first none may start another one any more.
  void killAll();

 private:
  struct Held {
    int file;
    unsigned long long started;
  };
  void forget(pid_t pid);

  pid_t root_;
  std::set<pid_t> spared_;
  std::set<pid_t> passedOver_;
  std::map<pid_t, Held> held_;
  std::set<pid_t> signalled_;
};
