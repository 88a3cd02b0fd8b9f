/*
 * stored_forms save     stores tasks and power times with values that another processor may misread
 * stored_forms print    prints every task: its id, its JSON, and its hash form by key
 *
 * Every processor prints the same for the same stored files.
 */
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <zelocore.h>
#include <zelosched.h>

static int compare(const void *a, const void *b) {
  return strcmp(*(const char *const *)a, *(const char *const *)b);
}

static int print_hash(const ZELO_SCHED_TASK *task) {
  PSZHASH hash = QLIBCSzHashAlloc(1);
  PSZLIST keys = QLIBCSzListAlloc(1);
  const char *sorted[100];
  int count = 0;
  int i = 0;
  if (ZELOSchedInitHashFromTask(&hash, task) != 0) return -1;
  count = QLIBCSzHashEnumKey(hash, &keys);
  for (i = 0; i < count && i < 100; ++i) sorted[i] = QLIBCSzListGet(keys, i);
  qsort(sorted, (size_t)i, sizeof *sorted, compare);
  for (i = 0; i < count && i < 100; ++i)
    printf("%s=%s\n", sorted[i], QLIBCSzHashGetValue(hash, sorted[i]));
  QLIBCSzListFree(keys);
  QLIBCSzHashFree(hash);
  return 0;
}

static int print_all(void) {
  static char json[ZELO_SCHED_JSON_SIZE_ANY];
  ZELO_SCHED_TASK *list = NULL;
  ZELO_SCHED_TASK *task = NULL;
  const int count = ZELOSchedTaskListGet(&list, NULL);
  for (task = list; task != NULL; task = ZELOSchedTaskNext(task)) {
    task->NextTriggerTime[0] = '\0'; /* the clock's */
    if (ZELOSchedTaskConvertToJson(task, json, sizeof json) != 0 || print_hash(task) != 0) return 1;
    printf("%d %s", task->ID, json);
  }
  ZELOSchedTaskListFree(&list);
  return count < 0;
}

static int save(ZELO_SCHED_TASK *task) {
  const int saved = task != NULL ? ZELOSchedTaskSave(task) : -1;
  if (task != NULL) ZELOSchedTaskFree(task);
  if (saved < 0)
    fprintf(stderr, "0x%04X %s:%d\n", QLIBCErrGet(), QLIBCErrorGetFile(), QLIBCErrorGetLine());
  return saved;
}

static int save_power_time(const char *args, const char *week, int32_t state, uint32_t hour) {
  ZELO_SCHED_TASK *task = ZELOSchedTaskAlloc();
  if (task == NULL) return -1;
  task->Backend = ZELO_SCHED_BACKEND_AUTOPOWER;
  if (ZELOSchedTaskGetDefault(task) < 0) return -1;
  task->ID = ZELO_SCHED_ID_NEW;
  snprintf(task->AppArgs, sizeof task->AppArgs, "%s", args);
  snprintf(task->Week, sizeof task->Week, "%s", week);
  task->Type = ZELO_SCHED_TYPE_WEEKLY;
  task->State = state;
  task->RunHour = hour;
  task->RunMin = 59;
  return save(task);
}

static int save_all(void) {
  ZELO_SCHED_TASK *task = ZELOSchedTaskAlloc();
  int i = 0;
  if (task == NULL) return 1;
  task->Owner = 4294967294U;
  task->RunHour = 23;
  task->RepeatHour = 4294967295U;
  task->State = ZELO_SCHED_STATE_DISABLED;
  for (i = 1; i < 256; ++i) task->Command[i - 1] = (char)i;
  for (i = 1; i < 256; ++i) task->Name[i - 1] = (char)(256 - i);
  if (save(task) < 0) return 1;
  task = ZELOSchedTaskAlloc();
  if (task == NULL) return 1;
  snprintf(task->Name, sizeof task->Name,
           "Gr\xc3\xbc\xc3\x9f"
           "e \xf0\x9f\x95\x90");
  snprintf(task->Command, sizeof task->Command, "true");
  task->Type = ZELO_SCHED_TYPE_YEARLY;
  task->StartYear = 2039;
  task->StartMonth = 2;
  task->StartDay = 29;
  if (save(task) < 0) return 1;
  /* The first needs a machine with a clock that can be armed. */
  return save_power_time("poweron", "1100110", ZELO_SCHED_STATE_ENABLED, 7) < 0 ||
         save_power_time("poweron", "0000000", ZELO_SCHED_STATE_DISABLED, 0) < 0 ||
         save_power_time("poweron", "1010101", ZELO_SCHED_STATE_DISABLED, 7) < 0 ||
         save_power_time("poweroff", "0101010", ZELO_SCHED_STATE_DISABLED, 23) < 0 ||
         save_power_time("poweroff", "1111111", ZELO_SCHED_STATE_ENABLED, 23) < 0;
}

int main(int argc, char **argv) {
  if (argc == 2 && strcmp(argv[1], "save") == 0) return save_all();
  if (argc == 2 && strcmp(argv[1], "print") == 0) return print_all();
  fprintf(stderr, "usage: %s save|print\n", argv[0]);
  return 2;
}
