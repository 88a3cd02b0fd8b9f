// Tasks and runs in words.
import { _, format, ngettext, visible } from "./text.js";
import { dateText, monthText, weekdayText } from "./moments.js";

export const DAYS = ["mon", "tue", "wed", "thu", "fri", "sat", "sun"];

// Three or more consecutive days become a range, also across Sunday.
export function daysText(days) {
  const on = DAYS.map((day) => days.includes(day));
  const count = on.filter((isOn) => isOn).length;
  if (count === 7) return _("Every day");
  if (count === 0) return _("On no day");
  const first = on.findIndex((isOn, day) => isOn && !on[(day + 6) % 7]);
  const isRange = [...Array(count).keys()].every((i) => on[(first + i) % 7]);
  if (isRange && count > 2) {
    return format(_("$0 to $1"), weekdayText(first, "long"), weekdayText((first + count - 1) % 7, "long"));
  }
  const width = count > 1 ? "short" : "long";
  return DAYS.map((day, i) => (on[i] ? weekdayText(i, width) : null)).filter((text) => text).join(", ");
}

// A date that does not exist is shown as it is stored: browsers take February 30 for March 2.
function dateInWords(text) {
  const date = new Date(text + "T00:00:00Z");
  const exists = !Number.isNaN(date.getTime()) && date.toISOString().startsWith(text);
  return exists ? dateText(date) : text;
}

function dayInWords(schedule) {
  switch (schedule.type) {
    case "once": return format(_("Once, on $0"), dateInWords(schedule.date));
    case "weekly": return daysText(schedule.days);
    case "monthly": return format(_("On day $0 of every month"), schedule.day);
    case "yearly": return format(_("Every year on $0 $1"), schedule.day, monthText(schedule.month));
    default: return _("Every day");
  }
}

export function scheduleText(schedule) {
  let text = format(_("$0 at $1"), dayInWords(schedule), schedule.at);
  const until = schedule.until_hour === null || schedule.until_hour === undefined ? 23 : schedule.until_hour;
  // A last hour that is not after the first leaves one run a day.
  if (schedule.every_hours && until > Number(schedule.at.slice(0, 2))) {
    const every = format(ngettext("every hour", "every $0 hours", schedule.every_hours), schedule.every_hours);
    text = format(_("$0, then $1 until $2"), text, every,
      String(until).padStart(2, "0") + schedule.at.slice(-3));
  }
  if (schedule.from) text = format(_("$0, from $1 on"), text, dateInWords(schedule.from));
  return text;
}

const BLANK = /^[\s\u200c\u200d]*$/;

// The name of a task, or its number where the name is blank.
export function titleOf(task) {
  return BLANK.test(task.name) ? format(_("Task $0"), task.id) : visible(task.name);
}

export function outcomeText(run) {
  if (!run) return _("has not run yet");
  if (run.state === "waiting") return _("waits for its turn");
  if (run.state === "running") return _("is running");
  switch (run.outcome) {
    case "finished": return _("finished");
    case "failed": return run.exit_code === null ? _("failed") : format(_("failed with code $0"), run.exit_code);
    case "killed": return run.signal === null ? _("was killed") : format(_("was killed by signal $0"), run.signal);
    case "not-started": return _("could not be started");
    case "time-limit": return _("reached its time limit");
    case "gave-up": return _("gave up waiting");
    case "cancelled": return _("was cancelled");
    case "stopped": return _("was stopped");
    default: return _("was lost");
  }
}

// The CSS class of a run: good, bad, busy or none.
export function gradeOf(run) {
  if (!run) return "none";
  if (run.state !== "ended") return "busy";
  if (run.outcome === "finished") return "good";
  return run.outcome === "cancelled" || run.outcome === "stopped" ? "none" : "bad";
}

export function triggerText(run) {
  switch (run.trigger) {
    case "schedule": return _("at its time");
    case "manual": return _("by hand");
    case "catch-up": return _("made up for");
    default: return _("by another program");
  }
}

// How long a run may take.
export function limitText(limit) {
  const found = /^(\d+)([smhd])$/.exec(limit || "");
  if (!found) return _("None");
  const count = Number(found[1]);
  switch (found[2]) {
    case "s": return format(ngettext("$0 second", "$0 seconds", count), count);
    case "m": return format(ngettext("$0 minute", "$0 minutes", count), count);
    case "h": return format(ngettext("$0 hour", "$0 hours", count), count);
    default: return format(ngettext("$0 day", "$0 days", count), count);
  }
}
