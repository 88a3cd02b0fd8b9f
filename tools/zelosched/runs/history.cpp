#include "runs/history.h"

#include <sys/statvfs.h>

#include <algorithm>
#include <ctime>

#include "runs/processes.h"
#include "runs/time_units.h"

namespace {

#define COLUMNS                                                                          \
  "run, task, generation, task_name, app, owner, started_by, due, queued, start, ended," \
  " duration, state, outcome, exit_code, signal, output_bytes, boot, status_id, pid,"    \
  " pid_born, keeper, keeper_born, stop_asked, told"

constexpr char kInsert[] =
    "INSERT INTO run(task, generation, task_name, app, owner, started_by, due, queued, start,"
    " ended, duration, state, outcome, exit_code, signal, output_bytes, boot, status_id, pid,"
    " pid_born, keeper, keeper_born, told, moment)"
    " VALUES(?, ?, ?, ?, ?, ?, ?, ?, ?, ?, ?, ?, ?, ?, ?, ?, ?, ?, ?, ?, ?, ?, ?, ?)";
// Without stop_asked, which noteStop() writes.
constexpr char kUpdate[] =
    "UPDATE run SET task = ?, generation = ?, task_name = ?, app = ?, owner = ?, started_by = ?,"
    " due = ?, queued = ?, start = ?, ended = ?, duration = ?, state = ?, outcome = ?,"
    " exit_code = ?, signal = ?, output_bytes = ?, boot = ?, status_id = ?, pid = ?,"
    " pid_born = ?, keeper = ?, keeper_born = ?, told = ?, moment = ? WHERE run = ?";

// Deletes the sweep's row of the same run.
constexpr char kGiveWay[] =
    "DELETE FROM run WHERE start = ? AND status_id = ? AND pid = ? AND task = ? AND run <> ?";

template <class Enum>
Enum enumOf(int64_t number, Enum last) {
  return number < 0 || number > static_cast<int64_t>(last) ? last : static_cast<Enum>(number);
}

std::optional<int> smallNumber(const Query &query, int column) {
  const std::optional<int64_t> number = query.optionalNumber(column);
  return number ? std::optional<int>(static_cast<int>(*number)) : std::nullopt;
}

KeptRun runOf(const Query &query) {
  KeptRun run;
  int column = 0;
  run.run = query.number(column++);
  run.task = query.number(column++);
  run.generation = query.optionalNumber(column++);
  run.taskName = query.text(column++);
  run.app = query.text(column++);
  run.owner = query.text(column++);
  run.trigger = enumOf(query.number(column++), Trigger::kOther);
  run.due = query.optionalNumber(column++);
  run.queued = query.optionalNumber(column++);
  run.start = query.optionalNumber(column++);
  run.end = query.optionalNumber(column++);
  run.duration = query.optionalReal(column++);
  run.state = enumOf(query.number(column++), RunState::kEnded);
  run.outcome = enumOf(query.number(column++), Outcome::kLost);
  run.exitCode = smallNumber(query, column++);
  run.signal = smallNumber(query, column++);
  run.outputBytes = query.number(column++);
  run.boot = query.text(column++);
  run.statusId = query.optionalNumber(column++);
  run.process.pid = query.number(column++);
  run.process.born = query.number(column++);
  run.keeper.pid = query.number(column++);
  run.keeper.born = query.number(column++);
  run.stopAsked = query.optionalNumber(column++);
  run.isTold = query.number(column) != 0;
  return run;
}

std::optional<int64_t> asLong(std::optional<int> number) {
  return number ? std::optional<int64_t>(*number) : std::nullopt;
}

void bind(Query *query, const KeptRun &run) {
  query->with(run.task).with(run.generation).with(run.taskName).with(run.app).with(run.owner);
  query->with(static_cast<int64_t>(run.trigger)).with(run.due).with(run.queued).with(run.start);
  query->with(run.end).with(run.duration).with(static_cast<int64_t>(run.state));
  query->with(static_cast<int64_t>(run.outcome))
      .with(asLong(run.exitCode))
      .with(asLong(run.signal));
  query->with(run.outputBytes).with(run.boot).with(run.statusId).with(run.process.pid);
  query->with(run.process.born).with(run.keeper.pid).with(run.keeper.born);
  query->with(run.isTold ? int64_t{1} : int64_t{0});
  const std::optional<int64_t> known = run.start ? run.start : run.queued ? run.queued : run.end;
  query->with(known ? *known : static_cast<int64_t>(time(nullptr)));
}

std::optional<int64_t> generationOf(const KeptDatabase &kept, int64_t task) {
  Query query(kept, "SELECT generation FROM task WHERE task = ? AND removed IS NULL");
  query.with(task);
  return query.next() ? std::optional<int64_t>(query.number(0)) : std::nullopt;
}

// For an existing task, its own runs; for a removed one, all runs of tasks that had the id.
std::string conditionOf(const KeptDatabase &kept, const RunFilter &filter,
                        std::vector<int64_t> *values) {
  std::string condition = " WHERE 1";
  const auto add = [&](const char *text, int64_t value) {
    condition += text;
    values->push_back(value);
  };
  if (filter.task) {
    const std::optional<int64_t> generation = generationOf(kept, *filter.task);
    if (generation) {
      add(" AND generation = ?", *generation);
    } else {
      add(" AND task = ?", *filter.task);
    }
  }
  if (filter.run) add(" AND run = ?", *filter.run);
  if (filter.since) add(" AND moment >= ?", *filter.since);
  if (filter.until) add(" AND moment <= ?", *filter.until);
  if (filter.failed) {
    condition += " AND state = 2 AND outcome <> ";
    condition += std::to_string(static_cast<int>(Outcome::kFinished));
  }
  if (filter.underWay) condition += " AND state < 2";
  if (filter.ofTasksOfToday) {
    condition += " AND generation IN (SELECT generation FROM task WHERE removed IS NULL)";
  }
  return condition;
}

bool isNearlyFull(const Settings &settings) {
  constexpr uint64_t kAll = 100;
  struct statvfs info {};
  if (statvfs(kHistoryDirectory, &info) != 0) return true;
  return info.f_bavail * kAll < info.f_blocks * static_cast<uint64_t>(settings.outputFreePercent);
}

// The oldest go first.
void dropOutputs(const KeptDatabase &kept, int64_t task, const Settings &settings) {
  Query(kept,
        "DELETE FROM output WHERE task = ?1 AND run <="
        " (SELECT run FROM output WHERE task = ?1 ORDER BY run DESC LIMIT 1 OFFSET ?2)")
      .with(task)
      .with(settings.outputRuns)
      .run();
  Query sum(kept, "SELECT total(size) FROM output");
  Query oldest(kept, "SELECT run, size FROM output ORDER BY run LIMIT 1");
  Query drop(kept, "DELETE FROM output WHERE run = ?");
  sum.next();
  for (int64_t left = sum.number(0); left > settings.outputTotal && oldest.next();) {
    const int64_t run = oldest.number(0);
    left -= oldest.number(1);
    while (oldest.next()) {
    }
    drop.with(run).run();
  }
}

// When the process was started, by the present clock.
int64_t bornAt(const ProcessName &process) {
  timespec up{};
  clock_gettime(CLOCK_BOOTTIME, &up);
  return static_cast<int64_t>(time(nullptr)) - static_cast<int64_t>(up.tv_sec) +
         process.born / sysconf(_SC_CLK_TCK);
}

// The newest runs of each task stay whatever their age, but no more than the total of all tasks.
void dropRuns(const KeptDatabase &kept, const Settings &settings) {
  Query(kept,
        "DELETE FROM run WHERE state = 2 AND run IN (SELECT run FROM (SELECT run, moment,"
        " row_number() OVER (PARTITION BY task ORDER BY moment DESC, run DESC) AS place FROM run)"
        " WHERE place > ? AND moment < ?)")
      .with(settings.runsOfTask)
      .with(static_cast<int64_t>(time(nullptr)) - settings.runsDays * kDay)
      .run();
  Query(kept,
        "DELETE FROM run WHERE state = 2 AND (moment, run) <= (SELECT moment, run FROM run"
        " ORDER BY moment DESC, run DESC LIMIT 1 OFFSET ?)")
      .with(settings.runsTotal)
      .run();
}

// Drops tasks that were removed long ago, with their notices and acknowledgements, when no run of
// that id is left.
void dropTasks(const KeptDatabase &kept, const Settings &settings) {
  const int64_t dropped = Query(kept,
                                "DELETE FROM task WHERE removed < ?"
                                " AND NOT EXISTS (SELECT 1 FROM run WHERE run.task = task.task)")
                              .with(static_cast<int64_t>(time(nullptr)) - settings.runsDays * kDay)
                              .run();
  if (dropped == 0) return;
  for (const char *sql :
       {"DELETE FROM notice WHERE generation NOT IN (SELECT generation FROM task)",
        "DELETE FROM acknowledged WHERE generation NOT IN"
        " (SELECT generation FROM task)"}) {
    Query(kept, sql).run();
  }
}

}  // namespace

