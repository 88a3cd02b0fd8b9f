// Listing, of a file that the process has not read yet: beside GLib's reader of such files, and
// beside what no reader can do without, the file's bytes and the records' memory.
#include <glib.h>
#include <sys/mman.h>
#include <zelosched.h>

#include <cstddef>
#include <string>

#include "support/row.h"
#include "support/stored_tasks.h"

namespace {

void readGroup(GKeyFile *file, const char *group) {
  gsize count = 0;
  gchar **keys = g_key_file_get_keys(file, group, &count, nullptr);
  for (gsize i = 0; i < count; ++i) {
    g_free(g_key_file_get_value(file, group, keys[i], nullptr));
  }
  g_strfreev(keys);
}

void readKeyFile() {
  GKeyFile *file = g_key_file_new();
  orDie(g_key_file_load_from_file(file, kStore, G_KEY_FILE_NONE, nullptr) != FALSE,
        "g_key_file_load_from_file");
  gsize count = 0;
  gchar **groups = g_key_file_get_groups(file, &count);
  for (gsize i = 0; i < count; ++i) {
    readGroup(file, groups[i]);
  }
  g_strfreev(groups);
  g_key_file_free(file);
}

// A byte of every text, and the numbers: what a list has to write of a record.
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

// Zeroed by the kernel, in the pages that cost least where there are enough of them.
void readAndTouch(int count) {
  readStore();
  const size_t size = static_cast<size_t>(count) * sizeof(ZELO_SCHED_TASK);
  void *records = mmap(nullptr, size, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
  orDie(records != MAP_FAILED, "mmap");
  madvise(records, size, MADV_HUGEPAGE);
  for (int i = 0; i < count; ++i) {
    touch(static_cast<ZELO_SCHED_TASK *>(records) + i);
  }
  munmap(records, size);
}

std::string tasks(int count) {
  return std::to_string(count) + " tasks";
}

Row compareListing(int count) {
  const auto setUp = [count] { fillStore(count); };
  return Row("ZELOSchedTaskListGet, " + tasks(count), Work{list, setUp, forgetStore})
      .atMost(0.5, "GKeyFile: load, get every key, " + tasks(count),
              Work{readKeyFile, setUp, forgetStore})
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
