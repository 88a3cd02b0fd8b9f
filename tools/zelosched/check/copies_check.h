// Whether the copies of the tasks are whole and agree.
#pragma once

#include "check/finding.h"

Findings checkCopies();

// What the next restore falls back on.
Findings checkLastGoodCopy();
