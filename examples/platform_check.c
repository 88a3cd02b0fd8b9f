/*
 * platform_check [--system] - calls each function of the platform that the
 * scheduler library calls, and says which contract does not hold.
 *
 *   platform_check            in a directory of its own below /tmp; nothing else is
 *                             changed
 *   platform_check --system   as root, where nothing can be harmed, for it changes what
 *                             a machine has once: power times, crontab, plugins. They
 *                             are put back as they were.
 *
 * Prints one line for each contract, "ok CALL: contract" or "not ok CALL: contract".
 * What crashes or hangs the calls of a group is named, and the next group goes on.
 * 0 when all hold, 1 when one does not, 2 for a wrong call.
 *
 *   cc platform_check.c -lzelosdk -lzelocore -o platform_check
 */
#include <errno.h>
#include <fcntl.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>
#include <zelocore.h>
#include <zelosdk.h>

enum { USAGE = 2, PATIENCE = 60, ROOM = 65536, CONTRACT_ROOM = 128 };

static int failed;          /* contracts of this group */
static char *current;       /* the contract that is being checked, shared with the parent */
static char directory[256]; /* of our own */
static char file[300];      /* in it */

static void contract(int holds) {
  printf("%s %s\n", holds ? "ok" : "not ok", current);
  fflush(stdout);
  failed += !holds;
}

