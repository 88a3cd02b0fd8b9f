// What a row of the status database says of a run of the history.
#pragma once

#include <string_view>

#include "runs/history.h"
#include "runs/runs.h"

// Takes the state and the outcome. A row that says "running" for a process that is gone is "lost":
// a keeper that saw the process end knows more.
void takeStatus(const Run &row, KeptRun *run);

// Sets the outcome of a run that was ended by 'stop' or by the time limit in the stored `command`.
// To be called when exit code and duration are known.
void judgeEnd(std::string_view command, bool isStopAsked, RunRecord *run);
