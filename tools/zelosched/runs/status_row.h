// What a row of the status database says of a run of the history.
#pragma once

#include <string_view>

#include "runs/history.h"
#include "runs/runs.h"

// How it ended, or that it goes on. A row that says "running" of a process that is gone is "lost":
// who saw that process end knows more.
void takeStatus(const Run &row, KeptRun *run);

// `command` is what is stored of the task: by its time limit, or by 'stop', it ends otherwise than
// by itself. To be called when all is known.
void judgeEnd(std::string_view command, bool isStopAsked, RunRecord *run);
