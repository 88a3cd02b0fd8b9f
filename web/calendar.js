// The coming seven days, hour by hour.
import { button, el, fill, setText } from "./dom.js";
import { href, taskPath } from "./address.js";
import { openDialog } from "./dialogs.js";
import { longDayText, moment, momentText, timeText, wallNow } from "./moments.js";
import { ask } from "./tool.js";
import { inTurn } from "./turns.js";
import { bandOfHour, offTimes } from "./week.js";
import { titleOf } from "./words.js";
import { _, format, ngettext, short } from "./text.js";

const DAYS = 7;
const HOURS = 24;
const DAY = 24 * 60 * 60 * 1000; // ms
const SHOWN = 3; // runs in a cell; the others are a click away
const HOUR = DAY / HOURS;
const MOST = 10000; // runs that the tool lists at most

// A run at a time when the machine is off is marked, as it will not happen.
function runLink(run) {
  const name = titleOf({ id: run.task, name: run.task_name });
  const title = run.isOff ? format(_("$0: the machine is off then"), short(name, 200)) : short(name, 200);
  return el("a", { class: run.isOff ? "run missed" : "run", href: href(taskPath(run.task)), title },
    el("time", {}, timeText(run.wall)), " ", el("bdi", {}, short(name, 60)),
    run.isOff ? el("span", { class: "unseen" }, _("the machine is off then")) : null);
}

function powerMark(run) {
  const title = run.power === "on" ? _("Machine on") : _("Machine off");
  return el("a", { class: "power-mark " + run.power, href: href(["power"]), title }, timeText(run.wall), " ",
    run.power === "on" ? _("On") : _("Off"));
}

export class CalendarView {
  constructor(root, model) {
    this.model = model;
    this.refresh = inTurn(() => this.load());
    this.title = _("Calendar");
    this.fault = el("div");
    this.note = el("p", { class: "beside", role: "status" });
    this.legend = el("p", { class: "legend", hidden: true }, el("span", { class: "swatch off", "aria-hidden": "true" }),
      _("The machine is off"));
    this.grid = el("div", { class: "calendar" });
    fill(root, el("h2", {}, _("The coming seven days")), this.fault, this.note, this.legend, this.grid);
    this.update();
  }

  update() {
    if (this.model.isPowerLoaded) this.refresh();
  }

  async load() {
    try {
      const [runs, power] = await Promise.all([ask("next", "--within", "7d"), this.askForPower()]);
      this.show(runs.runs, power.runs);
      fill(this.fault);
    } catch (error) {
      fill(this.fault, el("div", { class: "note bad", role: "alert" }, el("p", {}, error.message)));
    }
  }

  // In a request of their own: of very many runs of tasks not all are listed.
  askForPower() {
    const times = this.model.powerTimes.filter((time) => time.enabled);
    return times.length === 0 ? { runs: [] } : ask("next", ...times.map((time) => String(time.id)), "--within", "7d");
  }

  show(all, power) {
    const now = wallNow();
    const first = Date.UTC(now.getUTCFullYear(), now.getUTCMonth(), now.getUTCDate());
    const key = JSON.stringify([first, now.getUTCHours(), all, power]);
    if (this.shown === key) return;
    this.shown = key;
    const minutes = (wall) => (wall.getTime() - first) / 60000;
    const last = first + DAYS * DAY; // of the seventh day; in seven days from now there are runs of the eighth
    const runs = [...power, ...all.filter((run) => !run.power)].filter((run) => run.due)
      .map((run) => ({ ...run, wall: moment(run.due).wall })).filter((run) => run.wall.getTime() < last);
    // Runs after the last listed one are unknown.
    const end = all.length >= MOST ? all[all.length - 1].due : null;
    const firstUnknown = end ? Math.floor((moment(end).wall.getTime() - first) / HOUR) + 1 : DAYS * HOURS;
    const events = runs.filter((run) => run.power).map((run) => ({ at: minutes(run.wall), power: run.power }));
    const bands = offTimes(events, DAYS * HOURS * 60, false);
    const isOff = (at) => bands.some(({ from, to }) => from <= at && at < to);
    const cells = new Map();
    for (const run of runs) {
      run.isOff = !run.power && isOff(minutes(run.wall));
      const hour = Math.floor((run.wall.getTime() - first) / HOUR);
      if (!cells.has(hour)) cells.set(hour, []);
      cells.get(hour).push(run);
    }
    const hourNow = now.getUTCHours();
    fill(this.grid, this.hours(), ...[...Array(DAYS).keys()].map((day) =>
      this.day(new Date(first + day * DAY), day, { cells, bands, hourNow, firstUnknown })));
    setText(this.note, this.summary(runs.filter((run) => !run.power), end));
    this.legend.hidden = bands.length === 0;
  }

