// The page: which view is shown, and when it is shown anew.
import { el, fill, setAttribute, setText } from "./dom.js";
import { here, href } from "./address.js";
import { watchAccess } from "./access.js";
import { CalendarView } from "./calendar.js";
import { notesPlace } from "./dialogs.js";
import { FormView } from "./form.js";
import { Model } from "./model.js";
import { zoneNote } from "./moments.js";
import { PowerView } from "./power.js";
import { TaskView } from "./task.js";
import { TasksView } from "./tasks.js";
import { followTheme } from "./theme.js";
import { whenChanged } from "./tool.js";
import { Watch } from "./watch.js";
import { _, format, language } from "./text.js";

const cockpit = window.cockpit;
const MOST_WAIT = 2000000; // seconds: a longer timer of the browser ends at once

const TABS = () => [
  { path: [], label: _("Tasks"), isOf: (path) => path.length === 0 || path[0] === "task" || path[0] === "add" },
  { path: ["calendar"], label: _("Calendar"), isOf: (path) => path[0] === "calendar" },
  { path: ["power"], label: _("Power"), isOf: (path) => path[0] === "power" },
];

function viewOf(path) {
  if (path[0] === "add" || (path[0] === "task" && path[2] === "edit")) return FormView;
  if (path[0] === "task") return TaskView;
  if (path[0] === "calendar") return CalendarView;
  if (path[0] === "power") return PowerView;
  return TasksView;
}

class Page {
  constructor() {
    this.model = new Model();
    this.tabs = TABS().map((tab) => ({ ...tab, link: el("a", { href: href(tab.path) }, tab.label) }));
    this.zone = el("p", { class: "zone" });
    this.fault = el("div");
    this.view = null;
    this.root = el("main", { tabindex: "-1" });
    fill(document.getElementById("page"),
      el("header", {}, el("h1", {}, _("Scheduled tasks")), el("nav", { "aria-label": _("Views") }, ...this.tabs.map((tab) => tab.link))),
      this.zone, notesPlace(), this.fault, this.root);
    cockpit.addEventListener("locationchanged", () => this.route());
    this.model.addEventListener("changed", () => this.update());
  }

  // Another view, or the same with other options.
  route() {
    const { path, options } = here();
    const key = JSON.stringify(path);
    for (const { link, isOf } of this.tabs) setAttribute(link, "aria-current", isOf(path) ? "page" : null);
    if (key === this.shown) {
      this.view.take(options);
      return;
    }
    const isFirst = this.view === null;
    if (!isFirst) this.view.close();
    this.shown = key;
    const View = viewOf(path);
    fill(this.root);
    this.view = new View(this.root, this.model, { path, options });
    this.showTitle();
    // What was there before has gone, and with it the focus.
    if (!isFirst && !this.root.contains(document.activeElement)) this.root.focus();
  }

  showTitle() {
    document.title = this.view.title ? format("$0 – $1", this.view.title, _("Scheduled tasks")) : _("Scheduled tasks");
  }

  update() {
    const { model } = this;
    setText(this.zone, zoneNote() || "");
    fill(this.fault, model.fault === null ? null
      : el("div", { class: "note bad", role: "alert" }, el("p", {}, model.fault)));
    if (this.view) {
      this.view.update();
      this.showTitle();
    }
    this.waitForNext();
  }

  // At the time of the next run the list is another one, whether or not anything runs.
  waitForNext() {
    window.clearTimeout(this.next);
    const seconds = Math.min(this.model.secondsToNext() + 1, MOST_WAIT);
    if (seconds > 0) this.next = window.setTimeout(() => this.refresh(), seconds * 1000);
  }

  refresh() {
    if (!cockpit.hidden) this.model.refresh();
  }

  start() {
    this.route();
    watchAccess((isAllowed) => {
      this.model.mayChange = isAllowed;
      this.update();
    });
    whenChanged(() => this.refresh());
    this.watch = new Watch(() => this.refresh(), () => this.update());
  }
}

function start() {
  document.documentElement.lang = language();
  document.documentElement.dir = cockpit.language_direction || "ltr";
  followTheme();
  new Page().start();
}

cockpit.transport.wait(start);
