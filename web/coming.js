// The coming runs of one task, as a list.
import { el } from "./dom.js";
import { distanceText, moment, momentText, wallNow } from "./moments.js";
import { isOffAt } from "./week.js";
import { _ } from "./text.js";

// What the list says of each time, and whether the machine is off then.
export function comingRows(due, powerTimes) {
  return due.map((time) => {
    const isOff = isOffAt(powerTimes, moment(time).wall, wallNow());
    const distance = distanceText(time);
    return { time: momentText(time), beside: isOff ? distance + ", " + _("the machine is off then") : distance, isOff };
  });
}

export function comingItems(rows) {
  return rows.map(({ time, beside, isOff }) => el("li", { class: isOff ? "missed" : null },
    el("span", { class: "when" }, time), " ", el("span", { class: "beside" }, beside)));
}

// Empty unless the machine is off at all of them.
export function comingWarning(rows) {
  return rows.length > 0 && rows.every(({ isOff }) => isOff)
    ? _("By its power times the machine is off at all of these: the task will not run.") : "";
}
