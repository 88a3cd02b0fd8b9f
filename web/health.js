// What is wrong, worst first, each with what helps; or one line.
import { button, el, fill } from "./dom.js";
import { attempt } from "./dialogs.js";
import { change } from "./tool.js";
import { outcomeText } from "./words.js";
import { distanceText } from "./moments.js";
import { _, format, ngettext, short, visible } from "./text.js";
import { go, taskPath } from "./address.js";
import { runNow } from "./actions.js";

const cockpit = window.cockpit;

// The page's own words where it has them; else those of the program.
function textOf(finding, task) {
  const last = task && task.last_run;
  switch (finding.kind) {
    case "cron":
      return _("Cron is not running: no task will start by itself.");
    case "failed-run":
    case "gave-up":
      if (!last) break;
      return format(_("$0 $1, $2."), short(task.name), outcomeText(last),
        distanceText(last.end || last.start || last.queued));
    case "missed-run":
      if (!task) break;
      return format(_("$0 was due and did not run."), short(task.name));
    case "long-run":
      if (!last) break;
      return format(_("$0 has been running for unusually long: it began $1."), short(task.name),
        distanceText(last.start));
    case "runs":
    case "turns":
      if (finding.severity === "unknown") {
        return finding.kind === "runs"
          ? _("Which runs failed or were missed: unknown without administrative access.")
          : _("Whether something keeps changes waiting: unknown without administrative access.");
      }
      break;
  }
  return visible(finding.text);
}

function acknowledge(task) {
  return attempt(() => change(["status", "--acknowledge", String(task.id)]));
}

function actionsOf(finding, task, mayChange) {
  const actions = [];
  const add = (label, act) => actions.push(button(label, { class: "secondary small" }, act));
  if (finding.kind === "cron") {
    add(_("Start cron in Services"), () => cockpit.jump("/system/services#/cron.service"));
  } else if (task && (finding.kind === "failed-run" || finding.kind === "gave-up")) {
    const run = task.last_run ? task.last_run.run : null;
    add(_("Show the run"), () => go(taskPath(task.id), run ? { run: String(run) } : {}));
  } else if (task) {
    add(_("Show the task"), () => go(taskPath(task.id)));
  } else if (finding.kind === "power") {
    add(_("Show power times"), () => go(["power"]));
  } else if (finding.kind === "crontab" && mayChange) {
    add(_("Write the crontab again"), () => attempt(() => change(["sync"])));
  } else if ((finding.kind === "program" || finding.kind === "names") && mayChange) {
    add(_("Put it back"), () => attempt(() => change(["restore"])));
  }
  const isOfRun = task && ["failed-run", "gave-up", "missed-run"].includes(finding.kind);
  if (isOfRun && mayChange) {
    if (task.ui.can_run && !task.running) add(_("Run now"), () => runNow(task));
    add(_("Take note"), () => acknowledge(task));
  }
  return actions;
}

const SEVERITIES = {
  critical: () => _("Critical"),
  warning: () => _("Warning"),
  unknown: () => _("Unknown"),
};

export class Health {
  constructor() {
    this.element = el("section", { class: "health", "aria-label": _("Health") });
    this.shown = null;
  }

  show(model) {
    if (!model.status) return;
    const found = model.status.findings.filter((finding) => finding.severity !== "ok");
    // What has not changed stays, with the focus that may be in it.
    const rows = found.map((finding) => {
      const task = finding.task === null ? null : model.taskOf(finding.task);
      return { finding, task, text: textOf(finding, task) };
    });
    const key = JSON.stringify([rows.map((row) => [row.text, row.finding.kind, row.finding.severity,
      row.task && [row.task.id, row.task.running, row.task.last_run && row.task.last_run.run]]), model.mayChange,
    model.tasks.length === 0]);
    if (key === this.shown) return;
    this.shown = key;
    if (rows.length === 0) {
      fill(this.element, el("p", { class: "well", role: "status" },
        el("span", { class: "mark good", "aria-hidden": "true" }, "✓"), _("All is well.")));
      return;
    }
    fill(this.element, el("h2", {}, this.heading(found)),
      el("ul", { class: "findings" }, ...rows.map((row) => this.row(row, model.mayChange))));
  }

  heading(found) {
    const count = found.filter((finding) => finding.severity !== "unknown").length;
    if (count === 0) return _("Nothing is known to be wrong");
    return format(ngettext("$0 thing needs attention", "$0 things need attention", count), count);
  }

  row({ finding, task, text }, mayChange) {
    return el("li", { class: finding.severity },
      el("span", { class: "severity " + finding.severity }, SEVERITIES[finding.severity]()),
      el("span", { class: "what" }, el("bdi", {}, text)),
      el("span", { class: "row-actions" }, ...actionsOf(finding, task, mayChange)));
  }
}
