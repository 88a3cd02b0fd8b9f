// Running plugins for a change: the task as it was and as it is to be are their arguments.
#include <zelocore.h>
#include <zelosched.h>

#include <cstddef>
#include <cstdio>
#include <cstring>

#include "sched_report.h"
#include "sched_text.h"

namespace {

constexpr char kPluginName[] = "task_scheduler";
constexpr size_t kValueCapacity = 32;  // the interface cuts longer values to this

enum class Form { kId, kUnsigned, kSigned, kText };

struct HookArgument {
  const char *szName;
  Form form;
  size_t offset;
};

#define ARGUMENT(name, form, field) \
  { name, Form::form, offsetof(ZELO_SCHED_TASK, field) }
constexpr HookArgument kArguments[] = {
    ARGUMENT("TASK_ID", kId, ID),
    ARGUMENT("BACKEND", kId, Backend),
    ARGUMENT("OWNER", kUnsigned, Owner),
    ARGUMENT("NAME", kText, Name),
    ARGUMENT("STATE", kSigned, State),
    ARGUMENT("TYPE", kSigned, Type),
    ARGUMENT("APP", kText, App),
    ARGUMENT("YEAR", kUnsigned, StartYear),
    ARGUMENT("MONTH", kUnsigned, StartMonth),
    ARGUMENT("DAY", kUnsigned, StartDay),
    ARGUMENT("HOUR", kUnsigned, RunHour),
    ARGUMENT("MIN", kUnsigned, RunMin),
    ARGUMENT("REPEAT_HOUR", kUnsigned, RepeatHour),
    ARGUMENT("LAST_WORK_HOUR", kUnsigned, LastWorkHour),
    ARGUMENT("WEEK", kText, Week),
};
#undef ARGUMENT

void writeValue(const HookArgument &argument, const ZELO_SCHED_TASK &task,
                char (&szValue)[kValueCapacity]) {
  const char *field = reinterpret_cast<const char *>(&task) + argument.offset;
  int32_t number = 0;
  if (argument.form != Form::kText) {
    memcpy(&number, field, sizeof(number));
  }
  switch (argument.form) {
    case Form::kId:
      snprintf(szValue, sizeof(szValue), "%ld", static_cast<long>(number));
      break;
    case Form::kUnsigned:
      snprintf(szValue, sizeof(szValue), "%u", static_cast<unsigned>(number));
      break;
    case Form::kSigned:
      snprintf(szValue, sizeof(szValue), "%d", number);
      break;
    case Form::kText:
      copyText(szValue, field);
      break;
  }
}

int setArguments(ZELO_SCHED_PLUGIN *pPlugin, const char *szPrefix, const ZELO_SCHED_TASK *pTask) {
  if (pTask == nullptr) {
    return 0;
  }
  for (const HookArgument &argument : kArguments) {
    char szKey[kValueCapacity];
    char szValue[kValueCapacity];
    snprintf(szKey, sizeof(szKey), "%s_%s", szPrefix, argument.szName);
    writeValue(argument, *pTask, szValue);
    if (QLIBPluginSetArg(pPlugin->framework, szKey, szValue) < 0) {
      return -1;
    }
  }
  return 0;
}

int initContext(ZELO_SCHED_PLUGIN *pPlugin, const char *szAction, const ZELO_SCHED_TASK *pOrg,
                const ZELO_SCHED_TASK *pNew) {
  if (pPlugin == nullptr || szAction == nullptr || (pOrg == nullptr && pNew == nullptr)) {
    SCHED_SET_ERROR(kErrBadArgument);
    SCHED_LOG("Bad parameters");
    return -1;
  }
  *pPlugin = {};
  pPlugin->pOrg = pOrg;
  pPlugin->pNew = pNew;
  if (QLIBPluginInit(kPluginName, szAction, pPlugin->framework) < 0) {
    SCHED_LOG_CALLEE("Fail to do plugin init");
    return -1;
  }
  return 0;
}

}  // namespace

int ZELOSchedTaskPluginInit(ZELO_SCHED_PLUGIN *pPlugin, const char *szAction,
                            const ZELO_SCHED_TASK *pOrg, const ZELO_SCHED_TASK *pNew) {
  if (initContext(pPlugin, szAction, pOrg, pNew) < 0) {
    if (pPlugin != nullptr) {
      pPlugin->framework[0] = nullptr;
    }
    return -1;
  }
  return 0;
}

int ZELOSchedTaskPlugin(int action, ZELO_SCHED_PLUGIN *pPlugin) {
  if (pPlugin == nullptr || pPlugin->framework[0] == nullptr) {
    return -1;
  }
  if (pPlugin->pOrg == nullptr && pPlugin->pNew == nullptr) {
    SCHED_SET_ERROR(kErrBadArgument);
    return -1;
  }
  if (QLIBPluginSetArgByInt(pPlugin->framework, "RESULT", pPlugin->result) < 0 ||
      setArguments(pPlugin, "ORG", pPlugin->pOrg) < 0 ||
      setArguments(pPlugin, "NEW", pPlugin->pNew) < 0) {
    return -1;
  }
  return QLIBPluginAction(action, pPlugin->framework);
}

int ZELOSchedTaskPluginExit(ZELO_SCHED_PLUGIN *pPlugin) {
  if (pPlugin == nullptr) {
    SCHED_SET_ERROR(kErrBadArgument);
    return -1;
  }
  if (QLIBPluginExit(pPlugin->framework) < 0) {
    SCHED_LOG_CALLEE("Fail to do plugin exit");
    return -1;
  }
  return 0;
}
