// Adding a task, and changing one. The tool is asked at each change what it would say to it, and
// says when the task would run; nothing is saved by that.
import { button, el, fill, setText } from "./dom.js";
import { go, href, taskPath } from "./address.js";
import { showAccess } from "./access.js";
import { clearNotes, confirm, tell } from "./dialogs.js";
import { Field, Group, check, select } from "./fields.js";
import { distanceText, momentText } from "./moments.js";
import { ScheduleFields } from "./schedule-fields.js";
import { ask, askAbout, change } from "./tool.js";
import { _, format, short, visible } from "./text.js";

const PAUSE = 200; // ms without a key before the tool is asked
const COMING = "5";
const PLACE = "tasks[0].";

const UNITS = () => [["s", _("seconds")], ["m", _("minutes")], ["h", _("hours")], ["d", _("days")]];

// People first: they are who tasks are for. A hint of the store's owner is kept even when the machine
// does not list him.
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
    this.id = path[0] === "task" ? Number(path[1]) : null;
    this.title = this.id === null ? _("Add a task") : _("Edit the task");
    this.update();
  }

  // The form is made once. What comes in later is told, and does not touch what was typed.
  update() {
    if (!this.model.isLoaded || this.model.mayChange === null) return;
    const task = this.id === null ? null : this.model.taskOf(this.id);
    if (!this.form) {
      this.make(task);
    } else if (task && JSON.stringify(this.settingsOf(task)) !== this.before) {
      this.tellChanged();
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
    this.task = task;
    this.before = task && JSON.stringify(this.settingsOf(task));
    this.makeFields(task || { name: "", command: "", owner: "root", enabled: true, schedule: null, time_limit: null,
      overlap: { task: false, app: true }, app: null, ui: { can_edit_name: true, can_edit_owner: true } });
    this.fault = el("div");
    this.changed = el("div");
    this.coming = el("ol", { class: "coming" });
    this.comingNote = el("p", { class: "beside" });
    this.save = el("button", { class: "primary" }, this.id === null ? _("Add the task") : _("Save"));
    this.form = el("form", { novalidate: true, on: { submit: (event) => this.submit(event), input: () => this.typed() } },
      el("h2", { class: "long" }, this.id === null ? _("Add a task") : format(_("Edit $0"), short(task.name))),
      this.changed,
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
    this.start = JSON.stringify(this.value());
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

  // An owner without a name has a number.
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

  text() {
    return JSON.stringify({ version: 1, tasks: [this.value()] });
  }

  typed() {
    const field = this.fields.find((known) => known.element.contains(document.activeElement));
    if (field) this.touched.add(field);
    window.clearTimeout(this.timer);
    this.timer = window.setTimeout(() => this.preview(), PAUSE);
  }

  named(...words) {
    return this.id === null ? words : [...words, String(this.id)];
  }

  // What the tool says to what stands there. The answer to an older question is passed over.
  async preview() {
    this.asked = (this.asked || 0) + 1;
    const number = this.asked;
    try {
      const answer = await askAbout(this.text(), ...this.named("next", "--preview", "--count", COMING));
      if (number !== this.asked) return null;
      this.showPreview(answer);
      return answer;
    } catch (error) {
      if (number === this.asked) setText(this.comingNote, error.message);
      return null;
    }
  }

  showPreview({ due, faults }) {
    fill(this.coming, ...due.map((time) => el("li", {}, momentText(time) + " ",
      el("span", { class: "beside" }, distanceText(time)))));
    setText(this.comingNote, due.length > 0 ? "" : _("Not as it stands."));
    const placed = faults.map(({ place, text }) => ({ place: place.startsWith(PLACE) ? place.slice(PLACE.length) : "", text }));
    for (const field of this.fields) {
      const own = placed.filter(({ place }) => this.fieldOf(place) === field);
      field.tell(this.isSubmitted || this.touched.has(field) ? own.map(({ text }) => this.sentence(text)) : []);
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

  // First what the tool would say, beside the fields; then it is saved. What was typed stays in any case.
  async submit(event) {
    event.preventDefault();
    if (this.isSaving) return;
    this.isSaving = true;
    this.isSubmitted = true;
    this.save.disabled = true;
    window.clearTimeout(this.timer);
    clearNotes();
    try {
      const answer = await this.preview();
      if (answer && answer.faults.length > 0) {
        this.focusFault();
      } else {
        await this.store();
      }
    } catch (error) {
      this.showFaults([error.message]);
    }
    this.save.disabled = false;
    this.isSaving = false;
  }

  async store() {
    const words = this.id === null ? ["add", "--stdin", "--quiet"] : ["edit", String(this.id), "--stdin"];
    const said = await change(words, this.text());
    const id = this.id === null ? said.trim() : this.id;
    this.isSaved = true;
    await this.model.refresh();
    tell(format(_("$0 was saved."), short(this.name.input.value)));
    go(taskPath(id));
  }

  focusFault() {
    const field = this.fields.find((known) => known.input.getAttribute("aria-invalid") === "true");
    if (!field) return;
    const details = field.element.closest("details");
    if (details) details.open = true;
    if (field.focus) field.focus();
    else field.input.focus();
  }

  tellChanged() {
    fill(this.changed, el("div", { class: "note warn", role: "alert" },
      el("p", {}, _("This task has been changed elsewhere. Saving puts what stands here in its place.")),
      button(_("Show it as it is now"), { class: "secondary" }, () => {
        this.form = null;
        this.update();
      })));
  }

  async cancel() {
    const isChanged = JSON.stringify(this.value()) !== this.start;
    if (isChanged && !await confirm({ title: _("Leave without saving?"), text: _("What you have changed here is lost."),
      action: _("Leave"), isDangerous: true })) return;
    go(this.id === null ? [] : taskPath(this.id));
  }

  take() {}

  close() {
    window.clearTimeout(this.timer);
    this.asked = Infinity;
  }
}
