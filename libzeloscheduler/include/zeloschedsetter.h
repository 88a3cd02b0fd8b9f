/*
 * zeloschedsetter.h - sets the fields of a task record.
 *
 * Every setter returns 0, or -1 with 0x0D00 and the record unchanged when an
 * argument is null. Nothing else is checked: an hour of 99 is stored as it is.
 *
 * Each setter stands on a line of its own, which declares it for callers and
 * defines it in the library, so that a log line names the setter's line here.
 */
#ifndef ZELOSCHEDSETTER_H
#define ZELOSCHEDSETTER_H

#include "zelosched.h"

#ifdef __cplusplus
extern "C" {
#endif

#ifndef ZELO_SCHED_DEFINE_SETTERS
#define ZELO_SCHED_TYPE_SETTER(name, type) ZELO_SCHED_API int name(ZELO_SCHED_TASK *pTask);
#define ZELO_SCHED_FLAG_SETTER(name, field) \
  ZELO_SCHED_API int name(ZELO_SCHED_TASK *pTask, int32_t value);
#define ZELO_SCHED_NUMBER_SETTER(name, number, field) \
  ZELO_SCHED_API int name(ZELO_SCHED_TASK *pTask, number value);
#define ZELO_SCHED_TEXT_SETTER(name, field) \
  ZELO_SCHED_API int name(ZELO_SCHED_TASK *pTask, const char *szVal);
#endif

/* int NAME(ZELO_SCHED_TASK *pTask): makes the task run once, daily, ... */
ZELO_SCHED_TYPE_SETTER(ZELOSchedCTaskSetOnce, ZELO_SCHED_TYPE_ONCE)
ZELO_SCHED_TYPE_SETTER(ZELOSchedCTaskSetDaily, ZELO_SCHED_TYPE_DAILY)
ZELO_SCHED_TYPE_SETTER(ZELOSchedCTaskSetWeekly, ZELO_SCHED_TYPE_WEEKLY)
ZELO_SCHED_TYPE_SETTER(ZELOSchedCTaskSetMonthly, ZELO_SCHED_TYPE_MONTHLY)
ZELO_SCHED_TYPE_SETTER(ZELOSchedCTaskSetYearly, ZELO_SCHED_TYPE_YEARLY)

/* int NAME(ZELO_SCHED_TASK *pTask, int32_t value): 1 is yes (for the state:
 * enabled), anything else no (disabled). */
ZELO_SCHED_FLAG_SETTER(ZELOSchedCTaskSetState, State)
ZELO_SCHED_FLAG_SETTER(ZELOSchedCTaskSetListable, Listable)
ZELO_SCHED_FLAG_SETTER(ZELOSchedCTaskSetCanEditName, CanEditName)
ZELO_SCHED_FLAG_SETTER(ZELOSchedCTaskSetCanEditOwner, CanEditOwner)
ZELO_SCHED_FLAG_SETTER(ZELOSchedCTaskSetSimpleEditForm, SimpleEditForm)
ZELO_SCHED_FLAG_SETTER(ZELOSchedCTaskSetCanRunAppSameTime, CanRunAppSameTime)
ZELO_SCHED_FLAG_SETTER(ZELOSchedCTaskSetCanRunTaskSameTime, CanRunTaskSameTime)
ZELO_SCHED_FLAG_SETTER(ZELOSchedCTaskSetCanRunFromUI, CanRunFromUI)
ZELO_SCHED_FLAG_SETTER(ZELOSchedCTaskSetCanDeleteFromUI, CanDeleteFromUI)
ZELO_SCHED_FLAG_SETTER(ZELOSchedCTaskSetCanEditFromUI, CanEditFromUI)

/* int NAME(ZELO_SCHED_TASK *pTask, uint32_t value), int32_t for id and backend:
 * stores the number as it is. */
ZELO_SCHED_NUMBER_SETTER(ZELOSchedCTaskSetOwner, uint32_t, Owner)
ZELO_SCHED_NUMBER_SETTER(ZELOSchedCTaskSetStartYear, uint32_t, StartYear)
ZELO_SCHED_NUMBER_SETTER(ZELOSchedCTaskSetStartMonth, uint32_t, StartMonth)
ZELO_SCHED_NUMBER_SETTER(ZELOSchedCTaskSetStartDay, uint32_t, StartDay)
ZELO_SCHED_NUMBER_SETTER(ZELOSchedCTaskSetRunHour, uint32_t, RunHour)
ZELO_SCHED_NUMBER_SETTER(ZELOSchedCTaskSetRunMin, uint32_t, RunMin)
ZELO_SCHED_NUMBER_SETTER(ZELOSchedCTaskSetRepeatHour, uint32_t, RepeatHour)
ZELO_SCHED_NUMBER_SETTER(ZELOSchedCTaskSetLastWorkHour, uint32_t, LastWorkHour)
ZELO_SCHED_NUMBER_SETTER(ZELOSchedCTaskSetID, int32_t, ID)
ZELO_SCHED_NUMBER_SETTER(ZELOSchedCTaskSetBackend, int32_t, Backend)

/* int NAME(ZELO_SCHED_TASK *pTask, const char *szVal): copies the text, cut to
 * the field's capacity less one. */
ZELO_SCHED_TEXT_SETTER(ZELOSchedCTaskSetEditDialog, EditDialog)
ZELO_SCHED_TEXT_SETTER(ZELOSchedCTaskSetEditForm, EditForm)
ZELO_SCHED_TEXT_SETTER(ZELOSchedCTaskSetName, Name)
ZELO_SCHED_TEXT_SETTER(ZELOSchedCTaskSetAppArgs, AppArgs)
ZELO_SCHED_TEXT_SETTER(ZELOSchedCTaskSetAppName, AppName)
ZELO_SCHED_TEXT_SETTER(ZELOSchedCTaskSetApp, App)
ZELO_SCHED_TEXT_SETTER(ZELOSchedCTaskSetWeek, Week)
ZELO_SCHED_TEXT_SETTER(ZELOSchedCTaskSetCommand, Command)
ZELO_SCHED_TEXT_SETTER(ZELOSchedCTaskSetAction, Action)

#undef ZELO_SCHED_TYPE_SETTER
#undef ZELO_SCHED_FLAG_SETTER
#undef ZELO_SCHED_NUMBER_SETTER
#undef ZELO_SCHED_TEXT_SETTER

#ifdef __cplusplus
}
#endif
#endif
