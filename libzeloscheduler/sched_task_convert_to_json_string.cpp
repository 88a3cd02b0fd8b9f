// A task as JSON: one object with a member for every key of its hash form. Each value is written
// as a JSON string twice over, so a reader decodes it twice.
#include <zelocore.h>
#include <zelosched.h>

#include <algorithm>
#include <exception>
#include <string>
#include <string_view>

#include "sched_guards.h"
#include "sched_json.h"
#include "sched_report.h"
#include "sched_text.h"
#include "sched_utf8.h"

namespace {

constexpr size_t kSmallestBuffer = ZELO_SCHED_JSON_SIZE_MIN;
constexpr int kContainerCapacity = 512;

// JSON cannot represent a byte that is not UTF-8, and the writer takes the bytes after it for a
// part of the character. So each such byte is replaced, and the characters around it stay.
std::string wellFormed(std::string_view text) {
  constexpr std::string_view kReplacement = "\xEF\xBF\xBD";  // U+FFFD
  std::string result;
  result.reserve(text.size());
  while (!text.empty()) {
    const size_t bytes = schedFirstCharacter(text).bytes;
    result += bytes > 0 ? text.substr(0, bytes) : kReplacement;
    text.remove_prefix(bytes > 0 ? bytes : 1);
  }
  return result;
}

Json::Value valueOf(std::string_view text) {
  constexpr unsigned char kLastAscii = 0x7F;
  const bool isAscii = std::all_of(text.begin(), text.end(), [](char byte) {
    return static_cast<unsigned char>(byte) <= kLastAscii;
  });
  return isAscii ? Json::Value(text.data(), text.data() + text.size())
                 : Json::Value(wellFormed(text));
}

std::string objectOf(PSZHASH hash, PSZLIST keys) {
  Json::Value root(Json::objectValue);
  SchedJsonWriter writer;
  const int count = QLIBCSzListCount(keys);
  for (int i = 0; i < count; ++i) {
    const char *szKey = QLIBCSzListGet(keys, i);
    const char *szValue = QLIBCSzHashGetValue(hash, szKey);
    root[Json::StaticString(szKey)] = writer.write(valueOf(szValue != nullptr ? szValue : ""));
  }
  return writer.write(root);
}

int convert(const ZELO_SCHED_TASK *pTask, char *szBuf, size_t cbBuf) {
  HashGuard hash(QLIBCSzHashAlloc(kContainerCapacity));
  ListGuard keys(QLIBCSzListAlloc(kContainerCapacity));
  if (!hash || !keys) {
    SCHED_LOG("Out of memory");
    return -1;
  }
  if (ZELOSchedInitHashFromTask(hash.handle(), pTask) < 0) {
    SCHED_LOG("Task to hash failed");
    return -1;
  }
  if (QLIBCSzHashEnumKey(hash.get(), keys.handle()) < 0) {
    SCHED_LOG("enum hash key failed");
    return -1;
  }
  copyText(szBuf, cbBuf, objectOf(hash.get(), keys.get()).c_str());
  return 0;
}

}  // namespace

int ZELOSchedTaskConvertToJson(const ZELO_SCHED_TASK *pTask, char *szBuf, size_t cbBuf) {
  if (pTask == nullptr || szBuf == nullptr || cbBuf < kSmallestBuffer) {
    SCHED_LOG("Bad parameter");
    return -1;
  }
  try {
    return convert(pTask, szBuf, cbBuf);
  } catch (const std::exception &) {  // nothing but memory can be short here
    SCHED_LOG("Out of memory");
    return -1;
  }
}

int ZELOSchedTaskConvertToJsonById(long id, char *szBuf, size_t cbBuf) {
  if (szBuf == nullptr || id < 0 || cbBuf < kSmallestBuffer) {
    SCHED_LOG("Bad parameter");
    return -1;
  }
  const TaskGuard task(ZELOSchedTaskAlloc());
  if (task == nullptr) {
    SCHED_LOG("ZELOSchedTaskAlloc failed");
    return -1;
  }
  if (ZELOSchedTaskGetByID(id, task.get()) < 0) {
    SCHED_LOG("cannot get scheduler task, id=%ld", id);
    return -1;
  }
  if (ZELOSchedTaskConvertToJson(task.get(), szBuf, cbBuf) < 0) {
    SCHED_LOG("scheduler task to json failed, task=%ld", id);
    return -1;
  }
  return 0;
}
