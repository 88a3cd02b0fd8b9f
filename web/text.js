// Translated texts, and texts of others made fit to be seen.
const cockpit = window.cockpit;

export const _ = cockpit.gettext;
export const ngettext = cockpit.ngettext;
export const format = cockpit.format;

export function language() {
  return cockpit.language.replace("_", "-");
}

// What is no letter and can turn or hide others: control characters, marks of direction, and what
// has no width. The line feed and the tab stay.
const UNSEEN = /[\u0000-\u0008\u000b-\u001f\u007f-\u009f\u061c\u200b-\u200f\u2028-\u202e\u2060-\u206f\ufeff\ufff9-\ufffb]/g;

export function visible(text) {
  return String(text).replace(UNSEEN, (c) => "\\u" + c.charCodeAt(0).toString(16).padStart(4, "0"));
}

// For a title or a sentence; the whole is shown elsewhere.
export function short(text, most = 80) {
  const shown = [...visible(text).replace(/\s+/g, " ")];
  return shown.length <= most ? shown.join("") : shown.slice(0, most - 1).join("") + "…";
}
