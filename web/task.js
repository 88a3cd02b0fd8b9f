// One task: what it is, when it runs, how its runs went.
import { button, el, fill, setText } from "./dom.js";
import { removeTask, runNow, setEnabled, stopRuns } from "./actions.js";
import { go, href, replaceOptions } from "./address.js";
import { showAccess } from "./access.js";
import { durationChart } from "./chart.js";
import { distanceText, momentText } from "./moments.js";
import { Runs } from "./runs.js";
import { ask } from "./tool.js";
import { inTurn } from "./turns.js";
import { gradeOf, limitText, outcomeText, scheduleText } from "./words.js";
import { _, format, short, visible } from "./text.js";

const RUNS = "50";
const COMING = "5";

function fact(label, ...content) {
  return [el("dt", {}, label), el("dd", {}, ...content)];
}

function overlapText(overlap) {
  if (overlap.task && overlap.app) return _("A run starts whatever else is running.");
  if (overlap.app) return _("A run waits until the one before has ended.");
  if (overlap.task) return _("A run waits for those of other tasks of its application.");
  return _("A run waits for the one before, and for those of other tasks of its application.");
}

export class TaskView {
  constructor(root, model, { path, options }) {
    this.id = Number(path[1]);
    this.model = model;
    this.load = inTurn(() => this.isClosed || Promise.all([this.loadComing(), this.loadRuns()]));
    this.title = "";
    this.access = el("div");
    this.head = el("div", { class: "head" });
    this.facts = el("dl", { class: "facts" });
    this.coming = el("ol", { class: "coming" });
    this.chart = el("div");
    this.note = el("p", { class: "beside" });
    this.runs = new Runs((number) => replaceOptions({ run: number === null ? "" : String(number) }));
    this.runs.want(options.run ? Number(options.run) : null);
    this.newest = null;
    this.columns = el("div", { class: "columns" },
      el("section", { "aria-label": _("Task") }, el("h3", {}, _("Task")), this.facts),
      el("section", { "aria-label": _("Coming runs") }, el("h3", {}, _("Coming runs")), this.coming));
    this.history = el("section", { "aria-label": _("Runs") }, el("h3", {}, _("Runs")), this.chart, this.note, this.runs.element);
    fill(root, this.access, this.head, this.columns, this.history);
    this.update();
  }

  update() {
    showAccess(this.access, this.model.mayChange);
    if (!this.model.isLoaded) return;
    this.task = this.model.taskOf(this.id);
    this.columns.hidden = this.task === null;
    this.history.hidden = this.task === null;
    if (!this.task) {
      this.showGone();
      return;
    }
    this.title = short(this.task.name);
    this.showHead();
    this.showFacts();
    this.load();
  }

  showGone() {
    this.title = _("No such task");
    fill(this.head, el("h2", {}, _("There is no such task")), el("p", {}, el("a", { href: href([]) }, _("All tasks"))));
    this.headShown = null;
  }

  // Only when something of it changes: it has the buttons, and one of them may have the focus.
  showHead() {
    const { task, model } = this;
    const key = JSON.stringify([task.name, task.enabled, task.running, task.ui, task.problems, model.mayChange,
      task.last_run && [task.last_run.run, task.last_run.state, task.last_run.outcome]]);
    if (this.headShown === key) return;
    this.headShown = key;
    const focused = document.activeElement && document.activeElement.dataset.action;
    const run = task.last_run;
    fill(this.head,
      el("h2", { class: "long" }, el("bdi", {}, visible(task.name) || format(_("Task $0"), task.id))),
      el("p", { class: "state" },
        el("span", { class: "outcome " + (run === undefined ? "none" : gradeOf(run)) },
          run === undefined ? _("How its runs went: unknown") : format(_("Last run: $0"), outcomeText(run))),
        task.enabled ? null : el("span", { class: "outcome none" }, _("switched off"))),
      ...task.problems.map((problem) => el("div", { class: "note bad", role: "alert" }, el("p", {}, visible(problem)))),
      model.mayChange ? this.actions() : null);
    const again = focused && this.head.querySelector(`[data-action="${focused}"]`);
    if (again) again.focus();
  }

