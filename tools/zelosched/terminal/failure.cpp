#include "terminal/failure.h"

#include <zelocore.h>

#include <algorithm>
#include <cstdio>
#include <iterator>
#include <sstream>

#include "terminal/text.h"

namespace {

struct Reason {
  int code;
  const char *words;
};
constexpr Reason kReasons[] = {
    {0x0100, "out of memory"},
    {0x0200, "out of memory"},
    {0x0400, "another process holds the lock of runs or of changes; the system log names it"},
    {0x0500, "the run lock could not be released"},
    {0x0900, "a file or the database could not be opened, or is not root's alone"},
    {0x0B00, "reading or writing failed, or a file is cut off"},
    {0x0D00, "a bad argument"},
    {0x2000, "not found"},
    {0x2700, "a file could not be examined"},
    {0x2800, "a file could not be replaced"},
    {0x2A00, "a system call on time, identity or processes failed"},
    {0x4000, "a malformed number, date or time"},
};

const char *wordsFor(int code) {
  const auto *const found = std::find_if(std::begin(kReasons), std::end(kReasons),
                                         [&](const Reason &reason) { return reason.code == code; });
  return found == std::end(kReasons) ? "an error without a name" : found->words;
}

}  // namespace

void forgetError() {
  QLIBCErrSetEx(0, "", 0);
}

std::string errorInWords() {
  const int code = QLIBCErrGet();
  if (code == 0) return "the system log says why";
  char where[256];
  std::snprintf(where, sizeof where, " [0x%04X %s:%d]", static_cast<unsigned>(code),
                QLIBCErrorGetFile(), QLIBCErrorGetLine());
  return wordsFor(code) + std::string(where);
}

Failure failedTo(const std::string &what) {
  return Failure("cannot " + what + ": " + errorInWords());
}

int complain(const std::string &sentence) {
  // Some have names of other users' files, and standard error may be a terminal.
  std::istringstream lines(sentence);
  std::string shown = "zelosched:";
  for (std::string line; std::getline(lines, line);) shown += " " + printable(line) + "\n";
  std::fputs(shown.c_str(), stderr);
  return kFailed;
}
