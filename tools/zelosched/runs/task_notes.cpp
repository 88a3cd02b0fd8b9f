#include "runs/task_notes.h"

#include <unistd.h>

#include <ctime>

#include "terminal/failure.h"

namespace {

// The schedule as a text. After a change of it, earlier times do not count as missed.
std::string scheduleOf(const TaskRecord &task) {
  std::string text = std::to_string(task.Type) + " " + std::string(task.Week);
  for (const uint32_t number : {task.StartYear, task.StartMonth, task.StartDay, task.RunHour,
                                task.RunMin, task.RepeatHour, task.LastWorkHour}) {
    text += " " + std::to_string(number);
  }
  return text;
}

int64_t now() {
  return static_cast<int64_t>(time(nullptr));
}

void add(const KeptDatabase &kept, const TaskRecord &task, std::optional<int64_t> created) {
  Query insert(kept,
               "INSERT INTO task(task, app, name, schedule, command, enabled, created, changed)"
               " VALUES(?, ?, ?, ?, ?, ?, ?, ?)");
  insert.with(task.ID).with(std::string(task.App)).with(std::string(task.Name));
  insert.with(scheduleOf(task))
      .with(std::string(task.Command))
      .with(isEnabled(task) ? int64_t{1} : int64_t{0});
  insert.with(created).with(now()).run();
}

void end(const KeptDatabase &kept, int64_t id) {
  Query(kept, "UPDATE task SET removed = ? WHERE task = ? AND removed IS NULL")
      .with(now())
      .with(id)
      .run();
}

// What is recorded of an existing task.
struct Seen {
  int64_t generation;
  std::string app;
  std::string name;
  std::string schedule;
  std::string command;
  bool isEnabled;
};

#define SELECT_SEEN                                                                        \
  "SELECT generation, app, name, schedule, command, enabled, task FROM task WHERE removed" \
  " IS NULL"

Seen seenOf(const Query &query) {
  return {query.number(0), query.text(1), query.text(2),
          query.text(3),   query.text(4), query.number(5) != 0};
}

std::optional<Seen> seenOf(const KeptDatabase &kept, int64_t id) {
  Query query(kept, SELECT_SEEN " AND task = ?");
  query.with(id);
  return query.next() ? std::optional<Seen>(seenOf(query)) : std::nullopt;
}

std::map<int64_t, Seen> allSeen(const KeptDatabase &kept) {
  std::map<int64_t, Seen> all;
  Query query(kept, SELECT_SEEN);
  while (query.next()) all[query.number(6)] = seenOf(query);
  return all;
}

void update(const KeptDatabase &kept, const TaskRecord &task, const Seen &seen) {
  const std::string schedule = scheduleOf(task);
  const bool isSame = seen.schedule == schedule && seen.isEnabled == isEnabled(task);
  if (isSame && seen.app == task.App && seen.name == task.Name && seen.command == task.Command) {
    return;
  }
  Query change(kept,
               "UPDATE task SET app = ?, name = ?, schedule = ?, command = ?, enabled = ?,"
               " changed = iif(?, changed, ?) WHERE generation = ?");
  change.with(std::string(task.App)).with(std::string(task.Name)).with(schedule);
  change.with(std::string(task.Command))
      .with(isEnabled(task) ? int64_t{1} : int64_t{0})
      .with(isSame ? int64_t{1} : int64_t{0});
  change.with(now()).with(seen.generation).run();
}

// Another program may have removed it and made a new one, which got its id. A task that has both
// another name and another command is taken for such a one, and so is one of another application.
bool isAnother(const TaskRecord &task, const Seen &seen) {
  return seen.app != task.App || (seen.name != task.Name && seen.command != task.Command);
}

// Runs that were recorded before any task of that id are taken for those of the first one.
void adoptRuns(const KeptDatabase &kept, const TaskRecord &task) {
  Query(kept,
        "UPDATE run SET generation = (SELECT generation FROM task WHERE task = ?1 AND removed IS"
        " NULL) WHERE task = ?1 AND app = ?2 AND generation IS NULL"
        " AND (SELECT count(*) FROM task WHERE task = ?1) = 1")
      .with(task.ID)
      .with(std::string(task.App))
      .run();
}

void look(const KeptDatabase &kept, const TaskRecord &task, const Seen *seen) {
  if (seen && !isAnother(task, *seen)) return update(kept, task, *seen);
  if (seen) end(kept, task.ID);
  add(kept, task, std::nullopt);
  adoptRuns(kept, task);
}

// A change that cannot be recorded is not a failure, as it was made: the sweep records it later.
template <class Step>
void note(const TaskRecord &task, Step step) {
  if (isPower(task)) return;
  try {
    const KeptDatabase kept(KeptDatabase::kChange);
    Transaction transaction(kept);
    step(kept);
    transaction.commit();
  } catch (const Failure &failure) {
    complain(std::string(failure.what()) + ": the history does not know of the change yet");
  }
}

}  // namespace

std::map<int64_t, TaskNote> taskNotes(const KeptDatabase &kept) {
  std::map<int64_t, TaskNote> notes;
  if (!kept.isThere()) return notes;
  Query query(kept,
              "SELECT generation, task, app, name, enabled, created, changed FROM task"
              " WHERE removed IS NULL");
  while (query.next()) {
    TaskNote found;
    found.generation = query.number(0);
    found.task = query.number(1);
    found.app = query.text(2);
    found.name = query.text(3);
    found.isEnabled = query.number(4) != 0;
    found.created = query.optionalNumber(5);
    found.changed = query.number(6);
    notes[found.task] = std::move(found);
  }
  return notes;
}

void noteCreated(const TaskRecord &task) {
  note(task, [&](const KeptDatabase &kept) {
    end(kept, task.ID);
    add(kept, task, now());
  });
}

void noteEdited(const TaskRecord &task) {
  note(task, [&](const KeptDatabase &kept) {
    const std::optional<Seen> seen = seenOf(kept, task.ID);
    if (seen) return update(kept, task, *seen);
    add(kept, task, std::nullopt);
    adoptRuns(kept, task);
  });
}

void noteRemoved(const TaskRecord &task) {
  note(task, [&](const KeptDatabase &kept) {
    // Its runs must not be those of the next task with its id.
    if (!seenOf(kept, task.ID)) {
      add(kept, task, std::nullopt);
      adoptRuns(kept, task);
    }
    end(kept, task.ID);
  });
}

void noteTasks(const KeptDatabase &kept, const TaskList &list, bool isWhole) {
  std::map<int64_t, Seen> left = allSeen(kept);
  for (const TaskRecord *task : list.tasks()) {
    if (isPower(*task)) continue;
    const auto seen = left.find(task->ID);
    look(kept, *task, seen == left.end() ? nullptr : &seen->second);
    if (seen != left.end()) left.erase(seen);
  }
  if (!isWhole) return;
  for (const auto &[id, unused] : left) end(kept, id);
}

std::optional<int64_t> generationOf(const KeptDatabase &kept, const TaskRecord &task) {
  const std::optional<Seen> before = seenOf(kept, task.ID);
  look(kept, task, before ? &*before : nullptr);
  const std::optional<Seen> seen = seenOf(kept, task.ID);
  return seen ? std::optional<int64_t>(seen->generation) : std::nullopt;
}
