// The table of the fields, and the conversions and comparisons that its rows name.
#include "sched_parm_table.h"

#include <charconv>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <iterator>
#include <limits>

#include "sched_report.h"
#include "sched_text.h"

const ZELO_SCHED_ENUM kStateEnum[] = {{ZELO_SCHED_STATE_DISABLED, "disabled"},
                                      {ZELO_SCHED_STATE_ENABLED, "enabled"},
                                      {ZELO_SCHED_STATE_NOT_EXISTED, "NotExisted"},
                                      {-1, nullptr}};

const ZELO_SCHED_ENUM kTypeEnum[] = {
    {ZELO_SCHED_TYPE_ONCE, "once"},     {ZELO_SCHED_TYPE_DAILY, "daily"},
    {ZELO_SCHED_TYPE_WEEKLY, "weekly"}, {ZELO_SCHED_TYPE_MONTHLY, "monthly"},
    {ZELO_SCHED_TYPE_YEARLY, "yearly"}, {-1, nullptr}};

namespace {

// As snprintf with "%ld" or "%lu", which would take most of the time of converting a task.
void writeNumber(int64_t number, char *str, size_t cbStr) {
  char digits[std::numeric_limits<int64_t>::digits10 + 3];
  *std::to_chars(digits, std::end(digits) - 1, number).ptr = '\0';
  if (cbStr > 0) {
    copyText(str, cbStr, digits);
  }
}

// Reads a text of one to nine digits, as nearly all are, faster than strtoll. False for any other.
bool readShortNumber(const char *str, uint32_t *number) {
  constexpr int kFitAlways = 9;
  uint32_t value = 0;
  int digits = 0;
  for (; *str >= '0' && *str <= '9' && digits < kFitAlways; ++str, ++digits) {
    value = value * kDecimal + static_cast<uint32_t>(*str - '0');
  }
  *number = value;
  return digits > 0 && *str == '\0';
}

int signedToText(const void *private_data, char *str, size_t cbStr) {
  SCHED_CHECK_ARG(private_data != nullptr, "((void *)0) != private_data", -1);
  SCHED_CHECK_ARG(str != nullptr, "NULL != str", -1);
  writeNumber(*static_cast<const int32_t *>(private_data), str, cbStr);
  return 0;
}

int signedFromText(void *private_data, const char *str) {
  SCHED_CHECK_ARG(private_data != nullptr, "((void *)0) != private_data", -1);
  SCHED_CHECK_ARG(str != nullptr, "NULL != str", -1);
  uint32_t number = 0;
  // Of a larger number the lowest 32 bits are kept, which strtol would not give where long has 32.
  *static_cast<int32_t *>(private_data) = static_cast<int32_t>(
      readShortNumber(str, &number) ? number : strtoll(str, nullptr, kDecimal));
  return 0;
}

int unsignedToText(const void *private_data, char *str, size_t cbStr) {
  SCHED_CHECK_ARG(private_data != nullptr, "((void *)0) != private_data", -1);
  SCHED_CHECK_ARG(str != nullptr, "NULL != str", -1);
  writeNumber(*static_cast<const uint32_t *>(private_data), str, cbStr);
  return 0;
}

int unsignedFromText(void *private_data, const char *str) {
  SCHED_CHECK_ARG(private_data != nullptr, "((void *)0) != private_data", -1);
  SCHED_CHECK_ARG(str != nullptr, "NULL != str", -1);
  if (readShortNumber(str, static_cast<uint32_t *>(private_data))) {
    return 0;
  }
  char *end = nullptr;
  *static_cast<uint32_t *>(private_data) = static_cast<uint32_t>(strtoull(str, &end, kDecimal));
  if (*end != '\0') {
    SCHED_SET_ERROR(kErrMalformed);
    return -1;
  }
  return 0;
}

// The interface requires a sort by a number to order the records by their addresses, so these are
// compared and not the values.
template <class Word>
int compareLocations(const void *field1, const void *field2) {
  const Word word1 = reinterpret_cast<Word>(field1);
  const Word word2 = reinterpret_cast<Word>(field2);
  return word1 == word2 ? 0 : (word1 < word2 ? -1 : 1);
}

int compareTexts(const void *field1, const void *field2) {
  return strcmp(static_cast<const char *>(field1), static_cast<const char *>(field2));
}

constexpr bool kInHash = true;
constexpr bool kNotInHash = false;
constexpr bool kRequired = true;
constexpr bool kOptional = false;

constexpr SchedParm signedRow(const char *szKey, bool inHash, bool required, const char *szDefault,
                              size_t offset) {
  return {szKey, inHash,  required,     szDefault,      offset,
          0,     nullptr, signedToText, signedFromText, compareLocations<intptr_t>};
}

constexpr SchedParm unsignedRow(const char *szKey, bool required, const char *szDefault,
                                size_t offset) {
  return {szKey, kInHash, required,       szDefault,        offset,
          0,     nullptr, unsignedToText, unsignedFromText, compareLocations<uintptr_t>};
}

constexpr SchedParm enumRow(const char *szKey, const char *szDefault, size_t offset,
                            const ZELO_SCHED_ENUM *enumList) {
  return {szKey, kInHash,  kRequired, szDefault, offset,
          0,     enumList, nullptr,   nullptr,   compareLocations<intptr_t>};
}

#define TEXT_ROW(key, inHash, required, szDefault, field)                       \
  {                                                                             \
    key, inHash, required, szDefault, offsetof(ZELO_SCHED_TASK, field),         \
        sizeof(ZELO_SCHED_TASK::field), nullptr, nullptr, nullptr, compareTexts \
  }
#define OFFSET(name) offsetof(ZELO_SCHED_TASK, name)

}  // namespace

