#include "runs/run_output.h"

#include <poll.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdio>
#include <cstring>

#include "terminal/terminal.h"
#include "terminal/text.h"

namespace {

constexpr size_t kMostAtOnce = size_t{64} << 10;  // the usual capacity of a pipe
constexpr int kWritePause = 50;                   // milliseconds

}  // namespace

RunOutput::RunOutput(int reading) : reading_(reading), isForTerminal_(isTerminal()) {
  std::fflush(stdout);  // what was printed before must come first
}

bool RunOutput::pass(std::chrono::milliseconds time) {
  pollfd wanted{reading_, POLLIN, 0};
  const int ready = poll(&wanted, 1, static_cast<int>(time.count()));
  if (ready <= 0) return ready == 0;
  std::array<char, kMostAtOnce> buffer;
  const ssize_t count = read(reading_, buffer.data(), buffer.size());
  if (count <= 0) return false;
  show(std::string_view(buffer.data(), static_cast<size_t>(count)));
  return true;
}

void RunOutput::show(std::string_view bytes) {
  if (!isForTerminal_) {
    writeAll(bytes);
    return;
  }
  std::string text = std::move(cutCharacter_);
  text += bytes;
  const size_t whole = text.size() - cutCharacterLength(text);
  cutCharacter_ = text.substr(whole);
  text.resize(whole);
  writeAll(printableLines(text));
}

void RunOutput::finish() {
  writeAll(printableLines(cutCharacter_));
  cutCharacter_.clear();
}

// After an error the rest is read and dropped, so that the run does not block.
void RunOutput::writeAll(std::string_view bytes) {
  size_t written = 0;
  while (written < bytes.size() && fault_.empty()) {
    const ssize_t count = write(STDOUT_FILENO, &bytes[written], bytes.size() - written);
    if (count >= 0) {
      written += static_cast<size_t>(count);
    } else if (errno == EAGAIN) {
      pollfd wanted{STDOUT_FILENO, POLLOUT, 0};
      poll(&wanted, 1, kWritePause);
    } else if (errno != EINTR) {
      fault_ = std::strerror(errno);
    }
  }
}
