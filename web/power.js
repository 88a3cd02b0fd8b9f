// The times at which the machine switches on and off.
import { button, el, fill, setAttribute, setText } from "./dom.js";
import { showAccess } from "./access.js";
import { attempt, confirm, openForm } from "./dialogs.js";
import { DaysField, Field, select } from "./fields.js";
import { distanceText, momentText, weekdayText } from "./moments.js";
import { switchCell } from "./switch.js";
import { Table } from "./table.js";
import { change } from "./tool.js";
import { bandOfHour, offTimes } from "./week.js";
import { DAYS, daysText } from "./words.js";
import { _, format } from "./text.js";

const HOURS = 24;
const WEEK = 7 * HOURS * 60; // minutes

function minutesOf(at) {
  return Number(at.slice(0, 2)) * 60 + Number(at.slice(3));
}

function directionText(time) {
  return time.power === "on" ? _("On") : _("Off");
}

function inWords(time) {
  return format(time.power === "on" ? _("Machine on: $0 at $1") : _("Machine off: $0 at $1"), daysText(time.days), time.at);
}

// ---- adding and changing --------------------------------------------------------------------

const WORKDAYS = DAYS.slice(0, 5);

// For questions about a power time. One that is changed gets another id.
function subjectOf(model, time) {
  return {
    model,
    isThere: () => model.powerTimes.some((one) => one.id === time.id),
    gone: format(_("$0 is not there any more: nothing was done."), inWords(time)),
  };
}

// Adds a power time, with `newDays` and `hour` filled in, or changes `time`.
function askForTime(model, time, newDays, hour) {
  const direction = new Field(_("The machine goes"), select([["off", _("off")], ["on", _("on")]], time ? time.power : "off"));
  direction.input.disabled = time !== null;
  const days = new DaysField(time ? time.days : newDays);
  const at = new Field(_("Time"), el("input", { type: "time", class: "short",
    value: time ? time.at : String(hour).padStart(2, "0") + ":00" }));

  // False, with a message at the field, where something is missing.
  async function save() {
    const chosen = days.value();
    days.tell(chosen.length === 0 ? [_("Choose one day at least.")] : []);
    at.tell(at.input.value === "" ? [_("Give a time of day.")] : []);
    if (chosen.length === 0 || at.input.value === "") return false;
    const when = ["--weekly", chosen.join(","), at.input.value.slice(0, 5)];
    await change(time ? ["edit", String(time.id), ...when] : ["power", "add", direction.input.value, ...when, "--quiet"]);
    return true;
  }

  openForm({
    title: time ? _("Change the power time") : _("Add a power time"),
    fields: [direction.element, days.element, at.element],
    save,
    subject: time ? subjectOf(model, time) : null,
    more: (dialog) => (time ? [button(_("Remove"), { class: "danger" }, () => {
      dialog.close();
      removeTime(model, time);
    })] : []),
  });
}

function staysOff(times) {
  const used = times.filter((time) => time.enabled);
  return used.some((time) => time.power === "off") && !used.some((time) => time.power === "on");
}

function staysOffText() {
  return _("The machine goes off and, by its power times, never on again.");
}

async function removeTime(model, time) {
  const isLastOn = !staysOff(model.powerTimes) && staysOff(model.powerTimes.filter((other) => other.id !== time.id));
  const text = isLastOn ? inWords(time) + ". " + staysOffText() : inWords(time);
  const isAgreed = await confirm({ title: _("Remove the power time?"), text, action: _("Remove"),
    subject: subjectOf(model, time), isDangerous: true });
  if (isAgreed) await attempt(() => change(["power", "remove", "--yes", String(time.id)]));
}

// ---- the week -------------------------------------------------------------------------------

