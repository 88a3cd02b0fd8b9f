/*
 * Where long has 32 bits, the product and its tests are built with 64 bits for times and for places
 * in files, and the C library has other symbols for those calls: what a test defines as stat is
 * __stat64_time64. The tests' dlsym comes here, so that what they pass a call on to is of the same
 * kind.
 */
#undef dlsym
#include <dlfcn.h>
#include <stddef.h>
#include <string.h>

static const struct {
  const char *name;
  const char *symbol;
} wide_calls[] = {
    {"clock_gettime", "__clock_gettime64"},
    {"fcntl", "__fcntl_time64"},
    {"fopen", "fopen64"},
    {"fstat", "__fstat64_time64"},
    {"fstatat", "__fstatat64_time64"},
    {"ftruncate", "ftruncate64"},
    {"futimens", "__futimens64"},
    {"localtime", "__localtime64"},
    {"localtime_r", "__localtime64_r"},
    {"lstat", "__lstat64_time64"},
    {"mkostemp", "mkostemp64"},
    {"mkstemp", "mkstemp64"},
    {"mktime", "__mktime64"},
    {"nanosleep", "__nanosleep64"},
    {"open", "open64"},
    {"prctl", "__prctl_time64"},
    {"pread", "pread64"},
    {"pwrite", "pwrite64"},
    {"readdir", "readdir64"},
    {"stat", "__stat64_time64"},
    {"time", "__time64"},
};

void *zelo_tests_dlsym(void *handle, const char *name);
void *zelo_tests_dlsym(void *handle, const char *name) {
  size_t i;
  for (i = 0; i < sizeof wide_calls / sizeof *wide_calls; ++i) {
    if (strcmp(name, wide_calls[i].name) == 0) return dlsym(handle, wide_calls[i].symbol);
  }
  return dlsym(handle, name);
}
