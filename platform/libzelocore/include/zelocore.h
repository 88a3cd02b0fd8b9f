/*
 * zelocore.h - the appliance's core platform library.
 *
 * Conventions
 *  1. Plain C types; usable from C11 and C++.
 *  2. A function that fails returns a negative value (or NULL) and leaves its
 *     reason in the process-wide error record, with the file and the line that
 *     set it. A function that succeeds does not touch the record.
 *  3. Texts handed in are copied; texts handed out belong to the object that
 *     they came from and live until that object is changed or freed.
 *  4. One thread at a time: the record and the file cache are process-wide.
 *  5. No C++ exception leaves the library.
 */
#ifndef ZELOCORE_H
#define ZELOCORE_H

#include <sys/types.h>

#ifdef __cplusplus
extern "C" {
#endif
/* What is declared here is exported; all else is hidden. */
#pragma GCC visibility push(default)

/* ---- error record -------------------------------------------------------- */

/* Codes that this library sets; the scheduler library uses the same numbers. */
enum {
  QLIBC_ERR_OUT_OF_MEMORY = 0x0200, /* an allocation failed */
  QLIBC_ERR_OPEN = 0x0900, /* a file could not be created or opened, or is of the wrong kind */
  QLIBC_ERR_IO = 0x0B00,   /* a read or write failed, or a file was found cut off */
  QLIBC_ERR_BAD_PARAMETER = 0x0D00, /* a bad argument */
  QLIBC_ERR_NOT_FOUND = 0x2000,     /* something looked up was not found */
  QLIBC_ERR_STAT = 0x2700,          /* stat failed */
  QLIBC_ERR_RENAME = 0x2800,        /* rename failed */
  QLIBC_ERR_SYSTEM = 0x2A00         /* a system call on time, identity or processes failed */
};

/* Sets the record. szFile is copied (NULL counts as ""). */
void QLIBCErrSetEx(int code, const char *szFile, int line);
/* The code last set; 0 at start. */
int QLIBCErrGet(void);
/* The file that set it; "" at start. Valid until the next QLIBCErrSetEx. */
const char *QLIBCErrorGetFile(void);
/* The line that set it; 0 at start. */
int QLIBCErrorGetLine(void);

/* ---- text hashes ---------------------------------------------------------- */

/* A hash from text to text. Its order is unspecified. */
typedef struct QLIBC_SZHASH *PSZHASH;
/* A growable list of texts. */
typedef struct QLIBC_SZLIST *PSZLIST;

/* A new empty hash. `capacity` is the caller's guess at the number of entries: any
 * number will do, and the hash grows as it must. Free it with QLIBCSzHashFree.
 * NULL with 0x0200 when memory is short. */
PSZHASH QLIBCSzHashAlloc(int capacity);
/* Sets szKey to a copy of szValue, replacing what it had. The hash may grow,
 * hence the address of its handle. 0, or -1 (0x0D00, 0x0200). */
int QLIBCSzHashSetValue(PSZHASH *ppHash, const char *szKey, const char *szValue);
/* The value of szKey, or NULL when the hash lacks it (no error is set then; a
 * null argument sets 0x0D00). Valid until the hash is changed or freed. */
const char *QLIBCSzHashGetValue(PSZHASH pHash, const char *szKey);
/* Removes every entry and frees their memory. NULL is allowed. */
void QLIBCHashRemoveAll(PSZHASH pHash);
/* Appends every key to *ppList. Their number, or -1 (0x0D00, 0x0200). */
int QLIBCSzHashEnumKey(PSZHASH pHash, PSZLIST *ppList);
/* Frees the hash. NULL is allowed. */
void QLIBCSzHashFree(PSZHASH pHash);

/* ---- text lists ----------------------------------------------------------- */

/* A new empty list. `capacity` is the caller's guess at the number of texts, as for
 * a hash. Free it with QLIBCSzListFree. NULL with 0x0200 when memory is short. */
PSZLIST QLIBCSzListAlloc(int capacity);
/* Appends a copy of szText. The number of texts now in the list, or -1. */
int QLIBCSzListPush(PSZLIST *ppList, const char *szText);
/* The text at `index` (0-based), or NULL when there is none there. */
const char *QLIBCSzListGet(PSZLIST pList, int index);
/* The number of texts; 0 for NULL. */
int QLIBCSzListCount(PSZLIST pList);
/* Frees the list and its texts. NULL is allowed. */
void QLIBCSzListFree(PSZLIST pList);
/* Splits szText at every character of szSep and appends the pieces that are
 * not empty to *ppList. The number of pieces appended, or -1. */
int QLIBCStrSep(const char *szText, const char *szSep, PSZLIST *ppList);

/* ---- files and section files ----------------------------------------------
 *
 * A section file is text: `[name]`, then lines `key="value"`. In a quoted
 * value a backslash escapes `"`, `\` and control bytes; every other byte
 * stands for itself, so any text reads back unchanged. Blank lines, lines that
 * begin with `#` or `;`, and values without quotes are read too.
 *
 * A file that these functions wrote begins with a header comment and ends with
 * a trailer comment that carries the number of sections and a checksum. A
 * reader that finds an empty file, or a header without a trailer or with one
 * that disagrees, takes it for a copy in progress while the file is younger
 * than a second: it waits a few milliseconds and reads again. After that, a
 * header without a trailer is a file that was cut off, and every section call
 * fails on it with 0x0B00. A file whose trailer disagrees, or without a header,
 * was edited by hand and is read as it is.
 *
 * A change makes a new file, with the old one's owner and mode, and renames it
 * over the old one. Only regular files are read and changed; a symbolic link is
 * followed for reading and refused (0x0900) for a change. A change does not
 * wait for a copy in progress: nobody else may write the file meanwhile.
 */

/* For the functions that change a file: the change is on the disk when the call
 * returns, so that after a power cut the file is the old or the new one, never
 * half of it and never empty. */
enum { QLIBC_FILE_SYNC = 1 };

/* 0 when the path does not exist or is null, else 1, also when stat fails for
 * another reason (an error of the disk, a directory that may not be searched).
 * A dangling symbolic link does not exist. */
int QLIBCFileExist(const char *szPath);
/* Creates an empty file, or updates the times of an existing one. 0, or -1
 * (0x0D00, 0x0900). A symbolic link is not followed. A new file has mode 0644
 * at most. */
int QLIBCFileTouch(const char *szPath);
/* Appends the name of every section to *ppList, in file order. Their number,
 * or -1 (0x0D00, 0x0900, 0x0B00, 0x0200). */
int QLIBCFileEnumSection(const char *szPath, PSZLIST *ppList);
/* Sets every key of the section in *ppHash (keys that the hash has already
 * stay). 1 when the section was read, 0 when there is none, -1 on failure. Of
 * sections with the same name the first is meant. */
int QLIBCFileGetSection(const char *szPath, const char *szSection, PSZHASH *ppHash);
/* Replaces the whole content of an existing section by the hash, in place; the
 * other sections keep every byte, and so do comments and blank lines right
 * before the next one. 1 when replaced, 0 when there is no such section
 * (nothing is written), -1 on failure (0x0D00, 0x0900 also when there is no
 * file, 0x0B00, 0x2800, 0x0200; the file is as it was). The flags are 0 or
 * QLIBC_FILE_SYNC, `reserved` must be 0. A key must not be empty, begin with
 * `[`, `#` or `;`, begin or end with a blank, or hold `=` or a control byte
 * (0x0D00). */
int QLIBCFileSetSection(const char *szPath, const char *szSection, int flags, PSZHASH pHash,
                        int reserved);
/* Appends a new section, to a new file when there is none. 1, or -1 as above
 * (0x0D00 also for a section that exists, and for a name that is empty, begins
 * or ends with a blank, or holds `]` or a control byte). */
int QLIBCFileAddSection(const char *szPath, const char *szSection, PSZHASH pHash, int flags);
/* Removes a section, without waiting for the disk. 1 when removed, 0 when there
 * is none, -1 on failure as above. */
int QLIBCFileRemoveSection(const char *szPath, const char *szSection);

/* ---- files of lines -------------------------------------------------------- */

/* Changes the first line of a text file that contains szKey. Without a value
 * (NULL) that line is removed; with one it is replaced by the value, which is
 * appended as a new last line when no line contains the key. Every other line
 * is kept byte for byte, and so are the file's owner and mode; the change is
 * always on the disk when the call returns (QLIBC_FILE_SYNC), and a symbolic
 * link is refused. 1 when the file was changed; 0 when there is nothing to
 * remove, also when there is no file; -1 with the file as it was (0x0D00 for an
 * empty key, a value with a line feed and for flags other than 0, 0x0900 also
 * when there is no file to set a value in, 0x0B00, 0x2800, 0x0200). */
int QLIBCFileSetLine(const char *szPath, const char *szKey, const char *szValue, int flags);

/* ---- processes ------------------------------------------------------------ */

/* Runs szProgram with the arguments that follow, ended by NULL, and waits. The
 * exit status; 128 + N when signal N ended it (0x2A00 for either, unless it is
 * 0); -1 when it could not be started (0x2A00) or has more than 255 arguments
 * (0x0D00). The program is not looked up in PATH; it starts with default signal
 * handling and the caller's environment. SIGCHLD may be ignored or handled by the
 * caller. */
int QLIBCExec(const char *szProgram, ...) __attribute__((sentinel));
/* Forks a child that the caller need not wait for and that leaves no zombie:
 * 1 in the calling process, 0 in the child, -1 when there is no child
 * (0x2A00). */
int QLIBCProcForkChildNoWait(void);
/* 1 when the process exists and is no zombie, else 0. */
int QLIBCProcAlive(pid_t pid);

/* ---- plugins --------------------------------------------------------------
 *
 * A plugin of NAME is an executable regular file in
 * "/usr/zelo/libexec/plugins/NAME.d/" that root owns and nobody else may write.
 * Each is run, in name order, with the action name and "pre" or "post" as
 * arguments and the hook arguments as environment variables. One that runs
 * longer than 30 seconds is ended, with all that it started, and counts as
 * failed. Its working directory is "/", its standard input and output are
 * "/dev/null", and its environment has a fixed PATH beside the hook arguments.
 * Without the directory there are no plugins; one that others than root may
 * write is refused.
 */

enum { QLIBPLUGIN_PRE = 4, QLIBPLUGIN_POST = 5 };

/* Prepares a hook call. ppContext points to three machine words that belong to
 * this library until QLIBPluginExit; the first is not zero while the context
 * lives. 0, or -1 (0x0D00, 0x0200) with the first word zero. */
int QLIBPluginInit(const char *szPlugin, const char *szAction, void **ppContext);
/* Sets one argument of the hook calls that follow. The key is the name of an
 * environment variable other than PATH and LD_*. 0, or -1 (0x0D00, 0x0200). */
int QLIBPluginSetArg(void **ppContext, const char *szKey, const char *szValue);
int QLIBPluginSetArgByInt(void **ppContext, const char *szKey, int value);
/* Runs every plugin for the stage. 0 when each of them exited with 0, -1 when
 * one failed (0x2A00; all are run all the same) or on a failure before that
 * (0x0D00, 0x0900, 0x0200). */
int QLIBPluginAction(int stage, void **ppContext);
/* Releases the context and clears its words. 0, or -1 (0x0D00). */
int QLIBPluginExit(void **ppContext);

#pragma GCC visibility pop
#ifdef __cplusplus
}
#endif
#endif
