/*
 * zelosdk.h - the appliance's SDK library: users, Base64, the power schedule and
 * crontab entries.
 *
 * The conventions are those of zelocore.h: a negative result (0 for the two
 * Base64 calls) is a failure, whose reason is in the error record.
 */
#ifndef ZELOSDK_H
#define ZELOSDK_H

#include <stddef.h>
#include <stdint.h>
#include <sys/types.h>

#ifdef __cplusplus
extern "C" {
#endif
/* What is declared here is exported; all else is hidden. */
#pragma GCC visibility push(default)

/* ---- users ----------------------------------------------------------------- */

/* One user of the system's user database. */
typedef struct ZELOUSER {
  char *szName;  /* login name */
  uid_t uid;     /* user id */
  gid_t gid;     /* primary group id */
  char *szHome;  /* home directory */
  char *szShell; /* login shell */
} ZELOUSER, *PZELOUSER;

/* Looks a user up. On success *ppUser is a record to free with ZELOUserFree
 * and the result is 0; -1 when there is no such user (0x2000), memory is short
 * (0x0200), the database cannot be read (0x2A00) or ppUser is null (0x0D00);
 * *ppUser is left alone then. */
int ZELOUserGetByUID(uid_t uid, PZELOUSER *ppUser);
/* Frees the record. NULL is allowed. */
void ZELOUserFree(PZELOUSER pUser);

/* ---- Base64 ---------------------------------------------------------------- */

/* Encodes cbSrc bytes into dst, on one line and zero-terminated. 1, or 0 when
 * dst is too small or an argument is null (0x0D00). The last argument is
 * reserved and is 1. An empty source gives an empty text. */
int SzBase64EncodeFull(const char *src, size_t cbSrc, char *dst, size_t cbDst, int reserved);
/* Decodes cbSrc characters into dst. *pcbDst is the capacity of dst going in
 * and the number of bytes decoded coming out; no terminating zero is written.
 * White space is skipped. A text that ends within a group of four decodes to
 * the whole bytes that it holds. 1, or 0 (0x0D00) when a character is none of
 * the alphabet's or dst is too small. */
int ZELOEncodingBase64Decode(const char *src, size_t cbSrc, char *dst, size_t *pcbDst);

/* ---- power schedule ---------------------------------------------------------
 *
 * The machine's power times are two lists in "/usr/zelo/etc/power_sched.conf", a
 * section file (zelocore.h) that may be edited by hand:
 *
 *   [poweron]
 *   times="1 127 7 30; 0 62 8 0"
 *   [poweroff]
 *   times=""
 *
 * A time is "enabled weekdays hour minute", as in the record below. A change
 * replaces the file as a whole and is on the disk when the call returns: after a
 * crash at any point the file is the old or the new one. Of two processes that
 * change it at once, the later one wins.
 */

enum { ZELO_AUTOPOWER_ON = 0, ZELO_AUTOPOWER_OFF = 1 }; /* the lists */

typedef struct ZELO_AUTOPOWER {
  unsigned char enabled;  /* 1 or 0 */
  unsigned char weekdays; /* bit 0 = Sunday to bit 6 = Saturday; 127 = every day */
  unsigned char hour;     /* 0 to 23, local time */
  unsigned char minute;   /* 0 to 59 */
} ZELO_AUTOPOWER;

/* Copies at most `capacity` entries of a list. Their number, 0 also when
 * nothing was ever stored, or -1: 0x0D00 for a list that does not exist and bad
 * arguments, 0x4000 for a file with something else than power times, or what
 * reading the file left (0x0900, 0x0B00, 0x0200). */
int ZELOAutoPowerConfGet(int list, int capacity, ZELO_AUTOPOWER *pEntries);
/* Replaces a list; the other one stays. 0, or -1: 0x0D00 for a list that does not
 * exist, a negative count, more than 100 entries and one out of its ranges, or
 * what writing the file left (0x0900, 0x0B00, 0x2800, 0x0200). */
int ZELOAutoPowerConfSet(int list, int count, const ZELO_AUTOPOWER *pEntries);

/* Arms the machine's real-time clock, through the kernel's file
 * "/sys/class/rtc/rtc0/wakealarm", for the first moment after now at which an
 * enabled entry of the power-on list is due; disarms it when there is none. The
 * clock has one alarm: call this after every change of the list (the scheduler
 * library does), and before the machine goes off.
 *
 * Times are local. One that the change to summer time skips is due by so much
 * later (02:30 at 03:30); one that comes twice is due the first time. The
 * real-time clock is assumed to keep UTC.
 *
 * 0, also when there is nothing to arm on a machine without such a clock, or -1:
 * 0x0900 when a time is wanted and there is no such clock, or the file cannot be
 * opened; 0x0B00 when the kernel refused the time; 0x2A00 when the local time is
 * unknown; or what ZELOAutoPowerConfGet left. */
int ZELOAutoPoweronSet(void);

/* ---- crontab entries -------------------------------------------------------- */

/* A command at a time of some weekdays. */
typedef struct ZELO_SCHEDULE {
  int32_t weekdays;     /* bit 0 = Sunday to bit 6 = Saturday; 127 = every day */
  int32_t hour;         /* 0 to 23 */
  int32_t repeat;       /* reserved, 0: the command runs once a day */
  int32_t lastHour;     /* 0 to 23; of no effect without repeats */
  int32_t minute;       /* 0 to 59 */
  int32_t reserved;     /* 0 */
  char szCommand[1024]; /* for root's shell; no control character and no '%',
                           which has a meaning of its own to cron */
} ZELO_SCHEDULE;

/* Adds a line to "/etc/crontab" that runs the command as root. `enabled` is 1; a
 * schedule that is not enabled (0), or has no weekday, is never due and gets no
 * line. The file is replaced as a whole, with owner, mode and every other line
 * kept, and is on the disk when the call returns. 0, or -1: 0x0D00 for a record
 * out of its ranges, 0x0900 also when there is no crontab (none is made), 0x0B00,
 * 0x2800, 0x0200. */
int ZELOScheduleSet(const ZELO_SCHEDULE *pSchedule, int enabled);

/* Makes the cron daemon reload its crontabs after the lines of that command
 * changed. `stop` is reserved and 0: runs of the command that are under way go
 * on. `reload` 1 sends the daemon of "/var/run/crond.pid" a hang-up signal, 0
 * leaves it to notice the change by itself. 0, also when there is no daemon, or
 * -1: 0x0D00, 0x2A00 when the daemon cannot be signalled, 0x0900 when its file
 * cannot be read. */
int ZELOUpdateCrontab(const char *szCommand, int stop, int reload);

#pragma GCC visibility pop
#ifdef __cplusplus
}
#endif
#endif
