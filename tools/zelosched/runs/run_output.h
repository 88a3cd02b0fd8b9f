// What a run prints, on its way to our standard output.
#pragma once

#include <chrono>
#include <optional>
#include <string>

// A pipe from the run to us, lest the command get a terminal: whoever has one can read what is
// typed there, and type himself. What goes on to a terminal is made printable, but for line feeds
// and tabs; elsewhere it goes unchanged. No more of it is held than was read at once.
//
// While one lives, an interrupt waits until something else reads the pipe: a run that has begun
// goes on, and would end at the next line that it prints.
class RunOutput {
 public:
  RunOutput();  // throws Failure
  ~RunOutput();
  RunOutput(const RunOutput &) = delete;
  RunOutput &operator=(const RunOutput &) = delete;

  // What a run is to print to.
  int descriptorOfRun() const { return writing_; }
  // A run has it by now.
  void runHasBegun();

  // Waits so long for something to pass on, and does so.
  void pass(std::chrono::milliseconds time);
  // Passes on what there is at the end of the run. Who still has the pipe open, such as a daemon
  // that the command has left behind, is not waited for.
  void passRest();

  // Why not all of it could be written; empty when it could.
  const std::string &fault() const { return fault_; }

 private:
  size_t passOnce(size_t most);
  void show(std::string_view bytes);
  void writeAll(std::string_view bytes);
  void leaveReadingToAnother() const;
  void endWhenInterrupted() const;

  int reading_ = -1;
  int writing_ = -1;
  bool isReadByNobody_ = false;  // once the run has begun, until its end
  bool isForTerminal_;
  std::string cutCharacter_;  // the beginning of one whose rest is still to come
  std::string fault_;
};
