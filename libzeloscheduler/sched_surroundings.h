// What a run leaves behind of its caller, and what a command starts with.
#ifndef SCHED_SURROUNDINGS_H
#define SCHED_SURROUNDINGS_H

#include <sys/types.h>

// Replaces the environment, the working directory and the file mode mask of the process by what a
// command of that user starts with. Of the caller's environment only the locale and TZ stay. 0, or
// -1 with the reason logged.
int schedSetSurroundings(uid_t uid);

// Begins a session of its own, with the default signals and without the caller's descriptors, so
// that a run neither holds the caller's sockets, locks and databases nor dies with its terminal.
// The stream of a run lock that the process holds is the one thing kept, until it is released. 0,
// or -1 with the reason logged.
int schedLeaveCaller();

// While it lives, the real ids are the effective ones. A shell whose real id differs takes the real
// id back, which would give every task the rights of the process that started it.
class SchedRealIds {
 public:
  SchedRealIds();
  ~SchedRealIds();
  SchedRealIds(const SchedRealIds &) = delete;
  SchedRealIds &operator=(const SchedRealIds &) = delete;

  bool set() const { return set_; }

 private:
  uid_t uid_;
  gid_t gid_;
  bool set_;
};

#endif
