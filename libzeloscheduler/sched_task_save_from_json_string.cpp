// Saving a task from the JSON text that a browser sends back. The text comes from outside: nothing
// is saved unless all of it could be read.
#include <zelocore.h>
#include <zelosched.h>
#include <zelosdk.h>

#include <algorithm>
#include <charconv>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <string>
#include <string_view>

#include "backends/power_id.h"
#include "sched_cron_room.h"
#include "sched_guards.h"
#include "sched_json.h"
#include "sched_parm_table.h"
#include "sched_report.h"
#include "sched_text.h"
#include "schedule_cron.h"

namespace {

constexpr int kHashCapacity = 512;
// The text of a task has a few hundred KB at most, and parsing takes up to sixty times the memory
// of the text: a longer one could exhaust the machine.
constexpr size_t kLongestJson = size_t{4} << 20;

bool isBlank(char c) {
  return c == ' ' || c == '\t' || c == '\r' || c == '\n';
}

// Skips blanks and comments. False when a block comment is not closed. As for the reader, a
// carriage return ends a line too.
bool skipBlanks(std::string_view *text) {
  for (;;) {
    const auto *next = std::find_if_not(text->begin(), text->end(), isBlank);
    text->remove_prefix(static_cast<size_t>(next - text->begin()));
    const bool isBlock = text->starts_with("/*");
    if (!isBlock && !text->starts_with("//")) {
      return true;
    }
    constexpr size_t kMarkLength = 2;
    const size_t end = isBlock ? text->find("*/", kMarkLength) : text->find_first_of("\r\n");
    if (end == std::string_view::npos) {
      text->remove_prefix(text->size());
      return !isBlock;
    }
    text->remove_prefix(isBlock ? end + kMarkLength : end);
  }
}

// The reader stops at the end of the value. Blanks and comments may follow, nothing else.
bool isAllThereIs(std::string_view rest) {
  return skipBlanks(&rest) && rest.empty();
}

// The first character of a value tells its type.
constexpr char kObject = '{';
constexpr char kString = '"';

bool beginsWith(std::string_view text, char first) {
  return skipBlanks(&text) && text.starts_with(first);
}

constexpr char kArray = '[';

size_t lengthOfString(std::string_view text) {
  size_t length = 1;
  while (length < text.size() && text[length] != kString) {
    length += text[length] == '\\' ? 2 : 1;
  }
  return std::min(length + 1, text.size());
}

// Whether there is an array or an object in the root object of a text that could be parsed. The
// parsed value does not have the one whose member is given again.
bool isNested(std::string_view text) {
  constexpr size_t kRoot = 1;
  skipBlanks(&text);
  text.remove_prefix(kRoot);
  const bool isPossible =
      text.find(kArray) != std::string_view::npos || text.find(kObject) != std::string_view::npos;
  while (isPossible && skipBlanks(&text) && !text.empty()) {
    if (text.front() == kArray || text.front() == kObject) {
      return true;
    }
    text.remove_prefix(text.front() == kString ? lengthOfString(text) : 1);
  }
  return false;
}

constexpr unsigned kFirstHighSurrogate = 0xD800;
constexpr unsigned kFirstLowSurrogate = 0xDC00;
constexpr unsigned kLastSurrogate = 0xDFFF;

// The code of the escape "\uXXXX" at the beginning of the text, or 0, which is no surrogate
// either.
unsigned escapedNumber(std::string_view text) {
  constexpr size_t kMarkLength = 2;
  constexpr size_t kDigits = 4;
  constexpr int kHexadecimal = 16;
  unsigned number = 0;
  if (text.starts_with("\\u") && text.size() >= kMarkLength + kDigits) {
    const char *digits = text.data() + kMarkLength;
    std::from_chars(digits, digits + kDigits, number, kHexadecimal);
  }
  return number;
}

// Half of a surrogate pair is no character. The reader accepts a second half by itself, and joins
// a first half with any escape that follows.
bool hasHalfPair(std::string_view text) {
  constexpr size_t kEscapeLength = 6;
  for (size_t at = text.find('\\'); at < text.size(); at = text.find('\\', at)) {
    const unsigned number = escapedNumber(text.substr(at));
    if (number < kFirstHighSurrogate || number > kLastSurrogate) {
      at += 2;  // past the escaped character, which may be a backslash
      continue;
    }
    const unsigned second =
        number < kFirstLowSurrogate ? escapedNumber(text.substr(at + kEscapeLength)) : 0;
    if (second < kFirstLowSurrogate || second > kLastSurrogate) {
      return true;
    }
    at += 2 * kEscapeLength;
  }
  return false;
}

// A value of another type is not parsed, as one of many small values takes several times as long
// as a task's texts. The reader throws when the nesting is too deep.
bool parse(SchedJsonReader *reader, std::string_view text, char first, Json::Value *value) {
  try {
    return text.size() <= kLongestJson && beginsWith(text, first) && reader->read(text, value) &&
           !hasHalfPair(text) &&
           isAllThereIs(text.substr(static_cast<size_t>(value->getOffsetLimit())));
  } catch (const Json::Exception &) {
    return false;
  }
}

// The text of a string value, without a copy.
std::string_view textOf(const Json::Value &string) {
  const char *begin = nullptr;
  const char *end = nullptr;
  string.getString(&begin, &end);
  return {begin, static_cast<size_t>(end - begin)};
}

// A zero-terminated text would end at a zero byte: it is refused, not cut.
bool isPlainText(std::string_view text) {
  return text.find('\0') == std::string_view::npos;
}

// The value in a member's string, which must be a string again.
bool decodeMember(SchedJsonReader *reader, const Json::Value &member, Json::Value *inner) {
  return member.isString() && parse(reader, textOf(member), kString, inner) &&
         isPlainText(textOf(*inner));
}

long long numberIn(const char *szText) {
  return strtoll(szText, nullptr, kDecimal);
}

// Whether it is a number of a few digits, as nearly all are.
bool isShort(const char *szNumber) {
  constexpr size_t kFitAlways = 9;
  return szNumber[0] >= '0' && szNumber[0] <= '9' && strlen(szNumber) <= kFitAlways;
}

// A field has 32 bits, and a number that does not fit would become another one: 4294967296 the uid
// 0. A text that is no number is left to the conversion.
bool fitsNumber(const SchedParm &parm, const char *szNumber) {
  uint32_t field = 0;
  char szKept[32];
  return isShort(szNumber) || parm.fnFromHashStr(&field, szNumber) < 0 ||
         parm.ToHashStr(&field, szKept, sizeof(szKept)) < 0 ||
         numberIn(szKept) == numberIn(szNumber);
}

// A command that was cut is another command. Only padding at its end, which encodes nothing, may
// be cut. A text that is not Base64 is left to the conversion.
bool fitsCommand(std::string_view encoded) {
  constexpr size_t kLongest = sizeof(ZELO_SCHED_TASK::Command) - 1;
  constexpr char kPadding = '=';
  const std::string_view kept = encoded.substr(0, kLongest);
  if (encoded.find_first_not_of(kPadding, kept.size()) != std::string_view::npos) {
    return false;
  }
  char command[sizeof(ZELO_SCHED_TASK::Command)];
  size_t length = sizeof(command);
  return ZELOEncodingBase64Decode(kept.data(), kept.size(), command, &length) == 0 ||
         memchr(command, '\0', length) == nullptr;
}

bool eachFits(PSZHASH hash) {
  const char *szCommand = QLIBCSzHashGetValue(hash, kSchedCommandKey);
  if (szCommand != nullptr && !fitsCommand(szCommand)) {
    return false;
  }
  for (const SchedParm *parm = parm_table; parm->szKey != nullptr; ++parm) {
    const bool isNumber = parm->inHash && parm->fnFromHashStr != nullptr;
    const char *szNumber = isNumber ? QLIBCSzHashGetValue(hash, parm->szKey) : nullptr;
    if (szNumber != nullptr && !fitsNumber(*parm, szNumber)) {
      return false;
    }
  }
  return true;
}

// Malformed values are reported by the conversion, so this check restores the error record.
bool fitsFields(PSZHASH hash) {
  const SchedErrorRecord before;
  const bool fits = eachFits(hash);
  before.restore();
  return fits;
}

bool fillHash(const Json::Value &root, SchedJsonReader *reader, HashGuard *hash) {
  for (auto member = root.begin(); member != root.end(); ++member) {
    const std::string name = member.name();
    Json::Value inner;
    if (!isPlainText(name) || !decodeMember(reader, *member, &inner) ||
        QLIBCSzHashSetValue(hash->handle(), name.c_str(), inner.asCString()) < 0) {
      return false;
    }
  }
  return fitsFields(hash->get());
}

// The task that is stored under the id may be another program's new one by now. Only one with the
// same app and name is overwritten, in its backend.
bool findStored(ZELO_SCHED_TASK *pTask, ZELO_SCHED_TASK *pStored) {
  if (ZELOSchedTaskGetByID(pTask->ID, pStored) != 0 || strcmp(pStored->App, pTask->App) != 0 ||
      strcmp(pStored->Name, pTask->Name) != 0) {
    return false;
  }
  pTask->Backend = pStored->Backend;
  return true;
}

bool hasLine(const ZELO_SCHED_TASK &task) {
  return task.Backend == ZELO_SCHED_BACKEND_SCHEDULE && task.State == ZELO_SCHED_STATE_ENABLED;
}

// A disabled task is checked like an enabled one, as it may be enabled without another check. A
// power time has no task line, and the platform checks it. A task that adds no line may be saved
// even when the crontab is full.
bool canBeKept(const ZELO_SCHED_TASK &task, const ZELO_SCHED_TASK *stored) {
  if (stored != nullptr && task.Backend == ZELO_SCHED_BACKEND_AUTOPOWER) {
    return true;
  }
  const bool addsLine = hasLine(task) && (stored == nullptr || !hasLine(*stored));
  return schedIsCronLineReadable(task) && (!addsLine || schedHasCronRoom(1));
}

int refuse(const ZELO_SCHED_TASK &task) {
  SCHED_LOG("hash to task failed, task id=%ld", static_cast<long>(task.ID));
  return -1;
}

int save(ZELO_SCHED_TASK *pTask, bool create) {
  // Only a possible power time is looked up before its schedule is checked.
  const bool mayBePower = !create && isPowerId(pTask->ID);
  if (!mayBePower && !schedIsCronLineReadable(*pTask)) {
    return refuse(*pTask);
  }
  ZELO_SCHED_TASK stored = {};
  const bool overwrites = !create && findStored(pTask, &stored);
  if (!canBeKept(*pTask, overwrites ? &stored : nullptr)) {
    return refuse(*pTask);
  }
  if (overwrites) {
    if (ZELOSchedTaskEdit(pTask) != 0) {
      SCHED_LOG("overwrite failed, task=%ld", static_cast<long>(pTask->ID));
      return -1;
    }
  } else if (ZELOSchedTaskCreate(pTask) < 0) {
    SCHED_LOG("create task failed, task id=%ld", static_cast<long>(pTask->ID));
    return -1;
  }
  return pTask->ID;
}

int saveFromJson(const char *szJson, bool create) {
  const TaskGuard task(ZELOSchedTaskAlloc());
  if (task == nullptr) {
    SCHED_LOG_CALLEE("alloc task failed.");
    return -1;
  }
  SchedJsonReader reader;
  Json::Value root;
  if (!parse(&reader, szJson, kObject, &root)) {
    SCHED_LOG("parse json failed, szJson=%s", szJson);
    return -1;
  }
  HashGuard hash(QLIBCSzHashAlloc(kHashCapacity));
  if (!hash) {
    SCHED_LOG("Out of memory");
    return -1;
  }
  if (isNested(szJson) || !fillHash(root, &reader, &hash)) {
    SCHED_LOG("save appargs failed");
    return -1;
  }
  if (root.empty()) {
    return task->ID;
  }
  if (ZELOSchedInitTaskFromHash(task.get(), hash.get()) < 0) {
    return refuse(*task);
  }
  return save(task.get(), create);
}

}  // namespace

int ZELOSchedTaskSaveFromJson(const char *szJson, int create) {
  if (szJson == nullptr || szJson[0] == '\0') {
    SCHED_LOG("Bad parameter");
    return -1;
  }
  try {
    return saveFromJson(szJson, create != 0);
  } catch (const std::exception &) {  // nothing but memory can be short here
    SCHED_LOG("Out of memory");
    return -1;
  }
}
