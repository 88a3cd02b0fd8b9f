/*
 * To be preloaded into examples/platform_check: a platform that breaks one contract, the one that
 * WRONG_PLATFORM names as the check names it ("QLIBCExec: the exit status"). "CALL exits",
 * "CALL crashes" and "CALL hangs" are further ones; "ZELOScheduleSet adds lines in front" breaks
 * none.
 */
#include <dlfcn.h>
#include <signal.h>
#include <stdarg.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>
#include <zelocore.h>
#include <zelosdk.h>

static int wrong(const char *fault) {
  const char *wanted = getenv("WRONG_PLATFORM");
  return wanted != NULL && strcmp(wanted, fault) == 0;
}

enum { MUCH = 10000 };

/* The function that this one stands in for, as `real`. */
#define REAL(name)                      \
  static __typeof__(&name) real = NULL; \
  if (real == NULL) *(void **)&real = dlsym(RTLD_NEXT, #name)

#define WRONG(result, fault)         \
  do {                               \
    if (wrong(fault)) return result; \
  } while (0)

static void set_mode(const char *path, mode_t mode) {
  if (chmod(path, mode) != 0) abort();
}

/* After a change by the call. */
static void spoil_owner_and_mode(const char *call, const char *path) {
  char fault[128];
  snprintf(fault, sizeof fault, "%s: the mode stays", call);
  if (wrong(fault)) set_mode(path, 0600);
  snprintf(fault, sizeof fault, "%s: the owner stays", call);
  if (wrong(fault) && chown(path, 0, 0) != 0) abort();
}

static int left_alone; /* in the child of QLIBCProcForkChildNoWait */

static int wrong_in_child(const char *call, pid_t *first) {
  char fault[128];
  if (*first == 0) *first = getpid();
  if (*first == getpid()) return 0;
  snprintf(fault, sizeof fault, "%s: works in %s", call,
           left_alone ? "the child of QLIBCProcForkChildNoWait" : "a forked child too");
  return wrong(fault);
}

/* In a process that the first call was not made in. */
#define WRONG_IN_CHILD(result, name)                  \
  do {                                                \
    static pid_t first;                               \
    if (wrong_in_child(#name, &first)) return result; \
  } while (0)

/* ---- the error record ---- */

void QLIBCErrSetEx(int code, const char *szFile, int line) {
  REAL(QLIBCErrSetEx);
  WRONG_IN_CHILD(, QLIBCErrSetEx);
  if (szFile == NULL && wrong("QLIBCErrSetEx: no file counts as an empty one")) szFile = "none";
  real(code, szFile, line);
}

static int asked;

int QLIBCErrGet(void) {
  REAL(QLIBCErrGet);
  WRONG(asked++ == 0 ? 1 : real(), "QLIBCErrGet: 0 at start");
  WRONG(0, "QLIBCErrGet: the code last set");
  return real();
}

const char *QLIBCErrorGetFile(void) {
  REAL(QLIBCErrorGetFile);
  WRONG("x", "QLIBCErrorGetFile: empty at start");
  WRONG("b.c", "QLIBCErrorGetFile: a copy of the file last set");
  return real();
}

int QLIBCErrorGetLine(void) {
  REAL(QLIBCErrorGetLine);
  WRONG(1, "QLIBCErrorGetLine: 0 at start");
  WRONG(0, "QLIBCErrorGetLine: the line last set");
  return real();
}

/* ---- hashes and lists ---- */

static int removed; /* everything, from a hash */

PSZHASH QLIBCSzHashAlloc(int capacity) {
  REAL(QLIBCSzHashAlloc);
  WRONG(capacity < 0 ? NULL : real(capacity),
        "QLIBCSzHashAlloc: an empty hash, whatever the capacity");
  return real(capacity);
}

int QLIBCSzHashSetValue(PSZHASH *ppHash, const char *szKey, const char *szValue) {
  static const char *given; /* not copied */
  int result = 0;
  REAL(QLIBCSzHashSetValue);
  if (szKey == NULL) WRONG(0, "QLIBCSzHashSetValue: null is refused");
  if (strlen(szValue) > MUCH) WRONG(-1, "QLIBCSzHashSetValue: a value of 16384 bytes");
  if (szKey != NULL) {
    const int is_there = QLIBCSzHashGetValue(*ppHash, szKey) != NULL;
    if (is_there) WRONG(0, "QLIBCSzHashSetValue: a value is replaced");
    if (strcmp(szKey, "KEY") == 0 && wrong("QLIBCSzHashSetValue: keys differ in case"))
      szKey = "key";
    if (strcmp(szKey, "key 500") == 0) WRONG(-1, "QLIBCSzHashSetValue: the hash grows");
    if (strcmp(szKey, "a") == 0 && removed)
      WRONG(-1, "QLIBCHashRemoveAll: the hash can be filled again");
    if (wrong("QLIBCSzHashSetValue: key and value are copied")) szValue = given = "x";
  }
  (void)given;
  result = real(ppHash, szKey, szValue);
  WRONG(1, "QLIBCSzHashSetValue: 0");
  if (wrong("QLIBCSzHashSetValue: a success leaves the error record alone"))
    QLIBCErrSetEx(7, "", 0);
  return result;
}

const char *QLIBCSzHashGetValue(PSZHASH pHash, const char *szKey) {
  REAL(QLIBCSzHashGetValue);
  WRONG_IN_CHILD(NULL, QLIBCSzHashGetValue);
  if (strcmp(szKey, "none") == 0 &&
      wrong("QLIBCSzHashGetValue: null for a key that is not there, which is no error")) {
    QLIBCErrSetEx(0x2000, "", 0);
  }
  return real(pHash, szKey);
}

void QLIBCHashRemoveAll(PSZHASH pHash) {
  REAL(QLIBCHashRemoveAll);
  removed = 1;
  if (!wrong("QLIBCHashRemoveAll: no entry is left")) real(pHash);
}

int QLIBCSzHashEnumKey(PSZHASH pHash, PSZLIST *ppList) {
  REAL(QLIBCSzHashEnumKey);
  const int count = real(pHash, ppList);
  WRONG(count - 1, "QLIBCSzHashEnumKey: every key once, and how many");
  return count;
}

void QLIBCSzHashFree(PSZHASH pHash) {
  REAL(QLIBCSzHashFree);
  if (pHash == NULL && wrong("QLIBCSzHashFree: null is allowed")) abort();
  real(pHash);
}

PSZLIST QLIBCSzListAlloc(int capacity) {
  REAL(QLIBCSzListAlloc);
  WRONG(capacity < 0 ? NULL : real(capacity),
        "QLIBCSzListAlloc: an empty list, whatever the capacity");
  return real(capacity);
}

int QLIBCSzListPush(PSZLIST *ppList, const char *szText) {
  REAL(QLIBCSzListPush);
  if (strlen(szText) > MUCH) WRONG(-1, "QLIBCSzListPush: a text of 16384 bytes");
  if (wrong("QLIBCSzListPush: the text is copied")) szText = "xext";
  if (strcmp(szText, "more") == 0) WRONG(1, "QLIBCSzListCount: how many texts there are");
  const int count = real(ppList, szText);
  WRONG(0, "QLIBCSzListPush: the number of texts then");
  return count;
}

int QLIBCSzListCount(PSZLIST pList) {
  REAL(QLIBCSzListCount);
  if (wrong("QLIBCSzListCount exits")) exit(0);
  if (pList == NULL) WRONG(-1, "QLIBCSzListCount: 0 for null");
  return real(pList);
}

const char *QLIBCSzListGet(PSZLIST pList, int index) {
  REAL(QLIBCSzListGet);
  if (index == 999) WRONG(real(pList, 0), "QLIBCSzListGet: the texts in their order");
  if (index < 0) WRONG("", "QLIBCSzListGet: null where there is none");
  return real(pList, index);
}

int QLIBCStrSep(const char *szText, const char *szSep, PSZLIST *ppList) {
  REAL(QLIBCStrSep);
  const int count = real(szText, szSep, ppList);
  WRONG(count + 1, "QLIBCStrSep: the pieces that are not empty, appended");
  return count;
}

void QLIBCSzListFree(PSZLIST pList) {
  REAL(QLIBCSzListFree);
  if (pList == NULL && wrong("QLIBCSzListFree: null is allowed")) abort();
  real(pList);
}

/* ---- section files ---- */

static int is_link(const char *path) {
  struct stat found;
  return lstat(path, &found) == 0 && S_ISLNK(found.st_mode);
}

static void spoil_section(const char *path, const char *section) {
  REAL(QLIBCFileSetSection);
  PSZHASH hash = QLIBCSzHashAlloc(1);
  QLIBCSzHashSetValue(&hash, "other", "spoilt");
  real(path, section, 0, hash, 0);
  QLIBCSzHashFree(hash);
}

int QLIBCFileExist(const char *szPath) {
  REAL(QLIBCFileExist);
  const int exists = real(szPath);
  if (szPath == NULL) WRONG(1, "QLIBCFileExist: 0 for null");
  if (szPath != NULL && !exists) WRONG(1, "QLIBCFileExist: 0 for what is not there");
  if (exists && access(szPath, F_OK) == 0) WRONG(0, "QLIBCFileExist: 1 for what is there");
  if (exists) WRONG(0, "QLIBCFileExist: 1 for what cannot be told");
  return exists;
}

int QLIBCFileTouch(const char *szPath) {
  struct stat found;
  REAL(QLIBCFileTouch);
  WRONG_IN_CHILD(-1, QLIBCFileTouch);
  if (lstat(szPath, &found) != 0) {
    WRONG(0, "QLIBCFileTouch: an empty file is made");
  } else if (S_ISLNK(found.st_mode) && wrong("QLIBCFileTouch: a symbolic link is not followed")) {
    return QLIBCExec("/bin/sh", "-c", "echo >\"$1\"", "sh", szPath, NULL);
  } else if (wrong("QLIBCFileTouch: a file that is there keeps what is in it")) {
    return truncate(szPath, 0);
  }
  return real(szPath);
}

int QLIBCFileEnumSection(const char *szPath, PSZLIST *ppList) {
  REAL(QLIBCFileEnumSection);
  WRONG_IN_CHILD(-1, QLIBCFileEnumSection);
  if (wrong("QLIBCFileEnumSection: the names are appended")) {
    QLIBCSzListFree(*ppList);
    *ppList = QLIBCSzListAlloc(1);
  }
  const int before = QLIBCSzListCount(*ppList);
  int count = real(szPath, ppList);
  if (count < 0 && QLIBCErrGet() == QLIBC_ERR_OPEN) {
    WRONG(0, "QLIBCFileEnumSection: a file that is not there is told");
  }
  if (count < 0 && QLIBCErrGet() == QLIBC_ERR_IO) {
    WRONG(0, "QLIBCFileEnumSection: a file that is cut off is told");
  }
  if (count == 2 && strcmp(QLIBCSzListGet(*ppList, before + 1), "copied") == 0 &&
      wrong("QLIBCFileEnumSection: a file that is being copied is waited for")) {
    return -1;
  }
  if (count == 2 && strcmp(QLIBCSzListGet(*ppList, before + 1), "empty") == 0)
    WRONG(-1, "QLIBCFileEnumSection: a file of which no byte is there yet is waited for");
  if (count == 2 && (wrong("QLIBCFileEnumSection: the names in the order of the file") ||
                     wrong("QLIBCFileSetSection: the order stays"))) {
    char *first = strdup(QLIBCSzListGet(*ppList, before));
    char *second = strdup(QLIBCSzListGet(*ppList, before + 1));
    QLIBCSzListFree(*ppList);
    *ppList = QLIBCSzListAlloc(2);
    QLIBCSzListPush(ppList, second);
    QLIBCSzListPush(ppList, first);
    free(first);
    free(second);
  }
  return count;
}

int QLIBCFileGetSection(const char *szPath, const char *szSection, PSZHASH *ppHash) {
  REAL(QLIBCFileGetSection);
  WRONG_IN_CHILD(-1, QLIBCFileGetSection);
  if (wrong("QLIBCFileGetSection: keys that the hash has already stay"))
    QLIBCHashRemoveAll(*ppHash);
  const int found = real(szPath, szSection, ppHash);
  if (found < 0 && QLIBCErrGet() == QLIBC_ERR_IO)
    WRONG(0, "QLIBCFileGetSection: a file that is cut off is told");
  if (found < 0) WRONG(0, "QLIBCFileGetSection: a file that is not there is told");
  if (found == 0) WRONG(1, "QLIBCFileGetSection: 0 when there is no such section");
  WRONG(found > 0 ? 2 : found, "QLIBCFileGetSection: 1 when the section was read");
  if (found > 0) {
    if (wrong("QLIBCFileGetSection: its values")) {
      QLIBCSzHashSetValue(ppHash, "key", "\"two\"");
    }
    if (strcmp(szSection, "2") == 0 &&
        wrong("QLIBCFileAddSection: every byte but zero reads back")) {
      QLIBCSzHashSetValue(ppHash, "bytes", "\x01\x02");
    }
    if (wrong("QLIBCFileAddSection: a key with a blank reads back"))
      QLIBCSzHashSetValue(ppHash, "run hour", "");
    if (wrong("QLIBCFileAddSection: a value of 16384 bytes reads back"))
      QLIBCSzHashSetValue(ppHash, "long", "x");
  }
  return found;
}

int QLIBCFileAddSection(const char *szPath, const char *szSection, PSZHASH pHash, int flags) {
  REAL(QLIBCFileAddSection);
  if (is_link(szPath)) WRONG(1, "QLIBCFileAddSection: a symbolic link is refused");
  if (access(szPath, F_OK) != 0) WRONG(0, "QLIBCFileAddSection: 1, and the file is made");
  if (strcmp(szSection, "500") == 0) WRONG(1, "QLIBCFileAddSection: there is room for a thousand");
  if (strcmp(szSection, "2") == 0 && wrong("QLIBCFileAddSection: the other sections stay"))
    unlink(szPath);
  const int result = real(szPath, szSection, pHash, flags);
  if (result < 0 && QLIBCErrGet() == QLIBC_ERR_BAD_PARAMETER) {
    WRONG(1, "QLIBCFileAddSection: a section that is there is refused");
  }
  if (result < 0 && QLIBCErrGet() == QLIBC_ERR_IO) {
    WRONG(1, "QLIBCFileAddSection: a file that is cut off is not built on");
  }
  if (result == 1) spoil_owner_and_mode("QLIBCFileAddSection", szPath);
  return result;
}

int QLIBCFileSetSection(const char *szPath, const char *szSection, int flags, PSZHASH pHash,
                        int reserved) {
  struct stat before;
  REAL(QLIBCFileSetSection);
  if (is_link(szPath)) WRONG(1, "QLIBCFileSetSection: a symbolic link is refused");
  if (stat(szPath, &before) != 0) abort();
  if (wrong("QLIBCFileSetSection: the file is replaced as a whole")) {
    QLIBCExec("/bin/sh", "-c", "ln \"$1\" \"$1.was\"", "sh", szPath,
              NULL); /* its inode, to be used again */
  }
  if (wrong("QLIBCFileSetSection: no key of before is left")) {
    QLIBCFileGetSection(szPath, szSection, &pHash);
  }
  const int result = real(szPath, szSection, flags, pHash, reserved);
  if (result == 1) {
    spoil_owner_and_mode("QLIBCFileSetSection", szPath);
    WRONG(2, "QLIBCFileSetSection: 1 when it was replaced");
    if (wrong("QLIBCFileSetSection: the other sections keep what they hold"))
      spoil_section(szPath, "2");
    if (wrong("QLIBCFileSetSection: the file is replaced as a whole")) {
      static const char put_back[] = "cat \"$1\" >\"$1.was\" && mv \"$1.was\" \"$1\"";
      QLIBCExec("/bin/sh", "-c", put_back, "sh", szPath, NULL);
    }
  }
  if (result < 0 && QLIBCErrGet() == QLIBC_ERR_IO)
    WRONG(1, "QLIBCFileSetSection: a file that is cut off is not built on");
  if (result == 0)
    WRONG(1, "QLIBCFileSetSection: 0 when there is no such section, and nothing is written");
  return result;
}

int QLIBCFileRemoveSection(const char *szPath, const char *szSection) {
  REAL(QLIBCFileRemoveSection);
  if (is_link(szPath)) WRONG(1, "QLIBCFileRemoveSection: a symbolic link is refused");
  WRONG(1, "QLIBCFileRemoveSection: that section and no other is gone");
  const int result = real(szPath, szSection);
  if (result == 1 && wrong("QLIBCFileRemoveSection: the other sections keep what they hold"))
    spoil_section(szPath, "2");
  if (result < 0 && QLIBCErrGet() == QLIBC_ERR_IO)
    WRONG(1, "QLIBCFileRemoveSection: a file that is cut off is not built on");
  if (result == 1) spoil_owner_and_mode("QLIBCFileRemoveSection", szPath);
  if (result == 1) WRONG(0, "QLIBCFileRemoveSection: 1 when it was removed");
  if (result == 0) WRONG(1, "QLIBCFileRemoveSection: 0 when there is none");
  return result;
}

int QLIBCFileSetLine(const char *szPath, const char *szKey, const char *szValue, int flags) {
  REAL(QLIBCFileSetLine);
  if (is_link(szPath)) WRONG(1, "QLIBCFileSetLine: a symbolic link is refused");
  const int is_there = access(szPath, F_OK) == 0;
  if (!is_there && szValue == NULL) WRONG(1, "QLIBCFileSetLine: 0 when there is nothing to remove");
  if (!is_there && szValue != NULL) WRONG(0, "QLIBCFileSetLine: a value without a file is refused");
  if (strcmp(szKey, "key") == 0 && szValue != NULL &&
      wrong("QLIBCFileSetLine: the first line with the key is replaced")) {
    szKey = "key too";
  }
  if (strcmp(szKey, "none") == 0)
    WRONG(0, "QLIBCFileSetLine: where no line has it, one is appended");
  if (is_there && szValue == NULL) {
    WRONG(0, "QLIBCFileSetLine: without a value the line is removed");
    if (strcmp(szPath, "/etc/crontab") == 0)
      WRONG(1, "QLIBCFileSetLine: the line goes from the crontab");
  }
  if (szValue != NULL && strchr(szValue, '\n') != NULL) {
    WRONG(1, "QLIBCFileSetLine: a value with a line feed is refused");
  }
  const int result = real(szPath, szKey, szValue, flags);
  if (result == 1) spoil_owner_and_mode("QLIBCFileSetLine", szPath);
  return result;
}

/* ---- processes ---- */

int QLIBCExec(const char *szProgram, ...) {
  const char *arguments[8] = {NULL};
  va_list list;
  int i = 0;
  REAL(QLIBCExec);
  WRONG_IN_CHILD(-1, QLIBCExec);
  va_start(list, szProgram);
  for (i = 0; i < 7 && (arguments[i] = va_arg(list, const char *)) != NULL; ++i) {
  }
  va_end(list);
  if (i == 4 && wrong("QLIBCExec: arguments arrive as they are")) arguments[3] = "a";
  if (wrong("QLIBCExec: the environment arrives")) unsetenv("PLATFORM_CHECK");
  if (wrong("QLIBCExec: a child of the caller is still there to be waited for"))
    waitpid(-1, NULL, 0);
  const int result = real(szProgram, arguments[0], arguments[1], arguments[2], arguments[3],
                          arguments[4], (char *)NULL);
  if (result == 7) {
    WRONG(7 << 8, "QLIBCExec: the exit status");
    if (signal(SIGCHLD, SIG_IGN) == SIG_IGN)
      WRONG(-1, "QLIBCExec: the exit status for a caller who ignores his children");
    signal(SIGCHLD, SIG_DFL);
  }
  if (result > 128) WRONG(0, "QLIBCExec: not 0 for what a signal ended");
  if (result == -1) WRONG(127, "QLIBCExec: -1 when the program cannot be started");
  return result;
}

int QLIBCProcForkChildNoWait(void) {
  REAL(QLIBCProcForkChildNoWait);
  WRONG(fork() > 0, "QLIBCProcForkChildNoWait: there is no child to wait for");
  const int result = real();
  if (result == 1) WRONG(2, "QLIBCProcForkChildNoWait: 1 for the caller");
  if (result == 1 && wrong("QLIBCProcForkChildNoWait: the handling of SIGCHLD stays"))
    signal(SIGCHLD, SIG_DFL);
  if (result != 0) return result;
  left_alone = 1;
  if (wrong("QLIBCProcForkChildNoWait: 0 for the child, which runs")) _exit(0);
  if (wrong("QLIBCProcForkChildNoWait: the child keeps descriptors")) {
    int descriptor = 0;
    for (descriptor = 3; descriptor < 1024; ++descriptor) close(descriptor);
  }
  if (wrong("QLIBCProcForkChildNoWait: the child keeps the directory") && chdir("/") != 0) abort();
  if (wrong("QLIBCProcForkChildNoWait: the child keeps the session")) setsid();
  if (wrong("QLIBCProcForkChildNoWait: the child keeps the umask")) umask(0);
  return result;
}

int QLIBCProcAlive(pid_t pid) {
  siginfo_t ended;
  REAL(QLIBCProcAlive);
  WRONG_IN_CHILD(0, QLIBCProcAlive);
  if (geteuid() != 0) WRONG(0, "QLIBCProcAlive: as before with the effective id of another");
  const int is_alive = real(pid);
  if (is_alive) WRONG(0, "QLIBCProcAlive: 1 for this process");
  if (!is_alive) {
    const int is_zombie = waitid(P_PID, (id_t)pid, &ended, WEXITED | WNOWAIT | WNOHANG) == 0;
    if (is_zombie) WRONG(1, "QLIBCProcAlive: 0 for one that nobody has waited for yet");
    if (!is_zombie) WRONG(1, "QLIBCProcAlive: 0 for one that is gone");
  }
  return is_alive;
}

/* ---- plugins ---- */

static int ints; /* set so far */

int QLIBPluginInit(const char *szPlugin, const char *szAction, void **ppContext) {
  REAL(QLIBPluginInit);
  const int result = real(szPlugin, szAction, ppContext);
  WRONG(-1, "QLIBPluginInit: 0, and the first word is not null");
  if (wrong("QLIBPluginInit: the context is three words")) ppContext[3] = NULL;
  return result;
}

int QLIBPluginSetArg(void **ppContext, const char *szKey, const char *szValue) {
  REAL(QLIBPluginSetArg);
  WRONG(1, "QLIBPluginSetArg: 0");
  return real(ppContext, szKey, szValue);
}

int QLIBPluginSetArgByInt(void **ppContext, const char *szKey, int value) {
  REAL(QLIBPluginSetArgByInt);
  WRONG(1, "QLIBPluginSetArgByInt: 0");
  if (ints++ > 0) WRONG(-1, "QLIBPluginSetArgByInt: an argument can be set again");
  return real(ppContext, szKey, value);
}

int QLIBPluginAction(int stage, void **ppContext) {
  REAL(QLIBPluginAction);
  const int has_plugins = access("/usr/zelo/libexec/plugins/platform_check.d", F_OK) == 0;
  if (has_plugins && wrong("QLIBPluginAction crashes")) abort();
  if (has_plugins) WRONG(0, "QLIBPluginAction: a plugin is called");
  const int result = real(stage, ppContext);
  if (!has_plugins) WRONG(-1, "QLIBPluginAction: 0 without plugins");
  if (has_plugins && result == 0) WRONG(1, "QLIBPluginAction: 0 when every plugin succeeds");
  if (result < 0) WRONG(0, "QLIBPluginAction: below 0 when one fails");
  return result;
}

int QLIBPluginExit(void **ppContext) {
  REAL(QLIBPluginExit);
  WRONG(0, "QLIBPluginExit: 0, and the first word is null");
  return real(ppContext);
}

/* ---- users and Base64 ---- */

int ZELOUserGetByUID(uid_t uid, PZELOUSER *ppUser) {
  static pid_t first;
  REAL(ZELOUserGetByUID);
  if (wrong_in_child("ZELOUserGetByUID", &first)) pause(); /* for a thread that is not there */
  if (geteuid() != 0) WRONG(-1, "ZELOUserGetByUID: as before with the effective id of another");
  const int result = real(uid, ppUser);
  if (result == 0) {
    WRONG(1, "ZELOUserGetByUID: 0, and the user");
    if (wrong("ZELOUserGetByUID: his name, id, home directory and shell")) (*ppUser)->uid = 1;
  }
  if (uid == 4294967294U) WRONG(0, "ZELOUserGetByUID: the highest id is looked up like any other");
  if (result < 0 && wrong("ZELOUserGetByUID: the pointer is left alone on failure")) *ppUser = NULL;
  if (result < 0) WRONG(0, "ZELOUserGetByUID: a user who is not there is told");
  return result;
}

void ZELOUserFree(PZELOUSER pUser) {
  REAL(ZELOUserFree);
  if (pUser == NULL && wrong("ZELOUserFree: null is allowed")) abort();
  real(pUser);
}

int SzBase64EncodeFull(const char *src, size_t cbSrc, char *dst, size_t cbDst, int reserved) {
  REAL(SzBase64EncodeFull);
  if (cbSrc > MUCH) WRONG(0, "SzBase64EncodeFull: 12287 bytes");
  if (cbSrc == 0) WRONG(0, "SzBase64EncodeFull: an empty source is an empty text");
  const int result = real(src, cbSrc, dst, cbDst, reserved);
  if (result == 0) WRONG(1, "SzBase64EncodeFull: 0 where there is no room");
  if (cbDst == 9 && wrong("SzBase64EncodeFull: nothing is written behind the room")) dst[9] = 0;
  if (result == 1 && cbSrc == 4)
    WRONG(0, "SzBase64EncodeFull: 1, and a text that ends with a zero byte");
  if (result == 1 && cbSrc > 200 && wrong("SzBase64EncodeFull: one line, however long"))
    dst[76] = '\n';
  return result;
}

int ZELOEncodingBase64Decode(const char *src, size_t cbSrc, char *dst, size_t *pcbDst) {
  REAL(ZELOEncodingBase64Decode);
  WRONG_IN_CHILD(0, ZELOEncodingBase64Decode);
  if (cbSrc > MUCH) WRONG(0, "ZELOEncodingBase64Decode: 12287 bytes");
  const size_t room = *pcbDst;
  if (memchr(src, '\n', cbSrc) != NULL)
    WRONG(0, "ZELOEncodingBase64Decode: white space is passed over");
  if (cbSrc % 4 == 2)
    WRONG(0, "ZELOEncodingBase64Decode: a text that ends within a group is the whole bytes of it");
  const int result = real(src, cbSrc, dst, pcbDst);
  if (room == 4 && wrong("ZELOEncodingBase64Decode: nothing is written behind the room"))
    dst[4] = 0;
  if (result == 0 && room == 255) WRONG(1, "ZELOEncodingBase64Decode: 0 where there is no room");
  if (result == 1 && *pcbDst == 256 && wrong("ZELOEncodingBase64Decode: 1, and every byte"))
    dst[200] = 0;
  return result;
}

/* ---- power times and the crontab ---- */

static int reads; /* of the lists of before, which come first */

int ZELOAutoPowerConfGet(int list, int capacity, ZELO_AUTOPOWER *pEntries) {
  REAL(ZELOAutoPowerConfGet);
  const int count = real(list, capacity, pEntries);
  if (capacity > 100 && reads++ == 0) WRONG(-1, "ZELOAutoPowerConfGet: the lists are read");
  if (list > ZELO_AUTOPOWER_OFF)
    WRONG(0, "ZELOAutoPowerConfGet: a list that does not exist is refused");
  if (count == 2 && wrong("ZELOAutoPowerConfGet: what was set, and how many"))
    pEntries[1].minute = 0;
  if (capacity == 1) {
    WRONG(2, "ZELOAutoPowerConfGet: no more than there is room for");
    if (wrong("ZELOAutoPowerConfGet: nothing is written behind the room")) pEntries[1].minute = 0;
  }
  return count;
}

/* Those that are refused are carried out, on the machine. */
int ZELOAutoPowerConfSet(int list, int count, const ZELO_AUTOPOWER *pEntries) {
  static const ZELO_AUTOPOWER valid = {0, 127, 0, 0};
  static int sets;
  ZELO_AUTOPOWER got[2];
  REAL(ZELOAutoPowerConfSet);
  if (sets++ == 0 && wrong("ZELOAutoPowerConfSet: a list that was read is one that can be set"))
    return -1;
  if (list > ZELO_AUTOPOWER_OFF)
    WRONG(real(ZELO_AUTOPOWER_OFF, 1, &valid),
          "ZELOAutoPowerConfSet: a list that does not exist is refused");
  if (count == 1 && pEntries->hour > 23)
    WRONG(real(list, 1, &valid), "ZELOAutoPowerConfSet: an hour of 24 is refused");
  if (count == 0 && list == ZELO_AUTOPOWER_ON && QLIBCFileExist("/usr/zelo/etc/power_sched.conf"))
    WRONG(0, "ZELOAutoPowerConfSet: a list can be emptied");
  if (count == 0 && list == ZELO_AUTOPOWER_OFF &&
      ZELOAutoPowerConfGet(ZELO_AUTOPOWER_OFF, 2, got) == 1)
    WRONG(0, "ZELOAutoPowerConfSet: the times of before are put back");
  if (count == 100 && wrong("ZELOAutoPowerConfSet: there is room for a hundred")) count = 99;
  const int result = real(list, count, pEntries);
  if (count == 2) {
    if (wrong("ZELOAutoPowerConfSet crashes")) abort();
    WRONG(1, "ZELOAutoPowerConfSet: 0");
    if (wrong("ZELOAutoPowerConfSet: the other list stays")) real(ZELO_AUTOPOWER_OFF, 0, NULL);
  }
  return result;
}

int ZELOAutoPoweronSet(void) {
  ZELO_AUTOPOWER got[2];
  REAL(ZELOAutoPoweronSet);
  if (ZELOAutoPowerConfGet(ZELO_AUTOPOWER_ON, 2, got) > 0)
    WRONG(1, "ZELOAutoPoweronSet: 0 when a time is wanted, or why the machine cannot");
  else
    WRONG(-1, "ZELOAutoPoweronSet: 0 when no time is wanted");
  return real();
}

int ZELOScheduleSet(const ZELO_SCHEDULE *pSchedule, int enabled) {
  static const char crontab[] = "/etc/crontab";
  static int lines;
  ZELO_SCHEDULE given = *pSchedule;
  REAL(ZELOScheduleSet);
  if (given.hour > 23 && wrong("ZELOScheduleSet: an hour of 24 is refused")) given.hour = 23;
  if (given.weekdays == 127 && wrong("ZELOScheduleSet: a line of every day")) given.weekdays = 126;
  if (given.weekdays == 1 && wrong("ZELOScheduleSet: a line of Sundays")) given.weekdays = 64;
  if (enabled == 0 && wrong("ZELOScheduleSet: no line when it is not enabled")) enabled = 1;
  if (given.weekdays == 0 && wrong("ZELOScheduleSet: no line without a weekday"))
    given.weekdays = 127;
  if (given.weekdays == 2) {
    if (wrong("ZELOScheduleSet: a line of the time that runs the command as root"))
      given.weekdays = 4;
    if (++lines == 50) WRONG(0, "ZELOScheduleSet: a line for each of a hundred calls");
  }
  const int result = real(&given, enabled);
  if (result == 0 && enabled != 0 && given.weekdays != 0) {
    if (wrong("ZELOScheduleSet crashes")) abort();
    if (wrong("ZELOScheduleSet hangs")) pause();
    if (wrong("ZELOScheduleSet: every other line stays, and one is new")) {
      QLIBCExec("/bin/sh", "-c", "sed -i 1d /etc/crontab", NULL);
    }
    if (wrong("ZELOScheduleSet adds lines in front")) {
      static const char move[] = "text=$(tail -n 1 $0; sed '$d' $0) && echo \"$text\" >$0";
      QLIBCExec("/bin/sh", "-c", move, crontab, NULL);
    }
    if (wrong("ZELOScheduleSet: owner and mode stay")) set_mode(crontab, 0600);
  }
  return result;
}

int ZELOUpdateCrontab(const char *szCommand, int stop, int reload) {
  REAL(ZELOUpdateCrontab);
  if (reload)
    WRONG(-1, "ZELOUpdateCrontab: 0 when cron is told, and when there is none");
  else
    WRONG(-1, "ZELOUpdateCrontab: 0 when nothing is to be told");
  return real(szCommand, stop, reload);
}
