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
#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <stdexcept>

#include "shared_memory.h"
#include "zelocore.h"
#include "zelosdk.h"

namespace support {
namespace {

// Name, and whether a plan's key must be equal (=) to the call's or be contained in it (~).
#define CALLS(X)                   \
  X(QLIBCExec, '~')                \
  X(QLIBCSzHashAlloc, '=')         \
  X(QLIBCSzHashSetValue, '=')      \
  X(QLIBCSzHashGetValue, '=')      \
  X(QLIBCSzHashEnumKey, '~')       \
  X(QLIBCSzListAlloc, '~')         \
  X(QLIBCSzListPush, '~')          \
  X(QLIBCStrSep, '~')              \
  X(QLIBCFileExist, '~')           \
  X(QLIBCFileTouch, '~')           \
  X(QLIBCFileEnumSection, '~')     \
  X(QLIBCFileGetSection, '=')      \
  X(QLIBCFileSetSection, '=')      \
  X(QLIBCFileAddSection, '=')      \
  X(QLIBCFileRemoveSection, '=')   \
  X(QLIBCProcForkChildNoWait, '~') \
  X(QLIBCProcAlive, '=')           \
  X(QLIBPluginInit, '~')           \
  X(QLIBPluginSetArg, '=')         \
  X(QLIBPluginSetArgByInt, '=')    \
  X(QLIBPluginAction, '=')         \
  X(QLIBPluginExit, '~')           \
  X(ZELOUserGetByUID, '=')         \
  X(SzBase64EncodeFull, '~')       \
  X(ZELOAutoPowerConfGet, '~')     \
  X(ZELOAutoPowerConfSet, '~')     \
  X(ZELOAutoPoweronSet, '~')       \
  X(QLIBCFileSetLine, '~')         \
  X(ZELOUpdateCrontab, '~')        \
  X(ZELOScheduleSet, '~')          \
  X(ZELOEncodingBase64Decode, '~') \
  X(rename, '~')                   \
  X(fsync, '~')                    \
  X(fstat, '~')                    \
  X(stat, '~')                     \
  X(lstat, '~')                    \
  X(fchown, '~')                   \
  X(fchmod, '~')                   \
  X(ftruncate, '~')                \
  X(fflush, '~')                   \
  X(fclose, '~')                   \
  X(getline, '~')                  \
  X(read, '~')                     \
  X(write, '~')                    \
  X(fwrite, '~')                   \
  X(mkstemp, '~')                  \
  X(fdopen, '~')                   \
  X(fopen, '~')                    \
  X(flock, '~')                    \
  X(open, '~')                     \
  X(mkdir, '~')                    \
  X(mkdtemp, '~')                  \
  X(rmdir, '~')                    \
  X(renameat2, '~')                \
  X(chmod, '~')                    \
  X(access, '~')                   \
  X(unlink, '~')                   \
  X(chdir, '~')                    \
  X(fstatat, '~')                  \
  X(statx, '~')                    \
  X(mkostemp, '~')                 \
  X(futimens, '~')                 \
  X(fdopendir, '~')                \
  X(readdir, '~')                  \
  X(close, '~')                    \
  X(open64, '~')                   \
  X(pread64, '~')                  \
  X(pwrite, '~')                   \
  X(pwrite64, '~')                 \
  X(fdatasync, '~')                \
  X(fcntl64, '~')                  \
  X(dup, '~')                      \
  X(dup2, '~')                     \
  X(fcntl, '~')                    \
  X(pipe2, '~')                    \
  X(seteuid, '=')                  \
  X(setegid, '=')                  \
  X(setreuid, '~')                 \
  X(setresuid, '~')                \
  X(setregid, '~')                 \
  X(setresgid, '~')                \
  X(setgroups, '~')                \
  X(initgroups, '~')               \
  X(getpwuid_r, '~')               \
  X(setsid, '~')                   \
  X(prctl, '=')                    \
  X(keyctl, '~')                   \
  X(capget, '~')                   \
  X(capset, '~')                   \
  X(close_range, '~')              \
  X(sysconf, '~')                  \
  X(clearenv, '~')                 \
  X(putenv, '~')                   \
  X(kill, '~')                     \
  X(fork, '~')                     \
  X(posix_spawn, '~')              \
  X(pidfd_open, '~')               \
  X(poll, '~')                     \
  X(waitid, '~')                   \
  X(waitpid, '~')                  \
  X(localtime, '~')                \
  X(localtime_r, '~')              \
  X(mktime, '~')                   \
  X(malloc, '~')                   \
  X(calloc, '~')                   \
  X(realloc, '~')                  \
  X(system, '~')                   \
  X(sleep, '~')                    \
  X(usleep, '~')                   \
  X(nanosleep, '~')                \
  X(rand, '~')                     \
  X(srand, '~')                    \
  X(sqlite3_open, '~')             \
  X(sqlite3_exec, '~')             \
  X(sqlite3_close, '~')

enum class Call : size_t {
#define X(name, match) k_##name,
  CALLS(X)
#undef X
      kCount
};

struct CallName {
  const char *name;
  bool exact;
};

constexpr CallName kCalls[] = {
#define X(name, match) {#name, (match) == '='},
    CALLS(X)
#undef X
};

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

// malloc is called before anything else here is ready, and by everything here.
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
  return kCalls[static_cast<size_t>(call)].exact ? std::strcmp(key, plan.key) == 0
                                                 : std::strstr(key, plan.key) != nullptr;
}

bool canFail(Call call) {
  constexpr Call kNever[] = {
      Call::k_QLIBCFileExist, Call::k_QLIBCProcAlive, Call::k_QLIBCSzHashGetValue,
      Call::k_sleep,          Call::k_usleep,         Call::k_nanosleep,
      Call::k_rand,           Call::k_srand};
  return std::find(std::begin(kNever), std::end(kNever), call) == std::end(kNever);
}

// No room and no right to write is found by what writes.
bool canFailWith(Call call, int error) {
  constexpr Call kWriting[] = {
      Call::k_open,      Call::k_open64, Call::k_fopen,     Call::k_fdopen,    Call::k_mkstemp,
      Call::k_mkostemp,  Call::k_mkdir,  Call::k_mkdtemp,   Call::k_renameat2, Call::k_write,
      Call::k_fwrite,    Call::k_pwrite, Call::k_pwrite64,  Call::k_fflush,    Call::k_fclose,
      Call::k_close,     Call::k_fsync,  Call::k_fdatasync, Call::k_rename,    Call::k_unlink,
      Call::k_ftruncate, Call::k_fchown, Call::k_fchmod,    Call::k_chmod,     Call::k_futimens,
      Call::k_QLIBCExec};
  const bool isOfWriters = error == ENOSPC || error == EDQUOT || error == EROFS;
  return canFail(call) && (!isOfWriters || std::find(std::begin(kWriting), std::end(kWriting),
                                                     call) != std::end(kWriting));
}

int errorOf(Call call) {
  if (isAllocation(call)) return ENOMEM;
  if (call == Call::k_waitid || call == Call::k_waitpid) return ECHILD;
  return call == Call::k_fork ? EAGAIN : state().step.error;
}

// Whether the step that stands is at this call.
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
  forced().callAction(kCalls[static_cast<size_t>(call)].name);
  errno = error;
}

