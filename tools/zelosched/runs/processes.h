// What /proc tells of processes.
#pragma once

#include <sys/types.h>

#include <map>
#include <vector>

struct ProcessStat {
  char state = '\0';  // as ps shows it
  pid_t parent = 0;
  unsigned long long started = 0;  // in clock ticks since the boot; 0 of one that is not there
};

ProcessStat statOf(pid_t pid);
// Of all. Throws Failure.
std::map<pid_t, ProcessStat> processes();

// Ours. Throws Failure.
std::map<pid_t, ProcessStat> children();

// Those of another process, in the order in which they began.
std::vector<pid_t> childrenOf(pid_t pid);
bool hasChild(pid_t pid);

// What a command leaves behind becomes ours, and may be older than the next run's process. But it
// cannot have root's saved user id, which a run's process keeps as its way back.
bool isOfRoot(pid_t pid);

// Whether it runs the program that we run, as a child does that was forked and has started no
// other. A set-uid program that a command has started is of root too. True also where we may not
// look, as in a container without CAP_SYS_PTRACE.
bool isOfOurProgram(pid_t pid);
bool isOfSameProgram(pid_t pid, pid_t other);

// Whether it has ended, and waits for its parent to ask how. It has no program any more.
bool isOver(pid_t pid);
