// What the working copy of the store is, before any of it is read.
#ifndef STORE_STATE_H
#define STORE_STATE_H

#include <sys/types.h>

#include "sched_shared_names.h"

// What there is to be read or built on. A process of root's moves away what another user has put
// there. The tasks that are kept for the next boot must then be put back before any is changed,
// since the persistent copy is written as a whole: the store is made as one that is cut off.
SchedNameState schedLookAtStore();

// A process that only reads takes the name all the same: while it is free, another user can move a
// file of root's there. There are no tasks then, before and after.
void schedTakeFreeStore();

// A store without bytes was cut off by a copy that was killed when tasks are kept. Nobody must
// build on that, nor take it for a store without tasks.
bool schedIsCutToNothing(const char *szStore);

// 0 also of what cannot be looked at.
off_t schedSizeOf(const char *szPath);

#endif
