// Adding a task, and changing one. At each change the tool is asked for a preview: the faults, and
// when the task would run. It saves nothing.
import { button, el, fill, isFocusLost, setText } from "./dom.js";
import { go, goInstead, href, taskPath } from "./address.js";
import { showAccess } from "./access.js";
import { comingItems, comingRows, comingWarning } from "./coming.js";
import { clearFaults, confirm, tell, tellFault } from "./dialogs.js";
import { Field, Group, check, select } from "./fields.js";
import { ScheduleFields } from "./schedule-fields.js";
import { ask, askAbout, change } from "./tool.js";
import { oneAtATime } from "./turns.js";
import { titleOf } from "./words.js";
import { _, format, short, visible } from "./text.js";

const PAUSE = 200; // ms without a key before the tool is asked
const COMING = "5";
const PLACE = "tasks[0].";

const UNITS = () => [["s", _("seconds")], ["m", _("minutes")], ["h", _("hours")], ["d", _("days")]];

// People before accounts of programs. The task's owner is among them even when the machine does not
// list that user.
function ownerChoices(owners, current) {
  const name = (owner) => (owner.full_name && owner.full_name !== owner.owner
    ? `${visible(owner.owner)} (${short(owner.full_name, 60)})` : visible(owner.owner));
  const ordered = [...owners.filter((owner) => owner.is_person), ...owners.filter((owner) => !owner.is_person)];
  const choices = ordered.map((owner) => [owner.owner, name(owner)]);
  if (!choices.some(([owner]) => owner === String(current))) choices.unshift([String(current), visible(current)]);
  return choices;
}

export class FormView {
  constructor(root, model, { path }) {
    this.root = root;
    this.model = model;
    this.isSaved = false;
    this.saveOnce = oneAtATime(() => this.trySaving());
    this.id = path[0] === "task" ? Number(path[1]) : null;
    this.title = this.id === null ? _("Add a task") : _("Edit the task");
    this.update();
  }

  // The form is made once. Later changes of the task are reported, and do not touch what was typed.
  update() {
    if (!this.model.isLoaded || this.model.mayChange === null) return;
    const task = this.id === null ? null : this.model.taskOf(this.id);
    if (!this.form) {
      this.make(task);
    } else if (this.id !== null && !this.isSaving && !this.isSaved && this.model.isListed) {
      this.tellOf(task);
    }
  }

  make(task) {
    if (this.id !== null && !task) {
      fill(this.root, el("h2", {}, _("There is no such task")), el("p", {}, el("a", { href: href([]) }, _("All tasks"))));
      return;
    }
    if (!this.model.mayChange) {
      const access = el("div");
      showAccess(access, false);
      fill(this.root, access);
      return;
    }
    if (task && !task.ui.can_edit) {
      fill(this.root, el("h2", {}, format(_("Edit $0"), short(titleOf(task)))),
        el("p", {}, _("Its application does not let it be edited.")),
        el("p", {}, el("a", { href: href(taskPath(this.id)) }, _("Show the task"))));
      return;
    }
    this.task = task;
    this.before = task && JSON.stringify(this.settingsOf(task));
    this.makeFields(task || { name: "", command: "", owner: "root", enabled: true, schedule: null, time_limit: null,
      overlap: { task: false, app: true }, app: null, ui: { can_edit_name: true, can_edit_owner: true } });
    this.heading = el("h2", { class: "long" }, this.id === null ? _("Add a task") : format(_("Edit $0"), short(titleOf(task))));
    this.fault = el("div");
    this.changed = el("div");
    this.coming = el("ol", { class: "coming" });
    this.comingNote = el("p", { class: "beside" });
    this.save = el("button", { class: "primary" }, this.id === null ? _("Add the task") : _("Save"));
    this.form = el("form", { novalidate: true, on: { submit: (event) => this.submit(event), input: () => this.typed() } },
      this.heading, this.changed,
      el("div", { class: "form-columns" },
        el("div", { class: "fields" },
          el("fieldset", {}, el("legend", {}, _("What it does")), this.name.element, this.command.element, this.owner.element),
          this.schedule.element,
          el("details", {}, el("summary", {}, _("More")), this.limit.element, this.overlap.element, this.app.element,
            this.enabled.element)),
        el("aside", { class: "preview", "aria-label": _("Preview"), "aria-live": "polite" },
          el("h3", {}, _("It would run")), this.coming, this.comingNote)),
      this.fault,
      el("div", { class: "actions" }, this.save,
        button(_("Cancel"), { class: "secondary" }, () => this.cancel())));
    fill(this.root, this.form);
    this.start = this.value();
    this.toldOf = null;
    this.comingShown = null;
    this.touched = new Set();
    this.preview();
    this.loadOwners(task ? task.owner : "root");
    if (this.id === null) this.name.input.focus();
  }

