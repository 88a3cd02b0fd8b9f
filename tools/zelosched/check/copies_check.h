// Whether the copies of the tasks are whole and agree.
#pragma once

#include "check/finding.h"

Findings checkCopies();

// Whether the last good copy, which a restore falls back on, equals the persistent one.
Findings checkLastGoodCopy();