const SchedParm parm_table[] = {
    signedRow("id", kInHash, kRequired, "-1", OFFSET(ID)),
    signedRow("backend", kNotInHash, kOptional, "-1", OFFSET(Backend)),
    signedRow("can edit owner", kInHash, kOptional, "1", OFFSET(CanEditOwner)),
    signedRow("can edit name", kInHash, kOptional, "1", OFFSET(CanEditName)),
    signedRow("listable", kInHash, kOptional, "1", OFFSET(Listable)),
    signedRow("can run from ui", kInHash, kOptional, "1", OFFSET(CanRunFromUI)),
    signedRow("can delete from ui", kInHash, kOptional, "1", OFFSET(CanDeleteFromUI)),
    signedRow("can edit from ui", kInHash, kOptional, "1", OFFSET(CanEditFromUI)),
    signedRow("can run app same time", kInHash, kOptional, "1", OFFSET(CanRunAppSameTime)),
    signedRow("can run task same time", kInHash, kOptional, "0", OFFSET(CanRunTaskSameTime)),
    signedRow("simple edit form", kInHash, kOptional, "0", OFFSET(SimpleEditForm)),
    unsignedRow("owner", kOptional, "0", OFFSET(Owner)),
    unsignedRow("start year", kOptional, "2012", OFFSET(StartYear)),
    unsignedRow("start month", kOptional, "1", OFFSET(StartMonth)),
    unsignedRow("start day", kOptional, "1", OFFSET(StartDay)),
    unsignedRow("run hour", kRequired, "0", OFFSET(RunHour)),
    unsignedRow("run min", kRequired, "0", OFFSET(RunMin)),
    unsignedRow("repeat hour", kOptional, "0", OFFSET(RepeatHour)),
    unsignedRow("last work hour", kOptional, "0", OFFSET(LastWorkHour)),
    TEXT_ROW("name", kInHash, kRequired, "", Name),
    TEXT_ROW("edit form", kInHash, kOptional, "", EditForm),
    TEXT_ROW("edit dialog", kInHash, kOptional, "ZELO.TOV.TaskScheduler.EditDialog", EditDialog),
    TEXT_ROW("app", kInHash, kRequired, "", App),
    TEXT_ROW("app name", kInHash, kRequired, "", AppName),
    TEXT_ROW("app args", kInHash, kOptional, "", AppArgs),
    TEXT_ROW("action", kInHash, kRequired, "", Action),
    TEXT_ROW("week", kInHash, kOptional, "1111111", Week),
    TEXT_ROW(kSchedCommandKey, kInHash, kRequired, "", Command),
    TEXT_ROW("next trigger time", kNotInHash, kOptional, "", NextTriggerTime),
    enumRow("state", "enabled", OFFSET(State), kStateEnum),
    enumRow("type", "daily", OFFSET(Type), kTypeEnum),
    {nullptr, false, false, nullptr, 0, 0, nullptr, nullptr, nullptr, nullptr},
};
