// The readers and getters that zeloschedgetter.h lists, one macro for each kind.
#include <zelosched.h>

#include "sched_report.h"
#include "sched_text.h"

#define ZELO_SCHED_YES_NO_READER(name, field, yes)                       \
  ZELO_SCHED_API int name(int32_t *pVal, const ZELO_SCHED_TASK *pTask) { \
    SCHED_CHECK_ARG(pVal != nullptr, "((void *)0) != pVal", -1);         \
    SCHED_CHECK_ARG(pTask != nullptr, "NULL != pTask", -1);              \
    *pVal = pTask->field == (yes) ? 1 : 0;                               \
    return 0;                                                            \
  }

#define ZELO_SCHED_NUMBER_GETTER(name, number, field)                   \
  ZELO_SCHED_API int name(number *pVal, const ZELO_SCHED_TASK *pTask) { \
    SCHED_CHECK_ARG(pVal != nullptr, "((void *)0) != pVal", -1);        \
    SCHED_CHECK_ARG(pTask != nullptr, "NULL != pTask", -1);             \
    *pVal = pTask->field;                                               \
    return 0;                                                           \
  }

#define ZELO_SCHED_TEXT_GETTER(name, field)                                          \
  ZELO_SCHED_API int name(char *szBuf, size_t cbBuf, const ZELO_SCHED_TASK *pTask) { \
    SCHED_CHECK_ARG(szBuf != nullptr, "((void *)0) != szBuf", -1);                   \
    SCHED_CHECK_ARG(0 < cbBuf, "0 < cbBuf", -1);                                     \
    SCHED_CHECK_ARG(pTask != nullptr, "NULL != pTask", -1);                          \
    copyText(szBuf, cbBuf, pTask->field);                                            \
    return 0;                                                                        \
  }

#define ZELO_SCHED_DEFINE_GETTERS
#include <zeloschedgetter.h>
