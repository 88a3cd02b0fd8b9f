// The list of tasks.
import { el, fill, setAttribute, setText } from "./dom.js";
import { setEnabled } from "./actions.js";
import { href, replaceOptions, taskPath } from "./address.js";
import { showAccess } from "./access.js";
import { Health } from "./health.js";
import { Mails } from "./mails.js";
import { distanceText, moment, momentText } from "./moments.js";
import { switchCell } from "./switch.js";
import { Table } from "./table.js";
import { gradeOf, outcomeText, scheduleText, titleOf } from "./words.js";
import { _, format, language, ngettext, visible } from "./text.js";

const collator = new Intl.Collator(language(), { numeric: true, sensitivity: "base" });

function latest(task) {
  const run = task.last_run;
  const found = run && moment(run.end || run.start || run.queued);
  return found ? found.epoch : null;
}

// What never runs comes last, whichever way it is sorted.
function nextOf(task) {
  const found = task.enabled ? moment(task.next_run) : null;
  return found ? found.epoch : null;
}

const ORDERS = {
  name: (task) => task.name,
  schedule: (task) => scheduleText(task.schedule),
  next: nextOf,
  last: latest,
  owner: (task) => String(task.owner),
  enabled: (task) => (task.enabled ? 0 : 1),
};

function compare(a, b) {
  if (typeof a === "number" && typeof b === "number") return a - b;
  return collator.compare(a, b);
}

function sorted(tasks, key, isDescending) {
  const order = ORDERS[key];
  const rows = tasks.map((task) => ({ task, value: order(task) }));
  rows.sort((a, b) => {
    if (a.value === null || b.value === null) return (a.value === null) - (b.value === null) || a.task.id - b.task.id;
    return (isDescending ? -1 : 1) * compare(a.value, b.value) || a.task.id - b.task.id;
  });
  return rows.map((row) => row.task);
}

function isFailed(task) {
  return gradeOf(task.last_run) === "bad";
}

// ---- the columns ----------------------------------------------------------------------------

function nameCell(cell) {
  const link = el("a", { class: "name" }, el("bdi"));
  const app = el("span", { class: "app" });
  cell.append(link, app);
  return (task) => {
    setAttribute(link, "href", href(taskPath(task.id)));
    setText(link.firstChild, titleOf(task));
    setText(app, visible(task.app_name || task.app || ""));
    setAttribute(app, "dir", "auto");
  };
}

function nextCell(cell) {
  const time = el("span");
  const distance = el("span", { class: "beside" });
  cell.append(time, distance);
  return (task) => {
    const isComing = task.enabled && task.next_run;
    setText(time, isComing ? momentText(task.next_run) : task.enabled ? _("never") : _("switched off"));
    setText(distance, isComing ? distanceText(task.next_run) : "");
    setAttribute(cell, "class", isComing ? "c-next" : "c-next dim");
  };
}

function lastCell(cell) {
  const outcome = el("span");
  const age = el("span", { class: "beside" });
  cell.append(outcome, age);
  return (task) => {
    const run = task.last_run;
    const isUnknown = run === undefined;
    setText(outcome, isUnknown ? _("unknown") : outcomeText(run));
    setAttribute(outcome, "class", "outcome " + (isUnknown ? "none" : gradeOf(run)));
    setText(age, run ? distanceText(run.end || run.start || run.queued) : "");
  };
}

function columns(model) {
  return [
    { key: "name", label: _("Name"), isSortable: true, make: nameCell },
    { key: "schedule", label: _("Schedule"), isSortable: true,
      make: (cell) => (task) => setText(cell, scheduleText(task.schedule)) },
    { key: "next", label: _("Next run"), isSortable: true, make: nextCell },
    { key: "last", label: _("Last run"), isSortable: true, make: lastCell },
    { key: "owner", label: _("Owner"), isSortable: true,
      make: (cell) => (task) => setText(cell, visible(task.owner)) },
    { key: "enabled", label: _("On"), isSortable: true,
      make: switchCell({ mayChange: () => model.mayChange, set: setEnabled, nameOf: (task) => titleOf(task).slice(0, 200) }) },
  ];
}

// ---- the view -------------------------------------------------------------------------------

function optionsOf({ q = "", app = "", failed = "", sort = "", desc = "" }) {
  return { q, app, failed: failed === "1" ? failed : "", sort: Object.hasOwn(ORDERS, sort) ? sort : "", desc };
}

export class TasksView {
  constructor(root, model, { options }) {
    this.title = _("Tasks");
    this.model = model;
    this.options = optionsOf(options);
    this.health = new Health();
    this.access = el("div");
    this.table = new Table({ caption: _("Tasks"), columns: columns(model), sorted: (key) => this.sortBy(key) });
    this.count = el("span", { class: "count", role: "status" });
    this.empty = el("div", { class: "empty" });
    this.mails = new Mails();
    this.add = el("a", { class: "button primary", href: href(["add"]) }, _("Add a task"));
    this.old = el("div", { class: "note warn", role: "status", hidden: true },
      el("p", {}, _("The machine could not be asked for its tasks. They are shown as they were.")));
    this.list = el("section", { "aria-label": _("Tasks") }, this.old, this.tools(), this.empty, this.table.element, this.mails.element);
    fill(root, this.access, this.health.element, this.list);
    // Called before a link leads to another view.
    this.flush = () => this.remembering && this.remember();
    document.addEventListener("click", this.flush, true);
    this.update();
  }

