/*
 * take_root_back - tries every way back to root and root's groups. Prints a line
 * for each that worked, and exits with 0 when none did.
 */
#include <grp.h>
#include <stdio.h>
#include <sys/types.h>
#include <unistd.h>

enum { ROOT = 0, ALL_GROUPS = 1024 };

static int holds_root(void) {
  uid_t real = 1;
  uid_t effective = 1;
  uid_t saved = 1;
  gid_t real_group = 1;
  gid_t effective_group = 1;
  gid_t saved_group = 1;
  gid_t groups[ALL_GROUPS];
  const int count = getgroups(ALL_GROUPS, groups);
  if (getresuid(&real, &effective, &saved) != 0 ||
      getresgid(&real_group, &effective_group, &saved_group) != 0 || count < 0) {
    return 1;
  }
  for (int i = 0; i < count; i++) {
    if (groups[i] == ROOT) return 1;
  }
  return real == ROOT || effective == ROOT || saved == ROOT || real_group == ROOT ||
         effective_group == ROOT || saved_group == ROOT;
}

static int failed(const char *what, int result) {
  if (result != 0 && !holds_root()) return 0;
  printf("%s worked\n", what);
  return 1;
}

int main(void) {
  const gid_t root_group[] = {ROOT};
  const uid_t keep = (uid_t)-1;
  const gid_t keep_group = (gid_t)-1;
  int worked = 0;
  if (holds_root()) {
    printf("root from the start\n");
    worked = 1;
  }
  worked |= failed("setuid", setuid(ROOT));
  worked |= failed("seteuid", seteuid(ROOT));
  worked |= failed("setreuid", setreuid(ROOT, ROOT));
  worked |= failed("setreuid of the real id", setreuid(ROOT, keep));
  worked |= failed("setresuid", setresuid(ROOT, ROOT, ROOT));
  worked |= failed("setresuid of the saved id", setresuid(keep, keep, ROOT));
  worked |= failed("setgid", setgid(ROOT));
  worked |= failed("setegid", setegid(ROOT));
  worked |= failed("setregid", setregid(ROOT, ROOT));
  worked |= failed("setresgid", setresgid(ROOT, ROOT, ROOT));
  worked |= failed("setresgid of the saved id", setresgid(keep_group, keep_group, ROOT));
  worked |= failed("setgroups", setgroups(1, root_group));
  worked |= failed("initgroups", initgroups("root", ROOT));
  return worked;
}
