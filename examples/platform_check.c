/*
 * platform_check [--system [PLUGINS]] - calls each function of the platform that the
 * scheduler library calls, and says which contract does not hold.
 *
 *   platform_check              in a directory of its own below /tmp; nothing else is
 *                               changed, whatever the platform does of what it should not
 *   platform_check --system     as root, where nothing can be harmed, for it changes what
 *                               a machine has once: power times, the alarm of its clock, the
 *                               crontab. They are put back, also after a crash.
 *   platform_check --system /usr/zelo/libexec/plugins/platform_check.d
 *                               puts a plugin into that directory too, where this platform
 *                               looks for those of "platform_check"
 *
 * Prints one line for each contract, "ok CALL: contract" or "not ok CALL: contract".
 * What crashes, hangs or exits in the calls of a group is named, and the next group goes on.
 * 0 when all hold, 1 when one does not, 2 for a wrong call.
 *
 *   cc platform_check.c -I/opt/appliance/include -L/opt/appliance/lib -lzelosdk -lzelocore \
 *     -Wl,-rpath,/opt/appliance/lib -o platform_check
 */
#include <dirent.h>
#include <errno.h>
#include <fcntl.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <strings.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>
#include <zelocore.h>
#include <zelosdk.h>

/* A group that came to its end exits so: a status that no call of a platform has a reason for. */
enum { USAGE = 2, HELD = 87, FAILED = 88 };
enum { PATIENCE = 60, ROOM = 65536, CONTRACT_ROOM = 128, ENTRIES = 100, KEPT = 1000, GUARD = 0x5a };

/* What the groups, each a process of its own, leave to this one. */
static struct {
  char current[CONTRACT_ROOM]; /* the contract that is being checked */
  int counts[2];               /* the power times of before, -1 while nothing was changed */
  ZELO_AUTOPOWER times[2][KEPT];
} * shared;

static int failed;          /* contracts of this group */
static char directory[256]; /* of our own */
static char file[300];      /* in it */

static void contract(int holds) {
  printf("%s %s\n", holds ? "ok" : "not ok", shared->current);
  fflush(stdout);
  failed += !holds;
}

