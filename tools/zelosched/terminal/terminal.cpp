#include "terminal/terminal.h"

#include <langinfo.h>
#include <sys/ioctl.h>
#include <unistd.h>

#include <cstdlib>
#include <cstring>

#include "terminal/number.h"

namespace {

constexpr size_t kUsualColumns = 80;
constexpr int64_t kMostColumns = 10000;

const char *variable(const char *name) {
  const char *value = std::getenv(name);
  return value != nullptr ? value : "";
}

}  // namespace

bool isTerminal() {
  return isatty(STDOUT_FILENO) == 1;
}

std::optional<size_t> terminalColumns() {
  if (!isTerminal()) return std::nullopt;
  const std::optional<int64_t> told = parseNumber(variable("COLUMNS"));
  if (told && *told > 0 && *told <= kMostColumns) return static_cast<size_t>(*told);
  winsize size{};
  const bool known = ioctl(STDOUT_FILENO, TIOCGWINSZ, &size) == 0 && size.ws_col > 0;
  return known ? size.ws_col : kUsualColumns;
}

bool showsColour() {
  return isTerminal() && *variable("NO_COLOR") == '\0' && *variable("TERM") != '\0' &&
         std::strcmp(variable("TERM"), "dumb") != 0;
}

bool showsUnicode() {
  return !isTerminal() || std::strcmp(nl_langinfo(CODESET), "UTF-8") == 0;
}
