#include "failing_calls.h"

#include <dirent.h>
#include <dlfcn.h>
#include <fcntl.h>
#include <grp.h>
#include <poll.h>
#include <pwd.h>
#include <signal.h>
#include <spawn.h>
#include <sqlite3.h>
#include <sys/file.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <cctype>
#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <initializer_list>
#include <stdexcept>
#include <string_view>
#include <tuple>

#include "shared_memory.h"
#include "zelocore.h"
#include "zelosdk.h"

namespace support {
namespace {

// Where long has 32 bits, SQLite works with what the product calls by the shorter names.
#if __SIZEOF_LONG__ > 4
#define WIDE_CALLS(X)                  \
  X(4, pread64, "~", nullptr, kFailed) \
  X(4, pwrite64, "~w", nullptr, kFailed)
#else
#define WIDE_CALLS(X)
#endif

// X(number of arguments, name, how, key, failure) of each call that is passed on unchanged:
//   how      '=' a plan's key must be equal to the call's, '~' or be contained in it; and
//            'w' it writes, so it can fail with ENOSPC, EDQUOT and EROFS;
//            'n' it never fails in a step, as it cannot fail;
//            's' standard streams and descriptors are never touched;
//            'd' it has done its work when it fails
//   key      of its arguments a, b, c and so on; null for none
//   failure  its result when it fails, unless a plan says otherwise
#define PLAIN_CALLS(X)                                                                           \
  X(1, QLIBCSzHashAlloc, "=", std::to_string(a), kFailed)                                        \
  X(3, QLIBCSzHashSetValue, "=", b, kFailed)                                                     \
  X(2, QLIBCSzHashEnumKey, "~", nullptr, kFailed)                                                \
  X(1, QLIBCSzListAlloc, "~", nullptr, kFailed)                                                  \
  X(2, QLIBCSzListPush, "~", nullptr, kFailed)                                                   \
  X(3, QLIBCStrSep, "~", a, kFailed)                                                             \
  X(1, QLIBCFileExist, "~n", a, 0)                                                               \
  X(1, QLIBCFileTouch, "~", a, kFailed)                                                          \
  X(2, QLIBCFileEnumSection, "~", a, kFailed)                                                    \
  X(3, QLIBCFileGetSection, "=", b, kFailed)                                                     \
  X(5, QLIBCFileSetSection, "=", b, kFailed)                                                     \
  X(4, QLIBCFileAddSection, "=", b, kFailed)                                                     \
  X(2, QLIBCFileRemoveSection, "=", b, kFailed)                                                  \
  X(0, QLIBCProcForkChildNoWait, "~", nullptr, kFailed)                                          \
  X(1, QLIBCProcAlive, "=n", std::to_string(a), 0)                                               \
  X(3, QLIBPluginInit, "~", recordPlugin(b, {"init ", a, " ", b}), kFailed)                      \
  X(3, QLIBPluginSetArg, "=", recordPlugin(b, {"arg ", b, "=", c}), kFailed)                     \
  X(3, QLIBPluginSetArgByInt, "=", recordPlugin(b, {"int ", b, "=", std::to_string(c).c_str()}), \
    kFailed)                                                                                     \
  X(2, QLIBPluginAction, "=",                                                                    \
    recordPlugin(std::to_string(a), {"action ", std::to_string(a).c_str()}), kFailed)            \
  X(1, QLIBPluginExit, "~d", recordPlugin(nullptr, {"exit"}), kFailed)                           \
  X(2, ZELOUserGetByUID, "=", std::to_string(a), kFailed)                                        \
  X(5, SzBase64EncodeFull, "~", nullptr, 0)                                                      \
  X(4, ZELOEncodingBase64Decode, "~", nullptr, 0)                                                \
  X(2, rename, "~w", std::string(a) + " " + b, kFailed)                                          \
  X(5, renameat2, "~w", std::string(b) + " " + d, kFailed)                                       \
  X(1, fsync, "~w", nullptr, kFailed)                                                            \
  X(2, fstat, "~s", nullptr, kFailed)                                                            \
  X(2, stat, "~", a, kFailed)                                                                    \
  X(2, lstat, "~", a, kFailed)                                                                   \
  X(3, fchown, "~w", nullptr, kFailed)                                                           \
  X(2, fchmod, "~w", nullptr, kFailed)                                                           \
  X(2, ftruncate, "~w", nullptr, kFailed)                                                        \
  X(3, read, "~s", nullptr, kFailed)                                                             \
  X(3, write, "~ws", nullptr, kFailed)                                                           \
  X(4, pwrite, "~w", nullptr, kFailed)                                                           \
  X(1, mkstemp, "~w", a, kFailed)                                                                \
  X(2, flock, "~", nullptr, kFailed)                                                             \
  WIDE_CALLS(X)                                                                                  \
  X(1, fdatasync, "~w", nullptr, kFailed)                                                        \
  X(1, mkdtemp, "~w", a, kFailed)                                                                \
  X(1, rmdir, "~", a, kFailed)                                                                   \
  X(2, mkdir, "~w", a, kFailed)                                                                  \
  X(2, chmod, "~w", a, kFailed)                                                                  \
  X(2, access, "~", a, kFailed)                                                                  \
  X(1, unlink, "~w", a, kFailed)                                                                 \
  X(1, chdir, "~", a, kFailed)                                                                   \
  X(4, fstatat, "~", b, kFailed)                                                                 \
  X(5, statx, "~", b, kFailed)                                                                   \
  X(2, mkostemp, "~w", a, kFailed)                                                               \
  X(2, futimens, "~w", nullptr, kFailed)                                                         \
  X(1, fdopendir, "~", nullptr, kFailed)                                                         \
  X(1, readdir, "~", nullptr, kFailed)                                                           \
  X(1, dup, "~", nullptr, kFailed)                                                               \
  X(2, dup2, "~", nullptr, kFailed)                                                              \
  X(2, pipe2, "~", nullptr, kFailed)                                                             \
  X(2, fopen, "~w", a, kFailed)                                                                  \
  X(2, fdopen, "~w", b, kFailed)                                                                 \
  X(1, fflush, "~ws", nullptr, EOF)                                                              \
  X(1, fclose, "~wsd", nullptr, EOF)                                                             \
  X(4, fwrite, "~ws", nullptr, 0)                                                                \
  X(1, seteuid, "=", std::to_string(a), kFailed)                                                 \
  X(1, setegid, "=", std::to_string(a), kFailed)                                                 \
  X(2, setreuid, "~", nullptr, kFailed)                                                          \
  X(2, setregid, "~", nullptr, kFailed)                                                          \
  X(3, setresuid, "~", nullptr, kFailed)                                                         \
  X(3, setresgid, "~", nullptr, kFailed)                                                         \
  X(2, setgroups, "~", nullptr, kFailed)                                                         \
  X(2, initgroups, "~", a, kFailed)                                                              \
  X(0, setsid, "~", nullptr, kFailed)                                                            \
  X(3, close_range, "~", nullptr, kFailed)                                                       \
  X(0, clearenv, "~", nullptr, kFailed)                                                          \
  X(1, putenv, "~", a, kFailed)                                                                  \
  X(2, kill, "~", std::to_string(a), kFailed)                                                    \
  X(1, sysconf, "~", nullptr, kFailed)                                                           \
  X(0, fork, "~", nullptr, kFailed)                                                              \
  X(3, poll, "~", nullptr, kFailed)                                                              \
  X(4, waitid, "~d", nullptr, kFailed)                                                           \
  X(3, waitpid, "~d", nullptr, kFailed)                                                          \
  X(1, system, "~", recordSystem(a), kFailed)                                                    \
  X(1, localtime, "~", nullptr, kFailed)                                                         \
  X(2, localtime_r, "~", nullptr, kFailed)                                                       \
  X(1, mktime, "~", nullptr, kFailed)                                                            \
  X(1, sqlite3_close, "~d", nullptr, SQLITE_BUSY)

// X(name, how) of those that are defined further below, or in other test programs.
#define OTHER_CALLS(X)         \
  X(QLIBCExec, "~w")           \
  X(QLIBCSzHashGetValue, "=n") \
  X(ZELOAutoPowerConfGet, "~") \
  X(ZELOAutoPowerConfSet, "~") \
  X(ZELOAutoPoweronSet, "~")   \
  X(QLIBCFileSetLine, "~")     \
  X(ZELOUpdateCrontab, "~")    \
  X(ZELOScheduleSet, "~")      \
  X(getline, "~")              \
  X(open, "~w")                \
  X(open64, "~w")              \
  X(close, "~w")               \
  X(fcntl64, "~")              \
  X(fcntl, "~")                \
  X(getpwuid_r, "~")           \
  X(prctl, "=")                \
  X(keyctl, "~")               \
  X(capget, "~")               \
  X(capset, "~")               \
  X(posix_spawn, "~")          \
  X(pidfd_open, "~")           \
  X(malloc, "~")               \
  X(calloc, "~")               \
  X(realloc, "~")              \
  X(sleep, "~n")               \
  X(usleep, "~n")              \
  X(nanosleep, "~n")           \
  X(rand, "~n")                \
  X(srand, "~n")               \
  X(sqlite3_open, "~")         \
  X(sqlite3_exec, "~")

enum class Call : size_t {
#define PLAIN(count, name, how, key, failure) k_##name,
#define OTHER(name, how) k_##name,
  PLAIN_CALLS(PLAIN) OTHER_CALLS(OTHER)
#undef PLAIN
#undef OTHER
      kCount
};

struct CallName {
  const char *name;
  std::string_view how;
};

constexpr CallName kCalls[] = {
#define PLAIN(count, name, how, key, failure) {#name, how},
#define OTHER(name, how) {#name, how},
    PLAIN_CALLS(PLAIN) OTHER_CALLS(OTHER)
#undef PLAIN
#undef OTHER
};

constexpr const CallName &nameOf(Call call) {
  return kCalls[static_cast<size_t>(call)];
}

constexpr bool is(Call call, char how) {
  return nameOf(call).how.find(how) != std::string_view::npos;
}

// Of the platform, which reports its failures in the error record.
bool hasErrorRecord(Call call) {
  return std::isupper(static_cast<unsigned char>(nameOf(call).name[0])) != 0;
}

constexpr int kInjectedCode = 0x2A00;  // of the calls that fail in a step
constexpr size_t kPlansPerCall = 8;
constexpr size_t kKeySize = 256;
constexpr size_t kTextSize = 256;

// A FailPlan without pointers, so that it can lie in shared memory.
struct Plan {
  std::atomic<bool> stands;
  std::atomic<unsigned> matched;
  unsigned from;
  unsigned times;
  int error;
  int code;
  bool hasResult;
  long result;
  bool hasText;
  size_t minSize;
  char key[kKeySize];
  char text[kTextSize];
};

// Of all calls together.
struct Step {
  std::atomic<bool> stands;
  std::atomic<unsigned> seen;
  std::atomic<size_t> failed;  // the first that did, plus one
  unsigned nth;
  bool onwards;
  bool kills;
  int error;
  Plan plan;  // stands for none of its own
};

struct State {
  struct PerCall {
    std::atomic<unsigned> count;
    Plan plans[kPlansPerCall];
  } calls[static_cast<size_t>(Call::kCount)];
  std::atomic<unsigned> seed;
  Step step;
};

State &state() {
  static State *shared = static_cast<State *>(sharedMemory(sizeof(State)));
  return *shared;
}

constexpr size_t kRecordCapacity = size_t{8} << 20;

SharedLines &systemCommands() {
  static SharedLines lines(kRecordCapacity);
  return lines;
}

SharedLines &execs() {
  static SharedLines lines(kRecordCapacity);
  return lines;
}

SharedLines &pluginCalls() {
  static SharedLines lines(kRecordCapacity);
  return lines;
}

SharedLines &sleeps() {
  static SharedLines lines(kRecordCapacity);
  return lines;
}

struct Forced {
  bool reallySleep = false;
  unsigned timesShorter = 1;
  std::function<void(size_t)> sleepAction;
  std::function<void(const std::string &)> execAction;
  std::function<void(const std::string &)> callAction;
  std::vector<int> randValues;
  size_t randNext = 0;
};

Forced &forced() {
  static Forced values;
  return values;
}

// malloc is called before anything else here is initialised, and by everything here.
bool allocationPlanned = false;
bool callsAreWatched = false;

State::PerCall &slot(Call call) {
  return state().calls[static_cast<size_t>(call)];
}

Call callNamed(const std::string &name) {
  const auto *found = std::find_if(std::begin(kCalls), std::end(kCalls),
                                   [&](const CallName &call) { return name == call.name; });
  if (found == std::end(kCalls)) throw std::invalid_argument("no call to fail: " + name);
  return static_cast<Call>(found - std::begin(kCalls));
}

bool isAllocation(Call call) {
  return call == Call::k_malloc || call == Call::k_calloc || call == Call::k_realloc;
}

bool concerns(Call call, const Plan &plan, const char *key, size_t size) {
  if (!plan.stands || size < plan.minSize) return false;
  if (plan.key[0] == '\0') return true;
  if (key == nullptr) return false;
  return is(call, '=') ? std::strcmp(key, plan.key) == 0 : std::strstr(key, plan.key) != nullptr;
}

// Only calls that write fail with these errors.
bool canFailWith(Call call, int error) {
  const bool isOfWriters = error == ENOSPC || error == EDQUOT || error == EROFS;
  return !is(call, 'n') && (!isOfWriters || is(call, 'w'));
}

int errorOf(Call call) {
  if (isAllocation(call)) return ENOMEM;
  if (call == Call::k_waitid || call == Call::k_waitpid) return ECHILD;
  return call == Call::k_fork ? EAGAIN : state().step.error;
}

// Whether the current step fails this call.
bool fallsOn(Call call) {
  Step &step = state().step;
  if (!step.stands || OwnWork::isGoingOn() || !canFailWith(call, step.error)) return false;
  const unsigned seen = ++step.seen;
  if (step.onwards ? seen < step.nth : seen != step.nth) return false;
  if (step.kills) syscall(SYS_kill, 0, SIGKILL);  // kill itself may be the call
  size_t none = 0;
  step.failed.compare_exchange_strong(none, static_cast<size_t>(call) + 1);
  errno = errorOf(call);
  return true;
}

thread_local bool countsAreWritten = false;

void actBefore(Call call) {
  if (!callsAreWatched || OwnWork::isGoingOn() || isAllocation(call)) return;
  const OwnWork own;
  const int error = errno;
  forced().callAction(nameOf(call).name);
  errno = error;
}

// Counts the call. Returns the plan by which it fails, or null.
const Plan *failing(Call call, const char *key = nullptr, size_t size = 0) {
  if (countsAreWritten) return nullptr;
  State::PerCall &calls = slot(call);
  ++calls.count;
  actBefore(call);
  if (fallsOn(call)) {
    if (hasErrorRecord(call)) {
      QLIBCErrSetEx(kInjectedCode, kInjectedFile, kInjectedLine);
    }
    return &state().step.plan;
  }
  for (Plan &plan : calls.plans) {
    if (!concerns(call, plan, key, size)) continue;
    const unsigned nth = ++plan.matched;
    if (nth < plan.from || nth - plan.from >= plan.times) continue;
    if (plan.code != 0) QLIBCErrSetEx(plan.code, kInjectedFile, kInjectedLine);
    if (plan.error != 0) errno = plan.error;
    return &plan;
  }
  return nullptr;
}

template <typename Result>
Result resultOf(const Plan &plan, Result failure) {
  if constexpr (std::is_integral_v<Result>) {
    if (plan.hasResult) return static_cast<Result>(plan.result);
  }
  return failure;
}

void *nextSymbol(const char *name) {
  void *address = dlsym(RTLD_NEXT, name);
  if (address == nullptr) __builtin_trap();
  return address;
}

bool isStandard(const FILE *stream) {
  return stream == stdin || stream == stdout || stream == stderr;
}

bool isStandard(int descriptor) {
  return descriptor >= 0 && descriptor <= STDERR_FILENO;
}

template <class Argument>
bool isStandardArgument(Argument argument) {
  if constexpr (std::is_same_v<Argument, FILE *> || std::is_same_v<Argument, int>) {
    return isStandard(argument);
  }
  return false;
}

template <class Make>
void record(SharedLines &lines, Make make) {
  const OwnWork own;
  lines.append(0, make());
}

// A call's key, which is compared with that of a plan.
class KeyOfCall {
 public:
  template <class Make>
  explicit KeyOfCall(Make make) {
    const OwnWork own;
    take(make());
  }
  ~KeyOfCall() {
    const OwnWork own;
    delete made_;
  }
  KeyOfCall(const KeyOfCall &) = delete;
  KeyOfCall &operator=(const KeyOfCall &) = delete;

