#include "runs/missed.h"

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>

#include "runs/coming_runs.h"
#include "runs/planned_off.h"
#include "runs/task_notes.h"
#include "runs/time_units.h"
#include "store/store_files.h"

namespace {

constexpr int64_t kGrace = 2 * kMinute;  // in which the program that cron starts may still begin
constexpr int64_t kClockMoved = 2 * kMinute;
constexpr int64_t kBetweenLooks = 11 * kMinute;  // of the sweep: its timer's period and accuracy

int64_t uptime() {
  timespec up{};
  clock_gettime(CLOCK_BOOTTIME, &up);
  return static_cast<int64_t>(up.tv_sec);
}

int64_t epoch() {
  return static_cast<int64_t>(time(nullptr));
}

struct Boot {
  std::optional<int64_t> started;  // when restore ran, before cron was started
  int64_t began = 0;               // by the clock of the last sweep
  bool wasClockSet = false;
};

std::optional<Boot> bootOf(const KeptDatabase &kept, const std::string &id) {
  Query query(kept, "SELECT started, began, clock_until FROM boot WHERE boot = ?");
  query.with(id);
  if (!query.next()) return std::nullopt;
  return Boot{query.optionalNumber(0), query.number(1), query.optionalNumber(2).has_value()};
}

// The first jump of the clock in a boot means that it was wrong before. A later one is a change by
// hand: earlier due times were right.
void noteClock(const KeptDatabase &kept, const std::string &id, const Boot &boot, int64_t now) {
  const int64_t began = now - uptime();
  const bool hasMoved = std::abs(began - boot.began) > kClockMoved;
  if (hasMoved && !boot.wasClockSet) {
    Query(kept, "UPDATE boot SET clock_from = ?, clock_until = ? WHERE boot = ?")
        .with(began)
        .with(now)
        .with(id)
        .run();
  }
  Query(kept, "UPDATE boot SET began = ?, seen = ? WHERE boot = ?")
      .with(began)
      .with(now)
      .with(id)
      .run();
}

struct Span {
  int64_t from;
  int64_t until;
};

// The spans in which the clock was wrong.
std::vector<Span> unjudgedSpans(const KeptDatabase &kept) {
  std::vector<Span> spans;
  Query query(kept, "SELECT clock_from, clock_until FROM boot WHERE clock_until IS NOT NULL");
  while (query.next()) spans.push_back({query.number(0), query.number(1)});
  return spans;
}

// The spans in which the machine was on, as far as is known, in their order.
std::vector<Span> spansUp(const KeptDatabase &kept, int64_t now) {
  std::vector<Span> spans;
  const std::string current = bootId();
  Query query(kept, "SELECT boot, began, seen FROM boot ORDER BY began");
  while (query.next()) {
    spans.push_back({query.number(1), query.text(0) == current ? now : query.number(2)});
  }
  return spans;
}

bool isIn(const std::vector<Span> &spans, time_t moment) {
  return std::any_of(spans.begin(), spans.end(),
                     [&](const Span &span) { return moment >= span.from && moment < span.until; });
}

// Between two boots it was off, except for the minutes after the last sweep of the first one.
MachineThen machineAt(const std::vector<Span> &up, time_t moment) {
  if (isIn(up, moment)) return MachineThen::kOn;
  const auto isOff = [&](const Span &before, const Span &after) {
    return moment >= before.until + kBetweenLooks && moment < after.from;
  };
  return std::adjacent_find(up.begin(), up.end(), isOff) == up.end() ? MachineThen::kMaybeOn
                                                                     : MachineThen::kOff;
}

// The moment up to which a time without a run counts as missed.
int64_t judgedUntil(const KeptDatabase &kept, int64_t now) {
  const std::optional<Boot> boot = bootOf(kept, bootId());
  const int64_t certain = boot && boot->started ? *boot->started : 0;
  return std::max(now - kGrace, std::min(certain, now));
}

class Judge {
 public:
  Judge(const KeptDatabase &kept, const TaskList &list, int64_t since, int64_t now)
      : off_(list),
        unjudged_(unjudgedSpans(kept)),
        up_(spansUp(kept, now)),
        notes_(taskNotes(kept)),
        lastRun_(kept, "SELECT max(moment) FROM run WHERE generation = ? AND moment <= ?"),
        acknowledged_(kept, "SELECT moment FROM acknowledged WHERE generation = ?"),
        since_(since),
        now_(now),
        until_(judgedUntil(kept, now)) {}

