// The two lists of power times, in a section file of their own.
#include "power_schedule.h"

#include <algorithm>
#include <charconv>
#include <string>
#include <string_view>

#include "support.h"

namespace zelo {
namespace {

constexpr char kFile[] = "/usr/zelo/etc/power_sched.conf";
constexpr char kTimesKey[] = "times";
// By ZELO_AUTOPOWER_ON and ZELO_AUTOPOWER_OFF.
constexpr const char *kSections[] = {"poweron", "poweroff"};
constexpr int kMalformed = 0x4000;

class Hash {
 public:
  Hash() : hash_(QLIBCSzHashAlloc(1)) {}
  Hash(const Hash &) = delete;
  Hash &operator=(const Hash &) = delete;
  ~Hash() { QLIBCSzHashFree(hash_); }

  bool valid() const noexcept { return hash_ != nullptr; }
  PSZHASH get() const noexcept { return hash_; }
  PSZHASH *address() noexcept { return &hash_; }

 private:
  PSZHASH hash_;
};

const char *sectionOf(int list) noexcept {
  return list == ZELO_AUTOPOWER_ON || list == ZELO_AUTOPOWER_OFF ? kSections[list] : nullptr;
}

// One byte of an entry: where it lies, and the largest value that it may have.
struct Field {
  unsigned char ZELO_AUTOPOWER::*at;
  unsigned char most;
};
constexpr Field kFields[] = {
    {&ZELO_AUTOPOWER::enabled, 1},
    {&ZELO_AUTOPOWER::weekdays, 127},
    {&ZELO_AUTOPOWER::hour, 23},
    {&ZELO_AUTOPOWER::minute, 59},
};

bool isInRange(const ZELO_AUTOPOWER &entry) noexcept {
  return std::all_of(std::begin(kFields), std::end(kFields),
                     [&](const Field &field) { return entry.*field.at <= field.most; });
}

// ---- the text of a list ----

void skipBlanks(std::string_view *text) noexcept {
  while (!text->empty() && (text->front() == ' ' || text->front() == '\t')) {
    text->remove_prefix(1);
  }
}

bool takeByte(std::string_view *text, unsigned char *byte) noexcept {
  skipBlanks(text);
  const auto [end, error] = std::from_chars(text->data(), text->data() + text->size(), *byte);
  if (error != std::errc()) {
    return false;
  }
  text->remove_prefix(static_cast<size_t>(end - text->data()));
  return text->empty() || text->front() == ' ' || text->front() == '\t' || text->front() == ';';
}

bool takeEntry(std::string_view *text, ZELO_AUTOPOWER *entry) noexcept {
  for (const Field &field : kFields) {
    if (!takeByte(text, &(entry->*field.at))) {
      return false;
    }
  }
  return isInRange(*entry);
}

bool parse(std::string_view text, std::vector<ZELO_AUTOPOWER> *entries) {
  skipBlanks(&text);
  while (!text.empty()) {
    ZELO_AUTOPOWER entry{};
    if (!takeEntry(&text, &entry)) {
      return false;
    }
    entries->push_back(entry);
    skipBlanks(&text);
    if (!text.empty()) {
      if (text.front() != ';') {
        return false;
      }
      text.remove_prefix(1);
      skipBlanks(&text);
    }
  }
  return true;
}

std::string written(const ZELO_AUTOPOWER *entries, int count) {
  std::string text;
  for (int i = 0; i < count; ++i) {
    text += i == 0 ? "" : "; ";
    for (const Field &field : kFields) {
      text += field.at == kFields[0].at ? "" : " ";
      text += std::to_string(entries[i].*field.at);
    }
  }
  return text;
}

// ---- the file ----

int writePowerList(const char *section, const std::string &times) {
  Hash hash;
  if (!hash.valid() || QLIBCSzHashSetValue(hash.address(), kTimesKey, times.c_str()) < 0) {
    return -1;
  }
  const int set = QLIBCFileExist(kFile) == 0
                      ? 0
                      : QLIBCFileSetSection(kFile, section, QLIBC_FILE_SYNC, hash.get(), 0);
  if (set != 0) {
    return set < 0 ? -1 : 0;
  }
  return QLIBCFileAddSection(kFile, section, hash.get(), QLIBC_FILE_SYNC) < 0 ? -1 : 0;
}

}  // namespace

int readPowerList(int list, std::vector<ZELO_AUTOPOWER> *entries) {
  if (QLIBCFileExist(kFile) == 0) {
    return 0;
  }
  Hash hash;
  if (!hash.valid()) {
    return -1;
  }
  const int read = QLIBCFileGetSection(kFile, sectionOf(list), hash.address());
  if (read < 0) {
    return -1;
  }
  if (read == 0) {
    return 0;
  }
  // A section that this library wrote has the key, also for an empty list. Without it the file was
  // damaged: reading it as empty would let the next change overwrite its times.
  const char *times = QLIBCSzHashGetValue(hash.get(), kTimesKey);
  return times != nullptr && parse(times, entries) ? 0 : fail(kMalformed);
}

}  // namespace zelo

int ZELOAutoPowerConfGet(int list, int capacity, ZELO_AUTOPOWER *pEntries) {
  if (zelo::sectionOf(list) == nullptr || capacity < 0 || pEntries == nullptr) {
    return zelo::fail(QLIBC_ERR_BAD_PARAMETER);
  }
  return zelo::atBoundary(-1, [&] {
    std::vector<ZELO_AUTOPOWER> entries;
    if (zelo::readPowerList(list, &entries) < 0) {
      return -1;
    }
    const int count = static_cast<int>(std::min(entries.size(), static_cast<size_t>(capacity)));
    std::copy_n(entries.begin(), count, pEntries);
    return count;
  });
}

// The scheduler library reads as many; it would not see one more.
constexpr int kMostEntries = 100;

int ZELOAutoPowerConfSet(int list, int count, const ZELO_AUTOPOWER *pEntries) {
  if (zelo::sectionOf(list) == nullptr || count < 0 || count > kMostEntries ||
      (pEntries == nullptr && count > 0) ||
      !std::all_of(pEntries, pEntries + count, zelo::isInRange)) {
    return zelo::fail(QLIBC_ERR_BAD_PARAMETER);
  }
  return zelo::atBoundary(-1, [&] {
    return zelo::writePowerList(zelo::sectionOf(list), zelo::written(pEntries, count));
  });
}
