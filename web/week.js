// When the machine is off in a week, by its power times, as bands behind the hours.
import { svg } from "./dom.js";

const MINUTES = 60;

// Minutes from 0 to `length` in which the machine is off: [{from, to}]. `events` are {at, power} in
// order, `isOff` whether it is off at the beginning.
export function offTimes(events, length, isOff) {
  const bands = [];
  let since = isOff ? 0 : null;
  for (const { at, power } of events) {
    if (power === "off" && since === null) since = at;
    if (power === "on" && since !== null) {
      bands.push({ from: since, to: at });
      since = null;
    }
  }
  if (since !== null) bands.push({ from: since, to: length });
  return bands;
}

// A band in the cell of one hour, or nothing.
export function bandOfHour(bands, hourOfWeek) {
  const start = hourOfWeek * MINUTES;
  const pieces = bands.map(({ from, to }) => ({ from: Math.max(from, start), to: Math.min(to, start + MINUTES) }))
    .filter(({ from, to }) => from < to);
  if (pieces.length === 0) return null;
  return svg("svg", { class: "band", viewBox: "0 0 1 60", preserveAspectRatio: "none", "aria-hidden": "true" },
    ...pieces.map(({ from, to }) => svg("rect", { x: 0, width: 1, y: from - start, height: to - from })));
}
