/*
 * platform_check [--system [PLUGINS]] - calls each function of the platform that the
 * scheduler library calls, and says which contract does not hold.
 *
 *   platform_check              in a directory of its own below /tmp; changes nothing else
 *   platform_check --system     as root, on a test machine: changes also what a machine has
 *                               once, that is power times, the alarm of its clock and the
 *                               crontab. They are put back, also when a call crashes.
 *   platform_check --system /usr/zelo/libexec/plugins/platform_check.d
 *                               puts a plugin into that directory too, where this platform
 *                               looks for those of "platform_check"
 *
 * Prints one line for each contract, "ok CALL: contract" or "not ok CALL: contract", and the sum,
 * "N hold, M do not", as the last line, on standard error.
 * A group of calls that crashes, hangs or exits is reported, and the next group is run.
 * Exits with 0 when all hold, 1 when one does not, 2 for wrong arguments or missing rights.
 *
 *   cc platform_check.c -I/opt/appliance/include -I../platform/libzelocore/include \
 *     -I../platform/libzelosdk/include -L/opt/appliance/lib -lzelosdk -lzelocore \
 *     -Wl,-rpath,/opt/appliance/lib -o platform_check
 *
 * On armhf add -D_FILE_OFFSET_BITS=64 -D_TIME_BITS=64.
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

/* HELD and FAILED: exit statuses of a complete group, which no platform call should exit with. */
enum { USAGE = 2, HELD = 87, FAILED = 88 };
enum { PATIENCE = 60, ROOM = 65536, CONTRACT_ROOM = 128, ENTRIES = 100, KEPT = 1000, GUARD = 0x5a };
enum { LONG = 16384, LIMIT = 5, SOMEONE = 1, MANY = 1000 };

/* Shared memory for the results of the groups, each of which is a child process. */
static struct {
  char current[CONTRACT_ROOM]; /* the contract that is being checked */
  int sums[2];                 /* of the contracts that do not hold, and of those that do */
  int worked;                  /* in a child: 1, or -1 when not; 0 as long as it has not ended */
  int kept[4];                 /* by a child: descriptors, directory, session, umask */
  int counts[2];               /* of the power times before; -1 when they are not known */
  ZELO_AUTOPOWER times[2][KEPT];
} * shared;

static int failed;          /* contracts of this group */
static char directory[256]; /* of our own */
static char file[300];      /* in it */

static void contract(int holds) {
  printf("%s %s\n", holds ? "ok" : "not ok", shared->current);
  fflush(stdout);
  failed += !holds;
  ++shared->sums[holds];
}

/* Reports a fault. Returns 1, the number of faults. */
static int fault(const char *what, const char *why) {
  printf("not ok %s%s\n", what, why);
  fflush(stdout);
  ++shared->sums[0];
  return 1;
}

/* The contract is noted before the call, which may not return. */
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