// Counts the call. The plan by which it fails, or null.
const Plan *failing(Call call, const char *key = nullptr, size_t size = 0) {
  if (countsAreWritten) return nullptr;
  State::PerCall &calls = slot(call);
  ++calls.count;
  actBefore(call);
  if (fallsOn(call)) {
    if (call <= Call::k_ZELOEncodingBase64Decode) {
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

#define NEXT(variable, name) \
  static const auto variable = reinterpret_cast<decltype(&name)>(support::nextSymbol(#name))

#define REAL(name) NEXT(real_##name, name)

// The key may be a text that is made for it, which is the test's own work; looking for the call is
// not, and comes after it.
#define FAIL_OR_CALL(name, key, failure, ...)                             \
  do {                                                                    \
    const support::KeyOfCall key_of_call([&] { return key; });            \
    if (const auto *plan = failing(Call::k_##name, key_of_call.text())) { \
      return resultOf(*plan, failure);                                    \
    }                                                                     \
    NEXT(next_##name, name);                                              \
    return next_##name(__VA_ARGS__);                                      \
  } while (false)

extern "C" {

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

PSZHASH QLIBCSzHashAlloc(int capacity) {
  FAIL_OR_CALL(QLIBCSzHashAlloc, std::to_string(capacity), PSZHASH{}, capacity);
}

int QLIBCSzHashSetValue(PSZHASH *hash, const char *key, const char *value) {
  FAIL_OR_CALL(QLIBCSzHashSetValue, key, -1, hash, key, value);
}

const char *QLIBCSzHashGetValue(PSZHASH hash, const char *key) {
  if (const auto *plan = failing(Call::k_QLIBCSzHashGetValue, key)) {
    const char *nothing = resultOf(*plan, static_cast<const char *>(nullptr));
    return plan->hasText ? plan->text : nothing;
  }
  NEXT(next_QLIBCSzHashGetValue, QLIBCSzHashGetValue);
  return next_QLIBCSzHashGetValue(hash, key);
}

int QLIBCSzHashEnumKey(PSZHASH hash, PSZLIST *list) {
  FAIL_OR_CALL(QLIBCSzHashEnumKey, nullptr, -1, hash, list);
}

PSZLIST QLIBCSzListAlloc(int capacity) {
  FAIL_OR_CALL(QLIBCSzListAlloc, nullptr, PSZLIST{}, capacity);
}

int QLIBCSzListPush(PSZLIST *list, const char *text) {
  FAIL_OR_CALL(QLIBCSzListPush, nullptr, -1, list, text);
}

int QLIBCStrSep(const char *text, const char *separators, PSZLIST *list) {
  FAIL_OR_CALL(QLIBCStrSep, text, -1, text, separators, list);
}

int QLIBCFileExist(const char *path) {
  FAIL_OR_CALL(QLIBCFileExist, path, 0, path);
}

int QLIBCFileTouch(const char *path) {
  FAIL_OR_CALL(QLIBCFileTouch, path, -1, path);
}

int QLIBCFileEnumSection(const char *path, PSZLIST *list) {
  FAIL_OR_CALL(QLIBCFileEnumSection, path, -1, path, list);
}

int QLIBCFileGetSection(const char *path, const char *section, PSZHASH *hash) {
  FAIL_OR_CALL(QLIBCFileGetSection, section, -1, path, section, hash);
}

int QLIBCFileSetSection(const char *path, const char *section, int flags, PSZHASH hash,
                        int reserved) {
  FAIL_OR_CALL(QLIBCFileSetSection, section, -1, path, section, flags, hash, reserved);
}

int QLIBCFileAddSection(const char *path, const char *section, PSZHASH hash, int reserved) {
  FAIL_OR_CALL(QLIBCFileAddSection, section, -1, path, section, hash, reserved);
}

int QLIBCFileRemoveSection(const char *path, const char *section) {
  FAIL_OR_CALL(QLIBCFileRemoveSection, section, -1, path, section);
}

int QLIBCProcForkChildNoWait(void) {
  FAIL_OR_CALL(QLIBCProcForkChildNoWait, nullptr, -1);
}

int QLIBCProcAlive(pid_t pid) {
  FAIL_OR_CALL(QLIBCProcAlive, std::to_string(pid), 0, pid);
}

int QLIBPluginInit(const char *plugin, const char *action, void **context) {
  support::record(support::pluginCalls(), [&] {
    return std::string("init ") + (plugin != nullptr ? plugin : "") + " " +
           (action != nullptr ? action : "");
  });
  FAIL_OR_CALL(QLIBPluginInit, action, -1, plugin, action, context);
}

int QLIBPluginSetArg(void **context, const char *key, const char *value) {
  support::record(support::pluginCalls(), [&] {
    return std::string("arg ") + (key != nullptr ? key : "") + "=" +
           (value != nullptr ? value : "");
  });
  FAIL_OR_CALL(QLIBPluginSetArg, key, -1, context, key, value);
}

int QLIBPluginSetArgByInt(void **context, const char *key, int value) {
  support::record(support::pluginCalls(), [&] {
    return std::string("int ") + (key != nullptr ? key : "") + "=" + std::to_string(value);
  });
  FAIL_OR_CALL(QLIBPluginSetArgByInt, key, -1, context, key, value);
}

int QLIBPluginAction(int stage, void **context) {
  support::record(support::pluginCalls(), [&] { return "action " + std::to_string(stage); });
  FAIL_OR_CALL(QLIBPluginAction, std::to_string(stage), -1, stage, context);
}

int QLIBPluginExit(void **context) {
  support::record(support::pluginCalls(), [] { return "exit"; });
  REAL(QLIBPluginExit);
  const int result = real_QLIBPluginExit(context);
  const auto *plan = failing(Call::k_QLIBPluginExit);
  return plan != nullptr ? resultOf(*plan, -1) : result;
}

// ---- libzelosdk

int ZELOUserGetByUID(uid_t uid, PZELOUSER *user) {
  FAIL_OR_CALL(ZELOUserGetByUID, std::to_string(uid), -1, uid, user);
}

int SzBase64EncodeFull(const char *source, size_t length, char *target, size_t capacity,
                       int reserved) {
  FAIL_OR_CALL(SzBase64EncodeFull, nullptr, 0, source, length, target, capacity, reserved);
}

int ZELOEncodingBase64Decode(const char *source, size_t length, char *target, size_t *capacity) {
  FAIL_OR_CALL(ZELOEncodingBase64Decode, nullptr, 0, source, length, target, capacity);
}

// ---- files

int rename(const char *from, const char *to) noexcept {
  FAIL_OR_CALL(rename, std::string(from) + " " + to, -1, from, to);
}

int renameat2(int from_directory, const char *from, int to_directory, const char *to,
              unsigned flags) noexcept {
  FAIL_OR_CALL(renameat2, std::string(from) + " " + to, -1, from_directory, from, to_directory, to,
               flags);
}

int fsync(int descriptor) {
  FAIL_OR_CALL(fsync, nullptr, -1, descriptor);
}

int fstat(int descriptor, struct stat *status) noexcept {
  REAL(fstat);
  if (isStandard(descriptor)) return real_fstat(descriptor, status);
  FAIL_OR_CALL(fstat, nullptr, -1, descriptor, status);
}

int stat(const char *path, struct stat *status) noexcept {
  FAIL_OR_CALL(stat, path, -1, path, status);
}

int lstat(const char *path, struct stat *status) noexcept {
  FAIL_OR_CALL(lstat, path, -1, path, status);
}

int fchown(int descriptor, uid_t owner, gid_t group) noexcept {
  FAIL_OR_CALL(fchown, nullptr, -1, descriptor, owner, group);
}

int fchmod(int descriptor, mode_t mode) noexcept {
  FAIL_OR_CALL(fchmod, nullptr, -1, descriptor, mode);
}

int ftruncate(int descriptor, off_t length) noexcept {
  FAIL_OR_CALL(ftruncate, nullptr, -1, descriptor, length);
}

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

ssize_t read(int descriptor, void *buffer, size_t size) {
  REAL(read);
  if (isStandard(descriptor)) return real_read(descriptor, buffer, size);
  FAIL_OR_CALL(read, nullptr, ssize_t{-1}, descriptor, buffer, size);
}

ssize_t write(int descriptor, const void *buffer, size_t size) {
  REAL(write);
  if (isStandard(descriptor)) return real_write(descriptor, buffer, size);
  FAIL_OR_CALL(write, nullptr, ssize_t{-1}, descriptor, buffer, size);
}

ssize_t pwrite(int descriptor, const void *buffer, size_t size, off_t at) {
  FAIL_OR_CALL(pwrite, nullptr, ssize_t{-1}, descriptor, buffer, size, at);
}

int mkstemp(char *pattern) {
  FAIL_OR_CALL(mkstemp, pattern, -1, pattern);
}

int flock(int descriptor, int operation) noexcept {
  FAIL_OR_CALL(flock, nullptr, -1, descriptor, operation);
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

ssize_t pread64(int descriptor, void *buffer, size_t size, off64_t at) {
  FAIL_OR_CALL(pread64, nullptr, ssize_t{-1}, descriptor, buffer, size, at);
}

ssize_t pwrite64(int descriptor, const void *buffer, size_t size, off64_t at) {
  FAIL_OR_CALL(pwrite64, nullptr, ssize_t{-1}, descriptor, buffer, size, at);
}

int fcntl64(int descriptor, int command, ...) {
  va_list list;
  va_start(list, command);
  void *argument = va_arg(list, void *);
  va_end(list);
  FAIL_OR_CALL(fcntl64, nullptr, -1, descriptor, command, argument);
}

#endif

int fdatasync(int descriptor) {
  FAIL_OR_CALL(fdatasync, nullptr, -1, descriptor);
}

char *mkdtemp(char *pattern) noexcept {
  FAIL_OR_CALL(mkdtemp, pattern, nullptr, pattern);
}

int rmdir(const char *path) noexcept {
  FAIL_OR_CALL(rmdir, path, -1, path);
}

int mkdir(const char *path, mode_t mode) noexcept {
  FAIL_OR_CALL(mkdir, path, -1, path, mode);
}

int chmod(const char *path, mode_t mode) noexcept {
  FAIL_OR_CALL(chmod, path, -1, path, mode);
}

int access(const char *path, int mode) noexcept {
  FAIL_OR_CALL(access, path, -1, path, mode);
}

int unlink(const char *path) noexcept {
  FAIL_OR_CALL(unlink, path, -1, path);
}

int chdir(const char *path) noexcept {
  FAIL_OR_CALL(chdir, path, -1, path);
}

int fstatat(int directory, const char *path, struct stat *status, int flags) noexcept {
  FAIL_OR_CALL(fstatat, path, -1, directory, path, status, flags);
}

int statx(int directory, const char *path, int flags, unsigned mask,
          struct statx *status) noexcept {
  FAIL_OR_CALL(statx, path, -1, directory, path, flags, mask, status);
}

int mkostemp(char *pattern, int flags) {
  FAIL_OR_CALL(mkostemp, pattern, -1, pattern, flags);
}

int futimens(int descriptor, const timespec *times) noexcept {
  FAIL_OR_CALL(futimens, nullptr, -1, descriptor, times);
}

DIR *fdopendir(int descriptor) {
  FAIL_OR_CALL(fdopendir, nullptr, static_cast<DIR *>(nullptr), descriptor);
}

dirent *readdir(DIR *directory) {
  FAIL_OR_CALL(readdir, nullptr, static_cast<dirent *>(nullptr), directory);
}

int close(int descriptor) {
  REAL(close);
  if (isStandard(descriptor)) return real_close(descriptor);
  const int result = real_close(descriptor);
  if (result != 0) return result;  // of what was not open, which is no failure to be had
  const auto *plan = failing(Call::k_close);
  return plan != nullptr ? resultOf(*plan, -1) : result;
}

int dup(int descriptor) noexcept {
  FAIL_OR_CALL(dup, nullptr, -1, descriptor);
}

int dup2(int descriptor, int wanted) noexcept {
  FAIL_OR_CALL(dup2, nullptr, -1, descriptor, wanted);
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

int pipe2(int *ends, int flags) noexcept {
  FAIL_OR_CALL(pipe2, nullptr, -1, ends, flags);
}

// ---- streams

FILE *fopen(const char *path, const char *mode) {
  FAIL_OR_CALL(fopen, path, static_cast<FILE *>(nullptr), path, mode);
}

FILE *fdopen(int descriptor, const char *mode) noexcept {
  FAIL_OR_CALL(fdopen, mode, static_cast<FILE *>(nullptr), descriptor, mode);
}

int fflush(FILE *stream) {
  REAL(fflush);
  if (isStandard(stream)) return real_fflush(stream);
  FAIL_OR_CALL(fflush, nullptr, EOF, stream);
}

int fclose(FILE *stream) {
  REAL(fclose);
  if (isStandard(stream)) return real_fclose(stream);
  const int result = real_fclose(stream);
  const auto *plan = failing(Call::k_fclose);
  return plan != nullptr ? resultOf(*plan, EOF) : result;
}

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

size_t fwrite(const void *data, size_t size, size_t count, FILE *stream) {
  REAL(fwrite);
  if (isStandard(stream)) return real_fwrite(data, size, count, stream);
  FAIL_OR_CALL(fwrite, nullptr, size_t{0}, data, size, count, stream);
}

// Every other way to write to a stream counts as fwrite.

int fputs(const char *text, FILE *stream) {
  REAL(fputs);
  if (!isStandard(stream)) {
    if (const auto *plan = failing(Call::k_fwrite)) return resultOf(*plan, EOF);
  }
  return real_fputs(text, stream);
}

int fputc(int character, FILE *stream) {
  REAL(fputc);
  if (!isStandard(stream)) {
    if (const auto *plan = failing(Call::k_fwrite)) return resultOf(*plan, EOF);
  }
  return real_fputc(character, stream);
}

#undef putc
int putc(int character, FILE *stream) {
  return fputc(character, stream);
}

int vfprintf(FILE *stream, const char *format, va_list arguments) {
  REAL(vfprintf);
  if (!isStandard(stream)) {
    if (const auto *plan = failing(Call::k_fwrite)) return resultOf(*plan, -1);
  }
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

int seteuid(uid_t uid) noexcept {
  FAIL_OR_CALL(seteuid, std::to_string(uid), -1, uid);
}

int setegid(gid_t gid) noexcept {
  FAIL_OR_CALL(setegid, std::to_string(gid), -1, gid);
}

int setreuid(uid_t real, uid_t effective) noexcept {
  FAIL_OR_CALL(setreuid, nullptr, -1, real, effective);
}

int setregid(gid_t real, gid_t effective) noexcept {
  FAIL_OR_CALL(setregid, nullptr, -1, real, effective);
}

int setresuid(uid_t real, uid_t effective, uid_t saved) noexcept {
  FAIL_OR_CALL(setresuid, nullptr, -1, real, effective, saved);
}

int setresgid(gid_t real, gid_t effective, gid_t saved) noexcept {
  FAIL_OR_CALL(setresgid, nullptr, -1, real, effective, saved);
}

int setgroups(size_t count, const gid_t *groups) noexcept {
  FAIL_OR_CALL(setgroups, nullptr, -1, count, groups);
}

int initgroups(const char *user, gid_t group) {
  FAIL_OR_CALL(initgroups, user, -1, user, group);
}

int getpwuid_r(uid_t uid, struct passwd *entry, char *buffer, size_t size, struct passwd **result) {
  if (const auto *plan = failing(Call::k_getpwuid_r)) {
    *result = nullptr;
    return resultOf(*plan, plan->error);
  }
  REAL(getpwuid_r);
  return real_getpwuid_r(uid, entry, buffer, size, result);
}

pid_t setsid() noexcept {
  FAIL_OR_CALL(setsid, nullptr, pid_t{-1});
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

int close_range(unsigned first, unsigned last, int flags) noexcept {
  FAIL_OR_CALL(close_range, nullptr, -1, first, last, flags);
}

int clearenv() noexcept {
  FAIL_OR_CALL(clearenv, nullptr, -1);
}

int putenv(char *entry) noexcept {
  FAIL_OR_CALL(putenv, entry, -1, entry);
}

int kill(pid_t pid, int signal) noexcept {
  FAIL_OR_CALL(kill, std::to_string(pid), -1, pid, signal);
}

long sysconf(int name) noexcept {
  FAIL_OR_CALL(sysconf, nullptr, -1L, name);
}

pid_t fork() noexcept {
  FAIL_OR_CALL(fork, nullptr, pid_t{-1});
}

int posix_spawn(pid_t *pid, const char *program, const posix_spawn_file_actions_t *actions,
                const posix_spawnattr_t *attributes, char *const *arguments,
                char *const *environment) {
  if (const auto *plan = failing(Call::k_posix_spawn, program)) return plan->error;
  REAL(posix_spawn);
  return real_posix_spawn(pid, program, actions, attributes, arguments, environment);
}

int pidfd_open(pid_t pid, unsigned flags) noexcept {
  FAIL_OR_CALL(pidfd_open, nullptr, -1, pid, flags);
}

int poll(pollfd *events, nfds_t count, int timeout) {
  FAIL_OR_CALL(poll, nullptr, -1, events, count, timeout);
}

int waitid(idtype_t type, id_t id, siginfo_t *info, int options) {
  REAL(waitid);
  const int result = real_waitid(type, id, info, options);
  const auto *plan = failing(Call::k_waitid);
  return plan != nullptr ? resultOf(*plan, -1) : result;
}

pid_t waitpid(pid_t pid, int *status, int options) {
  REAL(waitpid);
  const pid_t result = real_waitpid(pid, status, options);
  const auto *plan = failing(Call::k_waitpid);
  return plan != nullptr ? resultOf(*plan, pid_t{-1}) : result;
}

int system(const char *command) {
  support::record(support::systemCommands(), [&] { return command != nullptr ? command : ""; });
  FAIL_OR_CALL(system, command, -1, command);
}

// ---- time and chance

struct tm *localtime(const time_t *seconds) noexcept {
  FAIL_OR_CALL(localtime, nullptr, static_cast<struct tm *>(nullptr), seconds);
}

struct tm *localtime_r(const time_t *seconds, struct tm *broken) noexcept {
  FAIL_OR_CALL(localtime_r, nullptr, static_cast<struct tm *>(nullptr), seconds, broken);
}

time_t mktime(struct tm *broken) noexcept {
  FAIL_OR_CALL(mktime, nullptr, time_t{-1}, broken);
}

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

void *__libc_malloc(size_t size);
void *__libc_calloc(size_t count, size_t size);
void *__libc_realloc(void *memory, size_t size);

void *malloc(size_t size) noexcept {
  if (support::allocationPlanned && !support::OwnWork::isGoingOn() &&
      failing(Call::k_malloc, nullptr, size) != nullptr) {
    errno = ENOMEM;
    return nullptr;
  }
  return __libc_malloc(size);
}

void *calloc(size_t count, size_t size) noexcept {
  if (support::allocationPlanned && !support::OwnWork::isGoingOn() &&
      failing(Call::k_calloc, nullptr, count * size) != nullptr) {
    errno = ENOMEM;
    return nullptr;
  }
  return __libc_calloc(count, size);
}

void *realloc(void *memory, size_t size) noexcept {
  if (support::allocationPlanned && !support::OwnWork::isGoingOn() &&
      failing(Call::k_realloc, nullptr, size) != nullptr) {
    errno = ENOMEM;
    return nullptr;
  }
  return __libc_realloc(memory, size);
}

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

int sqlite3_close(sqlite3 *database) {
  REAL(sqlite3_close);
  const int result = real_sqlite3_close(database);
  const auto *plan = failing(Call::k_sqlite3_close);
  return plan != nullptr ? resultOf(*plan, SQLITE_BUSY) : result;
}
}
