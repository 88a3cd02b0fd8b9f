// When the machine is off in a week, by its power times, as bands behind the hours.
import { svg } from "./dom.js";

const MINUTES = 60;
const MINUTES_OF_DAY = 24 * 60;
const MINUTES_OF_WEEK = 7 * MINUTES_OF_DAY;
const DAYS = ["sun", "mon", "tue", "wed", "thu", "fri", "sat"];

function minuteOfWeek(wall) {
  return wall.getUTCDay() * MINUTES_OF_DAY + wall.getUTCHours() * 60 + wall.getUTCMinutes();
}

function minutesOfWeek({ days, at }) {
  const [hour, minute] = at.split(":").map(Number);
  return days.map((day) => DAYS.indexOf(day) * MINUTES_OF_DAY + hour * 60 + minute);
}

// Whether the machine, which is on now, is off at a later time: by the last power time before it.
// One without power-on times is taken for switched on by hand.
export function isOffAt(powerTimes, wall, now) {
  const used = powerTimes.filter((time) => time.enabled);
  if (!used.some((time) => time.power === "on")) return false;
  const left = (wall - now) / 60000;
  let last = { ago: Infinity, power: "on" };
  for (const time of used) {
    for (const minute of minutesOfWeek(time)) {
      const ago = (minuteOfWeek(wall) - minute + MINUTES_OF_WEEK) % MINUTES_OF_WEEK;
      if (ago < left && ago < last.ago) last = { ago, power: time.power };
    }
  }
  return last.power === "off";
}

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
