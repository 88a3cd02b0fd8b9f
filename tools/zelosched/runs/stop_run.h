// Ending a run that waits or is running.
#pragma once

#include <chrono>
#include <csignal>
#include <cstdint>

#include "runs/history.h"

// By this signal the keeper tells a cancelled run from one that was killed otherwise.
inline constexpr int kSignalOfCancelling = SIGUSR2;

// Ends a run that still waits for its turn. False when its command has begun, or it is over.
bool cancelWaiting(const ProcessName &process);

enum class Stopped { kCancelled, kEnded, kKilled, kWasOver, kPartly, kNot };

// Ends the run, after noteStop(), and waits for its end. kKilled: a process of it had to be killed
// after `grace`. kPartly: without a keeper, processes that left the run's tree are not found. kNot:
// a process could not be ended. Throws Failure where the processes cannot be listed.
Stopped stopRun(const KeptRun &run, std::chrono::milliseconds grace);

// The runs under way of the task, and the record in the history that they are to end. A history
// that cannot be written is reported, and does not keep a run from being stopped. Throws Failure.
std::vector<KeptRun> runsToStop(int64_t task);
void noteStop(std::vector<KeptRun> *runs);
