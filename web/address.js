// The present view, which is in the address, so that it can be linked.
const cockpit = window.cockpit;

// An address that cannot be parsed is replaced by that of the first view.
function readable() {
  try {
    return cockpit.location;
  } catch (error) {
    window.history.replaceState(null, "", "#/");
    return cockpit.location;
  }
}

// Of an option that is there several times, the last one counts.
export function here() {
  const { path, options } = readable();
  const last = (value) => (Array.isArray(value) ? value[value.length - 1] : value);
  return { path, options: Object.fromEntries(Object.entries(options).map(([name, value]) => [name, last(value)])) };
}

export function go(path, options = {}) {
  cockpit.location.go(path, options);
}

// Replaces the entry of the browser's history: going back does not lead to the present view.
export function goInstead(path) {
  cockpit.location.replace(path);
}

// The same view with other options; going back leads to the view before.
export function replaceOptions(options) {
  const kept = Object.fromEntries(Object.entries(options).filter(([, value]) => value));
  cockpit.location.replace(cockpit.location.path, kept);
}

export function href(path, options) {
  return "#" + cockpit.location.encode(path, options || {});
}

export function taskPath(id) {
  return ["task", String(id)];
}
