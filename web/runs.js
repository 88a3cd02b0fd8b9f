// The runs of a task, each with its output below it.
import { button, el, fill, focusIn, place, setAttribute, setText } from "./dom.js";
import { Output } from "./output.js";
import { distanceText, durationText, moment, momentText, now } from "./moments.js";
import { gradeOf, outcomeText, triggerText } from "./words.js";
import { _, format } from "./text.js";

function keyOf(run) {
  return run.run === null ? "unknown " + run.queued : run.run;
}

function durationOf(run) {
  if (run.duration_seconds !== null) return durationText(run.duration_seconds);
  const start = moment(run.start);
  return start && run.state === "running" ? durationText(Math.max(0, now() - start.epoch)) : "";
}

const LOWEST = 0.7; // of the window, where there is room for the output below a run

class Row {
  constructor(list) {
    this.list = list;
    this.start = el("span");
    this.age = el("span", { class: "beside" });
    this.outcome = el("span");
    this.duration = el("td", { class: "c-duration", "data-label": _("Duration") });
    this.trigger = el("td", { class: "c-trigger", "data-label": _("Trigger") });
    this.toggle = button("", { class: "plain", "aria-expanded": "false" }, () => this.list.toggle(this.run));
    this.element = el("tr", {}, el("td", { class: "c-start", "data-label": _("Start") }, this.start, this.age), this.duration,
      el("td", { class: "c-outcome", "data-label": _("Outcome") }, this.outcome), this.trigger,
      el("td", { class: "c-output" }, this.toggle));
    this.place = el("td", { colspan: "5" });
    this.below = el("tr", { class: "below", hidden: true }, this.place);
    this.output = null;
  }

  update(run) {
    this.run = run;
    setText(this.start, momentText(run.start || run.queued || run.end));
    setText(this.age, distanceText(run.start || run.queued || run.end));
    setText(this.duration, durationOf(run));
    setText(this.outcome, outcomeText(run));
    setAttribute(this.outcome, "class", "outcome " + gradeOf(run));
    setText(this.trigger, triggerText(run));
    this.toggle.hidden = run.run === null;
    this.showToggle();
    if (this.output) this.output.update(run);
  }

  showToggle() {
    const isOpen = this.output !== null;
    setText(this.toggle, isOpen ? _("Hide output") : _("Output"));
    setAttribute(this.toggle, "aria-expanded", isOpen);
    setAttribute(this.toggle, "aria-label", format(isOpen ? _("Hide the output of $0") : _("Output of $0"),
      momentText(this.run.start || this.run.queued)));
  }

  open() {
    if (this.output) return;
    this.output = new Output(this.run);
    fill(this.place, this.output.element);
    this.below.hidden = false;
    this.showToggle();
    const { top, bottom } = this.element.getBoundingClientRect();
    if (top < 0 || bottom > window.innerHeight * LOWEST) this.element.scrollIntoView({ block: "start" });
  }

  shut() {
    if (!this.output) return;
    this.output.close();
    this.output = null;
    fill(this.place);
    this.below.hidden = true;
    this.showToggle();
  }
}

export class Runs {
  // `opened` is called with the number of the run whose output is shown, or null.
  constructor(opened) {
    this.opened = opened;
    this.rows = new Map();
    this.wanted = null;
    this.body = el("tbody");
    const heads = [_("Start"), _("Duration"), _("Outcome"), _("Trigger"), ""];
    this.element = el("div", { class: "table" }, el("table", {}, el("caption", { class: "unseen" }, _("Runs")),
      el("thead", {}, el("tr", {}, ...heads.map((head) => (head ? el("th", { scope: "col" }, head) : el("td"))))), this.body));
  }

  show(runs) {
    const kept = new Map();
    for (const run of runs) {
      const row = this.rows.get(keyOf(run)) || new Row(this);
      row.update(run);
      kept.set(keyOf(run), row);
    }
    for (const [key, row] of this.rows) if (!kept.has(key)) row.shut();
    this.rows = kept;
    place(this.body, [...kept.values()].flatMap((row) => [row.element, row.below]));
    this.openWanted();
  }

  // Shows the output of that run as soon as it is listed, and of no other one.
  want(number) {
    this.wanted = number;
    this.openWanted();
  }

  count() {
    return this.rows.size;
  }

  focusOn(i) {
    const row = [...this.rows.values()][i];
    if (row) focusIn(row.element);
  }

  openWanted() {
    for (const [key, row] of this.rows) {
      if (key === this.wanted) row.open();
      else row.shut();
    }
  }

  toggle(run) {
    this.want(this.wanted === run.run ? null : run.run);
    this.opened(this.wanted);
  }

  close() {
    for (const row of this.rows.values()) row.shut();
  }
}
