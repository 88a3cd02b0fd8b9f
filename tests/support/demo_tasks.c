/*
 * demo_tasks UID OUTPUT - saves three tasks through the library, as a program
 * of the appliance would: one of user UID that is due in the next minute and
 * writes the ids that it runs with to OUTPUT, one that is disabled, and one that
 * is due a year later, which a crontab line cannot express. Prints a line "ID
 * NAME OWNER STATE NEXT-TRIGGER-TIME", separated by tabs, for each, beginning
 * with the one that is due first.
 */
#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <time.h>

#include "zelosched.h"

enum {
  SECONDS_PER_MINUTE = 60,
  SECONDS_TO_GET_READY = 10, /* later in a minute, cron may miss the next one */
  TM_YEAR_BASE = 1900
};

static int fail(const char *what) {
  fprintf(stderr, "demo_tasks: cannot %s\n", what);
  return EXIT_FAILURE;
}

static void set_start(ZELO_SCHED_TASK *task, const struct tm *start) {
  task->StartYear = (uint32_t)(start->tm_year + TM_YEAR_BASE);
  task->StartMonth = (uint32_t)(start->tm_mon + 1);
  task->StartDay = (uint32_t)start->tm_mday;
  task->RunHour = (uint32_t)start->tm_hour;
  task->RunMin = (uint32_t)start->tm_min;
}

static void set_text(char *field, size_t capacity, const char *text) {
  snprintf(field, capacity, "%s", text);
}

/* Frees the record. 0, or -1. */
static int save(ZELO_SCHED_TASK *task) {
  ZELO_SCHED_TASK *stored = ZELOSchedTaskAlloc();
  int result = -1;
  if (stored != NULL && ZELOSchedTaskSave(task) == 0 &&
      ZELOSchedTaskGetByID(task->ID, stored) == 0) {
    printf("%d\t%s\t%u\t%s\t%s\n", stored->ID, stored->Name, stored->Owner,
           stored->State == ZELO_SCHED_STATE_ENABLED ? "enabled" : "disabled",
           stored->NextTriggerTime);
    result = 0;
  }
  ZELOSchedTaskFree(task);
  if (stored != NULL) ZELOSchedTaskFree(stored);
  return result;
}

static ZELO_SCHED_TASK *new_task(const char *name, const char *command, const struct tm *start) {
  ZELO_SCHED_TASK *task = ZELOSchedTaskAlloc();
  if (task == NULL) return NULL;
  set_text(task->Name, sizeof(task->Name), name);
  set_text(task->App, sizeof(task->App), "ZELO.TOV.TaskScheduler.Script");
  set_text(task->AppName, sizeof(task->AppName), "Script");
  set_text(task->Action, sizeof(task->Action), name);
  set_text(task->Command, sizeof(task->Command), command);
  task->Type = ZELO_SCHED_TYPE_DAILY;
  set_start(task, start);
  return task;
}

int main(int argc, char **argv) {
  char command[1024];
  const time_t now = time(NULL);
  const time_t due =
      (now + SECONDS_TO_GET_READY) / SECONDS_PER_MINUTE * SECONDS_PER_MINUTE + SECONDS_PER_MINUTE;
  struct tm due_date;
  struct tm next_year;
  ZELO_SCHED_TASK *task;

  if (argc != 3) return fail("work without UID OUTPUT");
  if (localtime_r(&due, &due_date) == NULL) return fail("read the clock");
  next_year = due_date;
  next_year.tm_year++;

  snprintf(command, sizeof(command), "echo \"$(id -ru) $(id -u) $(id -rg) $(id -g) $(id -G)\" > %s",
           argv[2]);
  task = new_task("Report ids", command, &due_date);
  if (task == NULL) return fail("make a task");
  task->Type = ZELO_SCHED_TYPE_ONCE;
  task->Owner = (uint32_t)strtoul(argv[1], NULL, 10);
  if (save(task) != 0) return fail("save the task that is due");

  task = new_task("Disabled", "/bin/false", &due_date);
  if (task == NULL) return fail("make a task");
  task->State = ZELO_SCHED_STATE_DISABLED;
  if (save(task) != 0) return fail("save the disabled task");

  task = new_task("Next year", "/bin/false", &next_year);
  if (task == NULL) return fail("make a task");
  task->Type = ZELO_SCHED_TYPE_ONCE;
  if (save(task) != 0) return fail("save the task of next year");
  return EXIT_SUCCESS;
}