/* The contents of a file, with a zero byte behind them; null when it cannot be read. */
static char *whole_text(const char *path, struct stat *status) {
  FILE *stream = fopen(path, "re");
  char *text = NULL;
  memset(status, 0, sizeof *status);
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

/* Whether guard bytes, which no call may write to, are unchanged. */
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

/* As long as the command of a task can be in the store. */
static const char *long_text(void) {
  static char text[LONG + 1];
  memset(text, 'x', LONG);
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
  CONTRACT(QLIBCSzHashSetValue, "a value of 16384 bytes",
           QLIBCSzHashSetValue(&hash, "key", long_text()) == 0 &&
               is(QLIBCSzHashGetValue(hash, "key"), long_text()));
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
  CONTRACT(
      QLIBCSzListPush, "a text of 16384 bytes",
      QLIBCSzListPush(&list, long_text()) == 1004 && is(QLIBCSzListGet(list, 1003), long_text()));
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
  static char value[LONG + 1];
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
  int touches = 0;
  CONTRACT(QLIBCFileExist, "0 for what is not there", QLIBCFileExist(file) == 0);
  CONTRACT(QLIBCFileExist, "0 for null", QLIBCFileExist(NULL) == 0);
  CONTRACT(QLIBCFileEnumSection, "a file that is not there is told",
           fails(QLIBCFileEnumSection(file, &list), 0x0900));
  CONTRACT(QLIBCFileGetSection, "a file that is not there is told",
           fails(QLIBCFileGetSection(file, "1", &hash), 0x0900));
  CONTRACT(
      QLIBCFileTouch, "an empty file is made",
      (touches = QLIBCFileTouch(file) == 0 && access(file, F_OK) == 0 && *read_text(file) == '\0'));
  CONTRACT(QLIBCFileExist, "1 for what is there", QLIBCFileExist(file) == 1);
  write_text(file, "any text\n");
  CONTRACT(QLIBCFileTouch, "a file that is there keeps what is in it",
           QLIBCFileTouch(file) == 0 && is(read_text(file), "any text\n"));
  unlink(file);
  QLIBCFileAddSection(file, "2", two, 0);
  QLIBCFileAddSection(file, "1", one, 0);
  CONTRACT(QLIBCFileEnumSection, "the names in the order of the file", is(sections(), "2 1 "));
  QLIBCSzListPush(&list, "before");
  CONTRACT(QLIBCFileEnumSection, "the names are appended",
           QLIBCFileEnumSection(file, &list) == 2 && QLIBCSzListCount(list) == 3 &&
               is(QLIBCSzListGet(list, 0), "before") && is(QLIBCSzListGet(list, 2), "1"));
  CONTRACT(QLIBCFileGetSection, "1 when the section was read",
           QLIBCFileGetSection(file, "2", &hash) == 1);
  CONTRACT(QLIBCFileGetSection, "its values",
           is(stored("2", "key"), "two") && is(stored("1", "key"), "one"));
  CONTRACT(QLIBCFileGetSection, "keys that the hash has already stay",
           is(QLIBCSzHashGetValue(hash, "kept"), "kept"));
  CONTRACT(QLIBCFileGetSection, "0 when there is no such section",
           QLIBCFileGetSection(file, "3", &hash) == 0);
  snprintf(other, sizeof other, "%s/other", directory);
  touches = touches && symlink(file, other) == 0 && unlink(file) == 0;
  CONTRACT(QLIBCFileTouch, "a symbolic link is not followed",
           touches && (QLIBCFileTouch(other), access(file, F_OK) != 0));
  unlink(other);
  CONTRACT(QLIBCFileExist, "1 for what cannot be told",
           symlink(other, other) == 0 && QLIBCFileExist(other) == 1);
  unlink(other);
  QLIBCSzHashFree(hash);
  QLIBCSzHashFree(one);
  QLIBCSzHashFree(two);
  QLIBCSzListFree(list);
}

/* Gives the file a mode, and where that can be done a strange owner. */
static int is_someones; /* now */

static void give_file_away(void) {
  if (chmod(file, 0640) != 0) perror(file);
  is_someones = chown(file, SOMEONE, SOMEONE) == 0;
}

/* For use after a call that should have changed the file; `changed`: it did. */
#define KEEPS_OWNER_AND_MODE(call, changed)                                         \
  do {                                                                              \
    struct stat is_now;                                                             \
    const int is_there = (changed) && stat(file, &is_now) == 0;                     \
    CONTRACT(call, "the mode stays", is_there && (is_now.st_mode & 07777) == 0640); \
    if (is_someones) {                                                              \
      CONTRACT(call, "the owner stays",                                             \
               is_there &&is_now.st_uid == SOMEONE && is_now.st_gid == SOMEONE);    \
    }                                                                               \
  } while (0)

static void check_changing(void) {
  char bytes[256];
  struct stat before;
  struct stat after;
  int i = 0;
  int changed = 0;
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
  QLIBCSzHashSetValue(&two, "run hour", "7");
  QLIBCSzHashSetValue(&two, "long", long_text());
  give_file_away();
  changed = QLIBCFileAddSection(file, "2", two, 0) == 1;
  CONTRACT(QLIBCFileAddSection, "every byte but zero reads back", is(stored("2", "bytes"), bytes));
  CONTRACT(QLIBCFileAddSection, "a key with a blank reads back", is(stored("2", "run hour"), "7"));
  CONTRACT(QLIBCFileAddSection, "a value of 16384 bytes reads back",
           is(stored("2", "long"), long_text()));
  CONTRACT(QLIBCFileAddSection, "the other sections stay",
           is(sections(), "1 2 ") && is(stored("1", "key"), "one"));
  KEEPS_OWNER_AND_MODE(QLIBCFileAddSection, changed);

  give_file_away();
  changed = stat(file, &before) == 0;
  CONTRACT(QLIBCFileSetSection, "1 when it was replaced",
           (i = QLIBCFileSetSection(file, "1", 0, two, 0)) == 1);
  changed = changed && i == 1 && stat(file, &after) == 0;
  CONTRACT(QLIBCFileSetSection, "no key of before is left",
           is(stored("1", "other"), "two") && is(stored("1", "key"), "(none)"));
  CONTRACT(QLIBCFileSetSection, "the order stays", is(sections(), "1 2 "));
  CONTRACT(QLIBCFileSetSection, "the other sections keep what they hold",
           is(stored("2", "other"), "two") && is(stored("2", "bytes"), bytes));
  CONTRACT(QLIBCFileSetSection, "the file is replaced as a whole",
           changed && before.st_ino != after.st_ino);
  KEEPS_OWNER_AND_MODE(QLIBCFileSetSection, changed);
  CONTRACT(QLIBCFileSetSection, "0 when there is no such section, and nothing is written",
           QLIBCFileSetSection(file, "3", 0, one, 0) == 0 && is(sections(), "1 2 "));

  give_file_away();
  CONTRACT(QLIBCFileRemoveSection, "1 when it was removed",
           (changed = QLIBCFileRemoveSection(file, "1") == 1));
  CONTRACT(QLIBCFileRemoveSection, "that section and no other is gone", is(sections(), "2 "));
  CONTRACT(QLIBCFileRemoveSection, "the other sections keep what they hold",
           is(stored("2", "other"), "two") && is(stored("2", "bytes"), bytes));
  KEEPS_OWNER_AND_MODE(QLIBCFileRemoveSection, changed);
  CONTRACT(QLIBCFileRemoveSection, "0 when there is none", QLIBCFileRemoveSection(file, "1") == 0);
  unlink(file);
  QLIBCSzHashFree(one);
  QLIBCSzHashFree(two);
}

/* A file that is cut off, as when its writer was killed. */
static void check_cut_off(void) {
  PSZHASH hash = hash_with("key", "value");
  struct stat whole;
  int is_cut = 0;
  unlink(file);
  is_cut = QLIBCFileAddSection(file, "1", hash, 0) == 1 &&
           QLIBCFileAddSection(file, "2", hash, 0) == 1 && stat(file, &whole) == 0 &&
           whole.st_size > 2 && truncate(file, whole.st_size * 2 / 3) == 0;
  CONTRACT(QLIBCFileEnumSection, "a file that is cut off is told",
           is_cut && is(sections(), "(failed)") && QLIBCErrGet() == 0x0B00);
  CONTRACT(QLIBCFileGetSection, "a file that is cut off is told",
           is_cut && fails(QLIBCFileGetSection(file, "1", &hash), 0x0B00));
  CONTRACT(QLIBCFileAddSection, "a file that is cut off is not built on",
           is_cut && fails(QLIBCFileAddSection(file, "9", hash, 0), 0x0B00));
  CONTRACT(QLIBCFileSetSection, "a file that is cut off is not built on",
           is_cut && fails(QLIBCFileSetSection(file, "1", 0, hash, 0), 0x0B00));
  CONTRACT(QLIBCFileRemoveSection, "a file that is cut off is not built on",
           is_cut && fails(QLIBCFileRemoveSection(file, "1"), 0x0B00));
  unlink(file);
  QLIBCSzHashFree(hash);
}

static int many_sections(void) {
  PSZHASH hash = hash_with("key", "value");
  PSZLIST list = QLIBCSzListAlloc(1);
  char name[16];
  int found = 0;
  int i = 0;
  unlink(file);
  for (i = 0; i < MANY; ++i) {
    snprintf(name, sizeof name, "%d", i);
    QLIBCFileAddSection(file, name, hash, 0);
  }
  QLIBCFileEnumSection(file, &list);
  for (i = 0; i < MANY; ++i) {
    snprintf(name, sizeof name, "%d", i);
    found += is(QLIBCSzListGet(list, i), name) && is(stored(name, "key"), "value");
  }
  unlink(file);
  QLIBCSzHashFree(hash);
  QLIBCSzListFree(list);
  return found;
}

static void check_many_sections(void) {
  CONTRACT(QLIBCFileAddSection, "there is room for a thousand", many_sections() == MANY);
}

/* The sections of a file of which some bytes are there, and the others come a moment later. */
static const char *copied_sections(const char *second, int parts) {
  PSZHASH hash = hash_with("key", "value");
  const char *found = NULL;
  char *bytes = NULL;
  struct stat whole;
  pid_t copier = 0;
  unlink(file);
  QLIBCFileAddSection(file, "1", hash, 0);
  QLIBCFileAddSection(file, second, hash, 0);
  QLIBCSzHashFree(hash);
  bytes = whole_text(file, &whole);
  if (bytes == NULL || truncate(file, parts == 0 ? 0 : whole.st_size / parts) != 0) return "(none)";
  copier = fork();
  if (copier == 0) {
    int out = -1;
    usleep(10000);
    out = open(file, O_WRONLY | O_CLOEXEC);
    _exit(out < 0 || write(out, bytes, (size_t)whole.st_size) != whole.st_size);
  }
  found = sections();
  waitpid(copier, NULL, 0);
  free(bytes);
  unlink(file);
  return found;
}

static void check_copied(void) {
  CONTRACT(QLIBCFileEnumSection, "a file that is being copied is waited for",
           is(copied_sections("copied", 2), "1 copied "));
  CONTRACT(QLIBCFileEnumSection, "a file of which no byte is there yet is waited for",
           is(copied_sections("empty", 0), "1 empty "));
}

/* A change through a symbolic link would change another file, or replace the link. */
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
  int changed = 0;
  CONTRACT(QLIBCFileSetLine, "0 when there is nothing to remove",
           QLIBCFileSetLine(file, "key", NULL, 0) == 0);
  CONTRACT(QLIBCFileSetLine, "a value without a file is refused",
           fails(QLIBCFileSetLine(file, "key", "a line", 0), 0x0900) && access(file, F_OK) != 0);
  write_text(file, "first\nhas the key\nhas the key too\n");
  give_file_away();
  CONTRACT(QLIBCFileSetLine, "the first line with the key is replaced",
           (changed = QLIBCFileSetLine(file, "key", "new", 0) == 1 &&
                      is(read_text(file), "first\nnew\nhas the key too\n")));
  CONTRACT(QLIBCFileSetLine, "where no line has it, one is appended",
           QLIBCFileSetLine(file, "none", "last", 0) == 1 &&
               is(read_text(file), "first\nnew\nhas the key too\nlast\n"));
  CONTRACT(
      QLIBCFileSetLine, "without a value the line is removed",
      QLIBCFileSetLine(file, "key", NULL, 0) == 1 && is(read_text(file), "first\nnew\nlast\n"));
  CONTRACT(QLIBCFileSetLine, "a value with a line feed is refused",
           fails(QLIBCFileSetLine(file, "new", "a\nb", 0), 0x0D00) &&
               is(read_text(file), "first\nnew\nlast\n"));
  KEEPS_OWNER_AND_MODE(QLIBCFileSetLine, changed);
  unlink(file);
}

