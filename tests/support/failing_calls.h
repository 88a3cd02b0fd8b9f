// Platform and C library calls that a test can make fail, force to a result, or look at. Each is
// passed on to the real one unless a plan says otherwise. Counts and records include the calls made
// in forked children.
//
//   failCall("rename", {.error = EXDEV});                     the next rename fails
//   failCall("fsync", {.from = 2, .times = kAlways});         all but the first
//   failCallFor("fopen", "/etc/crontab", {.error = EACCES});  only calls on that path
//   failCallFor("QLIBCSzHashSetValue", "cmd", {.code = 0x0200});
//   failCall("QLIBCProcAlive", {.times = kAlways, .result = 1});
//   failCall("sqlite3_exec", {.times = 3, .text = "database is locked"});
//   { FailingAllocation scope("calloc", {.minSize = sizeof(ZELO_SCHED_TASK)}); ... }
//
// What the second argument of failCallFor is compared with
//   hash key           QLIBCSzHashSetValue, QLIBCSzHashGetValue            equal
//   number             QLIBCProcAlive (pid), ZELOUserGetByUID, seteuid, setegid (id),
//                      prctl (option), QLIBPluginAction (stage),
//                      QLIBCSzHashAlloc (capacity)                                        equal
//   plugin argument    QLIBPluginSetArg, QLIBPluginSetArgByInt             equal
//   section name       QLIBCFile{Get,Set,Add,Remove}Section                equal
//   path or text       QLIBCFileExist, QLIBCFileTouch, QLIBCFileEnumSection, QLIBCExec (program and
//                      arguments), QLIBCStrSep, open, fopen, rename, renameat2 (both paths),
//                      mkstemp, mkdtemp, mkostemp, mkdir, rmdir, chmod, access, unlink, chdir,
//                      fstatat, statx, stat, lstat, system, posix_spawn, open64, putenv,
//                      kill (pid), sqlite3_open, sqlite3_exec (SQL), fdopen (mode),
//                      initgroups (name)                                                  contained
//
// Calls without a key: QLIBCSzListAlloc QLIBCSzListPush QLIBCSzHashEnumKey
// QLIBCProcForkChildNoWait SzBase64EncodeFull ZELOEncodingBase64Decode QLIBPluginInit
// QLIBPluginExit fsync fstat fchown fchmod ftruncate fflush fclose getline (getdelim too) read
// write fwrite (and all other writing to a stream) flock setreuid setresuid setregid setresgid
// setgroups localtime localtime_r mktime malloc calloc realloc sleep usleep nanosleep rand srand
// setsid keyctl capget capset (these three by syscall) close_range fork getpwuid_r futimens
// fdopendir dup dup2 fcntl (for F_DUPFD_CLOEXEC and F_SETFD) pipe2 readdir close pread64 pwrite
// pwrite64 fdatasync fcntl64 sysconf clearenv pidfd_open poll waitid waitpid sqlite3_close.
//
// Streams and descriptors 0 to 2 are never touched. close, fclose, waitid, waitpid (somebody else
// took the status), sqlite3_close and QLIBPluginExit that are made to fail have done their work all
// the same. sqlite3_open that is made to fail leaves a handle with a message, as the real one does.
#pragma once

#include <sys/types.h>

#include <cerrno>
#include <cstddef>
#include <functional>
#include <map>
#include <optional>
#include <string>
#include <vector>

