// A task to and from its hash form, row by row of the field table. The command is in Base64, which
// keeps its line feeds.
#include <zelocore.h>
#include <zelosched.h>
#include <zelosdk.h>

#include <algorithm>
#include <cstring>

#include "sched_hash.h"
#include "sched_parm_table.h"
#include "sched_report.h"
#include "sched_text.h"

namespace {

constexpr size_t kNumberCapacity = 4095;
constexpr size_t kEncodedCapacity = 32768;
constexpr size_t kCommandCapacity = sizeof(ZELO_SCHED_TASK::Command);
constexpr size_t kLongestText = kEncodedCapacity;

// What a row's value is in the hash form: a text, nothing (the key is left out), or a failure.
enum class RowText { kReady, kLeftOut, kFailed };

RowText textOfRow(int row, const ZELO_SCHED_TASK *pTask, char (&scratch)[kNumberCapacity],
                  const char **pszValue) {
  const SchedParm &parm = parm_table[row];
  const void *field = parm.fieldOf(pTask);
  if (parm.enumList != nullptr) {
    *pszValue = ZELOSchedEnumToName(parm.enumList, *static_cast<const int32_t *>(field));
    return *pszValue != nullptr ? RowText::kReady : RowText::kLeftOut;
  }
  if (parm.ToHashStr != nullptr) {
    *pszValue = scratch;
    if (parm.ToHashStr(field, scratch, sizeof(scratch)) < 0) {
      SCHED_LOG("parm_table[%d].ToHashStr failed.", row);
      return RowText::kFailed;
    }
    return RowText::kReady;
  }
  *pszValue = static_cast<const char *>(field);
  return RowText::kReady;
}

int setRows(PSZHASH *ppHash, const ZELO_SCHED_TASK *pTask) {
  char scratch[kNumberCapacity];
  for (int row = 0; parm_table[row].szKey != nullptr; ++row) {
    const SchedParm &parm = parm_table[row];
    if (!parm.inHash) {
      continue;
    }
    const char *szValue = nullptr;
    const RowText outcome = textOfRow(row, pTask, scratch, &szValue);
    if (outcome == RowText::kFailed) {
      return -1;
    }
    if (outcome == RowText::kReady && QLIBCSzHashSetValue(ppHash, parm.szKey, szValue) < 0) {
      SCHED_LOG_CALLEE("Set hash value failed. key:[%s], val:[%s]. ", parm.szKey, szValue);
      return -1;
    }
  }
  return 0;
}

int encodeCommand(PSZHASH *ppHash) {
  const char *szCommand = QLIBCSzHashGetValue(*ppHash, kSchedCommandKey);
  if (szCommand == nullptr) {
    SCHED_LOG("Failed to get cmd in hash");
    return -1;
  }
  char szEncoded[kEncodedCapacity];
  if (SzBase64EncodeFull(szCommand, strlen(szCommand), szEncoded, sizeof(szEncoded), 1) == 0) {
    SCHED_LOG_CALLEE("Base64 encoding failed. [%s] ", szCommand);
    return -1;
  }
  if (QLIBCSzHashSetValue(ppHash, kSchedCommandKey, szEncoded) < 0) {
    SCHED_LOG_CALLEE("set hash failed. key:[cmd], val:[%s] ", szEncoded);
    return -1;
  }
  return 0;
}

// The store has one value per line. Only texts can have line feeds.
int replaceLineFeeds(PSZHASH *ppHash) {
  SCHED_CHECK_ARG(*ppHash != nullptr, "NULL != *ppHash", 0);
  for (const SchedParm *parm = parm_table; parm->szKey != nullptr; ++parm) {
    const char *szValue = parm->isText() ? QLIBCSzHashGetValue(*ppHash, parm->szKey) : nullptr;
    if (szValue == nullptr || strchr(szValue, '\n') == nullptr) {
      continue;
    }
    char szOneLine[kLongestText];
    copyText(szOneLine, szValue);
    std::replace(szOneLine, szOneLine + strlen(szOneLine), '\n', ' ');
    if (QLIBCSzHashSetValue(ppHash, parm->szKey, szOneLine) < 0) {
      SCHED_LOG_CALLEE("Set hash value failed. key:[%s], val:[%s]. ", parm->szKey, szOneLine);
      return -1;
    }
  }
  return 0;
}

int fillRow(int row, ZELO_SCHED_TASK *pTask, const char *szValue, SchedSourceLocation location) {
  const SchedParm &parm = parm_table[row];
  void *field = parm.fieldOf(pTask);
  if (parm.enumList != nullptr) {
    const int value = ZELOSchedEnumToValue(parm.enumList, szValue);
    if (value >= 0) {
      *static_cast<int32_t *>(field) = value;
    }
    return 0;
  }
  if (parm.fnFromHashStr == nullptr) {
    copyText(static_cast<char *>(field), parm.capacity, szValue);
    return 0;
  }
  if (parm.fnFromHashStr(field, szValue) < 0) {
    SCHED_LOG_AT(location, "parm_table[%d].fnFromHashStr failed.", row);
    return -1;
  }
  return 0;
}

int decodeCommand(ZELO_SCHED_TASK *pTask, SchedSourceLocation location) {
  char szEncoded[kCommandCapacity];
  copyText(szEncoded, pTask->Command);
  size_t cbDecoded = kCommandCapacity;
  if (ZELOEncodingBase64Decode(szEncoded, strlen(szEncoded), pTask->Command, &cbDecoded) == 0) {
    SCHED_LOG_CALLEE_AT(location, "Base64 decoding failed. [%s] ", szEncoded);
    return -1;
  }
  pTask->Command[std::min(cbDecoded, kCommandCapacity - 1)] = '\0';
  return 0;
}

}  // namespace

int schedFillTaskFromHash(ZELO_SCHED_TASK *pTask, PSZHASH pHash, SchedSourceLocation location) {
  for (int row = 0; parm_table[row].szKey != nullptr; ++row) {
    const SchedParm &parm = parm_table[row];
    if (!parm.inHash) {
      continue;
    }
    const char *szValue = QLIBCSzHashGetValue(pHash, parm.szKey);
    if (szValue == nullptr && parm.required) {
      SCHED_LOG_CALLEE_AT(location, "Get hash value failed. key:[%s]. ", parm.szKey);
      return -1;
    }
    if (fillRow(row, pTask, szValue != nullptr ? szValue : parm.szDefault, location) < 0) {
      return -1;
    }
  }
  return decodeCommand(pTask, location);
}

int ZELOSchedInitHashFromTask(PSZHASH *ppHash, const ZELO_SCHED_TASK *pTask) {
  SCHED_CHECK_ARG(ppHash != nullptr, "((void *)0) != ppHash", -1);
  SCHED_CHECK_ARG(*ppHash != nullptr, "((void *)0) != *ppHash", -1);
  SCHED_CHECK_ARG(pTask != nullptr, "NULL != pTask", -1);
  QLIBCHashRemoveAll(*ppHash);
  if (setRows(ppHash, pTask) < 0 || encodeCommand(ppHash) < 0) {
    return -1;
  }
  return replaceLineFeeds(ppHash);
}

int ZELOSchedInitTaskFromHash(ZELO_SCHED_TASK *pTask, PSZHASH pHash) {
  SCHED_CHECK_ARG(pHash != nullptr, "((void *)0) != pHash", -1);
  SCHED_CHECK_ARG(pTask != nullptr, "NULL != pTask", -1);
  return schedFillTaskFromHash(pTask, pHash, SCHED_HERE);
}