/* ---- processes -------------------------------------------------------------------------- */

static void check_exec(void) {
  int exits = 0;
  int status = 0;
  pid_t child = 0;
  CONTRACT(QLIBCExec, "the exit status", (exits = QLIBCExec("/bin/sh", "-c", "exit 7", NULL) == 7));
  CONTRACT(QLIBCExec, "arguments arrive as they are",
           QLIBCExec("/bin/sh", "-c", "test \"$1\" = 'a  $b'", "sh", "a  $b", NULL) == 0);
  setenv("PLATFORM_CHECK", "a  b", 1);
  CONTRACT(QLIBCExec, "the environment arrives",
           QLIBCExec("/bin/sh", "-c", "test \"$PLATFORM_CHECK\" = 'a  b'", NULL) == 0);
  CONTRACT(QLIBCExec, "not 0 for what a signal ended",
           exits && QLIBCExec("/bin/sh", "-c", "kill -9 $$", NULL) != 0);
  CONTRACT(QLIBCExec, "-1 when the program cannot be started",
           fails(QLIBCExec("/nonexistent", NULL), 0x2A00));
  child = fork();
  if (child == 0) _exit(3);
  CONTRACT(QLIBCExec, "a child of the caller is still there to be waited for",
           QLIBCExec("/bin/sh", "-c", "exit 7", NULL) == 7 && waitpid(child, &status, 0) == child &&
               WIFEXITED(status) && WEXITSTATUS(status) == 3);
  signal(SIGCHLD, SIG_IGN);
  CONTRACT(QLIBCExec, "the exit status for a caller who ignores his children",
           QLIBCExec("/bin/sh", "-c", "exit 7", NULL) == 7);
  signal(SIGCHLD, SIG_DFL);
}

