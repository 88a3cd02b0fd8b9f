// The fields of a task, one row each, for the hash form, the defaults and the sorting of lists.
#ifndef SCHED_PARM_TABLE_H
#define SCHED_PARM_TABLE_H

#include <zelosched.h>

#include <cstddef>

struct SchedParm {
  const char *szKey;  // null ends the table
  bool inHash;        // written into the hash form and read back from it
  bool required;      // reading a hash without it fails
  const char *szDefault;
  size_t offset;                    // of the field within the record
  size_t capacity;                  // of a text field, else 0
  const ZELO_SCHED_ENUM *enumList;  // of an enumeration field, else null
  int (*ToHashStr)(const void *private_data, char *str, size_t cbStr);  // numbers only
  int (*fnFromHashStr)(void *private_data, const char *str);            // numbers only
  int (*compare)(const void *field1, const void *field2);

  bool isText() const { return capacity > 0; }
  void *fieldOf(ZELO_SCHED_TASK *task) const { return reinterpret_cast<char *>(task) + offset; }
  const void *fieldOf(const ZELO_SCHED_TASK *task) const {
    return reinterpret_cast<const char *>(task) + offset;
  }
};

// Of the row that JSON carries encoded.
inline constexpr char kSchedCommandKey[] = "cmd";

// The index of a row is the sort-field number that callers of ZELOSchedTaskListSortEx pass, so the
// order of the rows is part of the interface.
extern const SchedParm parm_table[];

extern const ZELO_SCHED_ENUM kStateEnum[];
extern const ZELO_SCHED_ENUM kTypeEnum[];

#endif
