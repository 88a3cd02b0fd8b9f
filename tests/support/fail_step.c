/* Preloaded into zelosched: of the calls that open or change files or start programs, the one of
   number FAIL_STEP fails with FAIL_ERROR, or kills the program where FAIL_ERROR is "kill". It
   creates the file FAIL_MARK, so that a caller sees when there are no more. Child processes are
   not affected. */
/* So that, with a 32-bit off_t, open and open64 are two functions here. */
#undef _FILE_OFFSET_BITS
#undef _TIME_BITS
#include <dlfcn.h>
#include <errno.h>
#include <fcntl.h>
#include <signal.h>
#include <spawn.h>
#include <stdarg.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/types.h>
#include <unistd.h>

static long steps_left;
static int error_wanted;

__attribute__((constructor)) static void read_wishes(void) {
  const char *step = getenv("FAIL_STEP");
  const char *error = getenv("FAIL_ERROR");
  if (step == NULL || error == NULL || strcmp(program_invocation_short_name, "zelosched") != 0)
    return;
  steps_left = atol(step);
  error_wanted = strcmp(error, "kill") == 0 ? 0 : atoi(error);
}

static int is_to_fail(void) {
  if (steps_left == 0 || --steps_left != 0) return 0;
  const char *mark = getenv("FAIL_MARK");
  if (mark != NULL) {
    const long file = syscall(SYS_openat, AT_FDCWD, mark, O_WRONLY | O_CREAT, 0600);
    if (file >= 0) syscall(SYS_close, file);
  }
  if (error_wanted == 0) kill(getpid(), SIGKILL);
  errno = error_wanted;
  return 1;
}

#define REPLACE(result, name, parameters, arguments)             \
  result name parameters {                                       \
    static result(*real) parameters;                             \
    if (real == NULL) *(void **)&real = dlsym(RTLD_NEXT, #name); \
    if (is_to_fail()) return -1;                                 \
    return real arguments;                                       \
  }

REPLACE(ssize_t, write, (int file, const void *bytes, size_t count), (file, bytes, count))
REPLACE(ssize_t, pwrite64, (int file, const void *bytes, size_t count, off64_t at),
        (file, bytes, count, at))
REPLACE(int, fsync, (int file), (file))
REPLACE(int, fdatasync, (int file), (file))
REPLACE(int, ftruncate64, (int file, off64_t size), (file, size))
REPLACE(int, fchmod, (int file, mode_t mode), (file, mode))
REPLACE(int, fchown, (int file, uid_t user, gid_t group), (file, user, group))
REPLACE(int, rename, (const char *from, const char *to), (from, to))
REPLACE(int, renameat2, (int a, const char *from, int b, const char *to, unsigned how),
        (a, from, b, to, how))
REPLACE(int, unlink, (const char *name), (name))
REPLACE(int, unlinkat, (int in, const char *name, int how), (in, name, how))
REPLACE(int, mkdir, (const char *name, mode_t mode), (name, mode))
REPLACE(int, flock, (int file, int how), (file, how))
REPLACE(pid_t, fork, (void), ())

/* These return the error. */
#define REPLACE_SPAWN(name)                                                                      \
  int name(pid_t *pid, const char *file, const posix_spawn_file_actions_t *actions,              \
           const posix_spawnattr_t *attributes, char *const argv[], char *const environment[]) { \
    static int (*real)(pid_t *, const char *, const posix_spawn_file_actions_t *,                \
                       const posix_spawnattr_t *, char *const[], char *const[]);                 \
    if (real == NULL) *(void **)&real = dlsym(RTLD_NEXT, #name);                                 \
    if (is_to_fail()) return errno;                                                              \
    return real(pid, file, actions, attributes, argv, environment);                              \
  }
REPLACE_SPAWN(posix_spawn)
REPLACE_SPAWN(posix_spawnp)

/* Opening for reading fails as well. */
#define REPLACE_OPEN(name)                                       \
  int name(const char *path, int how, ...) {                     \
    static int (*real)(const char *, int, ...);                  \
    va_list rest;                                                \
    va_start(rest, how);                                         \
    const mode_t mode = va_arg(rest, mode_t);                    \
    va_end(rest);                                                \
    if (real == NULL) *(void **)&real = dlsym(RTLD_NEXT, #name); \
    if (is_to_fail()) return -1;                                 \
    return real(path, how, mode);                                \
  }
REPLACE_OPEN(open)
REPLACE_OPEN(open64)
