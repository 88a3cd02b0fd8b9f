// Passes what a run prints from its keeper to our standard output. For a terminal it is made
// printable, except for line feeds and tabs; otherwise it is unchanged. Only what is read at once
// is in memory.
#pragma once

#include <chrono>
#include <string>
#include <string_view>

class RunOutput {
 public:
  explicit RunOutput(int reading);

  // Waits so long for bytes, and passes them on. False at their end, or after a signal.
  bool pass(std::chrono::milliseconds time);
  void show(std::string_view bytes);
  // Writes what there is of a character whose rest did not come.
  void finish();

  // Why not all of it could be written; empty when it could.
  const std::string &fault() const { return fault_; }

 private:
  void writeAll(std::string_view bytes);

  int reading_;
  bool isForTerminal_;
  std::string cutCharacter_;  // the beginning of one whose rest is still to come
  std::string fault_;
};
