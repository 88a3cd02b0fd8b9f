/*
 * save_and_list NAME COMMAND - saves a task that runs COMMAND every day at 02:30,
 * and lists all tasks with the time at which each runs next.
 *
 *   cc save_and_list.c $(pkg-config --cflags --libs zeloscheduler) -o save_and_list
 */
#include <stdio.h>
#include <stdlib.h>
#include <zelocore.h>
#include <zelosched.h>
#include <zeloschedsetter.h>

/* The error record says what failed and where; the system log says more. */
static int fail(const char *what) {
  fprintf(stderr, "cannot %s: [0x%04X %s:%d]\n", what, (unsigned)QLIBCErrGet(), QLIBCErrorGetFile(),
          QLIBCErrorGetLine());
  return EXIT_FAILURE;
}

static int save(const char *name, const char *command) {
  ZELO_SCHED_TASK *task = ZELOSchedTaskAlloc(); /* enabled, daily, of root */
  int saved;
  if (task == NULL) return -1;
  ZELOSchedCTaskSetName(task, name);
  ZELOSchedCTaskSetCommand(task, command);
  ZELOSchedCTaskSetRunHour(task, 2);
  ZELOSchedCTaskSetRunMin(task, 30);
  saved = ZELOSchedTaskSave(task);
  if (saved == 0) printf("saved as task %d\n", task->ID);
  ZELOSchedTaskFree(task);
  return saved;
}

int main(int argc, char **argv) {
  ZELO_SCHED_TASK *list = NULL;
  const ZELO_SCHED_TASK *task;
  if (argc != 3) {
    fprintf(stderr, "usage: save_and_list NAME COMMAND\n");
    return 2;
  }
  if (save(argv[1], argv[2]) != 0) return fail("save the task");
  if (ZELOSchedTaskListGet(&list, NULL) < 0) return fail("list the tasks");
  for (task = list; task != NULL; task = task->next) {
    printf("%-4d %-20s next run: %s\n", task->ID, task->Name, task->NextTriggerTime);
  }
  ZELOSchedTaskListFree(&list);
  return EXIT_SUCCESS;
}