/* Records in the child what it has inherited. */
static void note_what_is_kept(int descriptor, pid_t session) {
  struct stat here;
  struct stat ours;
  shared->kept[0] = descriptor >= 0 && fcntl(descriptor, F_GETFD) >= 0;
  shared->kept[1] = stat(".", &here) == 0 && stat(directory, &ours) == 0 &&
                    here.st_dev == ours.st_dev && here.st_ino == ours.st_ino;
  shared->kept[2] = getsid(0) == session;
  shared->kept[3] = umask(0) == 027;
}

static void on_child(int number) {
  (void)number;
}

static void check_fork(void) {
  char path[300];
  struct sigaction action;
  int descriptor = -1;
  int forked = 0;
  int i = 0;
  const pid_t session = getsid(0);
  snprintf(path, sizeof path, "%s/by_child", directory);
  memset(shared->kept, 0, sizeof shared->kept);
  descriptor = open(directory, O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  if (descriptor < 0 || chdir(directory) != 0) perror(directory);
  umask(027);
  signal(SIGCHLD, on_child);
  forked = QLIBCProcForkChildNoWait();
  if (forked == 0) {
    note_what_is_kept(descriptor, session);
    close(open(path, O_CREAT | O_WRONLY | O_CLOEXEC, 0600));
    _exit(0);
  }
  CONTRACT(QLIBCProcForkChildNoWait, "1 for the caller", forked == 1);
  CONTRACT(QLIBCProcForkChildNoWait, "the handling of SIGCHLD stays",
           forked == 1 && sigaction(SIGCHLD, NULL, &action) == 0 && action.sa_handler == on_child);
  signal(SIGCHLD, SIG_DFL);
  for (i = 0; i < 1000 && access(path, F_OK) != 0; ++i) usleep(10000);
  CONTRACT(QLIBCProcForkChildNoWait, "0 for the child, which runs", access(path, F_OK) == 0);
  CONTRACT(QLIBCProcForkChildNoWait, "there is no child to wait for",
           forked == 1 && waitpid(-1, NULL, WNOHANG) == -1 && errno == ECHILD);
  CONTRACT(QLIBCProcForkChildNoWait, "the child keeps descriptors", shared->kept[0]);
  CONTRACT(QLIBCProcForkChildNoWait, "the child keeps the directory", shared->kept[1]);
  CONTRACT(QLIBCProcForkChildNoWait, "the child keeps the session", shared->kept[2]);
  CONTRACT(QLIBCProcForkChildNoWait, "the child keeps the umask", shared->kept[3]);
  unlink(path);
}

static void check_alive(void) {
  int lives = 0;
  pid_t child = 0;
  CONTRACT(QLIBCProcAlive, "1 for this process", (lives = QLIBCProcAlive(getpid()) == 1));
  child = fork();
  if (child == 0) _exit(0);
  lives = lives && child > 0 && waitid(P_PID, (id_t)child, NULL, WEXITED | WNOWAIT) == 0;
  CONTRACT(QLIBCProcAlive, "0 for one that nobody has waited for yet",
           lives && QLIBCProcAlive(child) == 0);
  lives = lives && waitpid(child, NULL, 0) == child;
  CONTRACT(QLIBCProcAlive, "0 for one that is gone", lives && QLIBCProcAlive(child) == 0);
}

/* ---- in children ------------------------------------------------------------------------- */

/* Calls that are made in a process and then in a child of it, which has its memory and none of its
 * threads. */
static int error_works(void) {
  const int line = (int)getpid(); /* none that was set before */
  QLIBCErrSetEx(7, "a.c", line);
  return QLIBCErrGet() == 7 && is(QLIBCErrorGetFile(), "a.c") && QLIBCErrorGetLine() == line;
}

static int hash_works(void) {
  PSZHASH hash = hash_with("key", "value");
  const int works = is(QLIBCSzHashGetValue(hash, "key"), "value");
  QLIBCSzHashFree(hash);
  return works;
}

static int touch_works(void) {
  char path[300];
  snprintf(path, sizeof path, "%s/touched", directory);
  unlink(path);
  return QLIBCFileTouch(path) == 0 && unlink(path) == 0;
}

static int sections_work(void) {
  return is(sections(), "1 ");
}

static int section_works(void) {
  return is(stored("1", "key"), "value");
}

static int exec_works(void) {
  return QLIBCExec("/bin/sh", "-c", "exit 7", NULL) == 7;
}

static int alive_works(void) {
  return QLIBCProcAlive(getpid()) == 1 && QLIBCProcAlive(1) == 1;
}

static int user_works(void) {
  PZELOUSER user = NULL;
  const int works =
      ZELOUserGetByUID(0, &user) == 0 && user != NULL && user->uid == 0 && user->szName != NULL;
  if (works) ZELOUserFree(user);
  return works;
}

static int decoding_works(void) {
  char back[8];
  size_t size = sizeof back;
  return ZELOEncodingBase64Decode("YSBiPw==", 8, back, &size) == 1 && size == 4;
}

static const struct {
  const char *call;
  int (*works)(void);
} calls[] = {{"QLIBCErrSetEx", error_works},
             {"QLIBCSzHashGetValue", hash_works},
             {"QLIBCFileTouch", touch_works},
             {"QLIBCFileEnumSection", sections_work},
             {"QLIBCFileGetSection", section_works},
             {"QLIBCExec", exec_works},
             {"QLIBCProcAlive", alive_works},
             {"ZELOUserGetByUID", user_works},
             {"ZELOEncodingBase64Decode", decoding_works}};

/* Whether the call works in a forked child, within the time limit. */
static int works_in_child(int (*works)(void), int (*forks)(void)) {
  int result = 0;
  int i = 0;
  shared->worked = 0;
  result = forks();
  if (result == 0) {
    alarm(LIMIT);
    shared->worked = works() ? 1 : -1;
    _exit(0);
  }
  for (i = 0; result > 0 && i < LIMIT * 200 && *(volatile int *)&shared->worked == 0; ++i)
    usleep(5000);
  return result > 0 && *(volatile int *)&shared->worked == 1;
}

static int plain_fork(void) {
  return (int)fork();
}

static void check_forked(void) {
  PSZHASH hash = hash_with("key", "value");
  size_t i = 0;
  unlink(file);
  QLIBCFileAddSection(file, "1", hash, 0);
  QLIBCSzHashFree(hash);
  for (i = 0; i < sizeof calls / sizeof *calls; ++i) {
    int works = 0;
    alarm(PATIENCE);
    snprintf(shared->current, CONTRACT_ROOM, "%s: works in a forked child too", calls[i].call);
    works = calls[i].works();
    contract(works && works_in_child(calls[i].works, plain_fork));
    snprintf(shared->current, CONTRACT_ROOM, "%s: works in the child of QLIBCProcForkChildNoWait",
             calls[i].call);
    contract(works && works_in_child(calls[i].works, QLIBCProcForkChildNoWait));
  }
  unlink(file);
}

/* As root with another user's effective id, which may not read all that root may, as in a run. */
static void check_other_user(void) {
  const int user = user_works();
  const int alive = QLIBCProcAlive(getppid()) == 1;
  if (geteuid() != 0 || seteuid(SOMEONE) != 0) return;
  CONTRACT(ZELOUserGetByUID, "as before with the effective id of another", user && user_works());
  CONTRACT(QLIBCProcAlive, "as before with the effective id of another",
           alive && QLIBCProcAlive(getppid()) == 1);
  if (seteuid(0) != 0) perror("seteuid");
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
  ZELOUSER guard;
  PZELOUSER none = &guard;
  int highest = 0;
  memset(&guard, 0, sizeof guard);
  CONTRACT(ZELOUserGetByUID, "0, and the user", ZELOUserGetByUID(0, &user) == 0 && user != NULL);
  CONTRACT(ZELOUserGetByUID, "his name, id, home directory and shell",
           user != NULL && user->szName != NULL && user->szName[0] != '\0' && user->uid == 0 &&
               user->szHome != NULL && user->szHome[0] == '/' && user->szShell != NULL);
  CONTRACT(ZELOUserGetByUID, "a user who is not there is told",
           fails(ZELOUserGetByUID(0x7ffffffd, &none), 0x2000));
  CONTRACT(ZELOUserGetByUID, "the pointer is left alone on failure", none == &guard);
  none = &guard;
  highest = ZELOUserGetByUID(4294967294U, &none);
  CONTRACT(ZELOUserGetByUID, "the highest id is looked up like any other",
           highest == 0 ? none != NULL && none->uid == 4294967294U
                        : fails(highest, 0x2000) && none == &guard);
  if (none != &guard) ZELOUserFree(none);
  CONTRACT(ZELOUserFree, "null is allowed", (ZELOUserFree(user), ZELOUserFree(NULL), 1));
}

static void check_long_base64(void) {
  static char bytes[LONG * 3 / 4 - 1];
  static char text[LONG + 1];
  static char back[sizeof bytes];
  size_t size = sizeof back;
  size_t i = 0;
  int encoded = 0;
  for (i = 0; i < sizeof bytes; ++i) bytes[i] = (char)(i % 251);
  encoded = SzBase64EncodeFull(bytes, sizeof bytes, text, sizeof text, 1);
  CONTRACT(SzBase64EncodeFull, "12287 bytes", encoded == 1 && strlen(text) == LONG);
  CONTRACT(ZELOEncodingBase64Decode, "12287 bytes",
           encoded == 1 && ZELOEncodingBase64Decode(text, LONG, back, &size) == 1 &&
               size == sizeof bytes && memcmp(back, bytes, sizeof bytes) == 0);
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

/* ---- --system: what a machine has once ------------------------------------------------------- */

/* Into shared memory, where the next group finds them also when this one crashes. */
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

/* Atomically, and without the platform. Returns the number of faults. */
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
    return fault("/etc/crontab could not be put back: ", strerror(errno));
  }
  return 0;
}

