// Fuzz targets write no log, start no program and skip sleeping and syncing: they test how input
// is read.
#include <syslog.h>
#include <unistd.h>
#include <zelocore.h>

#include <cstdarg>

extern "C" {

void syslog(int, const char *, ...) {}
void vsyslog(int, const char *, va_list) {}
void __syslog_chk(int, int, const char *, ...) {}

// So no store is ever published.
int QLIBCExec(const char *, ...) {
  return -1;
}

int usleep(useconds_t) {
  return 0;
}

int fsync(int) {
  return 0;
}
}
