// One task: what it is, when it runs, how its runs went.
import { button, el, fill, setAttribute, setText } from "./dom.js";
import { removeTask, runNow, setEnabled, stopRuns } from "./actions.js";
import { go, href, replaceOptions } from "./address.js";
import { showAccess } from "./access.js";
import { durationChart } from "./chart.js";
import { comingItems, comingRows, comingWarning } from "./coming.js";
import { Runs } from "./runs.js";
import { ask } from "./tool.js";
import { inTurn, oneAtATime } from "./turns.js";
import { gradeOf, limitText, outcomeText, scheduleText, titleOf } from "./words.js";
import { _, format, ngettext, short, visible } from "./text.js";

const RUNS = 50;
const MOST_RUNS = 200;
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

function numberOf(text) {
  return /^\d+$/.test(text || "") ? Number(text) : null;
}

export class TaskView {
  constructor(root, model, { path, options }) {
    this.id = Number(path[1]);
    this.model = model;
    this.load = inTurn(() => this.isClosed || Promise.all([this.loadComing(), this.loadRuns()]));
    this.title = "";
    this.access = el("div");
    this.wanted = numberOf(options.run); // the run whose output is to be shown
    this.limit = RUNS;
    this.makeHead();
    this.facts = el("dl", { class: "facts" });
    this.coming = el("ol", { class: "coming" });
    this.comingWarning = el("p", { class: "fault", role: "status" });
    this.chart = el("div");
    this.note = el("p", { class: "beside" });
    this.more = button("", { class: "secondary" }, () => this.showMore());
    this.left = el("div", { class: "more", hidden: true }, this.more);
    this.runs = new Runs((number) => {
      this.wanted = number;
      replaceOptions({ run: number === null ? "" : String(number) });
    });
    this.runs.want(this.wanted);
    this.newest = null;
    this.columns = el("div", { class: "columns" },
      el("section", { "aria-label": _("Task") }, el("h3", {}, _("Task")), this.facts),
      el("section", { "aria-label": _("Coming runs") }, el("h3", {}, _("Coming runs")), this.coming, this.comingWarning));
    this.history = el("section", { "aria-label": _("Runs") }, el("h3", {}, _("Runs")), this.chart, this.note, this.runs.element, this.left);
    fill(root, this.access, this.gone, this.head, this.columns, this.history);
    this.update();
  }

  update() {
    showAccess(this.access, this.model.mayChange);
    this.task = this.model.taskOf(this.id);
    for (const element of [this.head, this.columns, this.history]) element.hidden = this.task === null;
    this.gone.hidden = this.task !== null || !this.model.isLoaded;
    if (!this.task) {
      this.title = this.model.isLoaded ? _("No such task") : "";
      this.dropRuns();
      return;
    }
    // Another one may have got the number.
    if (this.shownName !== this.task.name) {
      this.dropRuns();
      if (this.shownName !== undefined) this.want(null);
    }
    this.shownName = this.task.name;
    this.title = short(titleOf(this.task));
    this.showHead();
    this.showFacts();
    this.load();
  }

  // Also stops following their output.
  dropRuns() {
    this.runs.show([]);
    this.runs.element.hidden = true;
    this.showChart([]);
    this.shownRuns = null;
  }

  // The buttons stay the same elements, as one may have the focus, or get it back from a dialog.
  makeHead() {
    this.name = el("bdi");
    this.outcome = el("span");
    this.off = el("span", { class: "outcome none" }, _("switched off"));
    this.problems = el("div");
    const make = (label, style, act) => button(label, { class: style }, act);
    this.buttons = {
      run: make(_("Run now"), "primary", oneAtATime(() => this.run())),
      stop: make(_("Stop"), "danger", () => stopRuns(this.model, this.task)),
      edit: make(_("Edit"), "secondary", () => go(["task", String(this.id), "edit"])),
      enable: make("", "secondary", oneAtATime(() => setEnabled(this.task, !this.task.enabled))),
      remove: make(_("Remove"), "danger plain-danger", async () => {
        if (await removeTask(this.model, this.task)) go([]);
      }),
    };
    this.actions = el("div", { class: "actions" }, ...Object.values(this.buttons));
    this.head = el("div", { class: "head" }, el("h2", { class: "long" }, this.name),
      el("p", { class: "state" }, this.outcome, this.off), this.problems, this.actions);
    this.gone = el("div", { class: "head", hidden: true }, el("h2", {}, _("There is no such task")),
      el("p", {}, el("a", { href: href([]) }, _("All tasks"))));
  }