static int compare_lines(const void *one, const void *two) {
  return strcmp(*(char *const *)one, *(char *const *)two);
}

/* The sorted lines of the text, which is cut into them. */
static char **sorted_lines(char *text, size_t *count) {
  const size_t length = strlen(text);
  char **lines = calloc(length + 1, sizeof *lines);
  char *line = text;
  *count = 0;
  if (lines == NULL) exit(USAGE);
  while (line < text + length) {
    lines[(*count)++] = line;
    line += strcspn(line, "\n");
    *line++ = '\0';
  }
  qsort(lines, *count, sizeof *lines, compare_lines);
  return lines;
}

/* How many lines were added to the crontab; -1 when an old one is gone, or a new one has not the
 * command. The first new one is copied to `first`. */
static int lines_added(char *first, size_t room) {
  struct stat status;
  char *text = whole_text(crontab, &status);
  char *old_text = strdup(crontab_before);
  size_t counts[2] = {0, 0};
  char **before = old_text != NULL ? sorted_lines(old_text, &counts[0]) : NULL;
  char **now = text != NULL ? sorted_lines(text, &counts[1]) : NULL;
  size_t old = 0;
  size_t i = 0;
  int added = now != NULL && before != NULL ? 0 : -1;
  *first = '\0';
  for (i = 0; added >= 0 && i < counts[1]; ++i) {
    if (old < counts[0] && strcmp(before[old], now[i]) == 0) {
      ++old;
    } else if (strstr(now[i], ": platform_check") == NULL) {
      added = -1;
    } else if (added++ == 0) {
      snprintf(first, room, "%s", now[i]);
    }
  }
  if (old < counts[0]) added = -1;
  free(before);
  free(now);
  free(old_text);
  free(text);
  return added;
}