  MissedTask missedOf(const TaskRecord &task) {
    MissedTask missed{&task};
    const auto note = notes_.find(task.ID);
    if (note == notes_.end()) return missed;  // nobody knows since when it has been there
    const int64_t since = sinceOf(note->second);
    if (since >= until_) return missed;
    for (const LocalMinute &minute : runsBetween(task, localMinute(since), localMinute(until_))) {
      judge(minute, &missed);
    }
    return missed;
  }

 private:
  int64_t sinceOf(const TaskNote &note) {
    return std::max({since_, note.changed, numberOf(&lastRun_.with(note.generation).with(now_)),
                     numberOf(&acknowledged_.with(note.generation))});
  }

  static int64_t numberOf(Query *query) {
    int64_t number = 0;
    while (query->next()) number = query->number(0);
    return number;
  }

  void judge(const LocalMinute &minute, MissedTask *missed) const {
    const std::optional<time_t> due = momentOf(minute);
    if (!due) return;
    if (isIn(unjudged_, *due)) return;
    // The machine may have been switched on by hand between its power times.
    if (off_.isOffAt(minute) && !isIn(up_, *due)) {
      ++missed->planned;
    } else {
      ++missed->times;
      missed->due = *due;
      missed->machine = machineAt(up_, *due);
    }
  }

  PlannedOff off_;
  std::vector<Span> unjudged_;
  std::vector<Span> up_;
  std::map<int64_t, TaskNote> notes_;
  Query lastRun_;
  Query acknowledged_;
  int64_t since_;
  int64_t now_;
  int64_t until_;
};

}  // namespace

// Until the tasks are in /tmp, none of their times counts as missed.
bool areTasksLost() {
  struct stat info {};
  const bool isThere = lstat(kWorkingCopy, &info) == 0 && info.st_size > 0;
  return !isThere && (access(kPersistentCopy, F_OK) == 0 || access(kLastGoodCopy, F_OK) == 0);
}

void markMachineUp(bool isStarting) {
  const KeptDatabase kept(KeptDatabase::kChange);
  const std::string id = bootId();
  const int64_t now = epoch();
  Transaction transaction(kept);
  const std::optional<Boot> boot = bootOf(kept, id);
  if (boot) {
    noteClock(kept, id, *boot, now);
  } else {
    Query(kept, "INSERT INTO boot(boot, started, began, seen) VALUES(?, ?, ?, ?)")
        .with(id)
        .with(isStarting ? std::optional<int64_t>(now) : std::nullopt)
        .with(now - uptime())
        .with(now)
        .run();
  }
  Query(kept, "DELETE FROM boot WHERE boot <> ? AND seen < ?")
      .with(id)
      .with(now - 2 * kMissedRemembered)
      .run();
  transaction.commit();
}

std::vector<MissedTask> missedTasks(const KeptDatabase &kept, const TaskList &list, time_t since) {
  std::vector<MissedTask> found;
  if (!kept.isThere() || areTasksLost()) return found;
  const int64_t now = epoch();
  const Snapshot snapshot(kept);
  Judge judge(kept, list, std::max(static_cast<int64_t>(since), now - kMissedRemembered), now);
  for (const TaskRecord *task : list.tasks()) {
    if (!isEnabled(*task) || isPower(*task)) continue;
    const MissedTask missed = judge.missedOf(*task);
    if (missed.times + missed.planned > 0) found.push_back(missed);
  }
  std::stable_sort(found.begin(), found.end(),
                   [](const MissedTask &a, const MissedTask &b) { return a.due < b.due; });
  return found;
}

void acknowledge(const KeptDatabase &kept, std::optional<int64_t> task, Acknowledged what) {
  Transaction transaction(kept);
  Query note(kept,
             "INSERT INTO acknowledged(generation, moment, run) SELECT generation, ?1,"
             " iif(?3, (SELECT coalesce(max(run), 0) FROM run), 0)"
             " FROM task WHERE removed IS NULL AND (?2 IS NULL OR task = ?2)"
             " ON CONFLICT DO UPDATE SET moment = excluded.moment, run = max(run, excluded.run)");
  note.with(epoch()).with(task).with(what == Acknowledged::kAll ? int64_t{1} : int64_t{0}).run();
  transaction.commit();
}

bool isAcknowledged(const KeptDatabase &kept, const KeptRun &run) {
  if (!run.generation) return false;
  Query query(kept, "SELECT run FROM acknowledged WHERE generation = ?");
  query.with(*run.generation);
  return query.next() && query.number(0) >= run.run;
}
