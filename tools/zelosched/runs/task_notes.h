// What the history knows of the tasks: which there were, and since when each is as it is. An id
// that is free is given to the next new task, whose runs are its own alone.
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>

#include "runs/kept_database.h"
#include "store/task_list.h"

struct TaskNote {
  int64_t generation = 0;  // no other task ever has it, whatever its id
  int64_t task = 0;
  std::string app;
  std::string name;
  bool isEnabled = false;
  std::optional<int64_t> created;  // nothing when nobody saw it
  int64_t changed = 0;  // when its schedule or state were last changed, or it was first seen
};

// Of the tasks of today, by their ids. Throws Failure.
std::map<int64_t, TaskNote> taskNotes(const KeptDatabase &kept);

// The tools tell of each change of theirs, when it is made; a failure is said, and keeps nothing
// from being changed. Power times are no tasks in this sense.
void noteCreated(const TaskRecord &task);
void noteEdited(const TaskRecord &task);
void noteRemoved(const TaskRecord &task);

// Notes what other programs have changed since the last look. Only where the list has every stored
// task (`isWhole`) are those that it lacks gone. In a transaction of the caller's.
void noteTasks(const KeptDatabase &kept, const TaskList &list, bool isWhole);

// The generation of a task that runs now, noted when it was not known.
std::optional<int64_t> generationOf(const KeptDatabase &kept, const TaskRecord &task);