  makeFields(task) {
    this.name = new Field(_("Name"), el("input", { type: "text", value: task.name, disabled: !task.ui.can_edit_name,
      dir: "auto" }), { places: ["name"] });
    this.command = new Field(_("Command"), el("textarea", { rows: 3, value: task.command, spellcheck: "false", class: "code" }),
      { places: ["command"], hint: _("A line for the shell, such as /usr/local/bin/backup --all") });
    const owner = select(ownerChoices([], task.owner), String(task.owner));
    owner.disabled = !task.ui.can_edit_owner;
    this.owner = new Field(_("Runs as"), owner, { places: ["owner"] });
    this.schedule = new ScheduleFields(task.schedule);
    const limit = /^(\d+)([smhd])$/.exec(task.time_limit || "");
    this.limitCount = el("input", { type: "number", min: 1, value: limit ? limit[1] : "", class: "short",
      "aria-label": _("Time limit") });
    this.limitUnit = select(UNITS(), limit ? limit[2] : "h");
    this.limitUnit.setAttribute("aria-label", _("Unit of the time limit"));
    this.limit = new Group(_("Time limit"), [this.limitCount, this.limitUnit], { places: ["time_limit"],
      hint: _("A run that takes longer is ended. Left empty, it may take as long as it likes.") });
    this.overlapTask = check(_("A run may start while another one of this task goes on"), task.overlap.task);
    this.overlapApp = check(_("A run may start while another task of its application runs"), task.overlap.app);
    this.overlap = new Group(_("Overlap"), [this.overlapTask.element, this.overlapApp.element], { places: ["overlap"] });
    this.app = new Field(_("Application"), el("input", { type: "text", value: task.app || "" }),
      { places: ["app"], hint: _("Groups tasks. Application and name together name a task.") });
    this.isOn = check(_("Switched on"), task.enabled);
    this.enabled = new Group(_("State"), [this.isOn.element], { places: ["enabled"] });
    this.fields = [this.name, this.command, this.owner, ...this.schedule.fields, this.limit, this.overlap, this.app, this.enabled];
  }

  async loadOwners(current) {
    try {
      const { owners } = await ask("owners");
      const chosen = this.owner.input.value;
      fill(this.owner.input, ...ownerChoices(owners, current).map(([key, label]) => el("option", { value: key }, label)));
      this.owner.input.value = chosen;
    } catch (error) {
      this.owner.tell([error.message]);
    }
  }

  settingsOf({ name, command, owner, enabled, schedule, time_limit, overlap, app }) {
    return { name, command, owner, enabled, schedule, time_limit, overlap, app };
  }

  // An owner without a name is a number, not a text.
  ownerValue() {
    const owner = this.owner.input.value;
    return this.task && String(this.task.owner) === owner ? this.task.owner : owner;
  }

  value() {
    const count = this.limitCount.value;
    return {
      name: this.name.input.value,
      command: this.command.input.value,
      owner: this.ownerValue(),
      enabled: this.isOn.input.checked,
      schedule: this.schedule.value(),
      time_limit: count === "" ? null : count + this.limitUnit.value,
      overlap: { task: this.overlapTask.input.checked, app: this.overlapApp.input.checked },
      app: this.app.input.value || null,
    };
  }