/* A weekday by number (0 and 7: Sunday) or by name; -1 for neither. `*at` is moved behind it. */
static int weekday(const char **at) {
  static const char names[][4] = {"sun", "mon", "tue", "wed", "thu", "fri", "sat"};
  int day = 0;
  if (**at >= '0' && **at <= '7') return *(*at)++ - '0';
  for (day = 0; day < 7; ++day) {
    if (strncasecmp(*at, names[day], 3) == 0) {
      *at += 3;
      return day;
    }
  }
  return -1;
}

/* The weekdays of a field of a crontab, bit 0 = Sunday; 0 for what is none. */
static int weekdays_of(const char *field) {
  int days = 0;
  if (strcmp(field, "*") == 0) return 127;
  for (;;) {
    int day = weekday(&field);
    int last = day;
    if (*field == '-') {
      ++field;
      last = weekday(&field);
    }
    if (day < 0 || last < day) return 0;
    for (; day <= last; ++day) days |= 1 << day % 7;
    if (*field == '\0') return days;
    if (*field++ != ',') return 0;
  }
}

/* Whether one line was added, of 07:30 on these days. */
static int line_is_of(int weekdays) {
  char line[256];
  char days[64] = "";
  int found[2] = {-1, -1};
  int length = 0;
  if (lines_added(line, sizeof line) != 1) return 0;
  sscanf(line, "%d %d * * %63s root : platform_check%n", &found[0], &found[1], days, &length);
  return length > 0 && line[length] == '\0' && found[0] == 30 && found[1] == 7 &&
         weekdays_of(days) == weekdays;
}