  const char *text() const { return text_; }

 private:
  void take(std::nullptr_t) {}
  void take(const char *text) { text_ = text; }
  void take(std::string text) {
    made_ = new std::string(std::move(text));
    text_ = made_->c_str();
  }

  const char *text_ = nullptr;
  const std::string *made_ = nullptr;
};

// Each returns the key of its call.
template <class Key>
Key recordPlugin(Key key, std::initializer_list<const char *> texts) {
  record(pluginCalls(), [&] {
    std::string line;
    for (const char *text : texts) line += text != nullptr ? text : "";
    return line;
  });
  return key;
}

const char *recordSystem(const char *command) {
  record(systemCommands(), [&] { return command != nullptr ? command : ""; });
  return command;
}

// What an unsuccessful call gives: -1 or a null pointer.
struct Failed {
  template <class Result>
  operator Result() const {
    if constexpr (std::is_pointer_v<Result>) {
      return nullptr;
    } else {
      return -1;
    }
  }
};
constexpr Failed kFailed;

template <class Function>
struct Signature;
template <class ResultOf, class... Arguments>
struct Signature<ResultOf(Arguments...)> {
  using Result = ResultOf;
  using Tuple = std::tuple<Arguments...>;
  static constexpr bool kIsNoexcept = false;
};
template <class ResultOf, class... Arguments>
struct Signature<ResultOf(Arguments...) noexcept> : Signature<ResultOf(Arguments...)> {
  static constexpr bool kIsNoexcept = true;
};

// Making the key may allocate, which is the test's own work; looking up the next definition of the
// call is not, and comes after it.
template <Call call, class Next, class Key, class Failure, class... Arguments>
auto failOrCall(Next next, Key makeKey, const Failure &failure, Arguments... arguments) {
  using Result = decltype(next()(arguments...));
  if (is(call, 's') && (isStandardArgument(arguments) || ...)) return next()(arguments...);
  const KeyOfCall key(makeKey);
  if constexpr (is(call, 'd')) {
    const Result result = next()(arguments...);
    const auto *plan = failing(call, key.text());
    return plan != nullptr ? resultOf(*plan, static_cast<Result>(failure)) : result;
  } else {
    const auto *plan = failing(call, key.text());
    return plan != nullptr ? resultOf(*plan, static_cast<Result>(failure)) : next()(arguments...);
  }
}

constexpr long kMicrosecondsPerSecond = 1000000;
constexpr long kNanosecondsPerMicrosecond = 1000;

// Whether the caller shall really sleep.
bool recordSleep(const char *call, long long microseconds) {
  const OwnWork own;
  sleeps().append(static_cast<int>(microseconds), call);
  if (forced().sleepAction) forced().sleepAction(sleeps().lines().size());
  return forced().reallySleep;
}

}  // namespace

void failCallFor(const std::string &call, const std::string &key, const FailPlan &wanted) {
  if (key.size() >= kKeySize) throw std::invalid_argument("key too long: " + key);
  const Call number = callNamed(call);
  for (Plan &plan : slot(number).plans) {
    if (plan.stands) continue;
    plan.matched = 0;
    plan.from = wanted.from;
    plan.times = wanted.times;
    plan.error = wanted.error;
    plan.code = wanted.code;
    plan.hasResult = wanted.result.has_value();
    plan.result = wanted.result.value_or(0);
    plan.hasText = wanted.text != nullptr;
    plan.minSize = wanted.minSize;
    std::snprintf(plan.key, sizeof(plan.key), "%s", key.c_str());
    std::snprintf(plan.text, sizeof(plan.text), "%s", wanted.text != nullptr ? wanted.text : "");
    plan.stands = true;
    if (isAllocation(number)) allocationPlanned = true;
    return;
  }
  throw std::invalid_argument("too many plans for " + call);
}

void failCall(const std::string &call, const FailPlan &plan) {
  failCallFor(call, "", plan);
}

unsigned callCount(const std::string &call) {
  return slot(callNamed(call)).count;
}

void resetFailingCalls() {
  allocationPlanned = false;
  callsAreWatched = false;
  for (State::PerCall &calls : state().calls) {
    calls.count = 0;
    for (Plan &plan : calls.plans) plan.stands = false;
  }
  state().seed = 0;
  systemCommands().clear();
  execs().clear();
  pluginCalls().clear();
  sleeps().clear();
  forced() = Forced{};
}

FailingAllocation::FailingAllocation(const char *call, const FailPlan &plan) {
  failCall(call, plan);
}

FailingAllocation::~FailingAllocation() {
  allocationPlanned = false;
  for (const Call call : {Call::k_malloc, Call::k_calloc, Call::k_realloc}) {
    for (Plan &plan : slot(call).plans) plan.stands = false;
  }
}

FailingStep::FailingStep(unsigned nth, bool onwards, int error) {
  Step &step = state().step;
  step.seen = 0;
  step.failed = 0;
  step.nth = nth;
  step.onwards = onwards;
  step.kills = false;
  step.error = error;
  step.plan.error = error;
  allocationPlanned = true;
  step.stands = true;
}

KillingStep::KillingStep(unsigned nth) : FailingStep(nth, false, EIO) {
  state().step.kills = true;
}

FailingStep::~FailingStep() {
  state().step.stands = false;
  allocationPlanned = false;
}

bool failsInStep(const char *call) {
  const Call number = [&] {
    const OwnWork own;
    return callNamed(call);
  }();
  return failing(number) != nullptr;
}

std::string FailingStep::failed() const {
  const OwnWork own;
  const size_t failed = state().step.failed;
  return failed == 0 ? "" : kCalls[failed - 1].name;
}

std::vector<std::string> recordedSystemCommands() {
  return systemCommands().texts();
}

std::vector<std::string> recordedExecs() {
  return execs().texts();
}

std::vector<std::string> recordedPluginCalls() {
  return pluginCalls().texts();
}

std::vector<long> recordedSleeps(const std::string &call) {
  std::vector<long> microseconds;
  for (const SharedLines::Line &line : sleeps().lines()) {
    if (call.empty() || line.text == call) microseconds.push_back(line.number);
  }
  return microseconds;
}

void clearSleeps() {
  sleeps().clear();
}

std::map<pid_t, unsigned> sleepsByProcess(const std::string &call) {
  std::map<pid_t, unsigned> counts;
  for (const SharedLines::Line &line : sleeps().lines()) {
    if (line.text == call) ++counts[line.process];
  }
  return counts;
}

void realSleep(bool really, unsigned timesShorter) {
  forced().reallySleep = really;
  forced().timesShorter = timesShorter;
}

void onSleep(std::function<void(size_t)> action) {
  forced().sleepAction = std::move(action);
}

void onExec(std::function<void(const std::string &)> action) {
  forced().execAction = std::move(action);
}

void beforeEachCall(std::function<void(const std::string &)> action) {
  forced().callAction = std::move(action);
  callsAreWatched = true;
}

void setRandValues(std::vector<int> values) {
  forced().randValues = std::move(values);
  forced().randNext = 0;
}

unsigned lastSeed() {
  return state().seed;
}

}  // namespace support

