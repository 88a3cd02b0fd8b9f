// The setters that zeloschedsetter.h lists, one macro for each kind.
#include <zelosched.h>

#include "sched_report.h"
#include "sched_text.h"

#define ZELO_SCHED_TYPE_SETTER(name, type)                         \
  ZELO_SCHED_API int name(ZELO_SCHED_TASK *pTask) {                \
    SCHED_CHECK_ARG(pTask != nullptr, "((void *)0) != pTask", -1); \
    pTask->Type = type;                                            \
    return 0;                                                      \
  }

#define ZELO_SCHED_FLAG_SETTER(name, field)                        \
  ZELO_SCHED_API int name(ZELO_SCHED_TASK *pTask, int32_t value) { \
    SCHED_CHECK_ARG(pTask != nullptr, "((void *)0) != pTask", -1); \
    pTask->field = value == 1 ? 1 : 0;                             \
    return 0;                                                      \
  }

#define ZELO_SCHED_NUMBER_SETTER(name, number, field)              \
  ZELO_SCHED_API int name(ZELO_SCHED_TASK *pTask, number value) {  \
    SCHED_CHECK_ARG(pTask != nullptr, "((void *)0) != pTask", -1); \
    pTask->field = value;                                          \
    return 0;                                                      \
  }

#define ZELO_SCHED_TEXT_SETTER(name, field)                            \
  ZELO_SCHED_API int name(ZELO_SCHED_TASK *pTask, const char *szVal) { \
    SCHED_CHECK_ARG(szVal != nullptr, "((void *)0) != szVal", -1);     \
    SCHED_CHECK_ARG(pTask != nullptr, "NULL != pTask", -1);            \
    copyText(pTask->field, szVal);                                     \
    return 0;                                                          \
  }

#define ZELO_SCHED_DEFINE_SETTERS
#include <zeloschedsetter.h>
