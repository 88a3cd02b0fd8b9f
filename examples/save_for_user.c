/*
 * save_for_user UID KEY=VALUE... - how a back end saves a task for the user who is
 * logged in: UID is the session's, the pairs are what his browser sent.
 *
 *   save_for_user 1000 owner=1000 name=backup 'cmd=rsync -a /a /b' 'run hour=2' 'run min=30'
 *   save_for_user 1000 owner=1000 id=7 'run hour=4'
 *
 * A text from a browser is not handed on to ZELOSchedTaskSaveFromJson, which saves
 * it for whomever it names: for root, where its "owner" is missing or no number,
 * and over anybody's task whose id, name and app it repeats. Here each field is
 * checked, and set on a record of our own.
 *
 *   cc save_for_user.c $(pkg-config --cflags --libs zeloscheduler) -o save_for_user
 */
#include <errno.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <zelosched.h>
#include <zeloschedsetter.h>

enum { USAGE = 2, DECIMAL = 10 };

/* What a user may set. The crontab takes numbers as they are, and one hour of 24 can
 * stop cron for everybody; a text that is longer than its field would be cut. */
typedef struct FIELD {
  const char *key;
  unsigned long most; /* of a number; of a text, its length */
  int (*set_number)(ZELO_SCHED_TASK *, uint32_t);
  int (*set_text)(ZELO_SCHED_TASK *, const char *);
  int is_new_without; /* a new task has a default for it */
} FIELD;

static const FIELD fields[] = {
    {"owner", UINT32_MAX - 1, NULL, NULL, 0}, /* compared, and set by us */
    {"id", INT32_MAX, NULL, NULL, 1},         /* found by us */
    {"name", 4095, NULL, ZELOSchedCTaskSetName, 0},
    {"cmd", 12287, NULL, ZELOSchedCTaskSetCommand, 0},
    {"run hour", 23, ZELOSchedCTaskSetRunHour, NULL, 0},
    {"run min", 59, ZELOSchedCTaskSetRunMin, NULL, 0},
};
enum { OWNER, ID, COUNT = sizeof(fields) / sizeof(fields[0]) };

/* Plain decimal and nothing else: strtoul alone reads "", " 0" and "-0" as 0, the uid
 * of root. */
static int read_number(const char *text, unsigned long most, unsigned long *number) {
  if (strspn(text, "0123456789") != strlen(text) || text[0] == '\0') return -1;
  if (text[0] == '0' && text[1] != '\0') return -1;
  errno = 0;
  *number = strtoul(text, NULL, DECIMAL);
  return errno == 0 && *number <= most ? 0 : -1;
}

/* Sorts the pairs by field. A key that is unknown or comes twice is an error: of
 * two owners, one would be checked and the other one saved. */
static int read_pairs(char **pairs, const char *values[COUNT]) {
  for (; *pairs != NULL; pairs++) {
    const size_t length = strcspn(*pairs, "=");
    size_t i = 0;
    while (i < COUNT &&
           (strlen(fields[i].key) != length || strncmp(*pairs, fields[i].key, length) != 0)) {
      i++;
    }
    if (i == COUNT || (*pairs)[length] != '=' || values[i] != NULL) return -1;
    values[i] = *pairs + length + 1;
  }
  return 0;
}

/* Each enabled task is a line of the crontab, and cron ignores a crontab of more than
 * 10,000 lines: no user may fill it. */
enum { MOST_TASKS_OF_A_USER = 50 };

static unsigned long counted_uid;
static int is_counted(const ZELO_SCHED_TASK *task) {
  return task->Owner == counted_uid;
}

static int may_have_another(unsigned long uid) {
  ZELO_SCHED_TASK *tasks = NULL;
  const ZELO_SCHED_TASK *task;
  int count = 0;
  counted_uid = uid;
  if (ZELOSchedTaskListGet(&tasks, is_counted) < 0) return 0;
  for (task = tasks; task != NULL; task = task->next) count++;
  ZELOSchedTaskListFree(&tasks);
  return count < MOST_TASKS_OF_A_USER;
}

/* The stored task that is to be changed, if it is the user's own and may be, or a
 * new one. */
static ZELO_SCHED_TASK *find(unsigned long uid, const char *id) {
  ZELO_SCHED_TASK *task = NULL;
  unsigned long number = 0;
  if (id == NULL && !may_have_another(uid)) {
    fprintf(stderr, "this user has %d tasks, and may have no more\n", MOST_TASKS_OF_A_USER);
    return NULL;
  }
  task = ZELOSchedTaskAlloc();
  if (task == NULL || id == NULL) return task;
  if (read_number(id, INT32_MAX, &number) == 0 && ZELOSchedTaskGetByID((long)number, task) == 0 &&
      task->Owner == uid && task->Backend == ZELO_SCHED_BACKEND_SCHEDULE &&
      task->State != ZELO_SCHED_STATE_NOT_EXISTED && task->CanEditFromUI) {
    return task;
  }
  ZELOSchedTaskFree(task);
  fprintf(stderr, "there is no such task of this user\n");
  return NULL;
}

static int set_field(ZELO_SCHED_TASK *task, const FIELD *field, const char *value) {
  unsigned long number = 0;
  if (field->set_text != NULL) {
    return strlen(value) <= field->most ? field->set_text(task, value) : -1;
  }
  if (read_number(value, field->most, &number) != 0) return -1;
  return field->set_number != NULL ? field->set_number(task, (uint32_t)number) : 0;
}

/* The task keeps everything that the user may not set, as it was stored. */
static int fill(ZELO_SCHED_TASK *task, const char *values[COUNT]) {
  size_t i;
  for (i = 0; i < COUNT; i++) {
    const int is_needed = task->ID == ZELO_SCHED_ID_NEW && !fields[i].is_new_without;
    if (values[i] == NULL ? is_needed : set_field(task, &fields[i], values[i]) != 0) {
      fprintf(stderr, "\"%s\" is missing or cannot be taken\n", fields[i].key);
      return -1;
    }
  }
  return 0;
}

/* Between reading the stored task and changing it, another process can remove
 * it and store a new one, which may get the same id and is then overwritten: it is
 * lost, but nobody gains another one's rights, as what is saved has the user's uid.
 * A back end whose tasks nobody else changes prevents that with a lock of its own
 * around both. */
static int save(unsigned long uid, const char *values[COUNT]) {
  ZELO_SCHED_TASK *task = find(uid, values[ID]);
  int result = -1;
  if (task == NULL) {
    return -1;
  }
  if (fill(task, values) == 0) {
    ZELOSchedCTaskSetOwner(task, (uint32_t)uid);
    result = ZELOSchedTaskSave(task);
    if (result == 0) printf("saved as task %d\n", task->ID);
  }
  ZELOSchedTaskFree(task);
  return result;
}

int main(int argc, char **argv) {
  const char *values[COUNT] = {NULL};
  unsigned long uid = 0;
  if (argc < 3 || read_number(argv[1], fields[OWNER].most, &uid) != 0) {
    fprintf(stderr, "usage: save_for_user UID KEY=VALUE...\n");
    return USAGE;
  }
  if (read_pairs(argv + 2, values) != 0) {
    fprintf(stderr, "a field is unknown, or is given twice\n");
    return EXIT_FAILURE;
  }
  /* As texts: there is one way to write the number. */
  if (values[OWNER] == NULL || strcmp(values[OWNER], argv[1]) != 0) {
    fprintf(stderr, "the task is not this user's\n");
    return EXIT_FAILURE;
  }
  return save(uid, values) == 0 ? EXIT_SUCCESS : EXIT_FAILURE;
}