  tools() {
    this.text = el("input", { type: "search", value: this.options.q, placeholder: _("Filter by name, command or owner"),
      "aria-label": _("Filter tasks"), on: { input: () => this.choose({ q: this.text.value }) } });
    this.app = el("select", { "aria-label": _("Application"), on: { change: () => this.choose({ app: this.app.value }) } });
    this.failed = el("input", { type: "checkbox", checked: this.options.failed === "1",
      on: { change: () => this.choose({ failed: this.failed.checked ? "1" : "" }) } });
    return el("div", { class: "tools" }, this.text, this.app,
      el("label", { class: "check" }, this.failed, _("Only failed")), this.count, this.add);
  }

  choose(options) {
    Object.assign(this.options, options);
    this.showRows(true);
    // Not at each key, as changing the address takes longer than updating the table.
    window.clearTimeout(this.remembering);
    this.remembering = window.setTimeout(() => this.remember(), 300);
  }

  remember() {
    window.clearTimeout(this.remembering);
    this.remembering = null;
    replaceOptions(this.options);
  }

  sortBy(key) {
    const isSame = (this.options.sort || "next") === key;
    this.options.desc = isSame && !this.options.desc ? "1" : "";
    this.options.sort = key === "next" ? "" : key;
    this.remember();
    this.showRows();
  }

  chosen() {
    const words = this.options.q.toLocaleLowerCase().split(/\s+/).filter((word) => word !== "");
    return this.model.tasks.filter((task) => {
      if (!task.ui.listable) return false;
      if (this.options.app && (task.app || "") !== this.options.app) return false;
      if (this.options.failed && !isFailed(task)) return false;
      if (words.length === 0) return true;
      const text = this.textOf(task);
      return words.every((word) => text.includes(word));
    });
  }

  // The text that is searched, made once for each task object.
  textOf(task) {
    if (!this.texts.has(task)) {
      this.texts.set(task, [task.name, task.command, task.owner, task.app || "", task.app_name || "", task.action || ""]
        .join("\n").toLocaleLowerCase());
    }
    return this.texts.get(task);
  }

  showRows(areOthers = false) {
    const chosen = this.chosen();
    const all = this.model.tasks.filter((task) => task.ui.listable).length;
    this.table.showOrder(this.options.sort || "next", this.options.desc === "1");
    const rows = sorted(chosen, this.options.sort || "next", this.options.desc === "1");
    if (areOthers) this.table.showOthers(rows);
    else this.table.show(rows);
    this.table.element.hidden = chosen.length === 0;
    setText(this.count, chosen.length === all ? format(ngettext("$0 task", "$0 tasks", all), all)
      : format(ngettext("$0 of $1 task", "$0 of $1 tasks", all), chosen.length, all));
    this.showEmpty(all, chosen.length);
  }

  showEmpty(all, chosen) {
    this.empty.hidden = chosen > 0;
    if (chosen > 0) return;
    const key = (all > 0 ? "filtered" : this.model.isDamaged ? "damaged" : "none") + this.model.mayChange;
    if (this.empty.dataset.shown === key) return;
    this.empty.dataset.shown = key;
    if (all > 0 || this.model.isDamaged) {
      fill(this.empty, el("p", {}, all > 0 ? _("No task is like that.") : _("The tasks cannot be read.")));
      return;
    }
    fill(this.empty, el("h2", {}, _("There is no task yet")),
      el("p", {}, _("A task runs a command at certain times: a backup every night, a report every Monday.")),
      this.model.mayChange ? el("a", { class: "button primary", href: href(["add"]) }, _("Add the first task")) : null);
  }

  showApps() {
    const apps = new Map();
    for (const task of this.model.tasks) if (task.app && task.ui.listable) apps.set(task.app, task.app_name || task.app);
    if (this.options.app && !apps.has(this.options.app)) apps.set(this.options.app, this.options.app);
    const key = JSON.stringify([...apps]);
    if (this.apps === key) return;
    this.apps = key;
    fill(this.app, el("option", { value: "" }, _("All applications")),
      [...apps].sort((a, b) => collator.compare(a[1], b[1]))
        .map(([app, name]) => el("option", { value: app }, visible(name).slice(0, 100))));
    this.app.value = this.options.app;
    this.app.hidden = apps.size === 0;
  }

  update() {
    this.texts = new Map();
    showAccess(this.access, this.model.mayChange);
    this.health.show(this.model);
    this.list.hidden = !this.model.isLoaded;
    if (!this.model.isLoaded) return;
    this.old.hidden = this.model.isListed;
    setAttribute(this.table.element, "class", this.model.isListed ? "table" : "table old");
    this.add.hidden = !this.model.mayChange || this.model.isDamaged;
    this.mails.show(this.model);
    this.showApps();
    this.showRows();
  }

  // By a link, or by going back.
  take(options) {
    if (this.remembering) return;
    this.options = optionsOf(options);
    this.text.value = this.options.q;
    this.failed.checked = this.options.failed === "1";
    this.apps = null;
    this.update();
  }

  close() {
    window.clearTimeout(this.remembering);
    document.removeEventListener("click", this.flush, true);
  }
}
