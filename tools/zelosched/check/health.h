// Every check, worst findings first.
#pragma once

#include "check/finding.h"

// A check that throws Failure becomes a warning, and the others follow: those of the tasks only
// where the tasks can be listed.
Findings examineHealth();