  // `end`: the last time of which runs are known, if not all are.
  summary(runs, end) {
    if (runs.length === 0) return _("No task runs in the coming seven days.");
    const missed = runs.filter((run) => run.isOff).length;
    const count = format(ngettext("$0 run", "$0 runs", runs.length), runs.length);
    const sentences = [missed === 0 ? count + "."
      : format(ngettext("$0, $1 of which will not happen, as the machine is off.", "$0, $1 of which will not happen, as the machine is off.", missed), count, missed)];
    if (end) sentences.push(format(_("There are more than can be shown: what comes after $0 is missing here."), momentText(end)));
    return sentences.join(" ");
  }

  hours() {
    return el("div", { class: "day hours", "aria-hidden": "true" }, el("div", { class: "day-head" }),
      ...[...Array(HOURS).keys()].map((hour) => el("div", { class: "hour-name" }, String(hour).padStart(2, "0"))));
  }

  day(wall, day, { cells, bands, hourNow, firstUnknown }) {
    const name = longDayText(wall);
    return el("section", { class: "day", "aria-label": name }, el("h3", { class: "day-head" }, name),
      ...[...Array(HOURS).keys()].map((hour) => {
        const at = day * HOURS + hour;
        const runs = cells.get(at) || [];
        const band = bandOfHour(bands, at);
        const isUnknown = at >= firstUnknown;
        const isFirst = at === Math.max(firstUnknown, day * HOURS); // of the day: what it means is said once
        const style = ["hour", runs.length === 0 && !(isUnknown && isFirst) ? "none" : "", day === 0 && hour < hourNow ? "past" : "",
          day === 0 && hour === hourNow ? "now" : "", band ? "off" : "", isUnknown ? "unknown" : ""].filter((part) => part).join(" ");
        return el("div", { class: style, "data-hour": String(hour).padStart(2, "0") }, band,
          ...this.contents(runs, format(_("$0, $1 o'clock"), name, hour)),
          isUnknown && isFirst ? el("span", { class: "unknown-text" }, _("More runs than can be shown")) : null);
      }));
  }

  contents(runs, title) {
    const marks = runs.filter((run) => run.power).map(powerMark);
    const ofTasks = runs.filter((run) => !run.power);
    const shown = ofTasks.length > SHOWN + 1 ? ofTasks.slice(0, SHOWN) : ofTasks;
    const left = ofTasks.length - shown.length;
    return [...marks, ...shown.map(runLink), left > 0
      ? button(format(ngettext("$0 more", "$0 more", left), left), { class: "plain more-runs",
        "aria-label": format(ngettext("$0 more run: $1", "$0 more runs: $1", left), left, title) },
        () => this.showAll(title, ofTasks)) : null];
  }

  showAll(title, runs) {
    const dialog = openDialog(title, el("ul", { class: "all-runs" }, ...runs.map((run) => {
      const link = runLink(run);
      link.addEventListener("click", () => dialog.close());
      return el("li", {}, link);
    })), el("div", { class: "actions" }, button(_("Close"), { class: "secondary" }, () => dialog.close())));
  }

  take() {}

  close() {}
}
