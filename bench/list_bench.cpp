// Listing, of a file that the process has not read yet: beside GLib's reader of such files, and
// beside what no reader can do without, the file's bytes and the records' memory.
#include <glib.h>
#include <sys/mman.h>
#include <zelosched.h>

#include <cstddef>
#include <cstdint>
#include <string>

#include "support/row.h"
#include "support/stored_tasks.h"

namespace {

constexpr size_t kHugePage = size_t{2} << 20;

// The number of its keys.
gsize readGroup(GKeyFile *file, const char *group) {
  gsize count = 0;
  gchar **keys = g_key_file_get_keys(file, group, &count, nullptr);
  orDie(count > 0, "g_key_file_get_keys");
  for (gsize i = 0; i < count; ++i) {
    gchar *value = g_key_file_get_value(file, group, keys[i], nullptr);
    orDie(value != nullptr, "g_key_file_get_value");
    g_free(value);
  }
  g_strfreev(keys);
  return count;
}

void readKeyFile(gsize expected) {
  GKeyFile *file = g_key_file_new();
  orDie(g_key_file_load_from_file(file, kStore, G_KEY_FILE_NONE, nullptr) != FALSE,
        "g_key_file_load_from_file");
  gsize count = 0;
  gchar **groups = g_key_file_get_groups(file, &count);
  orDie(count == expected, "g_key_file_get_groups");
  const gsize keys = readGroup(file, groups[0]);
  for (gsize i = 1; i < count; ++i) {
    orDie(readGroup(file, groups[i]) == keys, "as many keys of each task");
  }
  g_strfreev(groups);
  g_key_file_free(file);
}

// A byte of every text: the numbers lie in the same pages.
void touch(ZELO_SCHED_TASK *task) {
  constexpr size_t kTexts[] = {
      offsetof(ZELO_SCHED_TASK, Name),       offsetof(ZELO_SCHED_TASK, NextTriggerTime),
      offsetof(ZELO_SCHED_TASK, EditDialog), offsetof(ZELO_SCHED_TASK, EditForm),
      offsetof(ZELO_SCHED_TASK, App),        offsetof(ZELO_SCHED_TASK, AppName),
      offsetof(ZELO_SCHED_TASK, AppArgs),    offsetof(ZELO_SCHED_TASK, Action),
      offsetof(ZELO_SCHED_TASK, Command),
  };
  for (const size_t text : kTexts) {
    reinterpret_cast<volatile char *>(task)[text] = 'x';
  }
}

size_t inHugePages(size_t size) {
  return (size + kHugePage - 1) / kHugePage * kHugePage;
}

// Zeroed by the kernel, in huge pages wherever the mapping begins.
void readAndTouch(int count) {
  readStore();
  const size_t size = inHugePages(static_cast<size_t>(count) * sizeof(ZELO_SCHED_TASK)) + kHugePage;
  void *memory = mmap(nullptr, size, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
  orDie(memory != MAP_FAILED, "mmap");
  madvise(memory, size, MADV_HUGEPAGE);
  const size_t begin = inHugePages(reinterpret_cast<uintptr_t>(memory));
  for (int i = 0; i < count; ++i) {
    touch(reinterpret_cast<ZELO_SCHED_TASK *>(begin) + i);
  }
  munmap(memory, size);
}

std::string tasks(int count) {
  return std::to_string(count) + " tasks";
}

Row compareListing(int count) {
  const auto setUp = [count] { fillStore(count); };
  return Row("ZELOSchedTaskListGet, " + tasks(count),
             Work{[count] { list(count); }, setUp, forgetStore})
      .atMost(0.5, "GKeyFile: load, get every key, " + tasks(count),
              Work{[count] { readKeyFile(static_cast<gsize>(count)); }, setUp, forgetStore})
      .atMost(3, "read, zero and touch the records, " + tasks(count),
              Work{[count] { readAndTouch(count); }, setUp, forgetStore});
}

}  // namespace

void makeRows() {
  compareListing(10);
  compareListing(100);
  compareListing(1000);
  // Ten times, and a little for what no longer fits into the processor's caches.
  compareListing(10000).atMost(12, "ZELOSchedTaskListGet, 1000 tasks");
}