ProcessName processNamed(int64_t pid) {
  return {pid, static_cast<int64_t>(statOf(static_cast<pid_t>(pid)).started)};
}

bool isAlive(const ProcessName &process) {
  if (process.pid <= 0 || process.born == 0) return false;
  const ProcessStat stat = statOf(static_cast<pid_t>(process.pid));
  return stat.started == static_cast<unsigned long long>(process.born) && stat.state != 'Z' &&
         stat.state != 'X';
}

ProcessName processOf(const Run &row) {
  constexpr int64_t kTolerance = 2;  // seconds, of two clocks and of their rounding
  const ProcessName process = processNamed(row.pid);
  const auto pid = static_cast<pid_t>(row.pid);
  const bool isNamed = process.born != 0 && isOfRoot(pid);
  return isNamed && bornAt(process) <= row.start + kTolerance ? process : ProcessName{row.pid, 0};
}

bool isKnown(const KeptDatabase &kept, const Run &row) {
  Query query(kept, "SELECT 1 FROM run WHERE start = ? AND status_id = ? AND pid = ? AND task = ?");
  query.with(row.start).with(row.statusId).with(row.pid).with(row.taskId);
  const bool isThere = query.next();
  if (isThere) query.next();
  return isThere;
}

bool isBad(const RunRecord &run) {
  return run.state == RunState::kEnded && run.outcome != Outcome::kFinished;
}

