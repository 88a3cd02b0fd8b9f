/*
 * zeloschedgetter.h - reads the fields of a task record.
 *
 * Every reader and getter takes the place for the result first. It returns 0,
 * or -1 with 0x0D00 and the result untouched when an argument is null or a
 * buffer has no room.
 *
 * Each stands on a line of its own, which declares it for callers and defines
 * it in the library, so that a log line names its line here.
 */
#ifndef ZELOSCHEDGETTER_H
#define ZELOSCHEDGETTER_H

#include "zelosched.h"

#ifdef __cplusplus
extern "C" {
#endif

#ifndef ZELO_SCHED_DEFINE_GETTERS
#define ZELO_SCHED_YES_NO_READER(name, field, yes) \
  ZELO_SCHED_API int name(int32_t *pVal, const ZELO_SCHED_TASK *pTask);
#define ZELO_SCHED_NUMBER_GETTER(name, number, field) \
  ZELO_SCHED_API int name(number *pVal, const ZELO_SCHED_TASK *pTask);
#define ZELO_SCHED_TEXT_GETTER(name, field) \
  ZELO_SCHED_API int name(char *szBuf, size_t cbBuf, const ZELO_SCHED_TASK *pTask);
#endif

/* int NAME(int32_t *pVal, const ZELO_SCHED_TASK *pTask): 1 in *pVal when the
 * field has the value in the line, else 0. */
ZELO_SCHED_YES_NO_READER(ZELOSchedCTaskIsOnce, Type, 0)
ZELO_SCHED_YES_NO_READER(ZELOSchedCTaskIsDaily, Type, 1)
ZELO_SCHED_YES_NO_READER(ZELOSchedCTaskIsWeekly, Type, 2)
ZELO_SCHED_YES_NO_READER(ZELOSchedCTaskIsMonthly, Type, 3)
ZELO_SCHED_YES_NO_READER(ZELOSchedCTaskIsYearly, Type, 4)
ZELO_SCHED_YES_NO_READER(ZELOSchedCTaskIsNew, ID, -1)
ZELO_SCHED_YES_NO_READER(ZELOSchedCTaskIsEnabled, State, 1)
ZELO_SCHED_YES_NO_READER(ZELOSchedCTaskIsListable, Listable, 1)
ZELO_SCHED_YES_NO_READER(ZELOSchedCTaskIsCanEditName, CanEditName, 1)
ZELO_SCHED_YES_NO_READER(ZELOSchedCTaskIsCanEditOwner, CanEditOwner, 1)
ZELO_SCHED_YES_NO_READER(ZELOSchedCTaskIsSimpleEditForm, SimpleEditForm, 1)
ZELO_SCHED_YES_NO_READER(ZELOSchedCTaskIsCanRunAppSameTime, CanRunAppSameTime, 1)
ZELO_SCHED_YES_NO_READER(ZELOSchedCTaskIsCanRunTaskSameTime, CanRunTaskSameTime, 1)
ZELO_SCHED_YES_NO_READER(ZELOSchedCTaskIsCanRunFromUI, CanRunFromUI, 1)
ZELO_SCHED_YES_NO_READER(ZELOSchedCTaskIsCanDeleteFromUI, CanDeleteFromUI, 1)
ZELO_SCHED_YES_NO_READER(ZELOSchedCTaskIsCanEditFromUI, CanEditFromUI, 1)

/* int NAME(uint32_t *pVal, const ZELO_SCHED_TASK *pTask), int32_t for id and
 * backend: the number as it is. */
ZELO_SCHED_NUMBER_GETTER(ZELOSchedCTaskGetOwner, uint32_t, Owner)
ZELO_SCHED_NUMBER_GETTER(ZELOSchedCTaskGetStartYear, uint32_t, StartYear)
ZELO_SCHED_NUMBER_GETTER(ZELOSchedCTaskGetStartMonth, uint32_t, StartMonth)
ZELO_SCHED_NUMBER_GETTER(ZELOSchedCTaskGetStartDay, uint32_t, StartDay)
ZELO_SCHED_NUMBER_GETTER(ZELOSchedCTaskGetRunHour, uint32_t, RunHour)
ZELO_SCHED_NUMBER_GETTER(ZELOSchedCTaskGetRunMin, uint32_t, RunMin)
ZELO_SCHED_NUMBER_GETTER(ZELOSchedCTaskGetRepeatHour, uint32_t, RepeatHour)
ZELO_SCHED_NUMBER_GETTER(ZELOSchedCTaskGetLastWorkHour, uint32_t, LastWorkHour)
ZELO_SCHED_NUMBER_GETTER(ZELOSchedCTaskGetID, int32_t, ID)
ZELO_SCHED_NUMBER_GETTER(ZELOSchedCTaskGetBackend, int32_t, Backend)

/* int NAME(char *szBuf, size_t cbBuf, const ZELO_SCHED_TASK *pTask): copies the
 * text, cut to cbBuf - 1 characters. */
ZELO_SCHED_TEXT_GETTER(ZELOSchedCTaskGetName, Name)
ZELO_SCHED_TEXT_GETTER(ZELOSchedCTaskGetAppArgs, AppArgs)
ZELO_SCHED_TEXT_GETTER(ZELOSchedCTaskGetAppName, AppName)
ZELO_SCHED_TEXT_GETTER(ZELOSchedCTaskGetEditForm, EditForm)
ZELO_SCHED_TEXT_GETTER(ZELOSchedCTaskGetEditDialog, EditDialog)
ZELO_SCHED_TEXT_GETTER(ZELOSchedCTaskGetApp, App)
ZELO_SCHED_TEXT_GETTER(ZELOSchedCTaskGetWeek, Week)
ZELO_SCHED_TEXT_GETTER(ZELOSchedCTaskGetCommand, Command)
ZELO_SCHED_TEXT_GETTER(ZELOSchedCTaskGetAction, Action)
ZELO_SCHED_TEXT_GETTER(ZELOSchedCTaskGetNextTriggerTime, NextTriggerTime)

#undef ZELO_SCHED_YES_NO_READER
#undef ZELO_SCHED_NUMBER_GETTER
#undef ZELO_SCHED_TEXT_GETTER

#ifdef __cplusplus
}
#endif
#endif