  showHead() {
    const { task } = this;
    const run = task.last_run;
    setText(this.name, titleOf(task));
    setText(this.outcome, run === undefined ? _("How its runs went: unknown") : format(_("Last run: $0"), outcomeText(run)));
    setAttribute(this.outcome, "class", "outcome " + (run === undefined ? "none" : gradeOf(run)));
    this.off.hidden = task.enabled;
    if (this.problemsShown !== task.problems.join("\n")) {
      this.problemsShown = task.problems.join("\n");
      fill(this.problems, ...task.problems.map((problem) => el("div", { class: "note bad", role: "alert" }, el("p", {}, visible(problem)))));
    }
    const { run: runs, stop, edit, enable, remove } = this.buttons;
    runs.hidden = !task.ui.can_run;
    stop.hidden = !task.running;
    edit.hidden = !task.ui.can_edit;
    setText(enable, task.enabled ? _("Switch off") : _("Switch on"));
    remove.hidden = !task.ui.can_delete;
    this.actions.hidden = !this.model.mayChange;
  }

  async run() {
    this.newest = Math.max(this.latestNumber(), this.task.last_run ? this.task.last_run.run || 0 : 0);
    this.opensNext = true;
    this.opensNext = await runNow(this.task) === true;
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
    const { task } = this;
    if (!task) return;
    let rows = [];
    let none = task.enabled ? _("None") : _("None, as it is switched off");
    try {
      const { runs } = task.enabled ? await ask("next", String(this.id), "--count", COMING) : { runs: [] };
      rows = comingRows(runs.map((run) => run.due).filter((due) => due), this.model.powerTimes);
    } catch (error) {
      none = error.message;
    }
    const key = JSON.stringify([rows, none]);
    if (this.comingShown === key) return;
    this.comingShown = key;
    fill(this.coming, ...comingItems(rows), rows.length === 0 ? el("li", { class: "none" }, none) : null);
    setText(this.comingWarning, comingWarning(rows));
  }

  async loadRuns() {
    const { task } = this;
    if (!task) return;
    if (this.model.mayChange !== true && task.last_run === undefined) {
      setText(this.note, _("Unknown without administrative access."));
      this.runs.element.hidden = true;
      return;
    }
    try {
      const { runs, why } = await this.askForRuns();
      if (this.isClosed || !this.task || this.task.name !== task.name) return; // it is another one
      this.shownRuns = runs;
      setText(this.note, why || (runs.length === 0 ? _("It has not run yet.") : ""));
      this.runs.element.hidden = runs.length === 0;
      this.showLeft(runs);
      this.runs.show(runs);
      this.openNewest();
      this.showChart(runs);
    } catch (error) {
      setText(this.note, error.message);
    }
  }

  // The last runs, and the wanted one where that is older; `why` says why it is not there.
  async askForRuns() {
    const latest = async () => (await ask("history", "--task", String(this.id), "--limit", String(this.limit))).runs;
    const { task, wanted } = this;
    const isThere = (runs) => wanted === null || runs.some((run) => run.run === wanted);
    let runs = await latest();
    if (!isThere(runs) && runs.length === this.limit && this.limit < MOST_RUNS) {
      this.limit = MOST_RUNS;
      runs = await latest();
    }
    if (isThere(runs)) return { runs, why: "" };
    try {
      const { run } = await ask("log", String(this.id), "--run", String(wanted));
      // A removed task may have had the number.
      return run.task_name === task.name ? { runs: [...runs, run], why: "" }
        : { runs, why: format(_("Run $0 is one of $1."), wanted, short(run.task_name)) };
    } catch (error) {
      return { runs, why: error.message };
    }
  }

  // There may be more runs than were asked for.
  showLeft(runs) {
    const next = MOST_RUNS - RUNS;
    this.left.hidden = this.limit === MOST_RUNS || runs.length < this.limit;
    setText(this.more, format(ngettext("Show up to $0 more", "Show up to $0 more", next), next));
  }

  async showMore() {
    const before = this.runs.count();
    this.limit = MOST_RUNS;
    await this.load();
    this.runs.focusOn(before);
  }

  // The run that was started here is shown as soon as it is known.
  openNewest() {
    const number = this.latestNumber();
    if (!this.opensNext || number <= this.newest) return;
    this.opensNext = false;
    this.want(number);
    replaceOptions({ run: String(number) });
  }

  want(number) {
    this.wanted = number;
    this.runs.want(number);
  }

  showChart(runs) {
    const key = JSON.stringify(runs.map((run) => [run.run, run.duration_seconds, run.outcome]));
    if (this.chartShown === key) return;
    this.chartShown = key;
    fill(this.chart, durationChart(runs, (run) => this.runs.toggle(run)));
  }

  take(options) {
    this.want(numberOf(options.run));
    this.load();
  }

  close() {
    this.isClosed = true;
    this.runs.close();
  }
}
