// The state of the working copy of the store, before it is read.
#ifndef STORE_STATE_H
#define STORE_STATE_H

#include <sys/types.h>

#include "sched_shared_names.h"

// The state of the store's name. A process of root's moves a file of another user away. If there
// is a persistent copy, an empty store takes its place, which counts as cut off: a change would
// overwrite the whole persistent copy, so its tasks must be restored first.
SchedNameState schedLookAtStore();

// A process that only reads makes a missing store too, without tasks: while the name is free,
// another user can move a file of root's there.
void schedTakeFreeStore();

// An empty store beside a persistent copy was truncated by a copy that was killed. It must not be
// changed, nor read as a store without tasks.
bool schedIsCutToNothing(const char *szStore);

// 0 also for a file that cannot be examined.
off_t schedSizeOf(const char *szPath);

#endif