  // What differs from what was loaded; of a new task all.
  changes() {
    const value = this.value();
    if (this.id === null) return value;
    const isOther = ([name]) => JSON.stringify(value[name]) !== JSON.stringify(this.start[name]);
    const changes = Object.fromEntries(Object.entries(value).filter(isOther));
    if ("app" in changes) changes.app_name = null; // it belongs to the former application
    return changes;
  }

  // Whether something would be lost by leaving.
  isChanged() {
    return Boolean(this.form) && !this.isSaved &&
      (JSON.stringify(this.value()) !== JSON.stringify(this.start) || this.fields.some((field) => field.isUnreadable()));
  }

  text() {
    return JSON.stringify({ version: 1, tasks: [this.changes()] });
  }

  typed() {
    const field = this.fields.find((known) => known.element.contains(document.activeElement));
    if (field) this.touched.add(field);
    window.clearTimeout(this.timer);
    this.timer = window.setTimeout(() => this.preview(), PAUSE);
  }

  // Asks for a preview of what was typed. Answers to earlier requests are ignored.
  async preview() {
    this.asked = (this.asked || 0) + 1;
    const number = this.asked;
    try {
      const answer = await askAbout(this.text(), "next", "--preview", "--count", COMING,
        ...(this.id === null ? [] : [String(this.id)]));
      if (number !== this.asked) return null;
      this.showPreview(answer);
      return answer;
    } catch (error) {
      if (number === this.asked) {
        this.showComing([], []);
        setText(this.comingNote, error.message);
      }
      return null;
    }
  }

  // Updated only when it changes, as screen readers announce it then.
  showComing(due, rows) {
    const key = JSON.stringify([due, rows.map(({ isOff }) => isOff)]);
    if (key === this.comingShown) return;
    this.comingShown = key;
    fill(this.coming, ...comingItems(rows));
  }

  comingNoteOf(rows) {
    if (rows.length === 0) return _("Not as it stands.");
    return this.isOn.input.checked ? comingWarning(rows)
      : _("But it is switched off, and does not run until it is switched on.");
  }

  // The faults that the page finds, by field. They hide the tool's faults of the same field.
  ownFaults() {
    const found = this.schedule.faults();
    for (const field of this.fields) {
      if (field.isUnreadable()) found.set(field, _("What stands here is no number, or not complete."));
    }
    return found;
  }

  showPreview({ due, faults }) {
    const unseen = this.ownFaults();
    const told = unseen.size > 0 ? [] : due;
    const rows = comingRows(told, this.model.powerTimes);
    this.showComing(told, rows);
    setText(this.comingNote, this.comingNoteOf(rows));
    this.showFieldFaults(faults, unseen);
  }

  showFieldFaults(faults, unseen) {
    const placed = faults.map(({ place, text }) => ({ place: place.startsWith(PLACE) ? place.slice(PLACE.length) : "", text }));
    for (const field of this.fields) {
      const own = unseen.has(field) ? [unseen.get(field)]
        : placed.filter(({ place }) => this.fieldOf(place) === field).map(({ text }) => this.sentence(text));
      field.tell(this.isSubmitted || this.touched.has(field) ? own : []);
    }
    const others = placed.filter(({ place }) => !this.fieldOf(place));
    this.showFaults(this.isSubmitted ? others.map(({ text }) => this.sentence(text)) : []);
  }

  fieldOf(place) {
    return this.fields.find((field) => field !== this.schedule.type && field.has(place)) ||
      (this.schedule.type.has(place) ? this.schedule.type : null);
  }

  sentence(text) {
    const shown = short(text, 300);
    return shown.charAt(0).toUpperCase() + shown.slice(1) + (/[.!?]$/.test(shown) ? "" : ".");
  }

