// The coming seven days, hour by hour.
import { button, el, fill } from "./dom.js";
import { href, taskPath } from "./address.js";
import { openDialog } from "./dialogs.js";
import { longDayText, moment, timeText, wallNow } from "./moments.js";
import { ask } from "./tool.js";
import { inTurn } from "./turns.js";
import { bandOfHour, offTimes } from "./week.js";
import { _, format, ngettext, short } from "./text.js";

const DAYS = 7;
const HOURS = 24;
const DAY = 24 * 60 * 60 * 1000; // ms
const SHOWN = 3; // runs in a cell; the others are a click away
const MOST = 10000; // runs that the tool tells at once

// One that falls into a time at which the machine is off will not come.
function runLink(run) {
  const title = run.isOff ? format(_("$0: the machine is off then"), short(run.task_name, 200)) : short(run.task_name, 200);
  return el("a", { class: run.isOff ? "run missed" : "run", href: href(taskPath(run.task)), title },
    el("time", {}, timeText(run.wall)), " ", el("bdi", {}, short(run.task_name, 60)),
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
    this.note = el("p", { class: "beside", role: "status" });
    this.legend = el("p", { class: "legend", hidden: true }, el("span", { class: "swatch off", "aria-hidden": "true" }),
      _("The machine is off"));
    this.grid = el("div", { class: "calendar" });
    fill(root, el("h2", {}, _("The coming seven days")), this.note, this.legend, this.grid);
    this.update();
  }

  update() {
    if (this.model.isLoaded) this.refresh();
  }

  async load() {
    try {
      const { runs } = await ask("next", "--within", "7d");
      this.show(runs);
    } catch (error) {
      fill(this.note, error.message);
    }
  }

  show(all) {
    const now = wallNow();
    const first = Date.UTC(now.getUTCFullYear(), now.getUTCMonth(), now.getUTCDate());
    const key = JSON.stringify([first, now.getUTCHours(), all]);
    if (this.shown === key) return;
    this.shown = key;
    const minutes = (wall) => (wall.getTime() - first) / 60000;
    const last = first + DAYS * DAY; // of the seventh day; in seven days from now there are runs of the eighth
    const runs = all.filter((run) => run.due).map((run) => ({ ...run, wall: moment(run.due).wall }))
      .filter((run) => run.wall.getTime() < last);
    const events = runs.filter((run) => run.power).map((run) => ({ at: minutes(run.wall), power: run.power }));
    const bands = offTimes(events, DAYS * HOURS * 60, false);
    const isOff = (at) => bands.some(({ from, to }) => from <= at && at < to);
    const cells = new Map();
    for (const run of runs) {
      run.isOff = !run.power && isOff(minutes(run.wall));
      const hour = Math.floor((run.wall.getTime() - first) / (DAY / HOURS));
      if (!cells.has(hour)) cells.set(hour, []);
      cells.get(hour).push(run);
    }
    const hourNow = now.getUTCHours();
    fill(this.grid, this.hours(), ...[...Array(DAYS).keys()].map((day) =>
      this.day(new Date(first + day * DAY), day, cells, bands, hourNow)));
    fill(this.note, this.summary(runs.filter((run) => !run.power), all.length >= MOST));
    this.legend.hidden = bands.length === 0;
  }

  summary(runs, areMore) {
    if (runs.length === 0) return _("No task runs in the coming seven days.");
    const missed = runs.filter((run) => run.isOff).length;
    const count = format(ngettext("$0 run", "$0 runs", runs.length), runs.length);
    const sentences = [missed === 0 ? count + "." : format(_("$0, $1 of them while the machine is off."), count, missed)];
    if (areMore) sentences.push(_("There are more than are shown here."));
    return sentences.join(" ");
  }

  hours() {
    return el("div", { class: "day hours", "aria-hidden": "true" }, el("div", { class: "day-head" }),
      ...[...Array(HOURS).keys()].map((hour) => el("div", { class: "hour-name" }, String(hour).padStart(2, "0"))));
  }

  day(wall, day, cells, bands, hourNow) {
    const name = longDayText(wall);
    return el("section", { class: "day", "aria-label": name }, el("h3", { class: "day-head" }, name),
      ...[...Array(HOURS).keys()].map((hour) => {
        const runs = cells.get(day * HOURS + hour) || [];
        const band = bandOfHour(bands, day * HOURS + hour);
        const style = ["hour", runs.length === 0 ? "none" : "", day === 0 && hour < hourNow ? "past" : "",
          day === 0 && hour === hourNow ? "now" : "", band ? "off" : ""].filter((part) => part).join(" ");
        return el("div", { class: style, "data-hour": String(hour).padStart(2, "0") }, band,
          ...this.contents(runs, format(_("$0, $1 o'clock"), name, hour)));
      }));
  }

  contents(runs, title) {
    const marks = runs.filter((run) => run.power).map(powerMark);
    const ofTasks = runs.filter((run) => !run.power);
    const shown = ofTasks.length > SHOWN + 1 ? ofTasks.slice(0, SHOWN) : ofTasks;
    const left = ofTasks.length - shown.length;
    return [...marks, ...shown.map(runLink), left > 0
      ? button(format(_("$0 more"), left), { class: "plain more-runs", "aria-label": format(_("$0 more runs: $1"), left, title) },
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
