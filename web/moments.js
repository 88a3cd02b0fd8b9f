// Times as the machine has them. A text such as "2026-12-24T18:30:00+01:00" is shown as it stands
// there, whatever the browser's own zone is.
import { _, format, language, ngettext } from "./text.js";

const MINUTE = 60;
const HOUR = 60 * MINUTE;
const DAY = 24 * HOUR;
const FORM = /^(\d{4})-(\d\d)-(\d\d)T(\d\d):(\d\d):(\d\d)(Z|[+-]\d\d:\d\d)$/;

let skew = 0; // seconds that the machine's clock is ahead of the browser's
let offset = null; // minutes that the machine's zone is ahead of UTC
let isZoneOther = false; // the browser has another offset at some time that was parsed

function offsetOf(text) {
  if (text === "Z") return 0;
  const minutes = Number(text.slice(1, 3)) * 60 + Number(text.slice(4, 6));
  return text[0] === "-" ? -minutes : minutes;
}

// Minutes that the browser's zone is ahead of UTC.
function ownOffset(epoch) {
  return -new Date(epoch * 1000).getTimezoneOffset();
}

// {epoch, wall}: seconds since 1970, and a Date whose UTC fields are those of the machine's clock.
export function moment(text) {
  const found = FORM.exec(text || "");
  if (!found) return null;
  const [year, month, day, hour, minute, second] = found.slice(1, 7).map(Number);
  const wall = new Date(0);
  wall.setUTCFullYear(year, month - 1, day);
  wall.setUTCHours(hour, minute, second);
  const ahead = offsetOf(found[7]);
  const epoch = wall.getTime() / 1000 - ahead * MINUTE;
  if (ahead !== ownOffset(epoch)) isZoneOther = true;
  return { epoch, wall, offset: ahead };
}

export function setMachineTime(text) {
  const now = moment(text);
  if (!now) return;
  skew = now.epoch - Date.now() / 1000;
  offset = now.offset;
}

export function now() {
  return Date.now() / 1000 + skew;
}

// A Date whose UTC fields are those of the machine's clock.
export function wallNow() {
  return new Date((now() + (offset || 0) * MINUTE) * 1000);
}

function zoneText(minutes) {
  const size = Math.abs(minutes);
  const hours = String(Math.floor(size / 60)).padStart(2, "0");
  return `UTC${minutes < 0 ? "-" : "+"}${hours}:${String(size % 60).padStart(2, "0")}`;
}

// A sentence when the browser's offset differs from the machine's, now or at a time that was
// parsed, as in summer; else null.
export function zoneNote() {
  if (offset === null || !isZoneOther) return null;
  const own = ownOffset(now());
  if (own === offset) return _("All times are the machine's. This browser is in another time zone, whose times differ at other seasons.");
  return format(_("All times are the machine's ($0). This browser is in another time zone ($1)."),
    zoneText(offset), zoneText(own));
}

// Making such a formatter costs more than using it.
const formatters = new Map();
function formatter(name, options) {
  if (!formatters.has(name)) {
    formatters.set(name, new Intl.DateTimeFormat(language(), { timeZone: "UTC", ...options }));
  }
  return formatters.get(name);
}

export function timeText(wall) {
  return wall.toISOString().slice(11, 16);
}

// "Mon, 23 Nov", with the year of one that is not this year's.
function dayText(wall) {
  const isThisYear = wall.getUTCFullYear() === wallNow().getUTCFullYear();
  const year = isThisYear ? {} : { year: "numeric" };
  return formatter(isThisYear ? "day" : "dayAndYear",
    { weekday: "short", day: "numeric", month: "short", ...year }).format(wall);
}

export function longDayText(wall) {
  return formatter("longDay", { weekday: "long", day: "numeric", month: "long" }).format(wall);
}

export function dateText(wall) {
  return formatter("date", { day: "numeric", month: "short", year: "numeric" }).format(wall);
}

export function momentText(text) {
  const found = moment(text);
  return found ? `${dayText(found.wall)}, ${timeText(found.wall)}` : "";
}

// 1970-01-05 was a Monday.
export function weekdayText(day, width) {
  return formatter("weekday" + width, { weekday: width }).format(new Date(Date.UTC(1970, 0, 5 + day)));
}

export function monthText(month) {
  return formatter("month", { month: "long" }).format(new Date(Date.UTC(1970, month - 1, 1)));
}

// "in 3 h" and "3 h ago"
export function distanceText(text) {
  const found = moment(text);
  if (!found) return "";
  const seconds = found.epoch - now();
  const size = Math.abs(seconds);
  const isAhead = seconds > 0;
  if (size < MINUTE) return isAhead ? _("in less than a minute") : _("just now");
  if (size < HOUR) return format(isAhead ? _("in $0 min") : _("$0 min ago"), Math.floor(size / MINUTE));
  if (size < 2 * DAY) return format(isAhead ? _("in $0 h") : _("$0 h ago"), Math.floor(size / HOUR));
  const days = Math.floor(size / DAY);
  return format(isAhead ? ngettext("in $0 day", "in $0 days", days) : ngettext("$0 day ago", "$0 days ago", days), days);
}

export function durationText(seconds) {
  if (seconds === null || seconds === undefined) return "";
  if (seconds < 10) return format(_("$0 s"), (Math.round(seconds * 10) / 10).toLocaleString(language()));
  if (seconds < MINUTE) return format(_("$0 s"), Math.round(seconds));
  if (seconds < HOUR) {
    return format(_("$0 min $1 s"), Math.floor(seconds / MINUTE), Math.floor(seconds % MINUTE));
  }
  return format(_("$0 h $1 min"), Math.floor(seconds / HOUR), Math.floor((seconds % HOUR) / MINUTE));
}