/* Noted before the call is made, in case it does not come back. */
#define CONTRACT(call, what, condition)                              \
  do {                                                               \
    snprintf(shared->current, CONTRACT_ROOM, "%s: %s", #call, what); \
    contract((condition) != 0);                                      \
  } while (0)

static int is(const char *text, const char *wanted) {
  return text != NULL && strcmp(text, wanted) == 0;
}

/* Whether a call failed, and with that code. */
static int fails(int result, int code) {
  return result == -1 && QLIBCErrGet() == code;
}

static void no_error(void) {
  QLIBCErrSetEx(0, "", 0);
}

static void write_text(const char *path, const char *text) {
  FILE *stream = fopen(path, "we");
  if (stream == NULL || fputs(text, stream) < 0 || fclose(stream) != 0) {
    perror(path);
    exit(USAGE);
  }
}

/* Whether bytes that no call may write to are as they were set. */
static int untouched(const void *bytes, size_t count) {
  size_t i = 0;
  while (i < count && ((const unsigned char *)bytes)[i] == GUARD) ++i;
  return i == count;
}

static const char *read_text(const char *path) {
  static char text[ROOM];
  FILE *stream = fopen(path, "re");
  size_t count = 0;
  if (stream == NULL) return "";
  count = fread(text, 1, sizeof text - 1, stream);
  fclose(stream);
  text[count] = '\0';
  return text;
}

/* ---- the error record ------------------------------------------------------------- */

static void check_error_record(void) {
  char name[] = "a.c";
  CONTRACT(QLIBCErrGet, "0 at start", QLIBCErrGet() == 0);
  CONTRACT(QLIBCErrorGetFile, "empty at start", is(QLIBCErrorGetFile(), ""));
  CONTRACT(QLIBCErrorGetLine, "0 at start", QLIBCErrorGetLine() == 0);
  QLIBCErrSetEx(0x2A00, name, 77);
  name[0] = 'b';
  CONTRACT(QLIBCErrGet, "the code last set", QLIBCErrGet() == 0x2A00);
  CONTRACT(QLIBCErrorGetFile, "a copy of the file last set", is(QLIBCErrorGetFile(), "a.c"));
  CONTRACT(QLIBCErrorGetLine, "the line last set", QLIBCErrorGetLine() == 77);
  QLIBCErrSetEx(1, NULL, 1);
  CONTRACT(QLIBCErrSetEx, "no file counts as an empty one", is(QLIBCErrorGetFile(), ""));
}

/* ---- hashes and lists --------------------------------------------------------------- */

static void check_hashes(void) {
  char key[16] = "key";
  char value[] = "value";
  int i = 0;
  int found = 0;
  PSZLIST keys = QLIBCSzListAlloc(1);
  PSZHASH hash = QLIBCSzHashAlloc(-1);
  CONTRACT(QLIBCSzHashAlloc, "an empty hash, whatever the capacity",
           hash != NULL && QLIBCSzHashGetValue(hash, "key") == NULL);
  no_error();
  CONTRACT(QLIBCSzHashSetValue, "0", QLIBCSzHashSetValue(&hash, key, value) == 0);
  CONTRACT(QLIBCSzHashSetValue, "a success leaves the error record alone", QLIBCErrGet() == 0);
  key[0] = value[0] = 'x';
  CONTRACT(QLIBCSzHashSetValue, "key and value are copied",
           is(QLIBCSzHashGetValue(hash, "key"), "value"));
  CONTRACT(QLIBCSzHashSetValue, "a value is replaced",
           QLIBCSzHashSetValue(&hash, "key", "") == 0 && is(QLIBCSzHashGetValue(hash, "key"), ""));
  CONTRACT(
      QLIBCSzHashSetValue, "keys differ in case",
      QLIBCSzHashSetValue(&hash, "KEY", "other") == 0 && is(QLIBCSzHashGetValue(hash, "key"), ""));
  CONTRACT(QLIBCSzHashSetValue, "null is refused",
           fails(QLIBCSzHashSetValue(&hash, NULL, ""), 0x0D00));
  no_error();
  CONTRACT(QLIBCSzHashGetValue, "null for a key that is not there, which is no error",
           QLIBCSzHashGetValue(hash, "none") == NULL && QLIBCErrGet() == 0);
  for (i = 0; i < 1000; ++i) {
    snprintf(key, sizeof key, "key %d", i);
    QLIBCSzHashSetValue(&hash, key, key);
  }
  for (i = 0; i < 1000; ++i) {
    snprintf(key, sizeof key, "key %d", i);
    found += is(QLIBCSzHashGetValue(hash, key), key);
  }
  CONTRACT(QLIBCSzHashSetValue, "the hash grows", found == 1000);
  CONTRACT(QLIBCSzHashEnumKey, "every key once, and how many",
           QLIBCSzHashEnumKey(hash, &keys) == 1002 && QLIBCSzListCount(keys) == 1002);
  QLIBCHashRemoveAll(NULL);
  QLIBCHashRemoveAll(hash);
  CONTRACT(QLIBCHashRemoveAll, "no entry is left",
           QLIBCSzHashGetValue(hash, "key") == NULL && QLIBCSzHashEnumKey(hash, &keys) == 0);
  CONTRACT(QLIBCHashRemoveAll, "the hash can be filled again",
           QLIBCSzHashSetValue(&hash, "a", "1") == 0 && is(QLIBCSzHashGetValue(hash, "a"), "1"));
  CONTRACT(QLIBCSzHashFree, "null is allowed", (QLIBCSzHashFree(hash), QLIBCSzHashFree(NULL), 1));
  QLIBCSzListFree(keys);
}

static void check_lists(void) {
  char text[] = "text";
  int i = 0;
  PSZLIST list = QLIBCSzListAlloc(-1);
  CONTRACT(QLIBCSzListAlloc, "an empty list, whatever the capacity",
           list != NULL && QLIBCSzListCount(list) == 0);
  CONTRACT(QLIBCSzListPush, "the number of texts then", QLIBCSzListPush(&list, text) == 1);
  text[0] = 'x';
  CONTRACT(QLIBCSzListPush, "the text is copied", is(QLIBCSzListGet(list, 0), "text"));
  for (i = 1; i < 1000; ++i) QLIBCSzListPush(&list, "more");
  CONTRACT(QLIBCSzListCount, "how many texts there are", QLIBCSzListCount(list) == 1000);
  CONTRACT(QLIBCSzListCount, "0 for null", QLIBCSzListCount(NULL) == 0);
  CONTRACT(QLIBCSzListGet, "the texts in their order",
           is(QLIBCSzListGet(list, 0), "text") && is(QLIBCSzListGet(list, 999), "more"));
  CONTRACT(QLIBCSzListGet, "null where there is none",
           QLIBCSzListGet(list, 1000) == NULL && QLIBCSzListGet(list, -1) == NULL);
  CONTRACT(QLIBCStrSep, "the pieces that are not empty, appended",
           QLIBCStrSep(",a,,b;c", ",;", &list) == 3 && is(QLIBCSzListGet(list, 1000), "a") &&
               is(QLIBCSzListGet(list, 1002), "c"));
  CONTRACT(QLIBCSzListFree, "null is allowed", (QLIBCSzListFree(list), QLIBCSzListFree(NULL), 1));
}

/* ---- section files --------------------------------------------------------------------- */

static PSZHASH hash_with(const char *key, const char *value) {
  PSZHASH hash = QLIBCSzHashAlloc(1);
  QLIBCSzHashSetValue(&hash, key, value);
  return hash;
}

/* The value of a key in the file. */
static const char *stored(const char *section, const char *key) {
  static char value[1024];
  PSZHASH hash = QLIBCSzHashAlloc(1);
  const char *found =
      QLIBCFileGetSection(file, section, &hash) == 1 ? QLIBCSzHashGetValue(hash, key) : NULL;
  snprintf(value, sizeof value, "%s", found != NULL ? found : "(none)");
  QLIBCSzHashFree(hash);
  return value;
}

/* The names of the sections, each with a blank after it. */
static const char *sections(void) {
  static char names[1024];
  PSZLIST list = QLIBCSzListAlloc(1);
  const int count = QLIBCFileEnumSection(file, &list);
  int i = 0;
  names[0] = '\0';
  for (i = 0; i < count; ++i) {
    const size_t length = strlen(names);
    snprintf(names + length, sizeof names - length, "%s ", QLIBCSzListGet(list, i));
  }
  QLIBCSzListFree(list);
  return count < 0 ? "(failed)" : names;
}

static void check_reading(void) {
  PSZHASH hash = hash_with("kept", "kept");
  PSZHASH one = hash_with("key", "one");
  PSZHASH two = hash_with("key", "two");
  PSZLIST list = QLIBCSzListAlloc(1);
  char other[300];
  CONTRACT(QLIBCFileExist, "0 for what is not there", QLIBCFileExist(file) == 0);
  CONTRACT(QLIBCFileExist, "0 for null", QLIBCFileExist(NULL) == 0);
  CONTRACT(QLIBCFileEnumSection, "a file that is not there is told",
           fails(QLIBCFileEnumSection(file, &list), 0x0900));
  CONTRACT(QLIBCFileGetSection, "a file that is not there is told",
           fails(QLIBCFileGetSection(file, "1", &hash), 0x0900));
  CONTRACT(QLIBCFileTouch, "an empty file is made",
           QLIBCFileTouch(file) == 0 && access(file, F_OK) == 0 && *read_text(file) == '\0');
  CONTRACT(QLIBCFileExist, "1 for what is there", QLIBCFileExist(file) == 1);
  write_text(file, "any text\n");
  CONTRACT(QLIBCFileTouch, "a file that is there keeps what is in it",
           QLIBCFileTouch(file) == 0 && is(read_text(file), "any text\n"));
  unlink(file);
  QLIBCFileAddSection(file, "2", two, 0);
  QLIBCFileAddSection(file, "1", one, 0);
  CONTRACT(QLIBCFileEnumSection, "the names in the order of the file", is(sections(), "2 1 "));
  CONTRACT(QLIBCFileGetSection, "1 when the section was read",
           QLIBCFileGetSection(file, "2", &hash) == 1);
  CONTRACT(QLIBCFileGetSection, "its values",
           is(stored("2", "key"), "two") && is(stored("1", "key"), "one"));
  CONTRACT(QLIBCFileGetSection, "keys that the hash has already stay",
           is(QLIBCSzHashGetValue(hash, "kept"), "kept"));
  CONTRACT(QLIBCFileGetSection, "0 when there is no such section",
           QLIBCFileGetSection(file, "3", &hash) == 0);
  snprintf(other, sizeof other, "%s/other", directory);
  CONTRACT(
      QLIBCFileTouch, "a symbolic link is not followed",
      symlink(file, other) == 0 && (unlink(file), QLIBCFileTouch(other), access(file, F_OK) != 0));
  unlink(other);
  CONTRACT(QLIBCFileExist, "1 for what cannot be told",
           symlink(other, other) == 0 && QLIBCFileExist(other) == 1);
  unlink(other);
  QLIBCSzHashFree(hash);
  QLIBCSzHashFree(one);
  QLIBCSzHashFree(two);
  QLIBCSzListFree(list);
}

static void check_changing(void) {
  char bytes[256];
  struct stat before;
  struct stat after;
  int i = 0;
  PSZHASH one = hash_with("key", "one");
  PSZHASH two = hash_with("other", "two");
  for (i = 1; i < 256; ++i) bytes[i - 1] = (char)i;
  bytes[255] = '\0';
  unlink(file);
  CONTRACT(
      QLIBCFileAddSection, "1, and the file is made",
      QLIBCFileAddSection(file, "1", one, QLIBC_FILE_SYNC) == 1 && is(stored("1", "key"), "one"));
  CONTRACT(QLIBCFileAddSection, "a section that is there is refused",
           fails(QLIBCFileAddSection(file, "1", two, 0), 0x0D00) && is(stored("1", "key"), "one"));
  QLIBCSzHashSetValue(&two, "bytes", bytes);
  QLIBCFileAddSection(file, "2", two, 0);
  CONTRACT(QLIBCFileAddSection, "every byte but zero reads back", is(stored("2", "bytes"), bytes));
  CONTRACT(QLIBCFileAddSection, "the other sections stay",
           is(sections(), "1 2 ") && is(stored("1", "key"), "one"));

  chmod(file, 0640);
  stat(file, &before);
  CONTRACT(QLIBCFileSetSection, "1 when it was replaced",
           QLIBCFileSetSection(file, "1", 0, two, 0) == 1);
  stat(file, &after);
  CONTRACT(QLIBCFileSetSection, "no key of before is left",
           is(stored("1", "other"), "two") && is(stored("1", "key"), "(none)"));
  CONTRACT(QLIBCFileSetSection, "the order stays", is(sections(), "1 2 "));
  CONTRACT(QLIBCFileSetSection, "the other sections keep what they hold",
           is(stored("2", "other"), "two") && is(stored("2", "bytes"), bytes));
  CONTRACT(QLIBCFileSetSection, "the file is replaced as a whole", before.st_ino != after.st_ino);
  CONTRACT(QLIBCFileSetSection, "the mode stays", (after.st_mode & 07777) == 0640);
  CONTRACT(QLIBCFileSetSection, "0 when there is no such section, and nothing is written",
           QLIBCFileSetSection(file, "3", 0, one, 0) == 0 && is(sections(), "1 2 "));

  CONTRACT(QLIBCFileRemoveSection, "1 when it was removed", QLIBCFileRemoveSection(file, "1") == 1);
  CONTRACT(QLIBCFileRemoveSection, "that section and no other is gone", is(sections(), "2 "));
  CONTRACT(QLIBCFileRemoveSection, "the other sections keep what they hold",
           is(stored("2", "other"), "two") && is(stored("2", "bytes"), bytes));
  CONTRACT(QLIBCFileRemoveSection, "0 when there is none", QLIBCFileRemoveSection(file, "1") == 0);

  /* As a copy is whose writer was killed. */
  stat(file, &after);
  if (truncate(file, after.st_size * 2 / 3) != 0) perror(file);
  CONTRACT(QLIBCFileEnumSection, "a file that is cut off is told",
           is(sections(), "(failed)") && QLIBCErrGet() == 0x0B00);
  CONTRACT(QLIBCFileAddSection, "a file that is cut off is not built on",
           fails(QLIBCFileAddSection(file, "9", one, 0), 0x0B00));
  unlink(file);
  QLIBCSzHashFree(one);
  QLIBCSzHashFree(two);
}

/* Half of a file, the rest of which comes a moment later. */
static void check_copied(void) {
  PSZHASH hash = hash_with("key", "value");
  char *text = NULL;
  struct stat whole;
  pid_t copier = 0;
  unlink(file);
  QLIBCFileAddSection(file, "1", hash, 0);
  QLIBCFileAddSection(file, "copied", hash, 0);
  QLIBCSzHashFree(hash);
  stat(file, &whole);
  text = strdup(read_text(file));
  if (truncate(file, whole.st_size / 2) != 0) perror(file);
  copier = fork();
  if (copier == 0) {
    usleep(10000);
    write_text(file, text);
    _exit(0);
  }
  CONTRACT(QLIBCFileEnumSection, "a file that is being copied is waited for",
           is(sections(), "1 copied "));
  waitpid(copier, NULL, 0);
  free(text);
  unlink(file);
}

/* Who changes a file through a link would change another one, or take the link away. */
static void check_links(void) {
  PSZHASH one = hash_with("key", "one");
  PSZHASH two = hash_with("key", "two");
  char link[300];
  char *before = NULL;
  snprintf(link, sizeof link, "%s/link", directory);
  QLIBCFileAddSection(file, "1", one, 0);
  before = strdup(read_text(file));
  if (symlink(file, link) != 0) perror(link);
  CONTRACT(QLIBCFileSetSection, "a symbolic link is refused",
           fails(QLIBCFileSetSection(link, "1", 0, two, 0), 0x0900) && is(read_text(file), before));
  CONTRACT(QLIBCFileAddSection, "a symbolic link is refused",
           fails(QLIBCFileAddSection(link, "2", two, 0), 0x0900) && is(read_text(file), before));
  CONTRACT(QLIBCFileRemoveSection, "a symbolic link is refused",
           fails(QLIBCFileRemoveSection(link, "1"), 0x0900) && is(read_text(file), before));
  CONTRACT(QLIBCFileSetLine, "a symbolic link is refused",
           fails(QLIBCFileSetLine(link, "1", NULL, 0), 0x0900) && is(read_text(file), before));
  free(before);
  unlink(link);
  unlink(file);
  QLIBCSzHashFree(one);
  QLIBCSzHashFree(two);
}

static void check_lines(void) {
  struct stat now;
  CONTRACT(QLIBCFileSetLine, "0 when there is nothing to remove",
           QLIBCFileSetLine(file, "key", NULL, 0) == 0);
  CONTRACT(QLIBCFileSetLine, "a value without a file is refused",
           fails(QLIBCFileSetLine(file, "key", "a line", 0), 0x0900) && access(file, F_OK) != 0);
  write_text(file, "first\nhas the key\nhas the key too\n");
  chmod(file, 0640);
  CONTRACT(QLIBCFileSetLine, "the first line with the key is replaced",
           QLIBCFileSetLine(file, "key", "new", 0) == 1 &&
               is(read_text(file), "first\nnew\nhas the key too\n"));
  CONTRACT(QLIBCFileSetLine, "where no line has it, one is appended",
           QLIBCFileSetLine(file, "none", "last", 0) == 1 &&
               is(read_text(file), "first\nnew\nhas the key too\nlast\n"));
  CONTRACT(
      QLIBCFileSetLine, "without a value the line is removed",
      QLIBCFileSetLine(file, "key", NULL, 0) == 1 && is(read_text(file), "first\nnew\nlast\n"));
  CONTRACT(QLIBCFileSetLine, "a value with a line feed is refused",
           fails(QLIBCFileSetLine(file, "new", "a\nb", 0), 0x0D00) &&
               is(read_text(file), "first\nnew\nlast\n"));
  CONTRACT(QLIBCFileSetLine, "the mode stays",
           stat(file, &now) == 0 && (now.st_mode & 07777) == 0640);
  unlink(file);
}

/* ---- processes -------------------------------------------------------------------------- */

static void check_processes(void) {
  char path[300];
  int status = 0;
  pid_t child = 0;
  snprintf(path, sizeof path, "%s/by_child", directory);
  CONTRACT(QLIBCExec, "the exit status", QLIBCExec("/bin/sh", "-c", "exit 7", NULL) == 7);
  CONTRACT(QLIBCExec, "arguments arrive as they are",
           QLIBCExec("/bin/sh", "-c", "test \"$1\" = 'a  $b'", "sh", "a  $b", NULL) == 0);
  CONTRACT(QLIBCExec, "not 0 for what a signal ended",
           QLIBCExec("/bin/sh", "-c", "kill -9 $$", NULL) != 0);
  CONTRACT(QLIBCExec, "-1 when the program cannot be started",
           fails(QLIBCExec("/nonexistent", NULL), 0x2A00));
  signal(SIGCHLD, SIG_IGN);
  CONTRACT(QLIBCExec, "the exit status for a caller who ignores his children",
           QLIBCExec("/bin/sh", "-c", "exit 7", NULL) == 7);
  signal(SIGCHLD, SIG_DFL);
  status = QLIBCProcForkChildNoWait();
  if (status == 0) {
    close(open(path, O_CREAT | O_WRONLY | O_CLOEXEC, 0600));
    _exit(0);
  }
  CONTRACT(QLIBCProcForkChildNoWait, "1 for the caller", status == 1);
  for (status = 0; status < 1000 && access(path, F_OK) != 0; ++status) usleep(10000);
  CONTRACT(QLIBCProcForkChildNoWait, "0 for the child, which runs", access(path, F_OK) == 0);
  CONTRACT(QLIBCProcForkChildNoWait, "there is no child to wait for",
           waitpid(-1, NULL, WNOHANG) == -1 && errno == ECHILD);
  unlink(path);
  CONTRACT(QLIBCProcAlive, "1 for this process", QLIBCProcAlive(getpid()) == 1);
  child = fork();
  if (child == 0) _exit(0);
  waitid(P_PID, (id_t)child, NULL, WEXITED | WNOWAIT);
  CONTRACT(QLIBCProcAlive, "0 for one that nobody has waited for yet", QLIBCProcAlive(child) == 0);
  waitpid(child, NULL, 0);
  CONTRACT(QLIBCProcAlive, "0 for one that is gone", QLIBCProcAlive(child) == 0);
}

/* ---- plugins ------------------------------------------------------------------------------ */

static void check_plugins(void) {
  void *context[4] = {NULL, NULL, NULL, NULL};
  memset(&context[3], GUARD, sizeof context[3]);
  CONTRACT(QLIBPluginInit, "0, and the first word is not null",
           QLIBPluginInit("platform_check", "task_edit", context) == 0 && context[0] != NULL);
  CONTRACT(QLIBPluginSetArg, "0", QLIBPluginSetArg(context, "NAME", "a text") == 0);
  CONTRACT(QLIBPluginSetArgByInt, "0", QLIBPluginSetArgByInt(context, "RESULT", -1) == 0);
  CONTRACT(QLIBPluginSetArgByInt, "an argument can be set again",
           QLIBPluginSetArgByInt(context, "RESULT", 0) == 0);
  CONTRACT(QLIBPluginAction, "0 without plugins", QLIBPluginAction(QLIBPLUGIN_PRE, context) == 0);
  CONTRACT(QLIBPluginExit, "0, and the first word is null",
           QLIBPluginExit(context) == 0 && context[0] == NULL);
  CONTRACT(QLIBPluginInit, "the context is three words", untouched(&context[3], sizeof context[3]));
}

/* ---- users and Base64 ------------------------------------------------------------------------ */

static void check_users(void) {
  PZELOUSER user = NULL;
  PZELOUSER none = NULL;
  CONTRACT(ZELOUserGetByUID, "0, and the user", ZELOUserGetByUID(0, &user) == 0 && user != NULL);
  CONTRACT(ZELOUserGetByUID, "his name, id, home directory and shell",
           user != NULL && user->szName != NULL && user->szName[0] != '\0' && user->uid == 0 &&
               user->szHome != NULL && user->szHome[0] == '/' && user->szShell != NULL);
  CONTRACT(ZELOUserGetByUID, "a user who is not there is told",
           fails(ZELOUserGetByUID(0x7ffffffd, &none), 0x2000) && none == NULL);
  CONTRACT(ZELOUserGetByUID, "the highest id is one of a user",
           fails(ZELOUserGetByUID(4294967294U, &none), 0x2000) && none == NULL);
  CONTRACT(ZELOUserFree, "null is allowed", (ZELOUserFree(user), ZELOUserFree(NULL), 1));
}

static void check_base64(void) {
  char bytes[256];
  char text[400];
  char back[256];
  size_t size = sizeof back;
  int i = 0;
  for (i = 0; i < 256; ++i) bytes[i] = (char)i;
  CONTRACT(SzBase64EncodeFull, "1, and a text that ends with a zero byte",
           SzBase64EncodeFull("a b?", 4, text, sizeof text, 1) == 1 && is(text, "YSBiPw=="));
  memset(text, GUARD, sizeof text);
  CONTRACT(SzBase64EncodeFull, "nothing is written behind the room",
           SzBase64EncodeFull("a b?", 4, text, 9, 1) == 1 && untouched(text + 9, sizeof text - 9) &&
               (SzBase64EncodeFull("a b?", 4, text, 8, 1), untouched(text + 9, sizeof text - 9)));
  CONTRACT(SzBase64EncodeFull, "an empty source is an empty text",
           SzBase64EncodeFull("", 0, text, sizeof text, 1) == 1 && is(text, ""));
  CONTRACT(SzBase64EncodeFull, "0 where there is no room",
           SzBase64EncodeFull("a b?", 4, text, 8, 1) == 0);
  CONTRACT(SzBase64EncodeFull, "one line, however long",
           SzBase64EncodeFull(bytes, 256, text, sizeof text, 1) == 1 && strlen(text) == 344 &&
               strchr(text, '\n') == NULL);
  CONTRACT(ZELOEncodingBase64Decode, "1, and every byte",
           ZELOEncodingBase64Decode(text, strlen(text), back, &size) == 1 && size == 256 &&
               memcmp(back, bytes, 256) == 0);
  size = 255;
  CONTRACT(ZELOEncodingBase64Decode, "0 where there is no room",
           ZELOEncodingBase64Decode(text, strlen(text), back, &size) == 0);
  size = sizeof back;
  CONTRACT(ZELOEncodingBase64Decode, "white space is passed over",
           ZELOEncodingBase64Decode("YSBi\nPw==", 9, back, &size) == 1 && size == 4);
  size = sizeof back;
  CONTRACT(ZELOEncodingBase64Decode, "a text that ends within a group is the whole bytes of it",
           ZELOEncodingBase64Decode("YSBiPw", 6, back, &size) == 1 && size == 4 &&
               memcmp(back, "a b?", 4) == 0);
  size = 4;
  memset(back, GUARD, sizeof back);
  CONTRACT(ZELOEncodingBase64Decode, "nothing is written behind the room",
           ZELOEncodingBase64Decode("YSBiPw==", 8, back, &size) == 1 &&
               untouched(back + 4, sizeof back - 4) &&
               (ZELOEncodingBase64Decode("YSBiP2EgYj8=", 12, back, &size),
                untouched(back + 4, sizeof back - 4)));
}

/* ---- --system: what a machine has once ---------------------------------------------------------
 */

/* Into what the next group finds, also when this one crashes. */
static void keep_power_times(void) {
  int got[2];
  int list = 0;
  for (list = 0; list < 2; ++list)
    got[list] = ZELOAutoPowerConfGet(list, KEPT, shared->times[list]);
  CONTRACT(ZELOAutoPowerConfGet, "the lists are read",
           got[0] >= 0 && got[0] < KEPT && got[1] >= 0 && got[1] < KEPT);
  if (failed > 0) return;
  CONTRACT(ZELOAutoPowerConfSet, "a list that was read is one that can be set",
           ZELOAutoPowerConfSet(0, got[0], shared->times[0]) == 0 &&
               ZELOAutoPowerConfSet(1, got[1], shared->times[1]) == 0);
  for (list = 0; failed == 0 && list < 2; ++list) shared->counts[list] = got[list];
}

static void put_back_power_times(void) {
  static ZELO_AUTOPOWER got[KEPT];
  int same = 1;
  int list = 0;
  for (list = 0; list < 2; ++list) {
    const int count = shared->counts[list];
    same = ZELOAutoPowerConfSet(list, count, shared->times[list]) == 0 && same;
    same = ZELOAutoPowerConfGet(list, KEPT, got) == count &&
           memcmp(got, shared->times[list], (size_t)count * sizeof *got) == 0 && same;
  }
  ZELOAutoPoweronSet();
  CONTRACT(ZELOAutoPowerConfSet, "the times of before are put back", same);
}

static void check_power_times(void) {
  const ZELO_AUTOPOWER times[] = {{1, 127, 7, 30}, {0, 1, 23, 59}};
  const ZELO_AUTOPOWER late = {1, 127, 24, 0};
  ZELO_AUTOPOWER many[ENTRIES];
  ZELO_AUTOPOWER got[ENTRIES];
  int i = 0;
  int result = 0;
  CONTRACT(ZELOAutoPowerConfSet, "0",
           ZELOAutoPowerConfSet(ZELO_AUTOPOWER_OFF, 1, times) == 0 &&
               ZELOAutoPowerConfSet(ZELO_AUTOPOWER_ON, 2, times) == 0);
  CONTRACT(ZELOAutoPowerConfGet, "what was set, and how many",
           ZELOAutoPowerConfGet(ZELO_AUTOPOWER_ON, 4, got) == 2 &&
               memcmp(got, times, sizeof times) == 0);
  CONTRACT(ZELOAutoPowerConfGet, "no more than there is room for",
           ZELOAutoPowerConfGet(ZELO_AUTOPOWER_ON, 1, got) == 1);
  memset(got, GUARD, sizeof got);
  ZELOAutoPowerConfGet(ZELO_AUTOPOWER_ON, 1, got);
  CONTRACT(ZELOAutoPowerConfGet, "nothing is written behind the room",
           untouched(got + 1, sizeof got - sizeof *got));
  CONTRACT(ZELOAutoPowerConfSet, "the other list stays",
           ZELOAutoPowerConfGet(ZELO_AUTOPOWER_OFF, 4, got) == 1 &&
               memcmp(got, times, sizeof *times) == 0);
  no_error();
  result = ZELOAutoPoweronSet();
  CONTRACT(ZELOAutoPoweronSet, "0 when a time is wanted, or why the machine cannot",
           result == 0 || (result == -1 && QLIBCErrGet() != 0));
  CONTRACT(ZELOAutoPowerConfGet, "a list that does not exist is refused",
           fails(ZELOAutoPowerConfGet(2, 1, got), 0x0D00));
  CONTRACT(ZELOAutoPowerConfSet, "a list that does not exist is refused",
           fails(ZELOAutoPowerConfSet(2, 0, NULL), 0x0D00));
  CONTRACT(ZELOAutoPowerConfSet, "an hour of 24 is refused",
           fails(ZELOAutoPowerConfSet(ZELO_AUTOPOWER_ON, 1, &late), 0x0D00));
  for (i = 0; i < ENTRIES; ++i) {
    many[i] = times[1];
    many[i].minute = (unsigned char)(i % 60);
  }
  CONTRACT(ZELOAutoPowerConfSet, "there is room for a hundred",
           ZELOAutoPowerConfSet(ZELO_AUTOPOWER_ON, ENTRIES, many) == 0 &&
               ZELOAutoPowerConfGet(ZELO_AUTOPOWER_ON, ENTRIES, got) == ENTRIES &&
               memcmp(got, many, sizeof many) == 0);
  ZELOAutoPowerConfSet(ZELO_AUTOPOWER_ON, 0, NULL);
  CONTRACT(ZELOAutoPowerConfSet, "a list can be emptied",
           ZELOAutoPowerConfGet(ZELO_AUTOPOWER_ON, 4, got) == 0);
  CONTRACT(ZELOAutoPoweronSet, "0 when no time is wanted", ZELOAutoPoweronSet() == 0);
}

static const char crontab[] = "/etc/crontab";
static struct stat crontab_was;
static char *crontab_before;

/* Of a file of any length; null without one. */
static char *whole_text(const char *path, struct stat *status) {
  FILE *stream = fopen(path, "re");
  char *text = NULL;
  if (stream == NULL) return NULL;
  if (fstat(fileno(stream), status) == 0 && S_ISREG(status->st_mode))
    text = calloc((size_t)status->st_size + 1, 1);
  if (text != NULL && fread(text, 1, (size_t)status->st_size, stream) != (size_t)status->st_size) {
    free(text);
    text = NULL;
  }
  fclose(stream);
  return text;
}

static int crontab_is_as_before(void) {
  struct stat status;
  char *text = whole_text(crontab, &status);
  const int same = text != NULL && status.st_mode == crontab_was.st_mode &&
                   status.st_uid == crontab_was.st_uid && status.st_gid == crontab_was.st_gid &&
                   status.st_size == crontab_was.st_size &&
                   memcmp(text, crontab_before, (size_t)status.st_size) == 0;
  free(text);
  return same;
}

/* As a whole, and without the platform. 0 or 1, the number of faults. */
static int put_back_crontab(void) {
  static const char next[] = "/etc/crontab.platform_check";
  int out = -1;
  if (crontab_is_as_before()) return 0;
  unlink(next);
  out = open(next, O_CREAT | O_EXCL | O_WRONLY | O_CLOEXEC, 0600);
  if (out < 0 || write(out, crontab_before, (size_t)crontab_was.st_size) != crontab_was.st_size ||
      fchown(out, crontab_was.st_uid, crontab_was.st_gid) != 0 ||
      fchmod(out, crontab_was.st_mode & 07777) != 0 || fsync(out) != 0 || close(out) != 0 ||
      rename(next, crontab) != 0) {
    printf("not ok %s could not be put back: %s\n", crontab, strerror(errno));
    return 1;
  }
  return 0;
}

/* How many lines there are behind the text of before; -1 when it is another one, or one of them has
 * not the command. */
static int lines_added(void) {
  const size_t length = (size_t)crontab_was.st_size;
  struct stat status;
  char *text = whole_text(crontab, &status);
  const char *line = NULL;
  int count = -1;
  if (text != NULL && (size_t)status.st_size >= length &&
      memcmp(text, crontab_before, length) == 0) {
    count = 0;
    for (line = strtok(text + length, "\n"); count >= 0 && line != NULL;
         line = strtok(NULL, "\n")) {
      count = strstr(line, ": platform_check") != NULL ? count + 1 : -1;
    }
  }
  free(text);
  return count;
}

/* The last line of the crontab: on Mondays, with any blanks, and the day's number or name. */
static int last_line_is(int minute, int hour) {
  struct stat status;
  char *text = whole_text(crontab, &status);
  int found[2] = {-1, -1};
  int length = 0;
  char day[4] = "";
  char *line = NULL;
  if (text == NULL) return 0;
  length = (int)strlen(text);
  if (length > 0 && text[length - 1] == '\n') text[length - 1] = '\0';
  line = strrchr(text, '\n') != NULL ? strrchr(text, '\n') + 1 : text;
  length = 0;
  sscanf(line, "%d %d * * %3[A-Za-z0-9] root : platform_check%n", &found[0], &found[1], day,
         &length);
  length = length > 0 && line[length] == '\0' && found[0] == minute && found[1] == hour &&
           (strcmp(day, "1") == 0 || strcasecmp(day, "mon") == 0);
  free(text);
  return length;
}

static void check_crontab(void) {
  ZELO_SCHEDULE schedule;
  struct stat is_now;
  int i = 0;
  memset(&schedule, 0, sizeof schedule);
  schedule.hour = 7;
  schedule.minute = 30;
  snprintf(schedule.szCommand, sizeof schedule.szCommand, ": platform_check");
  CONTRACT(ZELOScheduleSet, "no line without a weekday",
           ZELOScheduleSet(&schedule, 1) == 0 && crontab_is_as_before());
  schedule.weekdays = 127;
  schedule.hour = 24;
  CONTRACT(ZELOScheduleSet, "an hour of 24 is refused",
           fails(ZELOScheduleSet(&schedule, 1), 0x0D00) && crontab_is_as_before());
  schedule.weekdays = 2;
  schedule.hour = 7;
  CONTRACT(ZELOScheduleSet, "a line of the time that runs the command as root",
           ZELOScheduleSet(&schedule, 1) == 0 && last_line_is(30, 7));
  CONTRACT(ZELOScheduleSet, "every other line stays, and one is new", lines_added() == 1);
  CONTRACT(ZELOScheduleSet, "owner and mode stay",
           stat(crontab, &is_now) == 0 && crontab_was.st_mode == is_now.st_mode &&
               crontab_was.st_uid == is_now.st_uid);
  CONTRACT(ZELOUpdateCrontab, "0 when nothing is to be told",
           ZELOUpdateCrontab(": platform_check", 0, 0) == 0);
  CONTRACT(ZELOUpdateCrontab, "0 when cron is told, and when there is none",
           ZELOUpdateCrontab(": platform_check", 0, 1) == 0);
  QLIBCFileSetLine(crontab, ": platform_check", NULL, 0);
  CONTRACT(QLIBCFileSetLine, "the line goes from the crontab", lines_added() == 0);
  for (i = 0; i < ENTRIES; ++i) ZELOScheduleSet(&schedule, 1);
  CONTRACT(ZELOScheduleSet, "a line for each of a hundred calls", lines_added() == ENTRIES);
}

/* ---- --system PLUGINS: a plugin that is called
 * ---------------------------------------------------
 */

static char plugin[300]; /* none without a directory to put it into */
static char called[300];
static char failing[300];

static void check_called_plugins(void) {
  void *context[4] = {NULL, NULL, NULL, NULL};
  QLIBPluginInit("platform_check", "task_edit", context);
  QLIBPluginSetArg(context, "NAME", "a text");
  CONTRACT(QLIBPluginAction, "0 when every plugin succeeds",
           QLIBPluginAction(QLIBPLUGIN_PRE, context) == 0);
  CONTRACT(QLIBPluginAction, "a plugin is called", access(called, F_OK) == 0);
  write_text(failing, "");
  CONTRACT(QLIBPluginAction, "below 0 when one fails",
           QLIBPluginAction(QLIBPLUGIN_POST, context) < 0);
  QLIBPluginExit(context);
}

/* Makes each directory of the path that is not there, and what ends there says which. */
static size_t make_directories(char *path) {
  size_t there = 0;
  char *slash = path;
  for (;;) {
    slash = strchr(slash + 1, '/');
    if (slash != NULL) *slash = '\0';
    if (mkdir(path, 0755) != 0) there = strlen(path);
    if (slash == NULL) return there;
    *slash = '/';
  }
}

static void remove_directories(char *path, size_t there) {
  while (strlen(path) > there && rmdir(path) == 0) *strrchr(path, '/') = '\0';
}

/* ---- all of them
 * ---------------------------------------------------------------------------------
 */

/* Each group in a process of its own: one that crashes takes no other with it. The number of
 * faults. */
static int run(const char *name, void (*group)(void)) {
  int status = 0;
  pid_t child = 0;
  snprintf(shared->current, CONTRACT_ROOM, "%s: the first call", name);
  fflush(stdout);
  child = fork();
  if (child == 0) {
    signal(SIGINT, SIG_DFL);
    signal(SIGTERM, SIG_DFL);
    signal(SIGHUP, SIG_DFL);
    alarm(PATIENCE);
    group();
    fflush(stdout);
    _exit(failed > 0 ? FAILED : HELD);
  }
  if (child < 0 || waitpid(child, &status, 0) != child) {
    printf("not ok %s (no process: %s)\n", shared->current, strerror(errno));
    return 1;
  }
  if (WIFSIGNALED(status)) {
    printf("not ok %s (ended by signal %d)\n", shared->current, WTERMSIG(status));
  } else if (WEXITSTATUS(status) != HELD && WEXITSTATUS(status) != FAILED) {
    printf("not ok %s (ended with status %d)\n", shared->current, WEXITSTATUS(status));
  }
  fflush(stdout);
  return !WIFEXITED(status) || WEXITSTATUS(status) != HELD;
}

static int run_power_times(void) {
  int faults = 0;
  shared->counts[0] = shared->counts[1] = -1;
  faults = run("keeping the power times", keep_power_times);
  /* Lists that cannot be read, or not be set, would be lost. */
  if (faults > 0 || shared->counts[0] < 0 || shared->counts[1] < 0) return 1;
  faults += run("power times", check_power_times);
  return faults + run("putting the power times back", put_back_power_times);
}

static int run_crontab(void) {
  int faults = 0;
  crontab_before = whole_text(crontab, &crontab_was);
  if (crontab_before == NULL) {
    printf("not ok %s: cannot be read, so no line was added\n", crontab);
    return 1;
  }
  faults = run("crontab", check_crontab);
  faults += put_back_crontab();
  free(crontab_before);
  return faults;
}

static int run_plugins(char *plugins) {
  const size_t there = make_directories(plugins);
  char script[700];
  int faults = 0;
  snprintf(plugin, sizeof plugin, "%s/platform_check", plugins);
  snprintf(called, sizeof called, "%s/called", directory);
  snprintf(failing, sizeof failing, "%s/failing", directory);
  snprintf(script, sizeof script, "#!/bin/sh\n: >%s\ntest ! -e %s\n", called, failing);
  if (access(plugin, F_OK) == 0) {
    printf("not ok %s: is there already, so no plugin was called\n", plugin);
    return 1;
  }
  write_text(plugin, script);
  if (chmod(plugin, 0755) != 0) perror(plugin);
  faults = run("plugins that are called", check_called_plugins);
  unlink(plugin);
  remove_directories(plugins, there);
  return faults;
}

/* Whatever a group that crashed has left there. */
static void remove_own_directory(void) {
  DIR *stream = opendir(directory);
  struct dirent *entry = NULL;
  char path[600];
  while (stream != NULL && (entry = readdir(stream)) != NULL) {
    snprintf(path, sizeof path, "%s/%s", directory, entry->d_name);
    unlink(path);
  }
  if (stream != NULL) closedir(stream);
  rmdir(directory);
}

int main(int argc, char **argv) {
  static const struct {
    const char *name;
    void (*group)(void);
  } groups[] = {{"error record", check_error_record},
                {"hashes", check_hashes},
                {"lists", check_lists},
                {"reading sections", check_reading},
                {"changing sections", check_changing},
                {"a copied file", check_copied},
                {"symbolic links", check_links},
                {"lines", check_lines},
                {"processes", check_processes},
                {"plugins", check_plugins},
                {"users", check_users},
                {"Base64", check_base64}};
  char plugins[256] = "";
  int faults = 0;
  size_t i = 0;
  const int system = argc > 1 && strcmp(argv[1], "--system") == 0;
  if (argc > 3 || (argc > 1 && !system) || (argc == 3 && argv[2][0] != '/')) {
    fprintf(stderr, "usage: %s [--system [/DIRECTORY/OF/PLUGINS]]\n", argv[0]);
    return USAGE;
  }
  if (argc == 3) snprintf(plugins, sizeof plugins, "%s", argv[2]);
  umask(022);
  shared = mmap(NULL, sizeof *shared, PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
  snprintf(directory, sizeof directory, "/tmp/platform_check.XXXXXX");
  if (shared == MAP_FAILED || mkdtemp(directory) == NULL) {
    perror(directory);
    return USAGE;
  }
  /* What was changed is put back before this ends. */
  signal(SIGINT, SIG_IGN);
  signal(SIGTERM, SIG_IGN);
  signal(SIGHUP, SIG_IGN);
  signal(SIGCHLD, SIG_DFL);
  snprintf(file, sizeof file, "%s/file", directory);
  for (i = 0; i < sizeof groups / sizeof *groups; ++i)
    faults += run(groups[i].name, groups[i].group);
  if (system) faults += run_power_times() + run_crontab();
  if (plugins[0] != '\0') faults += run_plugins(plugins);
  remove_own_directory();
  return faults > 0;
}