  actions() {
    const { task } = this;
    const action = (name, label, style, isOffered, act) => (isOffered
      ? button(label, { class: style, "data-action": name }, act) : null);
    return el("div", { class: "actions" },
      action("run", _("Run now"), "primary", task.ui.can_run, () => this.run()),
      action("stop", _("Stop"), "danger", task.running, () => stopRuns(task)),
      action("edit", _("Edit"), "secondary", task.ui.can_edit, () => go(["task", String(task.id), "edit"])),
      action("enable", task.enabled ? _("Switch off") : _("Switch on"), "secondary", true,
        () => setEnabled(task, !task.enabled)),
      action("remove", _("Remove"), "danger plain-danger", task.ui.can_delete, async () => {
        if (await removeTask(task)) go([]);
      }));
  }

  async run() {
    this.newest = this.latestNumber();
    this.opensNext = true;
    this.opensNext = await runNow(this.task);
    this.load();
  }

  latestNumber() {
    return Math.max(0, ...(this.shownRuns || []).map((run) => run.run || 0));
  }

  showFacts() {
    const { task } = this;
    const key = JSON.stringify([task.schedule, task.owner, task.command, task.time_limit, task.overlap, task.app,
      task.app_name, task.action]);
    if (this.factsShown === key) return;
    this.factsShown = key;
    fill(this.facts,
      ...fact(_("Schedule"), scheduleText(task.schedule)),
      ...fact(_("Command"), el("pre", { class: "command", tabindex: "0", role: "group", "aria-label": _("Command") }, visible(task.command))),
      ...fact(_("Runs as"), el("bdi", {}, visible(task.owner))),
      ...fact(_("Time limit"), limitText(task.time_limit)),
      ...fact(_("Overlap"), overlapText(task.overlap)),
      ...(task.app ? fact(_("Application"), el("bdi", { class: "long" }, visible(task.app_name || task.app))) : []),
      ...(task.action ? fact(_("What it does"), el("bdi", { class: "long" }, visible(task.action))) : []));
  }

  async loadComing() {
    let due = [];
    try {
      if (this.task.enabled) due = (await ask("next", String(this.id), "--count", COMING)).runs.map((run) => run.due);
    } catch (error) {
      due = [];
    }
    const rows = due.filter((time) => time).map((time) => [momentText(time), distanceText(time)]);
    const key = JSON.stringify(rows);
    if (this.comingShown === key) return;
    this.comingShown = key;
    fill(this.coming, ...rows.map(([time, distance]) => el("li", {}, time + " ", el("span", { class: "beside" }, distance))));
    if (rows.length === 0) {
      fill(this.coming, el("li", { class: "none" }, this.task.enabled ? _("None") : _("None, as it is switched off")));
    }
  }

  async loadRuns() {
    if (this.model.mayChange !== true && this.task.last_run === undefined) {
      setText(this.note, _("Unknown without administrative access."));
      this.runs.element.hidden = true;
      return;
    }
    try {
      const { runs } = await ask("history", "--task", String(this.id), "--limit", RUNS);
      if (this.isClosed) return;
      this.shownRuns = runs;
      setText(this.note, runs.length === 0 ? _("It has not run yet.") : "");
      this.runs.element.hidden = runs.length === 0;
      this.runs.show(runs);
      this.openNewest();
      this.showChart(runs);
    } catch (error) {
      setText(this.note, error.message);
    }
  }

  // The run that was started here is shown as soon as it is known.
  openNewest() {
    const number = this.latestNumber();
    if (!this.opensNext || number <= this.newest) return;
    this.opensNext = false;
    this.runs.want(number);
    replaceOptions({ run: String(number) });
  }

  showChart(runs) {
    const key = JSON.stringify(runs.map((run) => [run.run, run.duration_seconds, run.outcome]));
    if (this.chartShown === key) return;
    this.chartShown = key;
    fill(this.chart, durationChart(runs, (run) => this.runs.toggle(run)));
  }

  take(options) {
    this.runs.want(options.run ? Number(options.run) : null);
  }

  close() {
    this.isClosed = true;
    this.runs.close();
  }
}