  showFaults(texts) {
    fill(this.fault, ...texts.map((text) => el("div", { class: "note bad", role: "alert" }, el("p", {}, text))));
  }

  submit(event) {
    event.preventDefault();
    this.saveOnce();
  }

  // Shows the faults of a preview at the fields, or saves where there are none.
  async trySaving() {
    this.isSaving = true;
    this.isSubmitted = true;
    window.clearTimeout(this.timer);
    clearFaults();
    try {
      const answer = await this.preview();
      const unseen = this.ownFaults();
      if (unseen.size > 0 || (answer && answer.faults.length > 0)) {
        if (!answer) this.showFieldFaults([], unseen);
        this.focusFault();
      } else {
        await this.store();
      }
    } catch (error) {
      this.showFaults([error.message]);
    }
    this.isSaving = false;
    if (!this.isClosed) this.update(); // changes that came in meanwhile
  }

  async store() {
    const words = this.id === null ? ["add", "--stdin", "--quiet"]
      : ["edit", String(this.id), "--if-name=" + this.task.name, "--stdin"];
    let said = "";
    let fault = null;
    try {
      said = await change(words, this.text());
    } catch (error) {
      // A new task may have been saved in spite of the error: then its id was printed.
      if (this.id !== null || !/^\d+$/.test((error.output || "").trim())) throw error;
      said = error.output;
      fault = error.message;
    }
    const id = this.id === null ? said.trim() : this.id;
    this.isSaved = true;
    if (fault !== null) tellFault(fault, { isOfNextView: true });
    else tell(format(_("$0 was saved."), short(titleOf({ id, name: this.name.input.value }))));
    if (!this.isClosed) goInstead(taskPath(id));
  }

  focusFault() {
    const field = this.fields.find((known) => known.input.getAttribute("aria-invalid") === "true");
    if (!field) return;
    const details = field.element.closest("details");
    if (details) details.open = true;
    if (field.focus) field.focus();
    else field.input.focus();
  }

  // Reports what others have changed of the task meanwhile.
  tellOf(task) {
    const now = JSON.stringify([task && task.name, task && this.settingsOf(task)]);
    if (now === this.toldOf) return;
    this.toldOf = now;
    if (task === null) {
      this.tellChanged(_("This task has been removed. What stands here can still be saved as a new one."), this.saveAsNew());
    } else if (task.name !== this.task.name) {
      this.tellChanged(format(_("Task $0 is $1 by now. What stands here can be saved as a new one."), this.id, short(titleOf(task))),
        this.saveAsNew(), this.showNow());
    } else if (JSON.stringify(this.settingsOf(task)) !== this.before) {
      this.tellChanged(_("This task has been changed elsewhere. Saving changes only what you have changed here; a schedule is changed whole."), this.showNow());
    } else {
      fill(this.changed);
    }
  }

  tellChanged(text, ...actions) {
    fill(this.changed, el("div", { class: "note warn", role: "alert" }, el("p", {}, text), ...actions));
  }

  showNow() {
    return button(_("Show it as it is now"), { class: "secondary" }, async () => {
      const isAgreed = !this.isChanged() || await confirm({ title: _("Show it as it is now?"),
        text: _("What you have changed here is lost."), action: _("Show it"), isDangerous: true });
      if (!isAgreed) return;
      this.form = null;
      this.update();
    });
  }

  saveAsNew() {
    return button(_("Make it a new task"), { class: "secondary" }, () => {
      this.id = null;
      this.task = null;
      this.name.input.disabled = false;
      this.owner.input.disabled = false;
      setText(this.heading, _("Add a task"));
      setText(this.save, _("Add the task"));
      fill(this.changed);
      this.preview();
      if (isFocusLost()) this.save.focus();
    });
  }

  cancel() {
    go(this.id === null ? [] : taskPath(this.id));
  }

  take() {}

  close() {
    this.isClosed = true;
    window.clearTimeout(this.timer);
    this.asked = Infinity;
  }
}