// The calls themselves: they come before those of the C library and the platform, because the
// program exports them.

using support::Call;
using support::failing;
using support::isStandard;
using support::Plan;
using support::resultOf;

#define REAL(name) \
  static const auto real_##name = reinterpret_cast<decltype(&(name))>(support::nextSymbol(#name))

// Gives the next definition of a call.
#define NEXT_OF(name)                                                                         \
  [] {                                                                                        \
    static const auto next = reinterpret_cast<decltype(&(name))>(support::nextSymbol(#name)); \
    return next;                                                                              \
  }

#define FAIL_OR_CALL(name, key, failure, ...) \
  return support::failOrCall<Call::k_##name>( \
      NEXT_OF(name), [&] { return key; }, failure, __VA_ARGS__)

#define PARAMETER(name, index, variable) \
  std::tuple_element_t<index, support::Signature<decltype(name)>::Tuple> variable
#define PARAMETERS_0(name)
#define PARAMETERS_1(name) PARAMETER(name, 0, a)
#define PARAMETERS_2(name) PARAMETERS_1(name), PARAMETER(name, 1, b)
#define PARAMETERS_3(name) PARAMETERS_2(name), PARAMETER(name, 2, c)
#define PARAMETERS_4(name) PARAMETERS_3(name), PARAMETER(name, 3, d)
#define PARAMETERS_5(name) PARAMETERS_4(name), PARAMETER(name, 4, e)
#define ARGUMENTS_0
#define ARGUMENTS_1 , a
#define ARGUMENTS_2 , a, b
#define ARGUMENTS_3 , a, b, c
#define ARGUMENTS_4 , a, b, c, d
#define ARGUMENTS_5 , a, b, c, d, e

extern "C" {

using support::kFailed;
using support::recordPlugin;
using support::recordSystem;

#define DEFINE(count, name, how, key, failure)                                        \
  support::Signature<decltype(name)>::Result name(PARAMETERS_##count(name)) noexcept( \
      support::Signature<decltype(name)>::kIsNoexcept) {                              \
    return support::failOrCall<Call::k_##name>(                                       \
        NEXT_OF(name), [&] { return key; }, failure ARGUMENTS_##count);               \
  }
// What the headers say of a call beside its types is for callers.
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wignored-attributes"
PLAIN_CALLS(DEFINE)
#pragma GCC diagnostic pop

// ---- libzelocore

int QLIBCExec(const char *program, ...) {
  constexpr size_t kMaxArguments = 8;
  std::array<const char *, kMaxArguments> arguments{};
  va_list list;
  va_start(list, program);
  for (size_t i = 0; i < kMaxArguments; ++i) {
    arguments[i] = va_arg(list, const char *);
    if (arguments[i] == nullptr) break;
  }
  va_end(list);
  const auto line = [&] {
    std::string text = program != nullptr ? program : "";
    for (const char *argument : arguments) {
      if (argument == nullptr) break;
      text.append(" ").append(argument);
    }
    return text;
  };
  support::record(support::execs(), line);
  if (support::forced().execAction) support::forced().execAction(line());
  FAIL_OR_CALL(QLIBCExec, line(), -1, program, arguments[0], arguments[1], arguments[2],
               arguments[3], arguments[4], arguments[5], arguments[6], arguments[7],
               static_cast<char *>(nullptr));
}

const char *QLIBCSzHashGetValue(PSZHASH hash, const char *key) {
  if (const auto *plan = failing(Call::k_QLIBCSzHashGetValue, key)) {
    const char *nothing = resultOf(*plan, static_cast<const char *>(nullptr));
    return plan->hasText ? plan->text : nothing;
  }
  REAL(QLIBCSzHashGetValue);
  return real_QLIBCSzHashGetValue(hash, key);
}

// ---- files

// What open may have been compiled to.
int __open_2(const char *path, int flags) {
  FAIL_OR_CALL(open, path, -1, path, flags);
}

int open(const char *path, int flags, ...) {
  mode_t mode = 0;
  if ((flags & O_CREAT) != 0 || (flags & O_TMPFILE) == O_TMPFILE) {
    va_list list;
    va_start(list, flags);
    mode = va_arg(list, mode_t);
    va_end(list);
  }
  FAIL_OR_CALL(open, path, -1, path, flags, mode);
}

// What SQLite works with. Where long has 32 bits, the calls above are these.
#if __SIZEOF_LONG__ > 4

int open64(const char *path, int flags, ...) {
  va_list list;
  va_start(list, flags);
  const mode_t mode = (flags & O_CREAT) != 0 ? va_arg(list, mode_t) : 0;
  va_end(list);
  FAIL_OR_CALL(open64, path, -1, path, flags, mode);
}

int fcntl64(int descriptor, int command, ...) {
  va_list list;
  va_start(list, command);
  void *argument = va_arg(list, void *);
  va_end(list);
  FAIL_OR_CALL(fcntl64, nullptr, -1, descriptor, command, argument);
}

#endif

int close(int descriptor) {
  REAL(close);
  if (isStandard(descriptor)) return real_close(descriptor);
  const int result = real_close(descriptor);
  if (result != 0) return result;  // the descriptor was not open
  const auto *plan = failing(Call::k_close);
  return plan != nullptr ? resultOf(*plan, -1) : result;
}

int fcntl(int descriptor, int command, ...) {
  va_list list;
  va_start(list, command);
  void *argument = va_arg(list, void *);
  va_end(list);
  REAL(fcntl);
  if (command != F_DUPFD_CLOEXEC && command != F_SETFD) {
    return real_fcntl(descriptor, command, argument);
  }
  FAIL_OR_CALL(fcntl, nullptr, -1, descriptor, command, argument);
}

// ---- streams

// getline may have been compiled to the call it is made of.
ssize_t __getdelim(char **line, size_t *capacity, int delimiter, FILE *stream) {
  if (const auto *plan = failing(Call::k_getline)) return resultOf(*plan, ssize_t{-1});
  REAL(__getdelim);
  return real___getdelim(line, capacity, delimiter, stream);
}

ssize_t getdelim(char **line, size_t *capacity, int delimiter, FILE *stream) {
  return __getdelim(line, capacity, delimiter, stream);
}

ssize_t getline(char **line, size_t *capacity, FILE *stream) {
  return __getdelim(line, capacity, '\n', stream);
}

// Every other way to write to a stream counts as fwrite.
#define FAIL_AS_FWRITE(stream)                                                                    \
  if (const auto *plan = isStandard(stream) ? nullptr : failing(Call::k_fwrite); plan != nullptr) \
  return resultOf(*plan, EOF)

int fputs(const char *text, FILE *stream) {
  FAIL_AS_FWRITE(stream);
  REAL(fputs);
  return real_fputs(text, stream);
}

int fputc(int character, FILE *stream) {
  FAIL_AS_FWRITE(stream);
  REAL(fputc);
  return real_fputc(character, stream);
}

#undef putc
int putc(int character, FILE *stream) {
  return fputc(character, stream);
}

int vfprintf(FILE *stream, const char *format, va_list arguments) {
  FAIL_AS_FWRITE(stream);
  REAL(vfprintf);
  return real_vfprintf(stream, format, arguments);
}

int fprintf(FILE *stream, const char *format, ...) {
  va_list arguments;
  va_start(arguments, format);
  const int result = vfprintf(stream, format, arguments);
  va_end(arguments);
  return result;
}

// ---- identity and processes

int getpwuid_r(uid_t uid, struct passwd *entry, char *buffer, size_t size, struct passwd **result) {
  if (const auto *plan = failing(Call::k_getpwuid_r)) {
    *result = nullptr;
    return resultOf(*plan, plan->error);
  }
  REAL(getpwuid_r);
  return real_getpwuid_r(uid, entry, buffer, size, result);
}

int prctl(int option, ...) noexcept {
  va_list list;
  va_start(list, option);
  const auto second = va_arg(list, unsigned long);
  const auto third = va_arg(list, unsigned long);
  const auto fourth = va_arg(list, unsigned long);
  const auto fifth = va_arg(list, unsigned long);
  va_end(list);
  FAIL_OR_CALL(prctl, std::to_string(option), -1, option, second, third, fourth, fifth);
}

// The calls that the C library has no function for.
long syscall(long number, ...) noexcept {
  constexpr size_t kMostArguments = 6;
  std::array<long, kMostArguments> arguments{};
  va_list list;
  va_start(list, number);
  for (long &argument : arguments) argument = va_arg(list, long);
  va_end(list);
  const Plan *plan = nullptr;
  if (number == SYS_keyctl) plan = failing(Call::k_keyctl);
  if (number == SYS_capget) plan = failing(Call::k_capget);
  if (number == SYS_capset) plan = failing(Call::k_capset);
  if (plan != nullptr) return resultOf(*plan, -1L);
  REAL(syscall);
  return real_syscall(number, arguments[0], arguments[1], arguments[2], arguments[3], arguments[4],
                      arguments[5]);
}

int posix_spawn(pid_t *pid, const char *program, const posix_spawn_file_actions_t *actions,
                const posix_spawnattr_t *attributes, char *const *arguments,
                char *const *environment) {
  if (const auto *plan = failing(Call::k_posix_spawn, program)) return plan->error;
  REAL(posix_spawn);
  return real_posix_spawn(pid, program, actions, attributes, arguments, environment);
}

// Its header lacks extern "C".
int pidfd_open(pid_t pid, unsigned flags) noexcept {
  FAIL_OR_CALL(pidfd_open, nullptr, kFailed, pid, flags);
}

// ---- time and chance

unsigned sleep(unsigned seconds) {
  const auto *plan = failing(Call::k_sleep);
  const bool really =
      support::recordSleep("sleep", seconds * 1LL * support::kMicrosecondsPerSecond);
  if (plan != nullptr) return resultOf(*plan, seconds);
  if (!really) return 0;
  const unsigned timesShorter = support::forced().timesShorter;
  if (timesShorter > 1) {
    REAL(usleep);
    real_usleep(static_cast<useconds_t>(seconds * support::kMicrosecondsPerSecond / timesShorter));
    return 0;
  }
  REAL(sleep);
  return real_sleep(seconds);
}

int usleep(useconds_t microseconds) {
  const auto *plan = failing(Call::k_usleep);
  const bool really = support::recordSleep("usleep", microseconds);
  if (plan != nullptr) return resultOf(*plan, -1);
  if (!really) return 0;
  REAL(usleep);
  return real_usleep(microseconds / support::forced().timesShorter);
}

int nanosleep(const timespec *wanted, timespec *left) {
  const auto *plan = failing(Call::k_nanosleep);
  const bool really =
      support::recordSleep("nanosleep", wanted->tv_sec * support::kMicrosecondsPerSecond +
                                            wanted->tv_nsec / support::kNanosecondsPerMicrosecond);
  if (plan != nullptr) return resultOf(*plan, -1);
  if (!really) return 0;
  REAL(nanosleep);
  return real_nanosleep(wanted, left);
}

int rand() noexcept {
  support::Forced &forced = support::forced();
  failing(Call::k_rand);
  if (!forced.randValues.empty()) {
    return forced.randValues[forced.randNext++ % forced.randValues.size()];
  }
  REAL(rand);
  return real_rand();
}

void srand(unsigned seed) noexcept {
  failing(Call::k_srand);
  support::state().seed = seed;
  REAL(srand);
  real_srand(seed);
}

// ---- memory

#if !defined(__SANITIZE_ADDRESS__)

#define ALLOCATION(name, bytes, parameters, ...)                        \
  void *__libc_##name parameters;                                       \
  void *name parameters noexcept {                                      \
    if (support::allocationPlanned && !support::OwnWork::isGoingOn() && \
        failing(Call::k_##name, nullptr, bytes) != nullptr) {           \
      errno = ENOMEM;                                                   \
      return nullptr;                                                   \
    }                                                                   \
    return __libc_##name(__VA_ARGS__);                                  \
  }
ALLOCATION(malloc, size, (size_t size), size)
ALLOCATION(calloc, count *size, (size_t count, size_t size), count, size)
ALLOCATION(realloc, size, (void *memory, size_t size), memory, size)

#endif

// ---- the build that counts what is run

// Called by its libraries around the writing of the counts.
void zelo_tests_let_be(int begin) {
  support::countsAreWritten = begin != 0;
}

// ---- SQLite

int sqlite3_open(const char *path, sqlite3 **database) {
  REAL(sqlite3_open);
  if (const auto *plan = failing(Call::k_sqlite3_open, path)) {
    const int result = real_sqlite3_open("/nonexistent/database", database);
    return resultOf(*plan, result);
  }
  return real_sqlite3_open(path, database);
}

int sqlite3_exec(sqlite3 *database, const char *sql, int (*callback)(void *, int, char **, char **),
                 void *argument, char **error) {
  if (const auto *plan = failing(Call::k_sqlite3_exec, sql)) {
    if (error != nullptr) *error = plan->hasText ? sqlite3_mprintf("%s", plan->text) : nullptr;
    return resultOf(*plan, SQLITE_ERROR);
  }
  REAL(sqlite3_exec);
  return real_sqlite3_exec(database, sql, callback, argument, error);
}
}