namespace support {

inline constexpr unsigned kAlways = ~0U;

// The file and line of the error record that a failing platform call leaves.
inline constexpr char kInjectedFile[] = "injected.cpp";
inline constexpr int kInjectedLine = 77;

struct FailPlan {
  unsigned from = 1;             // the first call that fails, of those that the plan is about
  unsigned times = 1;            // how many fail
  int error = 0;                 // errno; 0 leaves it alone
  std::optional<long> result{};  // what an int call gives; without it, what it gives on failure
  int code = 0;                  // error record; 0 leaves it alone
  const char *text = nullptr;    // sqlite3_exec: error text, or no text; QLIBCSzHashGetValue: what
                                 // it gives, or nothing
  size_t minSize = 0;            // allocations: only those of at least so many bytes
};

// Both throw std::invalid_argument for a call that is not in the table.
void failCall(const std::string &call, const FailPlan &plan = {});
void failCallFor(const std::string &call, const std::string &key, const FailPlan &plan = {});

// Calls since the last resetFailingCalls, failed ones included. Allocations are counted only while
// a plan for them stands.
unsigned callCount(const std::string &call);

// Forgets every plan, count, record and forced value.
void resetFailingCalls();

// Allocations fail within a scope only, since those of the test would fail too. Does nothing in a
// build with the address sanitizer, which has its own allocator: ask kAllocationsCanFail.
#if defined(__SANITIZE_ADDRESS__)
inline constexpr bool kAllocationsCanFail = false;
#else
inline constexpr bool kAllocationsCanFail = true;
#endif

class FailingAllocation {
 public:
  explicit FailingAllocation(const char *call, const FailPlan &plan = {});
  ~FailingAllocation();
  FailingAllocation(const FailingAllocation &) = delete;
  FailingAllocation &operator=(const FailingAllocation &) = delete;
};

// Within the scope the nth of all the calls above fails, and all after it when `onwards`. Not
// counted are those that cannot fail (QLIBCFileExist, QLIBCProcAlive,
// QLIBCSzHashGetValue, sleeps, rand, srand) and those of the test's own helpers.
//
//   FailingStep step(3, false);
//   act();
//   step.failed();   "rename"; "" when there were fewer calls
class FailingStep {
 public:
  // `error` is the errno of a call that has none of its own (as allocations have). ENOSPC, EDQUOT
  // and EROFS fail only calls that write.
  FailingStep(unsigned nth, bool onwards, int error = EIO);
  ~FailingStep();
  FailingStep(const FailingStep &) = delete;
  FailingStep &operator=(const FailingStep &) = delete;

  std::string failed() const;
};

// For a call that is interposed elsewhere: whether it is the one that the current step fails.
bool failsInStep(const char *call);

// As FailingStep, but before the nth call the whole process group is killed.
class KillingStep : public FailingStep {
 public:
  explicit KillingStep(unsigned nth);
};

// Calls within the scope are the test's own: they neither fail nor count in a FailingStep.
class OwnWork {
 public:
  OwnWork() { ++depth_; }
  ~OwnWork() { --depth_; }
  OwnWork(const OwnWork &) = delete;
  OwnWork &operator=(const OwnWork &) = delete;

  static bool isGoingOn() { return depth_ > 0; }

 private:
  static inline thread_local int depth_ = 0;
};

// Commands given to system(), which runs them unless a plan stands.
std::vector<std::string> recordedSystemCommands();

// "program argument argument" of each QLIBCExec.
std::vector<std::string> recordedExecs();

// "init PLUGIN ACTION", "arg KEY=VALUE", "int KEY=VALUE", "action STAGE", "exit".
std::vector<std::string> recordedPluginCalls();

// Sleeps return at once and are recorded, in microseconds; `call` picks one of sleep, usleep and
// nanosleep. clearSleeps forgets them. onSleep is called in the process that sleeps, with the
// number of sleeps recorded so far (from 1): the place to end what the library is waiting for.
std::vector<long> recordedSleeps(const std::string &call = "");
void clearSleeps();
// How often each process has slept, of those that have.
std::map<pid_t, unsigned> sleepsByProcess(const std::string &call);
// Sleeps are real, or so many times shorter than real.
void realSleep(bool really, unsigned timesShorter = 1);
void onSleep(std::function<void(size_t)> action);

// Called before each QLIBCExec, with "program argument argument".
void onExec(std::function<void(const std::string &)> action);

// Called before each call that can be made to fail, with its name: the moment at which somebody
// else acts. What it calls is the test's own work. resetFailingCalls ends it.
void beforeEachCall(std::function<void(const std::string &call)> action);

// rand() gives these values in turn, over and over; an empty list gives rand() back.
void setRandValues(std::vector<int> values);
// The seed that srand() was last given.
unsigned lastSeed();

}  // namespace support
