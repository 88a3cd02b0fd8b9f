// Processes, as /proc shows them.
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
// All processes. Throws Failure.
std::map<pid_t, ProcessStat> processes();

// Our children. Throws Failure.
std::map<pid_t, ProcessStat> children();

// The children of another process, in the order in which they began.
std::vector<pid_t> childrenOf(pid_t pid);
bool hasChild(pid_t pid);

// Whether the saved user id is root's, as a run's process keeps it. Orphans of commands, which
// become our children too, have another one unless they are root's or set-uid programs.
bool isOfRoot(pid_t pid);

// Whether its executable is ours, as that of a forked child is until it calls exec(). True also
// where we may not read that, as in a container without CAP_SYS_PTRACE.
bool isOfOurProgram(pid_t pid);
bool isOfSameProgram(pid_t pid, pid_t other);

// Whether it is a zombie, which has no executable any more.
bool isOver(pid_t pid);
