// The layout of the records that callers and the platform share with the library: after a change,
// programs compiled before would read other fields. The build fails when any differs.
//
// There are two layouts, as the processors differ only in the width of pointers and of long:
// amd64, arm64 and s390x have 64 bits, armhf has 32.
#include <zelosched.h>
#include <zelosdk.h>

#include <climits>
#include <ctime>

namespace {

constexpr bool kIsWide = sizeof(void *) == 8;

constexpr bool lies(size_t offset, size_t size, size_t wideOffset, size_t wideSize,
                    size_t narrowOffset, size_t narrowSize) {
  return kIsWide ? offset == wideOffset && size == wideSize
                 : offset == narrowOffset && size == narrowSize;
}

template <class Field>
constexpr size_t kSizeOf = sizeof(Field);

}  // namespace

// RECORD(name, size and alignment with 64 bits, the same with 32)
#define RECORD(record, ...) \
  static_assert(lies(sizeof(record), alignof(record), __VA_ARGS__), #record)

// FIELD(record, field, offset and size with 64 bits, the same with 32)
#define FIELD(record, field, ...)                                                             \
  static_assert(lies(offsetof(record, field), kSizeOf<decltype(record::field)>, __VA_ARGS__), \
                #record "." #field)

// clang-format off

RECORD(ZELO_SCHED_TASK, 34920, 8, 34912, 4);
FIELD(ZELO_SCHED_TASK, next, 0, 8, 0, 4);
FIELD(ZELO_SCHED_TASK, Backend, 8, 4, 4, 4);
FIELD(ZELO_SCHED_TASK, ID, 12, 4, 8, 4);
FIELD(ZELO_SCHED_TASK, Owner, 16, 4, 12, 4);
FIELD(ZELO_SCHED_TASK, Name, 20, 4096, 16, 4096);
FIELD(ZELO_SCHED_TASK, NextTriggerTime, 4116, 1024, 4112, 1024);
FIELD(ZELO_SCHED_TASK, State, 5140, 4, 5136, 4);
FIELD(ZELO_SCHED_TASK, Type, 5144, 4, 5140, 4);
FIELD(ZELO_SCHED_TASK, Week, 5148, 8, 5144, 8);
FIELD(ZELO_SCHED_TASK, StartYear, 5156, 4, 5152, 4);
FIELD(ZELO_SCHED_TASK, StartMonth, 5160, 4, 5156, 4);
FIELD(ZELO_SCHED_TASK, StartDay, 5164, 4, 5160, 4);
FIELD(ZELO_SCHED_TASK, RunHour, 5168, 4, 5164, 4);
FIELD(ZELO_SCHED_TASK, RunMin, 5172, 4, 5168, 4);
FIELD(ZELO_SCHED_TASK, RepeatHour, 5176, 4, 5172, 4);
FIELD(ZELO_SCHED_TASK, LastWorkHour, 5180, 4, 5176, 4);
FIELD(ZELO_SCHED_TASK, EditDialog, 5184, 1024, 5180, 1024);
FIELD(ZELO_SCHED_TASK, EditForm, 6208, 1024, 6204, 1024);
FIELD(ZELO_SCHED_TASK, SimpleEditForm, 7232, 4, 7228, 4);
FIELD(ZELO_SCHED_TASK, Listable, 7236, 4, 7232, 4);
FIELD(ZELO_SCHED_TASK, CanEditName, 7240, 4, 7236, 4);
FIELD(ZELO_SCHED_TASK, CanEditOwner, 7244, 4, 7240, 4);
FIELD(ZELO_SCHED_TASK, CanRunAppSameTime, 7248, 4, 7244, 4);
FIELD(ZELO_SCHED_TASK, CanRunTaskSameTime, 7252, 4, 7248, 4);
FIELD(ZELO_SCHED_TASK, CanRunFromUI, 7256, 4, 7252, 4);
FIELD(ZELO_SCHED_TASK, CanDeleteFromUI, 7260, 4, 7256, 4);
FIELD(ZELO_SCHED_TASK, CanEditFromUI, 7264, 4, 7260, 4);
FIELD(ZELO_SCHED_TASK, App, 7268, 1024, 7264, 1024);
FIELD(ZELO_SCHED_TASK, AppName, 8292, 1024, 8288, 1024);
FIELD(ZELO_SCHED_TASK, AppArgs, 9316, 8192, 9312, 8192);
FIELD(ZELO_SCHED_TASK, Action, 17508, 1024, 17504, 1024);
FIELD(ZELO_SCHED_TASK, Command, 18532, 16384, 18528, 16384);

RECORD(ZELO_SCHED_ENUM, 16, 8, 8, 4);
FIELD(ZELO_SCHED_ENUM, value, 0, 4, 0, 4);
FIELD(ZELO_SCHED_ENUM, szName, 8, 8, 4, 4);

RECORD(ZELO_SCHED_DATE, 24, 4, 24, 4);
FIELD(ZELO_SCHED_DATE, year, 0, 4, 0, 4);
FIELD(ZELO_SCHED_DATE, month, 4, 4, 4, 4);
FIELD(ZELO_SCHED_DATE, day, 8, 4, 8, 4);
FIELD(ZELO_SCHED_DATE, weekday, 12, 4, 12, 4);
FIELD(ZELO_SCHED_DATE, hour, 16, 4, 16, 4);
FIELD(ZELO_SCHED_DATE, minute, 20, 4, 20, 4);

RECORD(ZELO_SCHED_BACKEND, 88, 8, 44, 4);
FIELD(ZELO_SCHED_BACKEND, id, 0, 4, 0, 4);
FIELD(ZELO_SCHED_BACKEND, szName, 8, 8, 4, 4);
FIELD(ZELO_SCHED_BACKEND, sync, 16, 8, 8, 4);
FIELD(ZELO_SCHED_BACKEND, create, 24, 8, 12, 4);
FIELD(ZELO_SCHED_BACKEND, edit, 32, 8, 16, 4);
FIELD(ZELO_SCHED_BACKEND, remove, 40, 8, 20, 4);
FIELD(ZELO_SCHED_BACKEND, get_default, 48, 8, 24, 4);
FIELD(ZELO_SCHED_BACKEND, owns_id, 56, 8, 28, 4);
FIELD(ZELO_SCHED_BACKEND, get_by_id, 64, 8, 32, 4);
FIELD(ZELO_SCHED_BACKEND, run, 72, 8, 36, 4);
FIELD(ZELO_SCHED_BACKEND, list_get, 80, 8, 40, 4);

RECORD(ZELO_SCHED_PLUGIN, 48, 8, 24, 4);
FIELD(ZELO_SCHED_PLUGIN, framework, 0, 24, 0, 12);
FIELD(ZELO_SCHED_PLUGIN, result, 24, 4, 12, 4);
FIELD(ZELO_SCHED_PLUGIN, pOrg, 32, 8, 16, 4);
FIELD(ZELO_SCHED_PLUGIN, pNew, 40, 8, 20, 4);

RECORD(ZELO_SCHED_STATUS, 2080, 8, 2072, 4);
FIELD(ZELO_SCHED_STATUS, found, 0, 4, 0, 4);
FIELD(ZELO_SCHED_STATUS, pid, 4, 4, 4, 4);
FIELD(ZELO_SCHED_STATUS, statusID, 8, 4, 8, 4);
FIELD(ZELO_SCHED_STATUS, timestamp, 12, 4, 12, 4);
FIELD(ZELO_SCHED_STATUS, taskID, 16, 8, 16, 4);
FIELD(ZELO_SCHED_STATUS, szApp, 24, 1024, 20, 1024);
FIELD(ZELO_SCHED_STATUS, statusCode, 1048, 4, 1044, 4);
FIELD(ZELO_SCHED_STATUS, szComment, 1052, 1024, 1048, 1024);

RECORD(ZELOUSER, 32, 8, 20, 4);
FIELD(ZELOUSER, szName, 0, 8, 0, 4);
FIELD(ZELOUSER, uid, 8, 4, 4, 4);
FIELD(ZELOUSER, gid, 12, 4, 8, 4);
FIELD(ZELOUSER, szHome, 16, 8, 12, 4);
FIELD(ZELOUSER, szShell, 24, 8, 16, 4);

RECORD(ZELO_AUTOPOWER, 4, 1, 4, 1);
FIELD(ZELO_AUTOPOWER, enabled, 0, 1, 0, 1);
FIELD(ZELO_AUTOPOWER, weekdays, 1, 1, 1, 1);
FIELD(ZELO_AUTOPOWER, hour, 2, 1, 2, 1);
FIELD(ZELO_AUTOPOWER, minute, 3, 1, 3, 1);

RECORD(ZELO_SCHEDULE, 1048, 4, 1048, 4);
FIELD(ZELO_SCHEDULE, weekdays, 0, 4, 0, 4);
FIELD(ZELO_SCHEDULE, hour, 4, 4, 4, 4);
FIELD(ZELO_SCHEDULE, repeat, 8, 4, 8, 4);
FIELD(ZELO_SCHEDULE, lastHour, 12, 4, 12, 4);
FIELD(ZELO_SCHEDULE, minute, 16, 4, 16, 4);
FIELD(ZELO_SCHEDULE, reserved, 20, 4, 20, 4);
FIELD(ZELO_SCHEDULE, szCommand, 24, 1024, 24, 1024);
// clang-format on

static_assert(sizeof(long) == sizeof(void *), "the arguments that are long");
static_assert(CHAR_BIT == 8 && sizeof(int) == 4 && sizeof(uid_t) == 4, "ids and results");
// _TIME_BITS and _FILE_OFFSET_BITS, which another build for 32 bits may lack.
static_assert(sizeof(time_t) == 8 && sizeof(off_t) == 8, "times after 2038, and large files");
