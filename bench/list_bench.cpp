// Listing a file that the process has not read yet, compared with GLib's reader of such files.
#include <glib.h>
#include <zelosched.h>

#include <string>

#include "support/row.h"
#include "support/stored_tasks.h"

namespace {

// Returns the number of its keys.
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

std::string tasks(int count) {
  return std::to_string(count) + " tasks";
}

Row compareListing(int count, double most) {
  const auto setUp = [count] { fillStore(count); };
  return Row("ZELOSchedTaskListGet, " + tasks(count),
             Work{[count] { list(count); }, setUp, forgetStore})
      .atMost(most, "GKeyFile: load, get every key, " + tasks(count),
              Work{[count] { readKeyFile(static_cast<gsize>(count)); }, setUp, forgetStore});
}

}  // namespace

void makeRows() {
  compareListing(10, 0.5);
  compareListing(100, 0.7);
  compareListing(1000, 0.8);
  // Ten times, and some for what no longer fits into the processor's caches.
  compareListing(10000, 0.8).atMost(12, "ZELOSchedTaskListGet, 1000 tasks");
}
