// Whether the programs that are notified of a run's end work.
#pragma once

#include "check/finding.h"

Findings checkNotices();