static void check_crontab(void) {
  ZELO_SCHEDULE schedule;
  struct stat is_now;
  char line[256];
  int added = 0;
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
  CONTRACT(ZELOScheduleSet, "no line when it is not enabled",
           ZELOScheduleSet(&schedule, 0) == 0 && crontab_is_as_before());
  CONTRACT(ZELOScheduleSet, "a line of the time that runs the command as root",
           (added = ZELOScheduleSet(&schedule, 1) == 0) && line_is_of(2));
  CONTRACT(ZELOScheduleSet, "every other line stays, and one is new",
           added && lines_added(line, sizeof line) == 1);
  CONTRACT(ZELOScheduleSet, "owner and mode stay",
           added && stat(crontab, &is_now) == 0 && crontab_was.st_mode == is_now.st_mode &&
               crontab_was.st_uid == is_now.st_uid && crontab_was.st_gid == is_now.st_gid);
  CONTRACT(ZELOUpdateCrontab, "0 when nothing is to be told",
           ZELOUpdateCrontab(": platform_check", 0, 0) == 0);
  CONTRACT(ZELOUpdateCrontab, "0 when cron is told, and when there is none",
           ZELOUpdateCrontab(": platform_check", 0, 1) == 0);
  CONTRACT(QLIBCFileSetLine, "the line goes from the crontab",
           added && QLIBCFileSetLine(crontab, ": platform_check", NULL, 0) == 1 &&
               lines_added(line, sizeof line) == 0);
  schedule.weekdays = 127;
  CONTRACT(ZELOScheduleSet, "a line of every day",
           ZELOScheduleSet(&schedule, 1) == 0 && line_is_of(127));
  QLIBCFileSetLine(crontab, ": platform_check", NULL, 0);
  schedule.weekdays = 1;
  CONTRACT(ZELOScheduleSet, "a line of Sundays",
           ZELOScheduleSet(&schedule, 1) == 0 && line_is_of(1));
  QLIBCFileSetLine(crontab, ": platform_check", NULL, 0);
  schedule.weekdays = 2;
  for (i = 0; i < ENTRIES; ++i) ZELOScheduleSet(&schedule, 1);
  CONTRACT(ZELOScheduleSet, "a line for each of a hundred calls",
           lines_added(line, sizeof line) == ENTRIES);
}