std::vector<KeptRun> runsOf(const KeptDatabase &kept, const RunFilter &filter) {
  std::vector<KeptRun> runs;
  if (!kept.isThere()) return runs;
  std::vector<int64_t> values;
  const std::string sql =
      "SELECT " COLUMNS " FROM run" + conditionOf(kept, filter, &values) +
      // Without the index of moments: runs under way have an index of their own.
      (filter.underWay ? " ORDER BY +moment DESC" : " ORDER BY moment DESC") + ", run DESC LIMIT ?";
  Query query(kept, sql.c_str());
  for (const int64_t value : values) query.with(value);
  query.with(filter.limit);
  while (query.next()) runs.push_back(runOf(query));
  return runs;
}

std::vector<KeptRun> lastRuns(const KeptDatabase &kept, LastRun which) {
  std::vector<KeptRun> runs;
  if (!kept.isThere()) return runs;
  const std::string ended = " AND state = 2 AND outcome NOT IN (" +
                            std::to_string(static_cast<int>(Outcome::kStopped)) + ", " +
                            std::to_string(static_cast<int>(Outcome::kCancelled)) + ")";
  const std::string sql =
      "SELECT " COLUMNS
      " FROM run WHERE run IN (SELECT (SELECT run FROM run WHERE"
      " run.generation = task.generation AND moment <= ?" +
      (which == LastRun::kEnded ? ended : "") +
      " ORDER BY moment DESC, run DESC LIMIT 1) FROM task WHERE removed IS NULL)";
  Query query(kept, sql.c_str());
  query.with(static_cast<int64_t>(time(nullptr)));
  while (query.next()) runs.push_back(runOf(query));
  return runs;
}

