// Ending a run that waits or goes on.
#pragma once

#include <chrono>
#include <csignal>
#include <cstdint>

#include "runs/history.h"

// By which the keeper tells a run that was cancelled from one that somebody else has killed.
inline constexpr int kSignalOfCancelling = SIGUSR2;

// Ends a run that still waits for its turn. False when its command has begun, or it is over.
bool cancelWaiting(const ProcessName &process);

enum class Stopped { kCancelled, kEnded, kKilled, kWasOver, kPartly, kNot };

// Waits until it is over. The request is noted already. kKilled: something of it had to be killed
// after `grace`. kPartly: without a keeper, what has left the run's own processes is not found.
// kNot: something of it could not be ended. Throws Failure where the processes cannot be listed.
Stopped stopRun(const KeptRun &run, std::chrono::milliseconds grace);

// Notes for the runs under way of that task that somebody wants them ended, and gives them. A
// history that cannot be written is said, and keeps no run from being stopped. Throws Failure.
std::vector<KeptRun> runsToStop(int64_t task);
void noteStop(std::vector<KeptRun> *runs);
