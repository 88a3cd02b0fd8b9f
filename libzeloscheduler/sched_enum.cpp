// Names for enumeration values, and on/off characters as lists of names.
#include <strings.h>
#include <zelosched.h>

#include <cstring>

#include "sched_guards.h"
#include "sched_report.h"
#include "sched_text.h"

namespace {

constexpr size_t kResultCapacity = 4096;
constexpr int kListCapacity = 1024;
constexpr char kOff = '0';
constexpr char kOn = '1';

bool holdsIgnoringCase(PSZLIST items, const char *szName) {
  const int count = QLIBCSzListCount(items);
  for (int i = 0; i < count; ++i) {
    if (strcasecmp(QLIBCSzListGet(items, i), szName) == 0) {
      return true;
    }
  }
  return false;
}

}  // namespace

const char *ZELOSchedEnumToName(const ZELO_SCHED_ENUM *enum_list, int value) {
  SCHED_CHECK_ARG(enum_list != nullptr, "((void *)0) != enum_list", nullptr);
  for (; enum_list->szName != nullptr; ++enum_list) {
    if (enum_list->value == value) {
      return enum_list->szName;
    }
  }
  SCHED_SET_ERROR(kErrNotFound);
  return nullptr;
}

int ZELOSchedEnumToValue(const ZELO_SCHED_ENUM *enum_list, const char *szName) {
  SCHED_CHECK_ARG(enum_list != nullptr, "((void *)0) != enum_list", -1);
  SCHED_CHECK_ARG(szName != nullptr, "NULL != szName", -1);
  for (; enum_list->szName != nullptr; ++enum_list) {
    if (strcmp(enum_list->szName, szName) == 0) {
      return enum_list->value;
    }
  }
  SCHED_SET_ERROR(kErrNotFound);
  return -1;
}

const char *ZELOSchedMultiSelectToText(const char *szFlags, const char *const *names,
                                       size_t count) {
  static BoundedText<kResultCapacity> result;
  if (szFlags == nullptr || names == nullptr || strlen(szFlags) < count) {
    return nullptr;
  }
  result = {};
  for (size_t i = 0; szFlags[i] != '\0'; ++i) {
    if (szFlags[i] != kOff) {
      result.append("%s%s", result.c_str()[0] == '\0' ? "" : ",", names[i]);
    }
  }
  return result.c_str();
}

const char *ZELOSchedMultiSelectFromText(const char *text, const char *const *names, size_t count) {
  static char result[kResultCapacity];
  if (text == nullptr || names == nullptr || count == 0) {
    return nullptr;
  }
  memset(result, 0, sizeof(result));
  ListGuard items(QLIBCSzListAlloc(kListCapacity));
  if (!items) {
    return nullptr;
  }
  if (QLIBCStrSep(text, ",", items.handle()) <= 0) {
    return nullptr;
  }
  // Callers keep `count` below the capacity; for a larger one the result is cut.
  for (size_t i = 0; i < count && i < kResultCapacity - 1; ++i) {
    result[i] = holdsIgnoringCase(items.get(), names[i]) ? kOn : kOff;
  }
  return result;
}
