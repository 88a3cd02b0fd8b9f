// The fields of a schedule, and its JSON form.
import { el } from "./dom.js";
import { DaysField, Field, select } from "./fields.js";
import { monthText, wallNow } from "./moments.js";
import { _, format, ngettext } from "./text.js";

function isoDay(wall) {
  return wall.toISOString().slice(0, 10);
}

function tomorrow() {
  return isoDay(new Date(wallNow().getTime() + 24 * 60 * 60 * 1000));
}

const TYPES = () => [["daily", _("Every day")], ["weekly", _("On days of the week")], ["monthly", _("Every month")],
  ["yearly", _("Every year")], ["once", _("Once")]];

const WORKDAYS = ["mon", "tue", "wed", "thu", "fri"];

// Which fields a type has, beside the time of day.
const OF_TYPE = {
  once: ["date"], daily: ["from"], weekly: ["days", "from"], monthly: ["day", "from"], yearly: ["month", "day", "from"],
};

function hours(first, label) {
  return [["", label], ...[...Array(24 - first).keys()].map((i) => [String(i + first), String(i + first)])];
}

export class ScheduleFields {
  constructor(schedule) {
    const given = schedule || { type: "daily", at: "02:30" };
    const number = (value, most) => el("input", { type: "number", min: 1, max: most, value: value || 1, class: "short" });
    this.type = new Field(_("When"), select(TYPES(), given.type), { places: ["schedule.type", "schedule"] });
    this.at = new Field(_("Time"), el("input", { type: "time", value: given.at, required: true, class: "short" }),
      { places: ["schedule.at"] });
    this.days = new DaysField(given.days || WORKDAYS, { places: ["schedule.days"] });
    this.day = new Field(_("Day of the month"), number(given.day, 31), { places: ["schedule.day"],
      hint: _("Months without that day are passed over.") });
    this.month = new Field(_("Month"), select([...Array(12).keys()].map((i) => [String(i + 1), monthText(i + 1)]),
      String(given.month || 1)), { places: ["schedule.month"] });
    this.date = new Field(_("Date"), el("input", { type: "date", value: given.date || tomorrow(), class: "short" }),
      { places: ["schedule.date"] });
    this.every = new Field(_("Repeat on that day"), select([["", _("No, one run")], ...[...Array(23).keys()]
      .map((i) => [String(i + 1), format(ngettext("Every hour", "Every $0 hours", i + 1), i + 1)])],
    given.every_hours ? String(given.every_hours) : ""), { places: ["schedule.every_hours"] });
    this.until = new Field(_("Until the hour"), select(hours(0, _("End of the day")),
      given.until_hour === null || given.until_hour === undefined || given.until_hour === 23 ? "" : String(given.until_hour)),
    { places: ["schedule.until_hour"] });
    this.from = new Field(_("Not before"), el("input", { type: "date", value: given.from || "", class: "short" }),
      { places: ["schedule.from"], hint: _("Left empty, it runs from now on.") });
    this.fields = [this.type, this.date, this.days, this.month, this.day, this.at, this.every, this.until, this.from];
    this.element = el("fieldset", {}, el("legend", {}, _("When it runs")), ...this.fields.map((field) => field.element));
    this.element.addEventListener("input", () => this.showOfType());
    this.showOfType();
  }

  showOfType() {
    const shown = OF_TYPE[this.type.input.value] || [];
    for (const name of ["date", "days", "month", "day", "from"]) this[name].element.hidden = !shown.includes(name);
    this.until.element.hidden = this.every.input.value === "";
  }

  // The faults that the page itself finds, by field.
  faults() {
    const schedule = this.value();
    const found = new Map();
    if (schedule.at === "") found.set(this.at, _("Give a time of day."));
    if (OF_TYPE[schedule.type].includes("day") && !(schedule.day >= 1 && schedule.day <= 31)) {
      found.set(this.day, _("Give a day from 1 to 31."));
    }
    if (schedule.days && schedule.days.length === 0) found.set(this.days, _("Choose one day at least."));
    if (schedule.until_hour !== null && schedule.until_hour < Number(schedule.at.slice(0, 2))) {
      found.set(this.until, _("This hour is before the time above."));
    }
    return found;
  }

  // As JSON for the tool, which reports what is empty or no number: that is passed on as it is.
  value() {
    const type = this.type.input.value;
    const asNumber = (text) => (/^\d+$/.test(text) ? Number(text) : text);
    const schedule = { type, at: this.at.input.value.slice(0, 5) };
    const members = {
      date: () => { schedule.date = this.date.input.value; },
      days: () => { schedule.days = this.days.value(); },
      day: () => { schedule.day = asNumber(this.day.input.value); },
      month: () => { schedule.month = Number(this.month.input.value); },
      from: () => { schedule.from = this.from.input.value || null; },
    };
    for (const name of OF_TYPE[type]) members[name]();
    schedule.every_hours = this.every.input.value === "" ? null : Number(this.every.input.value);
    if (schedule.every_hours !== null) {
      schedule.until_hour = this.until.input.value === "" ? null : Number(this.until.input.value);
    }
    return schedule;
  }
}