/* Noted before the call is made, in case it does not come back. */
#define CONTRACT(call, what, condition)                      \
  do {                                                       \
    snprintf(current, CONTRACT_ROOM, "%s: %s", #call, what); \
    contract((condition) != 0);                              \
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
  write_text(file, "[2]\nkey=\"two\"\n\n# by hand\n[1]\nkey=one\n");
  CONTRACT(QLIBCFileTouch, "a file that is there keeps what is in it",
           QLIBCFileTouch(file) == 0 && strstr(read_text(file), "# by hand") != NULL);
  CONTRACT(QLIBCFileEnumSection, "the names in the order of the file", is(sections(), "2 1 "));
  CONTRACT(QLIBCFileGetSection, "1 when the section was read",
           QLIBCFileGetSection(file, "2", &hash) == 1);
  CONTRACT(QLIBCFileGetSection, "its values, with quotes and without",
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
  QLIBCSzHashFree(hash);
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
  CONTRACT(QLIBCFileSetSection, "the file is replaced as a whole", before.st_ino != after.st_ino);
  CONTRACT(QLIBCFileSetSection, "the mode stays", (after.st_mode & 07777) == 0640);
  CONTRACT(QLIBCFileSetSection, "0 when there is no such section, and nothing is written",
           QLIBCFileSetSection(file, "3", 0, one, 0) == 0 && is(sections(), "1 2 "));

  CONTRACT(QLIBCFileRemoveSection, "1 when it was removed", QLIBCFileRemoveSection(file, "1") == 1);
  CONTRACT(QLIBCFileRemoveSection, "that section and no other is gone", is(sections(), "2 "));
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
  void *context[3] = {NULL, NULL, NULL};
  CONTRACT(QLIBPluginInit, "0, and the first word is not null",
           QLIBPluginInit("platform_check", "task_edit", context) == 0 && context[0] != NULL);
  CONTRACT(QLIBPluginSetArg, "0", QLIBPluginSetArg(context, "NAME", "a text") == 0);
  CONTRACT(QLIBPluginSetArgByInt, "0", QLIBPluginSetArgByInt(context, "RESULT", -1) == 0);
  CONTRACT(QLIBPluginAction, "0 without plugins", QLIBPluginAction(QLIBPLUGIN_PRE, context) == 0);
  CONTRACT(QLIBPluginExit, "0, and the first word is null",
           QLIBPluginExit(context) == 0 && context[0] == NULL);
}

/* ---- users and Base64 ------------------------------------------------------------------------ */

static void check_users(void) {
  PZELOUSER user = NULL;
  PZELOUSER none = NULL;
  CONTRACT(ZELOUserGetByUID, "0, and the user", ZELOUserGetByUID(0, &user) == 0 && user != NULL);
  CONTRACT(ZELOUserGetByUID, "his name, ids, home directory and shell",
           user != NULL && is(user->szName, "root") && user->uid == 0 && user->gid == 0 &&
               user->szHome[0] == '/' && user->szShell != NULL);
  CONTRACT(ZELOUserGetByUID, "a user who is not there is told",
           fails(ZELOUserGetByUID(0x7ffffffd, &none), 0x2000) && none == NULL);
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
  CONTRACT(ZELOEncodingBase64Decode, "0 for another character",
           ZELOEncodingBase64Decode("YS*iPw==", 8, back, &size) == 0);
}

/* ---- what is refused: power times and the crontab -----------------------------------------------
 */

static void check_refusals(void) {
  const ZELO_AUTOPOWER late = {1, 127, 24, 0};
  ZELO_AUTOPOWER entry;
  ZELO_SCHEDULE schedule;
  memset(&schedule, 0, sizeof schedule);
  CONTRACT(ZELOAutoPowerConfGet, "a list that does not exist is refused",
           fails(ZELOAutoPowerConfGet(2, 1, &entry), 0x0D00));
  CONTRACT(ZELOAutoPowerConfSet, "a list that does not exist is refused",
           fails(ZELOAutoPowerConfSet(2, 0, NULL), 0x0D00));
  CONTRACT(ZELOAutoPowerConfSet, "an hour of 24 is refused",
           fails(ZELOAutoPowerConfSet(ZELO_AUTOPOWER_ON, 1, &late), 0x0D00));
  schedule.weekdays = 127;
  schedule.hour = 24;
  snprintf(schedule.szCommand, sizeof schedule.szCommand, "platform_check");
  CONTRACT(ZELOScheduleSet, "an hour of 24 is refused",
           fails(ZELOScheduleSet(&schedule, 1), 0x0D00));
  CONTRACT(ZELOUpdateCrontab, "0 when nothing is to be told",
           ZELOUpdateCrontab("platform_check", 0, 0) == 0);
}

/* ---- --system: what a machine has once
 * ------------------------------------------------------------ */

static void check_power_times(void) {
  const ZELO_AUTOPOWER times[] = {{1, 127, 7, 30}, {0, 1, 23, 59}};
  ZELO_AUTOPOWER kept[2][100];
  ZELO_AUTOPOWER got[4];
  int counts[2];
  int list = 0;
  for (list = 0; list < 2; ++list) counts[list] = ZELOAutoPowerConfGet(list, 100, kept[list]);
  CONTRACT(ZELOAutoPowerConfSet, "0",
           ZELOAutoPowerConfSet(ZELO_AUTOPOWER_OFF, 1, times) == 0 &&
               ZELOAutoPowerConfSet(ZELO_AUTOPOWER_ON, 2, times) == 0);
  CONTRACT(ZELOAutoPowerConfGet, "what was set, and how many",
           ZELOAutoPowerConfGet(ZELO_AUTOPOWER_ON, 4, got) == 2 &&
               memcmp(got, times, sizeof times) == 0);
  CONTRACT(ZELOAutoPowerConfGet, "no more than there is room for",
           ZELOAutoPowerConfGet(ZELO_AUTOPOWER_ON, 1, got) == 1);
  CONTRACT(ZELOAutoPowerConfSet, "the other list stays",
           ZELOAutoPowerConfGet(ZELO_AUTOPOWER_OFF, 4, got) == 1 &&
               memcmp(got, times, sizeof *times) == 0);
  ZELOAutoPowerConfSet(ZELO_AUTOPOWER_ON, 0, NULL);
  CONTRACT(ZELOAutoPowerConfSet, "a list can be emptied",
           ZELOAutoPowerConfGet(ZELO_AUTOPOWER_ON, 4, got) == 0);
  CONTRACT(ZELOAutoPoweronSet, "0 when no time is wanted", ZELOAutoPoweronSet() == 0);
  for (list = 0; list < 2; ++list)
    ZELOAutoPowerConfSet(list, counts[list] < 0 ? 0 : counts[list], kept[list]);
  ZELOAutoPoweronSet();
}

static void check_crontab(void) {
  static const char crontab[] = "/etc/crontab";
  const char *text = read_text(crontab);
  char *before = strdup(text);
  ZELO_SCHEDULE schedule;
  struct stat was;
  struct stat is_now;
  memset(&schedule, 0, sizeof schedule);
  schedule.hour = 7;
  schedule.minute = 30;
  snprintf(schedule.szCommand, sizeof schedule.szCommand, ": platform_check");
  stat(crontab, &was);
  CONTRACT(ZELOScheduleSet, "no line without a weekday",
           ZELOScheduleSet(&schedule, 1) == 0 && is(read_text(crontab), before));
  schedule.weekdays = 2;
  CONTRACT(
      ZELOScheduleSet, "a line of the time that runs the command as root",
      ZELOScheduleSet(&schedule, 1) == 0 && strstr(read_text(crontab), ": platform_check") != NULL);
  text = read_text(crontab);
  CONTRACT(ZELOScheduleSet, "every other line stays", strncmp(text, before, strlen(before)) == 0);
  CONTRACT(
      ZELOScheduleSet, "owner and mode stay",
      stat(crontab, &is_now) == 0 && was.st_mode == is_now.st_mode && was.st_uid == is_now.st_uid);
  QLIBCFileSetLine(crontab, ": platform_check", NULL, 0);
  CONTRACT(QLIBCFileSetLine, "the line goes from the crontab", is(read_text(crontab), before));
  if (!is(read_text(crontab), before)) write_text(crontab, before);
  if (chmod(crontab, was.st_mode & 07777) != 0) perror(crontab);
  free(before);
}

static void check_called_plugins(void) {
  static const char parent[] = "/usr/zelo/libexec/plugins";
  static const char plugins[] = "/usr/zelo/libexec/plugins/platform_check.d";
  void *context[3] = {NULL, NULL, NULL};
  char plugin[300];
  char script[600];
  QLIBCExec("/bin/mkdir", "-p", plugins, NULL);
  snprintf(plugin, sizeof plugin, "%s/plugin", plugins);
  snprintf(script, sizeof script, "#!/bin/sh\necho \"$1 $2 $NAME $RESULT\" >%s\nexit ${RESULT#-}\n",
           file);
  write_text(plugin, script);
  chmod(plugin, 0755);
  QLIBPluginInit("platform_check", "task_edit", context);
  QLIBPluginSetArg(context, "NAME", "a text");
  QLIBPluginSetArgByInt(context, "RESULT", 0);
  CONTRACT(QLIBPluginAction, "0 when every plugin succeeds",
           QLIBPluginAction(QLIBPLUGIN_PRE, context) == 0);
  CONTRACT(QLIBPluginSetArg, "a plugin is told the action, the stage and the arguments",
           is(read_text(file), "task_edit pre a text 0\n"));
  QLIBPluginSetArgByInt(context, "RESULT", -1);
  CONTRACT(QLIBPluginAction, "below 0 when one fails",
           QLIBPluginAction(QLIBPLUGIN_POST, context) < 0);
  CONTRACT(QLIBPluginSetArgByInt, "an argument can be set again",
           is(read_text(file), "task_edit post a text -1\n"));
  QLIBPluginExit(context);
  unlink(plugin);
  rmdir(plugins);
  rmdir(parent);
  rmdir("/usr/zelo/libexec");
  unlink(file);
}

/* ------------------------------------------------------------------------------------------------------
 */

/* Each group in a process of its own: one that crashes takes no other with it. */
static void run(void (*group)(void), int *faults) {
  int status = 0;
  pid_t child = 0;
  current[0] = '\0';
  fflush(stdout);
  child = fork();
  if (child == 0) {
    alarm(PATIENCE);
    group();
    _exit(failed > 0);
  }
  waitpid(child, &status, 0);
  if (WIFSIGNALED(status)) {
    printf("not ok %s (ended by signal %d)\n", current, WTERMSIG(status));
  }
  *faults += status != 0;
}

int main(int argc, char **argv) {
  static void (*const groups[])(void) = {
      check_error_record, check_hashes,  check_lists, check_reading, check_changing, check_lines,
      check_processes,    check_plugins, check_users, check_base64,  check_refusals};
  static void (*const of_system[])(void) = {check_power_times, check_crontab, check_called_plugins};
  int faults = 0;
  size_t i = 0;
  const int system = argc == 2 && strcmp(argv[1], "--system") == 0;
  if (argc > 2 || (argc == 2 && !system)) {
    fprintf(stderr, "usage: %s [--system]\n", argv[0]);
    return USAGE;
  }
  current = mmap(NULL, CONTRACT_ROOM, PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
  snprintf(directory, sizeof directory, "/tmp/platform_check.XXXXXX");
  if (current == MAP_FAILED || mkdtemp(directory) == NULL) {
    perror(directory);
    return USAGE;
  }
  snprintf(file, sizeof file, "%s/file", directory);
  for (i = 0; i < sizeof groups / sizeof *groups; ++i) run(groups[i], &faults);
  for (i = 0; system && i < sizeof of_system / sizeof *of_system; ++i) run(of_system[i], &faults);
  unlink(file);
  rmdir(directory);
  return faults > 0;
}
