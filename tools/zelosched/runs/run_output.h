// What a run prints, on its way from its keeper to our standard output. What goes to a terminal is
// made printable, but for line feeds and tabs; elsewhere it goes unchanged. No more of it is held
// than was read at once.
#pragma once

#include <chrono>
#include <string>
#include <string_view>

class RunOutput {
 public:
  explicit RunOutput(int reading);

  // Waits so long for something to pass on, and does so. False at the end of all, or after a
  // signal.
  bool pass(std::chrono::milliseconds time);
  void show(std::string_view bytes);
  // What there is of a character whose rest did not come.
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
