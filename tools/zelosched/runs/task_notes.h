// The tasks in the history: which there were, and since when each is as it is. As a free id is
// given to the next new task, a generation tells the tasks of one id apart.
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>

#include "runs/kept_database.h"
#include "store/task_list.h"

struct TaskNote {
  int64_t generation = 0;  // is not reused, unlike the id
  int64_t task = 0;
  std::string app;
  std::string name;
  bool isEnabled = false;
  std::optional<int64_t> created;  // nothing when no tool saw it
  int64_t changed = 0;  // when its schedule or state were last changed, or it was first seen
};

// Of the existing tasks, by their ids. Throws Failure.
std::map<int64_t, TaskNote> taskNotes(const KeptDatabase &kept);

// The tools record each of their changes at once. A failure is reported, and does not undo the
// change. Power times are not recorded.
void noteCreated(const TaskRecord &task);
void noteEdited(const TaskRecord &task);
void noteRemoved(const TaskRecord &task);

// Records what other programs have changed since the last sweep. Only where the list has every
// stored task (`isWhole`), those that it lacks are removed. In a transaction of the caller's.
void noteTasks(const KeptDatabase &kept, const TaskList &list, bool isWhole);

// The generation of a task that runs now, which is recorded when it is not known.
std::optional<int64_t> generationOf(const KeptDatabase &kept, const TaskRecord &task);
