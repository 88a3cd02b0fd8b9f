/*
 * zelosched.h - scheduled tasks of the appliance: keep them, list them, run
 * them, and find out how they ended.
 *
 * Conventions
 *
 *  1. Records. A task is one ZELO_SCHED_TASK, flat and of fixed size. A record
 *     comes from ZELOSchedTaskAlloc and goes back through ZELOSchedTaskFree; a
 *     list comes from ZELOSchedTaskListGet, is walked with ZELOSchedTaskNext
 *     and goes back through ZELOSchedTaskListFree. Only a hook context keeps
 *     pointers to a caller's records after a call (ZELOSchedTaskPluginInit).
 *  2. Texts are zero-terminated and hold at most their capacity less one;
 *     what is longer is cut without an error.
 *  3. Results. 0 or a count that is not negative for success, -1 for failure.
 *     A lookup that may find nothing: 1 found, 0 not found, -1 error.
 *  4. Errors. Except where a function says otherwise, a failure leaves code,
 *     file and line in the platform's error record (QLIBCErrGet and the like),
 *     and a line in the system log at priority error that begins with the file
 *     and the line. The codes:
 *     0x0100 array allocation, 0x0200 record allocation, 0x0400 run lock or
 *     change lock not taken, 0x0500 run lock not released, 0x0900 file or
 *     database not opened, 0x0B00 read or write failed, 0x0D00 bad argument,
 *     0x2000 not found, 0x2700 fstat failed, 0x2800 rename failed, 0x2A00 call
 *     on time or identity failed, 0x4000 malformed number, date or time.
 *  5. Null. A pointer that must be given is tested; a null one is a failure
 *     with 0x0D00. Where null is allowed or leaves no code, the function says so.
 *  6. Outputs are untouched when a call fails, except a record that was being
 *     filled: discard it. ZELOSchedTaskCreate says what it may leave.
 *  7. Threads. One thread of a process at a time. Processes may use the
 *     library side by side.
 *  8. Clock. All times are local time; the resolution is the minute.
 *  9. Locking. Creating, editing, removing and synchronising hold a lock that
 *     excludes other processes. A change that has not got it after 30 seconds is
 *     not made, and fails with 0x0400 (ZELOSchedTaskSync only logs that).
 * 10. "/tmp". The live files are there, under fixed names. A process of root's
 *     makes those that are missing and replaces one that is another user's, which
 *     is moved into a directory that only root can enter and that the log names.
 *     For any other process such a file is a failure (0x0900). A program with a
 *     "/tmp" of its own (systemd's PrivateTmp, a container) must not use the
 *     library: it would write a crontab for tasks that cron's "/tmp" lacks.
 * 11. Width. No record and no call depends on the width of time_t or off_t. Where
 *     long has 32 bits (armhf), so have the ids that are arguments and the time
 *     that ZELOSchedDBGetStatusByTaskID gives, which is LONG_MAX for a run after
 *     January 2038; the database has the right time.
 */
#ifndef ZELOSCHED_H
#define ZELOSCHED_H

#include <stddef.h>
#include <stdint.h>
#include <stdio.h>

#if defined(__GNUC__)
#define ZELO_SCHED_API __attribute__((visibility("default")))
#else
#define ZELO_SCHED_API
#endif