// Seven days beside each other, hours below: the arrow keys go through them, Enter adds or changes.
class Week {
  constructor(model) {
    this.model = model;
    this.focused = { day: 0, hour: 7 };
    this.cells = [...Array(HOURS).keys()].map((hour) => [...Array(7).keys()].map((day) =>
      el("td", { class: "cell", role: "gridcell", tabindex: "-1", on: {
        click: () => this.act(day, hour), keydown: (event) => this.key(event, day, hour),
        focus: () => this.moveTo(day, hour, false) } })));
    this.element = el("table", { class: "week", role: "grid", "aria-label": _("Power times of the week") },
      el("thead", {}, el("tr", { role: "row" }, el("td"), ...[...Array(7).keys()].map((day) =>
        el("th", { scope: "col", role: "columnheader", abbr: weekdayText(day, "long") }, weekdayText(day, "short"))))),
      el("tbody", {}, ...this.cells.map((row, hour) => el("tr", { role: "row" },
        el("th", { scope: "row", role: "rowheader" }, String(hour).padStart(2, "0")), ...row))));
    this.moveTo(0, 7, false);
  }

  moveTo(day, hour, isFocused = true) {
    setAttribute(this.cells[this.focused.hour][this.focused.day], "tabindex", -1);
    this.focused = { day, hour };
    const cell = this.cells[hour][day];
    setAttribute(cell, "tabindex", 0);
    if (isFocused) cell.focus();
  }

  timesAt(day, hour) {
    return this.times.filter((time) => time.days.includes(DAYS[day]) && Number(time.at.slice(0, 2)) === hour);
  }

  // Of several in an hour the first one; each is in the table above.
  act(day, hour) {
    if (!this.mayChange) return;
    askForTime(this.model, this.timesAt(day, hour)[0] || null, [DAYS[day]], hour);
  }

  key(event, day, hour) {
    const steps = { ArrowLeft: [-1, 0], ArrowRight: [1, 0], ArrowUp: [0, -1], ArrowDown: [0, 1] };
    const times = this.timesAt(day, hour);
    if (steps[event.key]) {
      const [days, hours] = steps[event.key];
      this.moveTo((day + days + 7) % 7, Math.min(HOURS - 1, Math.max(0, hour + hours)));
    } else if (event.key === "Home" || event.key === "End") {
      this.moveTo(day, event.key === "Home" ? 0 : HOURS - 1);
    } else if (event.key === "Enter" || event.key === " ") {
      this.act(day, hour);
    } else if (event.key === "Delete" && times.length > 0 && this.mayChange) {
      removeTime(this.model, times[0]);
    } else {
      return;
    }
    event.preventDefault();
  }

  bands() {
    const events = this.times.filter((time) => time.enabled).flatMap((time) =>
      time.days.map((day) => ({ at: DAYS.indexOf(day) * HOURS * 60 + minutesOf(time.at), power: time.power })));
    events.sort((a, b) => a.at - b.at);
    const isComplete = ["on", "off"].every((power) => events.some((event) => event.power === power));
    // The week repeats: it begins in the state in which it ends.
    return isComplete ? offTimes(events, WEEK, events[events.length - 1].power === "off") : [];
  }

  show(times, mayChange) {
    this.times = times;
    this.mayChange = mayChange;
    const bands = this.bands();
    this.cells.forEach((row, hour) => row.forEach((cell, day) => {
      const own = this.timesAt(day, hour);
      const band = bandOfHour(bands, day * HOURS + hour);
      const state = own.map((time) => (time.enabled ? inWords(time) : format(_("$0, switched off"), inWords(time)))).join("; ");
      setAttribute(cell, "aria-label", format("$0 $1:00 $2", weekdayText(day, "long"), hour,
        state || (band ? _("off") : mayChange ? _("nothing; Enter adds a time") : "")));
      fill(cell, band, ...own.map((time) => el("span", { class: "power-mark " + time.power + (time.enabled ? "" : " disabled") },
        format("$0 $1", directionText(time), time.at))));
    }));
  }
}

// ---- the view -------------------------------------------------------------------------------

function setEnabled(time, isEnabled) {
  return attempt(() => change([isEnabled ? "enable" : "disable", String(time.id)]));
}

