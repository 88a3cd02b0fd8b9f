/*
 * tasks_of_owner UID - lists the enabled tasks of one user: a filter.
 *
 *   cc tasks_of_owner.c $(pkg-config --cflags --libs zeloscheduler) -o tasks_of_owner
 */
#include <stdio.h>
#include <stdlib.h>
#include <zelosched.h>

/* A filter is given the task and nothing else, hence a global variable. */
static uint32_t wanted_owner;

static int is_wanted(const ZELO_SCHED_TASK *task) {
  return task->Owner == wanted_owner && task->State == ZELO_SCHED_STATE_ENABLED;
}

int main(int argc, char **argv) {
  ZELO_SCHED_TASK *list = NULL;
  const ZELO_SCHED_TASK *task;
  int count;
  if (argc != 2) {
    fprintf(stderr, "usage: tasks_of_owner UID\n");
    return 2;
  }
  wanted_owner = (uint32_t)strtoul(argv[1], NULL, 10);
  count = ZELOSchedTaskListGet(&list, is_wanted);
  if (count < 0) return EXIT_FAILURE;
  for (task = list; task != NULL; task = task->next) printf("%d %s\n", task->ID, task->Name);
  printf("%d tasks\n", count);
  ZELOSchedTaskListFree(&list);
  return EXIT_SUCCESS;
}
