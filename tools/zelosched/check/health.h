// Every check, worst findings first.
#pragma once

#include "check/finding.h"

// A check that cannot be made does not hide the others: why it cannot is a warning.
Findings examineHealth();
