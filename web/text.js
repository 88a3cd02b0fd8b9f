// Translated texts, and texts from elsewhere with unsafe characters escaped.
const cockpit = window.cockpit;

export const _ = cockpit.gettext;
export const ngettext = cockpit.ngettext;
export const format = cockpit.format;

export function language() {
  return cockpit.language.replace("_", "-");
}

// Unsafe characters: control characters, marks of direction, and invisible ones, as zelosched
// escapes them, but for the line feed and the tab. Zero-width joiners stay. A variation selector is
// escaped unless it follows a visible character.
const UNSEEN = "\\u0000-\\u0008\\u000b-\\u001f\\u007f-\\u009f\\u00ad\\u034f\\u061c\\u115f\\u1160\\u17b4\\u17b5\\u180b-\\u180f\\u200b" +
  "\\u200e\\u200f\\u2028-\\u202e\\u2060-\\u206f\\u2800\\u3164\\ufeff\\uffa0\\ufff9-\\ufffb\\u{1d159}\\u{1d173}-\\u{1d17a}\\u{e0000}-\\u{e0fff}";
const UNSAFE = new RegExp(`[${UNSEEN}]|(?<=^|[${UNSEEN}])[\\ufe00-\\ufe0f]`, "gu");

function escaped(character) {
  const code = character.codePointAt(0).toString(16);
  return code.length > 4 ? `\\u{${code}}` : "\\u" + code.padStart(4, "0");
}

export function visible(text) {
  return String(text).replace(UNSAFE, escaped);
}

// For a title or a sentence; the whole is shown elsewhere.
export function short(text, most = 80) {
  const shown = [...visible(text).replace(/\s+/g, " ")];
  return shown.length <= most ? shown.join("") : shown.slice(0, most - 1).join("") + "…";
}