#ifdef __cplusplus
extern "C" {
#endif

/* The platform's text hash (zelocore.h) and SQLite's connection (sqlite3.h). */
typedef struct QLIBC_SZHASH *PSZHASH;
typedef struct sqlite3 sqlite3;

/* ---- the task record ------------------------------------------------------ */

enum { ZELO_SCHED_ID_NEW = -1 }; /* the id of a task that is not stored yet */

enum { /* ZELO_SCHED_TASK.Backend */
       ZELO_SCHED_BACKEND_SCHEDULE = -2,
       ZELO_SCHED_BACKEND_AUTOPOWER = -3
};

enum { /* ZELO_SCHED_TASK.State */
       ZELO_SCHED_STATE_DISABLED = 0,
       ZELO_SCHED_STATE_ENABLED = 1,
       ZELO_SCHED_STATE_NOT_EXISTED = 2
};

enum { /* ZELO_SCHED_TASK.Type */
       ZELO_SCHED_TYPE_ONCE = 0,
       ZELO_SCHED_TYPE_DAILY = 1,
       ZELO_SCHED_TYPE_WEEKLY = 2,
       ZELO_SCHED_TYPE_MONTHLY = 3,
       ZELO_SCHED_TYPE_YEARLY = 4
};

typedef struct ZELO_SCHED_TASK ZELO_SCHED_TASK;
struct ZELO_SCHED_TASK {
  ZELO_SCHED_TASK *next;      /* next record of the list; null ends it */
  int32_t Backend;            /* id of the backend that owns the task */
  int32_t ID;                 /* id within the backend; -1 = not stored yet */
  uint32_t Owner;             /* uid under whose rights the task runs */
  char Name[4096];            /* display name */
  char NextTriggerTime[1024]; /* "YYYY-MM-DD hh:mm" or "N/A"; never stored */
  int32_t State;              /* 0 disabled, 1 enabled, 2 not existing */
  int32_t Type;               /* 0 once, 1 daily, 2 weekly, 3 monthly, 4 yearly */
  char Week[8];               /* seven from Sunday on; '0' = off, all else and the end = on */
  uint32_t StartYear;         /* day of the first or only run */
  uint32_t StartMonth;        /* 1 to 12 */
  uint32_t StartDay;          /* 1 to 31 */
  uint32_t RunHour;           /* 0 to 23: first run of a day */
  uint32_t RunMin;            /* 0 to 59: minute of every run */
  uint32_t RepeatHour;        /* 0 = one run a day; n = again every n hours */
  uint32_t LastWorkHour;      /* last hour at which a repeated run may start */
  char EditDialog[1024];      /* user interface: dialog class that edits the task */
  char EditForm[1024];        /* user interface: form within that dialog */
  int32_t SimpleEditForm;     /* flags: 1 = yes, 0 = no */
  int32_t Listable;
  int32_t CanEditName;
  int32_t CanEditOwner;
  int32_t CanRunAppSameTime;  /* may overlap runs of other tasks of its application */
  int32_t CanRunTaskSameTime; /* may overlap another run of itself */
  int32_t CanRunFromUI;
  int32_t CanDeleteFromUI;
  int32_t CanEditFromUI;
  char App[1024];      /* application that owns the task */
  char AppName[1024];  /* its display name */
  char AppArgs[8192];  /* its arguments, in a form of its own */
  char Action[1024];   /* what the task does, for display */
  char Command[16384]; /* command line, given to the shell; of a longer one than
                          12287 bytes only that many survive being stored */
};

/* A predicate on a task: nonzero keeps it. */
typedef int (*ZELO_SCHED_TASK_FILTER)(const ZELO_SCHED_TASK *pTask);

/* Allocates a record with the defaults of `zeloschedule`: a new, enabled,
 * daily task at 00:00 without a command, named "Task N" after the next free id.
 * The caller frees it with ZELOSchedTaskFree. Null on failure: 0x0200, or what
 * reading the store left. */
ZELO_SCHED_API ZELO_SCHED_TASK *ZELOSchedTaskAlloc(void);

/* Frees one record (a list goes through ZELOSchedTaskListFree). 0, or -1 with
 * 0x0D00 for null. */
ZELO_SCHED_API int ZELOSchedTaskFree(ZELO_SCHED_TASK *pTask);

/* Fills a record with the defaults for a new task of the backend that
 * pTask->Backend names, which the caller sets beforehand. The backend's result
 * (0 or more), or -1: 0x0D00, 0x2000 when no backend has that id, or what the
 * backend left. */
ZELO_SCHED_API int ZELOSchedTaskGetDefault(ZELO_SCHED_TASK *pTask);

/* Fills a record with the stored task of that id, of whichever backend, its
 * next trigger time included. 0, or -1: 0x0D00, 0x2000 when no backend has the
 * id, or what the backend left. */
ZELO_SCHED_API int ZELOSchedTaskGetByID(long id, ZELO_SCHED_TASK *pTask);

/* ZELOSchedTaskGetDefault for id -1, ZELOSchedTaskGetByID for any other; an id
 * below -1 is a bad argument. 0 or -1. */
ZELO_SCHED_API int ZELOSchedTaskLoad(long id, ZELO_SCHED_TASK *pTask);

/* Stores a new task with the backend that pTask->Backend names, which writes
 * the new id into the record (and a name, where that was empty). The backend's
 * result (0 or more), or -1: 0x0D00, 0x2000 when no backend has that id, or
 * what the backend left. After a failure the record has its new id if the task
 * was stored but the crontab was not written. For a power time it may have the
 * new id, and the new name, after any failure.
 *
 * A state or a type that the enumerations above lack is not stored, here and in
 * ZELOSchedTaskEdit. The call still succeeds, but the task can then be neither
 * read nor listed, has no crontab line, and its id is given to a later new
 * task, which overwrites it.
 *
 * The schedule is written into the crontab unchecked, here and in
 * ZELOSchedTaskEdit: the caller checks it. Debian's cron ignores the whole of
 * /etc/crontab, and starts nothing, for one enabled task with an hour above 23,
 * a minute above 59, a day other than 1 to 31 (once, monthly, yearly), a month
 * other than 1 to 12 (once, yearly) or no day of the week (weekly). It also
 * ignores a crontab of more than 10000 lines, comments and lines of other
 * programs included. Each enabled task has one line, and no call here limits
 * their number: a program that saves tasks for others counts the lines
 * itself. */
ZELO_SCHED_API int ZELOSchedTaskCreate(ZELO_SCHED_TASK *pTask);

/* Overwrites the stored task of the record's id; plugins are run before and
 * after. The backend's result, or -1: 0x0D00, 0x2000 when the task or the
 * backend is not found, or what the backend left. */
ZELO_SCHED_API int ZELOSchedTaskEdit(ZELO_SCHED_TASK *pTask);

/* ZELOSchedTaskCreate for a record with id -1, ZELOSchedTaskEdit for any other
 * id. 0 or -1. */
ZELO_SCHED_API int ZELOSchedTaskSave(ZELO_SCHED_TASK *pTask);

/* Deletes the stored task of that id; plugins are run before and after. 0, or
 * -1: 0x2000 when the task is not found, or what the backend left. */
ZELO_SCHED_API int ZELOSchedTaskRemove(long id);

/* Lists the tasks of every backend, each with its next trigger time; `filter`
 * may be null (all). When there are any, *pTaskList becomes the list, which the
 * caller frees with ZELOSchedTaskListFree; else it is unchanged. A backend that
 * fails is logged and adds nothing. The number of tasks, or -1: 0x0D00, or what
 * the registration of the backends left. */
ZELO_SCHED_API int ZELOSchedTaskListGet(ZELO_SCHED_TASK **pTaskList, ZELO_SCHED_TASK_FILTER filter);

/* The record after pTask, or null after the last one and for null. */
ZELO_SCHED_API ZELO_SCHED_TASK *ZELOSchedTaskNext(ZELO_SCHED_TASK *pTask);

/* Frees every record of the list and makes *pTaskList null. Null, and a list
 * that is empty, are allowed. */
ZELO_SCHED_API void ZELOSchedTaskListFree(ZELO_SCHED_TASK **pTaskList);

/* Writes the tasks of every backend out to where they take effect (crontab,
 * power hardware). 0 also when a backend failed, which is logged; -1 when the
 * backends cannot be registered. */
ZELO_SCHED_API int ZELOSchedTaskSync(void);

/* 1 when the task belongs to one of the applications that come with the
 * appliance's scheduler, else 0 (null included). */
ZELO_SCHED_API int ZELOSchedTaskIsBuildInApp(const ZELO_SCHED_TASK *pTask);

/* Sorts a list in place by the field whose key is szKey ("name", "app", ...),
 * ascending for direction 1, else descending; equal records keep their order
 * ascending and reverse it descending. Text fields sort byte by byte. For a
 * number or an enumeration the records are sorted by their addresses, not by
 * the value. 0, also for an empty list, or -1: 0x0D00 for a null argument,
 * 0x0100 when memory is short, no code and no log line for an unknown key. */
ZELO_SCHED_API int ZELOSchedTaskListSort(ZELO_SCHED_TASK **pTaskList, const char *szKey,
                                         int direction);

/* The same by the field's row index in the field table (0 "id" to 30 "type"),
 * which is not checked. An empty list is a failure here (0x0D00). */
ZELO_SCHED_API int ZELOSchedTaskListSortEx(ZELO_SCHED_TASK **pTaskList, int index, int direction);

/* ---- the hash form: a task as texts by field key --------------------------- */

/* Empties the hash and fills it from the task: numbers as decimal text, state
 * and type by name, the command in Base64, line feeds in every other text as
 * blanks. A state or a type without a name is left out, and the hash can then
 * not be read back. *ppHash is an existing hash (it may grow). 0, or -1:
 * 0x0D00, or what the platform left, with the hash partly filled. */
ZELO_SCHED_API int ZELOSchedInitHashFromTask(PSZHASH *ppHash, const ZELO_SCHED_TASK *pTask);

/* Fills the task from a hash, except `next`, `Backend` and `NextTriggerTime`.
 * "id", "run hour", "run min", "name", "app", "app name", "action", "cmd",
 * "state" and "type" must be there, the rest have defaults. Of a number that
 * does not fit 32 bits the lowest 32 are kept: "4294967297" is read as 1. 0, or
 * -1: 0x0D00, 0x4000 when an unsigned number ("owner", "run hour", ...) has
 * trailing characters, or what the platform left, with the record partly
 * filled. */
ZELO_SCHED_API int ZELOSchedInitTaskFromHash(ZELO_SCHED_TASK *pTask, PSZHASH pHash);

/* ---- JSON: a task as a text for a browser ----------------------------------- */

enum {
  ZELO_SCHED_JSON_SIZE_MIN = 40960, /* the smallest buffer that is accepted */
  ZELO_SCHED_JSON_SIZE_ANY = 163840 /* a buffer that every task fits into */
};

/* Writes the task as one JSON object on one line, with a line feed at its end.
 * Its members are the keys of the hash form ("id", "name", "run hour", "cmd" in
 * Base64, ...). Each value is written as a JSON string twice over, so a reader
 * decodes it twice: a name of a"b is written as "name":"\"a\\\"b\"\n". All
 * characters beyond ASCII are escaped. JSON cannot represent a byte that is not
 * UTF-8: each becomes U+FFFD, except in the command, which is in Base64.
 *
 * cbBuf is the size of szBuf in bytes, at least ZELO_SCHED_JSON_SIZE_MIN. What
 * does not fit is cut without an error; every task fits into
 * ZELO_SCHED_JSON_SIZE_ANY. 0, or -1 with szBuf untouched: no code of its own
 * for a null argument or a small buffer, else what the callee left. */
ZELO_SCHED_API int ZELOSchedTaskConvertToJson(const ZELO_SCHED_TASK *pTask, char *szBuf,
                                              size_t cbBuf);

/* The same for the stored task of that id. 0, or -1 with szBuf untouched: no
 * code of its own for a negative id, null or a small buffer; 0x2000 when no
 * backend has the id, or what the callee left. */
ZELO_SCHED_API int ZELOSchedTaskConvertToJsonById(long id, char *szBuf, size_t cbBuf);

/* Saves the task that a JSON text in that form describes. With `create` 0 it
 * overwrites the stored task of its id when that has the same app and name. In
 * every other case, and always with `create` not 0, it becomes a new task of
 * the backend `zeloschedule`, also when the text was made from a power task. So
 * a power task that was read by its id ("Poweroff 0") is saved over itself, and
 * one from a list ("PowerOff task 0"), which has another name, becomes an
 * ordinary task. Missing keys have the defaults of the hash form; of a member
 * given twice the last counts; members that are no key of a task are ignored.
 *
 * The text may come from anyone. These are failures, and nothing is saved: a
 * root that is no object, a member that is no string or whose string is no JSON
 * string, half of a surrogate pair, a zero byte, too deep a nesting, anything
 * but blanks and comments after the end, a number that does not fit its field,
 * a command of more than 12287 bytes, a schedule that cron cannot read (see
 * ZELOSchedTaskCreate), even in a disabled task, an enabled task whose line
 * would be the 9801st or later in /etc/crontab, and a text of more than 4 MiB.
 * Bytes that are not UTF-8 are saved as they are; a text other than the command
 * is cut to its field.
 *
 * The text alone determines the owner. A task whose "owner" is missing or
 * empty, or reads as 0 (" 0", "-0", given again as 0), is root's, and its
 * command runs as root. One with the id, name and app of another user's task,
 * which everybody can read, overwrites that. So a web back end must not pass on
 * the text of a user: examples/save_for_user.c shows how to save for him.
 *
 * The id of the saved task (0 or more), or -1: no code of its own for a null or
 * empty text or one that cannot be read, else what the callee left. An object
 * without members saves nothing and gives -1, the id of a new record, without a
 * log line. Looking up an id that no stored task has, such as that of a new
 * task, leaves a log line and 0x2000 even where a new task is then created. */
ZELO_SCHED_API int ZELOSchedTaskSaveFromJson(const char *szJson, int create);

/* ---- enumerations ----------------------------------------------------------- */

/* One value and its name; a null name ends the list. */
typedef struct ZELO_SCHED_ENUM {
  int32_t value;
  const char *szName;
} ZELO_SCHED_ENUM;

/* The name of the first entry with that value (it belongs to the list), or
 * null: 0x0D00 for a null list, 0x2000 (not logged) when no entry has it. */
ZELO_SCHED_API const char *ZELOSchedEnumToName(const ZELO_SCHED_ENUM *enum_list, int value);

/* The value of the first entry with exactly that name, or -1: 0x0D00 for a
 * null argument, 0x2000 (not logged) when no entry has it. */
ZELO_SCHED_API int ZELOSchedEnumToValue(const ZELO_SCHED_ENUM *enum_list, const char *szName);

/* Turns on/off characters ("0" = off) into the names at the positions that are
 * on, joined by commas. szFlags has exactly `count` characters, names as many
 * entries. The text lives in a buffer of 4096 characters that the next call
 * overwrites. Null, without code or log line, for a null argument or a szFlags
 * shorter than `count`. */
ZELO_SCHED_API const char *ZELOSchedMultiSelectToText(const char *szFlags, const char *const *names,
                                                      size_t count);

/* The reverse: for each of the `count` names (below 4096) a '1' when the
 * comma-separated text has it, ignoring case, else a '0'. The text lives in a
 * buffer that the next call overwrites. Null, without a log line, for a null
 * argument, a count of 0, a text without items, and when memory is short. */
ZELO_SCHED_API const char *ZELOSchedMultiSelectFromText(const char *text, const char *const *names,
                                                        size_t count);

/* ---- dates ------------------------------------------------------------------- */

typedef struct ZELO_SCHED_DATE {
  uint32_t year;    /* full year */
  uint32_t month;   /* 1 to 12 */
  uint32_t day;     /* 1 to 31 */
  uint32_t weekday; /* 0 = Sunday to 6 = Saturday */
  uint32_t hour;    /* 0 to 23 */
  uint32_t minute;  /* 0 to 59 */
} ZELO_SCHED_DATE;

/* The current local date and time. 0, or -1: 0x0D00, 0x2A00. */
ZELO_SCHED_API int ZELOSchedDateGet(ZELO_SCHED_DATE *pDate);

/* Compares the days (year, month, day): -1 when pDate1 is earlier, 0 when they
 * are the same day, 1 when it is later; also -1, with 0x0D00, for null. */
ZELO_SCHED_API int ZELOSchedDateComp(const ZELO_SCHED_DATE *pDate1, const ZELO_SCHED_DATE *pDate2);

/* Reads "2013/5/7" or "2013/05/07" into year, month and day, whose ranges are
 * not checked; the other fields are left alone. 0, or -1: 0x0D00, 0x4000. */
ZELO_SCHED_API int ZELOSchedDateParse(const char *szDateOrg, ZELO_SCHED_DATE *pDate);

/* Reads "8:30" or "08:30" into hour and minute, whose ranges are not checked;
 * the other fields are left alone. 0, or -1: 0x0D00, 0x4000. */
ZELO_SCHED_API int ZELOSchedTimeParse(const char *szTimeOrg, ZELO_SCHED_DATE *pDate);

/* Normalises fields that are out of range (32 January becomes 1 February) and
 * computes the weekday. The time is taken as standard time: in summer time it
 * comes back one hour later. 0, or -1 with the date unchanged: 0x0D00; 0x2A00,
 * also when the year is too great. */
ZELO_SCHED_API int ZELOSchedDateNormalize(ZELO_SCHED_DATE *pDate);

/* Seeds rand() from the time and the process id, once in a process. */
ZELO_SCHED_API void ZELOSchedRandInit(void);

/* Computes the next run after the current minute into NextTriggerTime:
 * "YYYY-MM-DD hh:mm", or "N/A" for a task that runs once and is over. 0, or -1
 * with the field unchanged: 0x0D00, 0x2A00. */
ZELO_SCHED_API int ZELOSchedNextTriggerTime(ZELO_SCHED_TASK *pTask);

/* ---- backends ------------------------------------------------------------------ */

/* One store of tasks. A null slot is an operation that the backend does not
 * offer. */
typedef struct ZELO_SCHED_BACKEND {
  int32_t id;                                 /* the Backend field of its tasks */
  const char *szName;                         /* not a copy */
  int (*sync)(void);                          /* below 0 = failure */
  int (*create)(ZELO_SCHED_TASK *pTask);      /* gives the id; below 0 = failure */
  int (*edit)(ZELO_SCHED_TASK *pTask);        /* below 0 = failure */
  int (*remove)(long id);                     /* 1 removed, 0 no such task, below 0 = failure */
  int (*get_default)(ZELO_SCHED_TASK *pTask); /* below 0 = failure */
  int (*owns_id)(long id);                    /* 0 = certainly not this backend's */
  int (*get_by_id)(long id, ZELO_SCHED_TASK *pTask); /* 1 found, 0 not here, -1 error */
  /* Runs the task in the user context that the caller has set up, and reports a
   * status code and a comment of at most cbComment - 1 characters; the buffer
   * has room for at least 4. Below 0 = failure. */
  int (*run)(ZELO_SCHED_TASK *pTask, int *pStatusCode, char *szComment, size_t cbComment);
  /* Attaches its tasks at the end of the list; their number, below 0 = failure. */
  int (*list_get)(ZELO_SCHED_TASK **pTaskList, ZELO_SCHED_TASK_FILTER filter);
} ZELO_SCHED_BACKEND;

/* The table, in the order in which backends are asked, and the number of
 * entries. */
extern ZELO_SCHED_API ZELO_SCHED_BACKEND SchedBackends[16];
extern ZELO_SCHED_API uint32_t cBackend;

/* Registers the backends, once in a process; every call that needs them does
 * this itself. 0, or -1 with the table empty, so that the next call tries
 * again. */
ZELO_SCHED_API int ZELOSchedBackendInit(void);

/* Fills an entry for the backend "zeloschedule", except its id. 0, or -1:
 * 0x0D00, no code for another name. */
ZELO_SCHED_API int zeloschedule_init(const char *szName, ZELO_SCHED_BACKEND *pBackend);

/* The same for the backend "zeloautopower", which presents the machine's power
 * schedule as tasks: "app args" is "poweron" or "poweroff", and the weekdays,
 * the hour and the minute are the entry's.
 *
 * The id of a power task encodes its content and changes with it: after an edit
 * the task has another id. It is
 *   60000000 + 10000000 * enabled + 10000 * weekdays + 100 * hour + minute,
 * and 20000000 more for power-off; bit 0 of the weekdays is Sunday, so that
 * 71270730 is an enabled power-on at 07:30 of every day. */
ZELO_SCHED_API int zeloautopower_init(const char *szName, ZELO_SCHED_BACKEND *pBackend);

/* ---- hooks: running plugins around changes ---------------------------------------- */

/* The caller zeroes it, and frees it after ZELOSchedTaskPluginExit. */
typedef struct ZELO_SCHED_PLUGIN {
  void *framework[3];          /* the platform's; the first is not null while live */
  int32_t result;              /* passed to the plugins as RESULT */
  const ZELO_SCHED_TASK *pOrg; /* the task as it was, or null */
  const ZELO_SCHED_TASK *pNew; /* the task as it is to be, or null */
} ZELO_SCHED_PLUGIN;

enum { ZELO_SCHED_PLUGIN_PRE = 4, ZELO_SCHED_PLUGIN_POST = 5 };

/* Prepares a hook context for the action "task_create", "task_edit" or
 * "task_remove". One of the two tasks must be given; they must live until
 * ZELOSchedTaskPluginExit. 0, or -1: 0x0D00, or what the platform left. */
ZELO_SCHED_API int ZELOSchedTaskPluginInit(ZELO_SCHED_PLUGIN *pPlugin, const char *szAction,
                                           const ZELO_SCHED_TASK *pOrg,
                                           const ZELO_SCHED_TASK *pNew);

/* Runs the plugins for PRE or POST. The platform's result (below 0 when one
 * failed), or -1: 0x0D00 without tasks, no code for a context that was not
 * initialised, what the platform left when an argument could not be set; none
 * of these is logged. */
ZELO_SCHED_API int ZELOSchedTaskPlugin(int action, ZELO_SCHED_PLUGIN *pPlugin);

/* Releases the platform's resources for the context. 0, or -1. */
ZELO_SCHED_API int ZELOSchedTaskPluginExit(ZELO_SCHED_PLUGIN *pPlugin);

/* ---- running, and the record of runs ------------------------------------------------ */

enum {                             /* status codes of a run */
       ZELO_SCHED_STATUS_NONE = 0, /* in ZELOSchedDBSetStatus: any former code */
       ZELO_SCHED_STATUS_GONE = 1, /* was running, but its process is gone */
       ZELO_SCHED_STATUS_RUNNING = 2,
       ZELO_SCHED_STATUS_FINISHED = 3,    /* exit code 0 */
       ZELO_SCHED_STATUS_NOT_STARTED = 4, /* the shell could not be started */
       ZELO_SCHED_STATUS_STOPPED = 5,     /* comment = signal */
       ZELO_SCHED_STATUS_KILLED = 6,      /* comment = signal */
       ZELO_SCHED_STATUS_EXIT_NONZERO = 7 /* comment = exit code */
};

/* What the running checks find: found, pid, statusID and taskID. No call fills
 * the other fields. The caller zeroes it. */
typedef struct ZELO_SCHED_STATUS {
  int32_t found;     /* 1 = a live run was found */
  int32_t pid;       /* process that runs the task */
  int32_t statusID;  /* key of the row */
  int32_t timestamp; /* start, in seconds since the epoch */
  long taskID;
  char szApp[1024];
  int32_t statusCode;
  char szComment[1024];
} ZELO_SCHED_STATUS;

/* Runs a stored task in a detached child process, which waits for conflicting
 * runs, records the run in the status database and runs the command with the
 * owner's rights. checkRunTime 1: only when the current minute is one of the
 * task's. skipDisabled 1: not when the task is disabled. 0 when a child was
 * started or there was nothing to do, or -1: 0x2000 when the task is not found,
 * or what the callee left. How the run ended is only in the status database and
 * the log.
 *
 * Of the caller's file descriptors the command inherits only 1 and 2, and each
 * of these only if it is a pipe or a regular file, open for writing only (an
 * anonymous pipe, from pipe(2), may be open for reading too) and without
 * FD_CLOEXEC. The command may still write there when the call has returned. Any
 * other 1 or 2 (a terminal, a socket, open for reading too, closed) is replaced
 * by /dev/null, as 0 always is. The command can open /dev/stdout and
 * /dev/stderr only where the task's owner may open the file or pipe; a pipe
 * belongs to the user who made it. */
ZELO_SCHED_API int ZELOSchedTaskRun(long id, int checkRunTime, int skipDisabled);

/* The stream of the run lock file while this process holds the run lock, else
 * null. */
extern ZELO_SCHED_API FILE *pfLock;

/* Opens the status database, creating it when it is missing. The caller closes
 * it with sqlite3_close, before the library is unloaded. The database is made
 * with mode 0600: only root and the user who made it can use it. It and its
 * rollback journal are used only while they are root's or the caller's, and no
 * other file beside them: the connection supports neither WAL mode nor
 * transactions over attached databases. A database in WAL mode is moved aside,
 * which is logged, and a new one is made. The calls below run their statements
 * on the connection and leave its authorizer, limits, hooks and transaction as
 * they are. Null on failure: 0x0900 when it cannot be opened, no code, and the
 * connection left open, when the table cannot be created. */
ZELO_SCHED_API sqlite3 *ZELOSchedDBInit(void);

/* Looks for a run of the task, or of any task of the application, that is still
 * going. 0 with pStatus->found 1 (pid, statusID and taskID are the run's) or
 * untouched, or -1: 0x0D00, no code when the statement failed. szApp is put
 * into the statement unescaped: the caller doubles an apostrophe of the name. A
 * text that ends the quoted one may go on with comparisons of columns, numbers
 * and texts, joined by AND, OR, NOT and ||; anything else fails the call. */
ZELO_SCHED_API int ZELOSchedDBIsTaskRunning(sqlite3 *db, long id, ZELO_SCHED_STATUS *pStatus);
ZELO_SCHED_API int ZELOSchedDBIsAppRunning(sqlite3 *db, const char *szApp,
                                           ZELO_SCHED_STATUS *pStatus);

/* Records a run of the task by this process, starting now. pStatusID, which may
 * be null, receives the row's key. 0, or -1: 0x0D00, 0x0B00, not logged, when the
 * row cannot be read back, no code when a statement failed, which it does when an
 * apostrophe in pTask->App is not doubled. */
ZELO_SCHED_API int ZELOSchedDBAddRecord(sqlite3 *db, const ZELO_SCHED_TASK *pTask, int *pStatusID);

/* Sets code and comment (null or empty: the comment stays) of the row with that
 * key (-1: of every row) whose code is orgStatusCode (0: any). Not both -1 and
 * 0. 0, or -1: 0x0D00, no code when the statement failed, which it does when an
 * apostrophe in szComment is not doubled. */
ZELO_SCHED_API int ZELOSchedDBSetStatus(sqlite3 *db, int iStatusID, int orgStatusCode,
                                        int newStatusCode, const char *szComment);

/* The status of one run, or of the latest run of a task. A running one whose
 * process is gone reads as ZELO_SCHED_STATUS_GONE. szComment and pTimestamp
 * (seconds since the epoch) may be null. 1 found, 0 not found with the outputs
 * untouched, -1: 0x0D00, no code when the statement failed. */
ZELO_SCHED_API int ZELOSchedDBGetStatusByStatusID(sqlite3 *db, int iStatusID, int *pStatusCode,
                                                  char *szComment, size_t cbComment);
ZELO_SCHED_API int ZELOSchedDBGetStatusByTaskID(sqlite3 *db, long id, long *pTimestamp,
                                                int *pStatusCode, char *szComment,
                                                size_t cbComment);

#ifdef __cplusplus
}
#endif
#endif
