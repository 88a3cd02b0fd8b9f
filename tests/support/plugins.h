// Plugins that a test installs, as an administrator would.
//
//   installPlugin("10-first", "echo $1 $2 >> /tmp/told");    a shell script; $1 action, $2 stage
//   std::vector<std::string> toldPlugins();                  lines of kToldFile, which a test's
//                                                            plugins append to
//   std::vector<std::string> hookCalls();                    recordedPluginCalls() of the library
#pragma once

#include <filesystem>
#include <string>
#include <vector>

#include "failing_calls.h"
#include "sandbox_fixture.h"

namespace support {

inline constexpr char kToldFile[] = "/tmp/told";
inline constexpr mode_t kProgramMode = 0755;

inline std::string pluginPath(const std::string &name) {
  return std::string(kPluginDirectory) + "/task_scheduler.d/" + name;
}

inline void installPlugin(const std::string &name, const std::string &script) {
  std::filesystem::remove(kToldFile);
  writeFile(pluginPath(name), "#!/bin/sh\n" + script + "\n", kProgramMode);
}

inline std::vector<std::string> toldPlugins() {
  return linesOf(readFile(kToldFile));
}

// The platform sets a number by setting its text, which is no call of the library.
inline std::vector<std::string> hookCalls() {
  std::vector<std::string> calls = recordedPluginCalls();
  std::erase_if(calls, [](const std::string &call) { return call.starts_with("arg RESULT="); });
  return calls;
}

}  // namespace support
