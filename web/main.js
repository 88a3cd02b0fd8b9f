// The page: which view is shown, and when it is updated.
import { el, fill, isFocusLost, setAttribute, setText } from "./dom.js";
import { go, here, href } from "./address.js";
import { watchAccess } from "./access.js";
import { CalendarView } from "./calendar.js";
import { clearNotesOfView, confirm, notesPlace } from "./dialogs.js";
import { FormView } from "./form.js";
import { Model } from "./model.js";
import { zoneNote } from "./moments.js";
import { PowerView } from "./power.js";
import { TaskView } from "./task.js";
import { TasksView } from "./tasks.js";
import { followTheme } from "./theme.js";
import { whenChanged } from "./tool.js";
import { Watch } from "./watch.js";
import { oneAtATime } from "./turns.js";
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
    this.root = el("main", { tabindex: "-1", hidden: true });
    this.waiting = el("p", { class: "beside", role: "status" }, _("Asking the machine …"));
    fill(document.getElementById("page"),
      el("header", {}, el("h1", {}, _("Scheduled tasks")), el("nav", { "aria-label": _("Views") }, ...this.tabs.map((tab) => tab.link))),
      this.zone, notesPlace(), this.fault, this.waiting, this.root);
    cockpit.addEventListener("locationchanged", () => this.route());
    this.model.addEventListener("changed", () => this.update());
    this.mayLeave = oneAtATime(() => this.askToLeave());
    window.addEventListener("beforeunload", (event) => {
      if (!this.hasUnsaved()) return;
      event.preventDefault();
      event.returnValue = ""; // for browsers that ask by this only
    });
  }

  hasUnsaved() {
    return Boolean(this.view && this.view.isChanged && this.view.isChanged());
  }

  // The address has changed already, and is set back when the user stays.
  async askToLeave() {
    const stayed = this.path;
    const isAgreed = await confirm({ title: _("Leave without saving?"), text: _("What you have changed here is lost."),
      action: _("Leave"), isDangerous: true });
    if (isAgreed) this.show();
    else go(stayed);
  }

  // Another view, or the same with other options.
  route() {
    const { path, options } = here();
    if (JSON.stringify(path) === JSON.stringify(this.path)) this.view.take(options);
    else if (this.hasUnsaved()) this.mayLeave();
    else this.show();
  }

  show() {
    const { path, options } = here();
    for (const { link, isOf } of this.tabs) setAttribute(link, "aria-current", isOf(path) ? "page" : null);
    const isFirst = this.view === null;
    if (!isFirst) {
      this.view.close();
      clearNotesOfView();
    }
    this.path = path;
    const View = viewOf(path);
    fill(this.root);
    this.view = new View(this.root, this.model, { path, options });
    this.showTitle();
    // What was there before has gone, and with it the focus.
    if (!isFirst && !this.root.contains(document.activeElement)) this.root.focus({ preventScroll: true });
  }

  showTitle() {
    document.title = this.view.title ? format("$0 – $1", this.view.title, _("Scheduled tasks")) : _("Scheduled tasks");
  }

  update() {
    const { model } = this;
    const hadFocus = !isFocusLost();
    this.waiting.hidden = model.isAnswered;
    this.root.hidden = !model.isAnswered;
    fill(this.fault, model.fault === null ? null
      : el("div", { class: "note bad", role: "alert" }, el("p", {}, model.fault)));
    if (this.view) {
      this.view.update();
      this.showTitle();
    }
    setText(this.zone, zoneNote() || "");
    // The update may have removed the focused element.
    if (hadFocus && isFocusLost() && !document.querySelector("dialog")) this.root.focus({ preventScroll: true });
    this.waitForNext();
  }

  // At the time of the next run the list changes, whether or not that run happens.
  waitForNext() {
    window.clearTimeout(this.next);
    const seconds = Math.min(this.model.secondsToNext() + 1, MOST_WAIT);
    if (seconds > 0) this.next = window.setTimeout(() => this.refresh(), seconds * 1000);
  }

  refresh() {
    return cockpit.hidden ? null : this.model.refresh();
  }

  async look() {
    if (await this.model.isOther()) this.refresh();
  }

  start() {
    this.route();
    watchAccess((isAllowed) => {
      this.model.mayChange = isAllowed;
      this.update();
    });
    whenChanged(() => this.refresh());
    this.watch = new Watch(() => this.refresh(), () => this.look());
  }
}

function start() {
  document.documentElement.lang = language();
  document.documentElement.dir = cockpit.language_direction || "ltr";
  followTheme();
  here(); // replaces an address that cannot be parsed
  new Page().start();
}

cockpit.transport.wait(start);
