// What a command starts with: environment, directory, file mode mask and ids.
#ifndef SCHED_RUN_ENVIRONMENT_H
#define SCHED_RUN_ENVIRONMENT_H

#include <sys/types.h>

// Replaces the environment, the working directory and the file mode mask of the process by what a
// command of that user starts with. Of the caller's environment only the locale and TZ stay. 0, or
// -1 with the reason logged.
int schedSetRunEnvironment(uid_t uid);

// While it lives, the real ids are the effective ones. A shell whose real id differs sets the
// effective one back to it, which would give every task the rights of the process that started it.
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