function actionsCell(model, mayChange) {
  return (cell) => {
    let shown = null;
    const edit = button(_("Change"), { class: "secondary small" }, () => askForTime(model, shown, [], 0));
    const remove = button(_("Remove"), { class: "secondary small" }, () => removeTime(model, shown));
    cell.append(edit, remove);
    return (time) => {
      shown = time;
      edit.hidden = !mayChange();
      remove.hidden = !mayChange();
      setAttribute(edit, "aria-label", format(_("Change $0"), inWords(time)));
      setAttribute(remove, "aria-label", format(_("Remove $0"), inWords(time)));
    };
  };
}

export class PowerView {
  constructor(root, model) {
    this.model = model;
    this.title = _("Power");
    this.access = el("div");
    this.clock = el("div", { class: "clock" });
    this.week = new Week(model);
    this.none = el("p", { class: "beside" });
    const mayChange = () => model.mayChange === true;
    this.table = new Table({ caption: _("Power times"), columns: [
      { key: "power", label: _("Machine"), make: (cell) => {
        const mark = el("span");
        cell.append(mark);
        return (time) => {
          setText(mark, directionText(time));
          setAttribute(mark, "class", "power-mark " + time.power);
        };
      } },
      { key: "when", label: _("When"), make: (cell) => (time) => setText(cell, format(_("$0 at $1"), daysText(time.days), time.at)) },
      { key: "next", label: _("Next"), make: (cell) => (time) =>
        setText(cell, time.enabled && time.next ? `${momentText(time.next)} (${distanceText(time.next)})` : _("switched off")) },
      { key: "enabled", label: _("On"), make: switchCell({ mayChange, set: setEnabled, nameOf: inWords }) },
      { key: "actions", label: _("Actions"), make: actionsCell(model, mayChange) },
    ], sorted: () => {} });
    this.add = button(_("Add a power time"), { class: "primary" }, () => askForTime(model, null, WORKDAYS, 23));
    fill(root, this.access, el("h2", {}, _("When the machine goes on and off")), this.clock,
      el("section", { "aria-label": _("Power times") }, el("div", { class: "actions" }, this.add), this.none, this.table.element),
      el("p", { class: "beside" }, _("Choose an hour of the week to add a time there, or one that is there to change it.")),
      el("div", { class: "week-place" }, this.week.element));
    this.update();
  }

  update() {
    showAccess(this.access, this.model.mayChange);
    if (!this.model.isPowerLoaded) return;
    const mayChange = this.model.mayChange === true;
    this.add.hidden = !mayChange;
    const times = this.model.powerTimes;
    const hadFocus = this.table.element.contains(document.activeElement);
    this.table.show(times);
    this.table.element.hidden = times.length === 0;
    if (hadFocus && times.length === 0) this.add.focus();
    setText(this.none, times.length === 0 ? _("There is no power time: the machine stays as it is.") : "");
    this.showClock(times);
    const key = JSON.stringify([times, mayChange]);
    if (this.weekShown === key) return;
    this.weekShown = key;
    this.week.show(times, mayChange);
  }

  showClock(times) {
    const next = times.filter((time) => time.power === "on" && time.enabled && time.next).map((time) => time.next).sort()[0];
    const { clock } = this.model;
    if (!next) {
      fill(this.clock, staysOff(times) ? el("div", { class: "note warn" }, el("p", {}, staysOffText())) : null);
    } else if (clock.is_armed) {
      fill(this.clock, el("p", { role: "status" }, el("span", { class: "mark good", "aria-hidden": "true" }, "✓"),
        format(_("The machine goes on next $0 ($1). Its clock is armed."), momentText(next), distanceText(next))));
    } else {
      fill(this.clock, el("div", { class: "note bad" }, el("p", { role: "status" },
        format(clock.is_there ? _("The machine would go on next $0, but its clock is not armed.")
          : _("The machine would go on next $0, but it has no clock that could be armed."), momentText(next)))));
    }
  }

  take() {}

  close() {}
}
