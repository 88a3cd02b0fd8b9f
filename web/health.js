// The findings, worst first, each with its remedies; or one line when all is well.
import { button, el, fill, focusIn, isFocusLost, place, setAttribute, setText } from "./dom.js";
import { attempt } from "./dialogs.js";
import { change } from "./tool.js";
import { outcomeText, titleOf } from "./words.js";
import { distanceText, momentText } from "./moments.js";
import { _, format, ngettext, short, visible } from "./text.js";
import { go, taskPath } from "./address.js";
import { acknowledge, runNow } from "./actions.js";

const cockpit = window.cockpit;

const OF_PAST_RUN = ["failed-run", "gave-up", "missed-run"];

// By the state of the machine at that time, where it is known.
const MISSED = {
  off: () => _("$0 was due $1, $2, and did not run, as the machine was off."),
  on: () => _("$0 was due $1, $2, and did not run, though the machine was on."),
};

function missedForm(machine) {
  return machine === null ? _("$0 was due $1, $2, and did not run.") : MISSED[machine]();
}

// The page's own words where it has them; else those of the program.
function textOf({ kind, severity, text, run, due, machine }, task) {
  const name = task && short(titleOf(task));
  switch (kind) {
    case "cron":
      return _("Cron is not running: no task will start by itself.");
    case "failed-run":
    case "gave-up":
      if (!task || !run) break;
      return format(_("$0 $1, $2."), name, outcomeText(run), distanceText(run.end || run.start || run.queued));
    case "missed-run":
      if (!task || !due) break;
      return format(missedForm(machine), name, momentText(due), distanceText(due));
    case "long-run":
      if (!task || !run) break;
      return format(_("$0 has been running for unusually long: it began $1."), name, distanceText(run.start));
    case "runs":
    case "turns":
      if (severity !== "unknown") break;
      return kind === "runs"
        ? _("Which runs failed or were missed: unknown without administrative access.")
        : _("Whether something keeps changes waiting: unknown without administrative access.");
  }
  return visible(text);
}

// Remedies that are commands, {command: label}: each has a button.
const COMMANDS = { sync: () => _("Write the crontab again"), restore: () => _("Put it back") };

function commandOf({ remedy }) {
  const found = /^'zelosched (sync|restore)'/.exec(remedy || "");
  return found ? found[1] : null;
}

// The buttons of a finding, as {key, label, act}.
function actionsOf(finding, task, mayChange) {
  const { kind, run } = finding;
  const actions = [];
  const add = (key, label, act) => actions.push({ key, label, act });
  if (kind === "cron") {
    add("services", _("Start cron in Services"), () => cockpit.jump("/system/services#/cron.service"));
  } else if (task && run) {
    add("show", _("Show the run"), () => go(taskPath(task.id), run.run ? { run: String(run.run) } : {}));
  } else if (task) {
    add("show", _("Show the task"), () => go(taskPath(task.id)));
  } else if (kind === "power") {
    add("show", _("Show power times"), () => go(["power"]));
  }
  if (!mayChange) return actions;
  if (task && OF_PAST_RUN.includes(kind)) {
    if (task.ui.can_run && !task.running) add("run", _("Run now"), () => runNow(task));
    add("note", _("Take note"), () => acknowledge(task));
  }
  const command = commandOf(finding);
  if (command) add(command, COMMANDS[command](), () => attempt(() => change([command])));
  return actions;
}

const SEVERITIES = {
  critical: () => _("Critical"),
  warning: () => _("Warning"),
  unknown: () => _("Unknown"),
};

// One finding. Its buttons stay the same elements as long as they are offered, and keep the focus.
class Row {
  constructor() {
    this.severity = el("span");
    this.text = el("bdi");
    this.remedy = el("span", { class: "beside" });
    this.buttons = new Map();
    this.actions = el("span", { class: "row-actions" });
    this.element = el("li", {}, this.severity, el("span", { class: "what" }, this.text, this.remedy), this.actions);
  }

