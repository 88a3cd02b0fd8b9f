/*
 * Preloaded into the cron daemon: appends what it logs to the file named by
 * SYSLOG_FILE. There is no log daemon in the sandbox.
 */
#include <stdarg.h>
#include <stdio.h>
#include <stdlib.h>
#include <syslog.h>

/* Kept from the start: the daemon makes a new environment for each job. */
static const char *path;

__attribute__((constructor)) static void keep_path(void) {
  path = getenv("SYSLOG_FILE");
}

static void append(const char *format, va_list arguments) {
  FILE *file = path != NULL ? fopen(path, "ae") : NULL;
  if (file == NULL) return;
  vfprintf(file, format, arguments);
  fputc('\n', file);
  fclose(file);
}

void syslog(int priority, const char *format, ...) {
  va_list arguments;
  (void)priority;
  va_start(arguments, format);
  append(format, arguments);
  va_end(arguments);
}

/* The name that syslog() has in a program built with fortified calls. */
void __syslog_chk(int priority, int flag, const char *format, ...);
void __syslog_chk(int priority, int flag, const char *format, ...) {
  va_list arguments;
  (void)priority;
  (void)flag;
  va_start(arguments, format);
  append(format, arguments);
  va_end(arguments);
}
