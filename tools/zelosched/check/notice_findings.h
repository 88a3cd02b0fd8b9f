// Whether those who want to know of a run's end are told.
#pragma once

#include "check/finding.h"

Findings checkNotices();