  show({ finding, task, text, actions }) {
    setAttribute(this.element, "class", finding.severity);
    setAttribute(this.severity, "class", "severity " + finding.severity);
    setText(this.severity, SEVERITIES[finding.severity]());
    setText(this.text, text);
    // A remedy that has a button is not shown as text.
    const isTold = finding.remedy && !OF_PAST_RUN.includes(finding.kind) && !commandOf(finding);
    setText(this.remedy, isTold ? ": " + visible(finding.remedy) : "");
    const kept = new Map();
    for (const action of actions) {
      const one = this.buttons.get(action.key) || this.makeButton(action.key);
      one.act = action.act;
      setText(one.element, action.label);
      setAttribute(one.element, "aria-label", task ? format("$0: $1", action.label, short(titleOf(task))) : null);
      kept.set(action.key, one);
    }
    this.buttons = kept;
    place(this.actions, [...kept.values()].map((one) => one.element));
  }

  makeButton() {
    const one = { act: null };
    one.element = button("", { class: "secondary small" }, () => one.act());
    return one;
  }
}

const MOST = 10; // shown at first, so that the tasks below stay in view

// The task that it is about, and no other one that has its number by now.
function taskOf(finding, model) {
  const task = finding.task === null ? null : model.taskOf(finding.task);
  return task && task.name === finding.task_name ? task : null;
}

export class Health {
  constructor() {
    this.heading = el("h2");
    this.list = el("ul", { class: "findings" });
    this.well = el("p", { class: "well", role: "status" });
    this.most = MOST;
    this.more = button("", { class: "secondary small" }, () => this.showAll());
    this.element = el("section", { class: "health", "aria-label": _("Health"), tabindex: "-1" }, this.heading, this.well, this.list,
      this.more);
    this.rows = new Map();
  }

  show(model) {
    this.model = model;
    const { status, mayChange } = model;
    const found = status === null ? [{ severity: "unknown", kind: "machine", text: _("The machine could not be asked how it is."),
      task: null, run: null, due: null, remedy: null }] : status.findings.filter((finding) => finding.severity !== "ok");
    const hadFocus = this.list.contains(document.activeElement);
    const focused = [...this.list.children].findIndex((row) => row.contains(document.activeElement));
    const rows = this.shownOf(found, model, mayChange);
    const kept = new Map();
    for (const shown of rows.slice(0, this.most)) {
      const row = this.rows.get(shown.key) || new Row();
      row.show(shown);
      kept.set(shown.key, row);
    }
    this.rows = kept;
    place(this.list, [...kept.values()].map((row) => row.element));
    setText(this.heading, rows.length === 0 ? "" : this.headingOf(found, status !== null));
    this.heading.hidden = rows.length === 0;
    this.list.hidden = rows.length === 0;
    const left = rows.length - kept.size;
    this.more.hidden = left === 0;
    setText(this.more, format(ngettext("Show $0 more", "Show $0 more", left), left));
    this.showWell(rows.length === 0);
    if (hadFocus && isFocusLost()) this.giveFocus(focused);
  }

  showAll() {
    const before = this.list.children.length;
    this.most = Infinity;
    this.show(this.model);
    focusIn(this.list.children[before]);
  }

  // Each with a key that identifies it in later updates.
  shownOf(found, model, mayChange) {
    const times = new Map();
    return found.map((finding) => {
      const task = taskOf(finding, model);
      const name = [finding.kind, finding.task, finding.run && finding.run.run].join(" ");
      times.set(name, (times.get(name) || 0) + 1);
      // The crontab is written from the tasks, which must be there first.
      const actions = actionsOf(finding, task, mayChange).filter(({ key }) => !(key === "sync" && model.isDamaged));
      return { key: name + " " + times.get(name), finding, task, text: textOf(finding, task), actions };
    });
  }

  // To the row in the place of the one that had the focus.
  giveFocus(i) {
    const row = this.list.children[Math.min(i, this.list.children.length - 1)];
    if (!row || !focusIn(row)) this.element.focus();
  }

  showWell(isWell) {
    if (this.well.hidden === !isWell && this.well.firstChild) return;
    this.well.hidden = !isWell;
    fill(this.well, el("span", { class: "mark good", "aria-hidden": "true" }, "✓"), _("All is well."));
  }

  headingOf(found, isKnown) {
    if (!isKnown) return _("Whether all is well: unknown");
    const count = found.filter((finding) => finding.severity !== "unknown").length;
    if (count === 0) return _("Nothing is known to be wrong");
    return format(ngettext("$0 thing needs attention", "$0 things need attention", count), count);
  }
}
