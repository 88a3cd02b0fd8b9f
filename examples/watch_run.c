/*
 * watch_run ID - runs a stored task now and waits for its end, which it reads from
 * the status database.
 *
 *   cc watch_run.c $(pkg-config --cflags --libs zeloscheduler sqlite3) -o watch_run
 */
#include <sqlite3.h>
#include <stdio.h>
#include <stdlib.h>
#include <time.h>
#include <zelosched.h>

enum {
  PATIENCE_IN_SECONDS = 600, /* a run may have to wait for another one */
  LOOKS_PER_SECOND = 10
};

static const char *const meanings[] = {"",        "gone",   "running", "finished", "not started",
                                       "stopped", "killed", "failed"};

/* The code of a run that began at `start` or later and is over, or 0 when there
 * is none yet. */
static int code_at_end(sqlite3 *db, long id, long start, char *comment, size_t size) {
  long began = 0;
  int code = 0;
  if (ZELOSchedDBGetStatusByTaskID(db, id, &began, &code, comment, size) != 1) return 0;
  return began >= start && code != ZELO_SCHED_STATUS_RUNNING ? code : 0;
}

int main(int argc, char **argv) {
  const long start = (long)time(NULL);
  const struct timespec pause = {0, 1000000000L / LOOKS_PER_SECOND};
  char comment[1024] = "";
  sqlite3 *db;
  long id;
  int looks;
  int code = 0;
  if (argc != 2) {
    fprintf(stderr, "usage: watch_run ID\n");
    return 2;
  }
  id = strtol(argv[1], NULL, 10);
  /* Now, whatever the clock says, and even when the task is disabled. */
  if (ZELOSchedTaskRun(id, 0, 0) != 0 || (db = ZELOSchedDBInit()) == NULL) {
    fprintf(stderr, "task %ld cannot be run; the system log says why\n", id);
    return EXIT_FAILURE;
  }
  for (looks = PATIENCE_IN_SECONDS * LOOKS_PER_SECOND; looks > 0 && code == 0; looks--) {
    nanosleep(&pause, NULL);
    code = code_at_end(db, id, start, comment, sizeof(comment));
  }
  sqlite3_close(db);
  if (code == 0) {
    fprintf(stderr, "task %ld is not over yet\n", id);
    return EXIT_FAILURE;
  }
  printf("task %ld %s%s%s\n", id, meanings[code], comment[0] != '\0' ? " with " : "", comment);
  return code == ZELO_SCHED_STATUS_FINISHED ? EXIT_SUCCESS : EXIT_FAILURE;
}
