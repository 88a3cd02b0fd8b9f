// A task as JSON: one object with a member for every key of its hash form. Each member's value is
// the value written as JSON once before, so a reader decodes it twice.
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

namespace {

constexpr size_t kSmallestBuffer = ZELO_SCHED_JSON_SIZE_MIN;
constexpr int kContainerCapacity = 512;

// UTF-8 by its first byte: how long a character is, and the range of its second byte, which is what
// tells overlong forms, surrogates and numbers beyond Unicode. Any further byte is 80 to BF.
struct Utf8Form {
  unsigned char firstLead;
  unsigned char lastLead;
  size_t length;
  unsigned char firstSecond;
  unsigned char lastSecond;
};
constexpr Utf8Form kUtf8Forms[] = {
    {0x00, 0x7F, 1, 0x00, 0x00}, {0xC2, 0xDF, 2, 0x80, 0xBF}, {0xE0, 0xE0, 3, 0xA0, 0xBF},
    {0xE1, 0xEC, 3, 0x80, 0xBF}, {0xED, 0xED, 3, 0x80, 0x9F}, {0xEE, 0xEF, 3, 0x80, 0xBF},
    {0xF0, 0xF0, 4, 0x90, 0xBF}, {0xF1, 0xF3, 4, 0x80, 0xBF}, {0xF4, 0xF4, 4, 0x80, 0x8F},
};

bool isWithin(char byte, unsigned char first, unsigned char last) {
  const auto number = static_cast<unsigned char>(byte);
  return first <= number && number <= last;
}

// The length of the character that `text` begins with, or 0 when it begins with none.
size_t characterLength(std::string_view text) {
  for (const Utf8Form &form : kUtf8Forms) {
    if (!isWithin(text[0], form.firstLead, form.lastLead)) {
      continue;
    }
    if (text.size() < form.length) {
      return 0;
    }
    for (size_t i = 1; i < form.length; ++i) {
      if (!isWithin(text[i], i == 1 ? form.firstSecond : 0x80, i == 1 ? form.lastSecond : 0xBF)) {
        return 0;
      }
    }
    return form.length;
  }
  return 0;
}

// JSON has no way to carry a byte that is not UTF-8, and the writer takes whatever follows one for
// a part of it. So each such byte is replaced by itself, and the characters around it stay.
std::string wellFormed(std::string_view text) {
  constexpr std::string_view kReplacement = "\xEF\xBF\xBD";  // U+FFFD
  std::string result;
  result.reserve(text.size());
  while (!text.empty()) {
    const size_t length = characterLength(text);
    result += length > 0 ? text.substr(0, length) : kReplacement;
    text.remove_prefix(length > 0 ? length : 1);
  }
  return result;
}

constexpr unsigned char kLastAscii = kUtf8Forms[0].lastLead;

Json::Value valueOf(std::string_view text) {
  const bool isAscii = std::all_of(text.begin(), text.end(),
                                   [](char byte) { return isWithin(byte, 0x00, kLastAscii); });
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
