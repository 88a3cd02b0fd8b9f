// A task's command that says when it has started and then waits to be let go: kWaitingCommand.
//
//   makeFifos();
//   ... ZELOSchedTaskRun(...) of a task with kWaitingCommand
//   waitUntilStarted();  the command is running now, and goes on doing so
//   letGo();
#pragma once

#include <sys/stat.h>

#include <cstdio>
#include <stdexcept>
#include <string>

#include "sandbox_fixture.h"

namespace support {

inline constexpr char kStartedFifo[] = "/tmp/fifo_test.started";
inline constexpr char kGoFifo[] = "/tmp/fifo_test.go";
inline constexpr char kWaitingCommand[] =
    "echo started > /tmp/fifo_test.started; read go < /tmp/fifo_test.go";

inline void makeFifos() {
  constexpr mode_t kForEverybody = 0666;
  for (const char *path : {kStartedFifo, kGoFifo}) {
    std::remove(path);
    if (mkfifo(path, kForEverybody) != 0 || chmod(path, kForEverybody) != 0) {
      throw std::runtime_error(std::string("cannot make ") + path);
    }
  }
}

inline void waitUntilStarted() {
  readFile(kStartedFifo);
}

inline void letGo() {
  writeFile(kGoFifo, "go\n");
}

}  // namespace support
