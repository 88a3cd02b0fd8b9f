// What a run does not keep of the process that started it.
#ifndef SCHED_LEAVE_CALLER_H
#define SCHED_LEAVE_CALLER_H

// For the process of a run, before it opens any file. It begins a session and a session keyring of
// its own, so that it neither ends with the caller's terminal nor finds the caller's keys. It
// drops the capabilities that an exec would pass on. Signals, priority, scheduling and the score
// of the out-of-memory killer are reset to the defaults.
//
// Descriptor 0 is /dev/null. 1 and 2 stay the caller's where they are a pipe or a regular file,
// open for writing only (an anonymous pipe, also for reading) and without FD_CLOEXEC, and are
// /dev/null otherwise: a terminal or a socket can be read, however it was opened. All others are
// closed, except the stream of a run lock that the process holds.
//
// 0, or -1 with the reason logged: then no command may be run.
int schedLeaveCaller();

#endif
