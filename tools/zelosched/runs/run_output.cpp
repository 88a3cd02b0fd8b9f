#include "runs/run_output.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <sys/ioctl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <iterator>

#include "terminal/failure.h"
#include "terminal/terminal.h"
#include "terminal/text.h"

namespace {

constexpr size_t kMostAtOnce = size_t{64} << 10;  // what a pipe holds
constexpr std::chrono::milliseconds kPause(50);

// The owner may open it for writing by the names of the standard streams; only we read it.
constexpr mode_t kPipeMode = 0622;

// ---- interrupts

constexpr int kInterrupts[] = {SIGINT, SIGTERM, SIGHUP, SIGQUIT, SIGPIPE};
volatile sig_atomic_t interruptedBy = 0;
struct sigaction formerActions[std::size(kInterrupts)];

void noteInterrupt(int signal) {
  interruptedBy = signal;
}

// Without SA_RESTART: what waits is to come back.
void noteInterrupts() {
  struct sigaction action = {};
  action.sa_handler = noteInterrupt;
  for (size_t i = 0; i < std::size(kInterrupts); ++i) {
    sigaction(kInterrupts[i], nullptr, &formerActions[i]);
    if (formerActions[i].sa_handler != SIG_IGN) sigaction(kInterrupts[i], &action, nullptr);
  }
}

void obeyInterrupts() {
  for (size_t i = 0; i < std::size(kInterrupts); ++i) {
    sigaction(kInterrupts[i], &formerActions[i], nullptr);
  }
}

// ---- reading on when we are gone

[[noreturn]] void readOn(int reading) {
  setsid();
  obeyInterrupts();
  // Whoever waits for the end of our output waits for us alone, not for the run.
  for (const int stream : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO}) close(stream);
  static_cast<void>(chdir("/") < 0);
  std::array<char, kMostAtOnce> buffer;
  ssize_t count;
  do {
    count = read(reading, buffer.data(), buffer.size());
  } while (count > 0 || (count < 0 && errno == EINTR));
  _exit(0);
}

bool isReady(int descriptor, short event, std::chrono::milliseconds time) {
  pollfd wanted{descriptor, event, 0};
  return poll(&wanted, 1, static_cast<int>(time.count())) > 0;
}

}  // namespace

RunOutput::RunOutput() : isForTerminal_(isTerminal()) {
  int ends[2];
  if (pipe2(ends, O_CLOEXEC) != 0) {
    throw Failure(std::string("cannot make a pipe for the output: ") + std::strerror(errno));
  }
  reading_ = ends[0];
  writing_ = ends[1];
  fchmod(writing_, kPipeMode);
  std::fflush(stdout);  // what was printed before comes before
  noteInterrupts();
}

RunOutput::~RunOutput() {
  if (isReadByNobody_) leaveReadingToAnother();
  close(reading_);
  if (writing_ >= 0) close(writing_);
  obeyInterrupts();
  if (interruptedBy != 0) raise(interruptedBy);
}

void RunOutput::runHasBegun() {
  isReadByNobody_ = true;
  close(writing_);  // or its end would never be seen
  writing_ = -1;
}

void RunOutput::pass(std::chrono::milliseconds time) {
  if (isReady(reading_, POLLIN, time)) {
    if (passOnce(kMostAtOnce) == 0) poll(nullptr, 0, static_cast<int>(time.count()));
  }
  endWhenInterrupted();
}

void RunOutput::passRest() {
  int left = 0;
  ioctl(reading_, FIONREAD, &left);
  while (left > 0) {
    const size_t passed = passOnce(std::min(static_cast<size_t>(left), kMostAtOnce));
    if (passed == 0) break;
    left -= static_cast<int>(passed);
  }
  writeAll(printableLines(cutCharacter_));
  cutCharacter_.clear();
  isReadByNobody_ = false;
}

// What the descriptor has, which is not waited for; 0 at the end of all.
size_t RunOutput::passOnce(size_t most) {
  std::array<char, kMostAtOnce> buffer;
  ssize_t count;
  do {
    count = read(reading_, buffer.data(), most);
  } while (count < 0 && errno == EINTR);
  if (count <= 0) return 0;
  const auto size = static_cast<size_t>(count);
  show(std::string_view(buffer.data(), size));
  return size;
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

// A run is not held up by what cannot be written any more: the rest is read, and forgotten.
void RunOutput::writeAll(std::string_view bytes) {
  size_t written = 0;
  while (written < bytes.size() && fault_.empty()) {
    const ssize_t count = write(STDOUT_FILENO, &bytes[written], bytes.size() - written);
    if (count >= 0) {
      written += static_cast<size_t>(count);
      continue;
    }
    const int reason = errno;
    endWhenInterrupted();
    if (reason == EAGAIN) {
      isReady(STDOUT_FILENO, POLLOUT, kPause);
    } else if (reason != EINTR) {
      fault_ = std::strerror(reason);
    }
  }
}

void RunOutput::leaveReadingToAnother() const {
  if (fork() == 0) readOn(reading_);
}

void RunOutput::endWhenInterrupted() const {
  if (interruptedBy == 0) return;
  if (isReadByNobody_) leaveReadingToAnother();
  obeyInterrupts();
  raise(interruptedBy);  // which ends the process
}