std::map<int64_t, int64_t> lastSuccesses(const KeptDatabase &kept) {
  std::map<int64_t, int64_t> moments;
  if (!kept.isThere()) return moments;
  Query query(kept,
              "SELECT task, (SELECT coalesce(ended, moment) FROM run WHERE"
              " run.generation = task.generation AND outcome = ? ORDER BY moment DESC LIMIT 1)"
              " AS success FROM task WHERE removed IS NULL AND success IS NOT NULL");
  query.with(static_cast<int64_t>(Outcome::kFinished));
  while (query.next()) moments[query.number(0)] = query.number(1);
  return moments;
}

std::map<Outcome, int64_t> countByOutcome(const KeptDatabase &kept) {
  std::map<Outcome, int64_t> counts;
  if (!kept.isThere()) return counts;
  Query query(kept, "SELECT outcome, count(*) FROM run WHERE state = 2 GROUP BY outcome");
  while (query.next()) counts[enumOf(query.number(0), Outcome::kLost)] += query.number(1);
  return counts;
}

std::vector<KeptRun> keptRuns(const RunFilter &filter) {
  return runsOf(KeptDatabase(KeptDatabase::kRead), filter);
}

void saveRun(const KeptDatabase &kept, KeptRun *run) {
  if (run->start && run->statusId) {
    Query giveWay(kept, kGiveWay);
    giveWay.with(*run->start).with(*run->statusId).with(run->process.pid).with(run->task);
    giveWay.with(run->run).run();
  }
  if (!run->generation) run->generation = generationOf(kept, run->task);
  if (run->run != 0) {
    Query update(kept, kUpdate);
    bind(&update, *run);
    if (update.with(run->run).run() > 0) return;
    run->run = 0;  // the database has been removed meanwhile
  }
  Query insert(kept, kInsert);
  bind(&insert, *run);
  insert.run();
  run->run = insert.lastKey();
}

void saveOutput(const KeptDatabase &kept, const KeptRun &run, const Output &output,
                const Settings &settings) {
  if (isNearlyFull(settings)) return;
  const auto size = static_cast<int64_t>(output.head.size() + output.tail.size());
  if (size == 0 || settings.outputRuns == 0) return;
  Query insert(kept,
               "INSERT OR REPLACE INTO output(run, task, size, left_out, head, tail)"
               " VALUES(?, ?, ?, ?, ?, ?)");
  insert.with(run.run).with(run.task).with(size).with(output.leftOut);
  insert.withBytes(output.head).withBytes(output.tail).run();
  dropOutputs(kept, run.task, settings);
}

std::optional<Output> outputOf(const KeptDatabase &kept, int64_t run) {
  if (!kept.isThere()) return std::nullopt;
  Query query(kept, "SELECT head, tail, left_out FROM output WHERE run = ?");
  query.with(run);
  if (!query.next()) return std::nullopt;
  return Output{query.text(0), query.text(1), query.number(2)};
}

void dropOldRuns(const KeptDatabase &kept, const Settings &settings) {
  dropRuns(kept, settings);
  dropTasks(kept, settings);
}

bool noteTold(const KeptDatabase &kept, std::string_view kind, int64_t generation, int64_t moment) {
  Query note(kept,
             "INSERT OR IGNORE INTO notice(kind, generation, moment, told)"
             " VALUES(?, ?, ?, ?)");
  note.with(std::string(kind)).with(generation).with(moment);
  return note.with(static_cast<int64_t>(time(nullptr))).run() > 0;
}

bool wasBadBefore(const KeptDatabase &kept, const KeptRun &run) {
  if (!run.generation) return false;
  Query query(kept,
              "SELECT outcome FROM run WHERE generation = ? AND run < ? AND state = 2"
              " ORDER BY run DESC LIMIT 1");
  query.with(*run.generation).with(run.run);
  return query.next() && query.number(0) != static_cast<int64_t>(Outcome::kFinished);
}
