/*
 * zelosdk.h - the appliance's SDK library: users and Base64.
 *
 * The conventions are those of zelocore.h: a negative result (0 for the two
 * Base64 calls) is a failure, whose reason is in the error record.
 */
#ifndef ZELOSDK_H
#define ZELOSDK_H

#include <stddef.h>
#include <sys/types.h>

#ifdef __cplusplus
extern "C" {
#endif
/* What stands here leaves the library; all else is hidden. */
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

#pragma GCC visibility pop
#ifdef __cplusplus
}
#endif
#endif