/* ---- --system PLUGINS: a plugin that is called ----------------------------------------------- */

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

/* Makes the missing directories of the path. Returns the length of the part that was there. */
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

/* ---- all of them ----------------------------------------------------------------------------- */

/* Runs a group in a child process, so that a crash does not affect others. Returns the number of
 * faults. */
static int run(const char *name, void (*group)(void)) {
  char why[64];
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
    snprintf(why, sizeof why, " (no process: %s)", strerror(errno));
    return fault(shared->current, why);
  }
  if (WIFSIGNALED(status)) {
    snprintf(why, sizeof why, " (ended by signal %d)", WTERMSIG(status));
    return fault(shared->current, why);
  }
  if (WEXITSTATUS(status) != HELD && WEXITSTATUS(status) != FAILED) {
    snprintf(why, sizeof why, " (ended with status %d)", WEXITSTATUS(status));
    return fault(shared->current, why);
  }
  return WEXITSTATUS(status) != HELD;
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
  if (crontab_before == NULL) return fault(crontab, ": cannot be read, so no line was added");
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
  if (access(plugin, F_OK) == 0)
    return fault(plugin, ": is there already, so no plugin was called");
  write_text(plugin, script);
  if (chmod(plugin, 0755) != 0) perror(plugin);
  faults = run("plugins that are called", check_called_plugins);
  unlink(plugin);
  remove_directories(plugins, there);
  return faults;
}

/* With all that a crashed group has left there. */
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
                {"a file that is cut off", check_cut_off},
                {"a copied file", check_copied},
                {"many sections", check_many_sections},
                {"symbolic links", check_links},
                {"lines", check_lines},
                {"programs", check_exec},
                {"a child of nobody", check_fork},
                {"processes", check_alive},
                {"forked children", check_forked},
                {"other users", check_other_user},
                {"plugins", check_plugins},
                {"users", check_users},
                {"Base64", check_base64},
                {"long Base64", check_long_base64}};
  char plugins[256] = "";
  int faults = 0;
  size_t i = 0;
  const int system = argc > 1 && strcmp(argv[1], "--system") == 0;
  if (argc > 3 || (argc > 1 && !system) || (argc == 3 && argv[2][0] != '/')) {
    fprintf(stderr, "usage: %s [--system [/DIRECTORY/OF/PLUGINS]]\n", argv[0]);
    return USAGE;
  }
  if (system && geteuid() != 0) {
    fprintf(stderr, "%s: only root can check what a machine has once\n", argv[0]);
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
  /* Ignored, so that what was changed is put back. */
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
  fprintf(stderr, "%d hold, %d do not\n", shared->sums[1], shared->sums[0]);
  return faults > 0;
}
