// Where in the page somebody is, which the address tells, so that it can be linked.
const cockpit = window.cockpit;

export function here() {
  const { path, options } = cockpit.location;
  return { path, options };
}

export function go(path, options = {}) {
  cockpit.location.go(path, options);
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
