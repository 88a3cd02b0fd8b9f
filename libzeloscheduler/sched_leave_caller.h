// What a run gives up of the process that asked for it.
#ifndef SCHED_LEAVE_CALLER_H
#define SCHED_LEAVE_CALLER_H

// For the process of a run, before it opens or looks at anything. It begins a session and a session
// keyring of its own, so that it neither dies with the caller's terminal nor finds the caller's
// keys; it keeps no capability that an exec would hand on; signals, priority, scheduling and the
// score of the out-of-memory killer are the usual ones.
//
// Descriptor 0 is /dev/null. 1 and 2 stay the caller's where they are a pipe or a regular file,
// open for writing alone, and are /dev/null else: a terminal or a socket can be read, whatever it
// was opened for. All others are closed, but for the stream of a run lock that the process holds,
// which it keeps until it is released.
//
// 0, or -1 with the reason logged: then nothing must be run.
int schedLeaveCaller();

#endif
