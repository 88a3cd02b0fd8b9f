// Whether failures are mailed, and to whom.
import { button, el, setText } from "./dom.js";
import { openDialog } from "./dialogs.js";
import { Field, check } from "./fields.js";
import { ask, change } from "./tool.js";
import { _, format, visible } from "./text.js";

function stateText({ is_on: isOn, to }) {
  if (!isOn) return _("Failures are not mailed.");
  return to === null ? _("Failures are mailed to the owners of the tasks.") : format(_("Failures are mailed to $0."), visible(to));
}

function askForMails(mail, saved) {
  const isOn = check(_("Mail when a task fails, and when it runs well again"), mail.is_on || !mail.to);
  const address = new Field(_("Address"), el("input", { type: "email", value: mail.to || "" }),
    { hint: _("Left empty, each failure is mailed to the owner of its task.") });
  const fault = el("p", { class: "fault", role: "alert" });

  async function save(event) {
    event.preventDefault();
    const to = address.input.value.trim();
    const words = isOn.input.checked ? ["mail", "on", ...(to === "" ? ["--to-owners"] : ["--to=" + to])] : ["mail", "off"];
    try {
      await change(words);
      dialog.close();
      saved();
    } catch (error) {
      setText(fault, error.message.split("\n")[0]);
    }
  }

  const dialog = openDialog(_("Mails"), el("form", { novalidate: true, on: { submit: save } }, el("p", {}, isOn.element),
    address.element,
    mail.has_mailer ? null : el("div", { class: "note warn" },
      el("p", {}, _("This machine has no program that sends mail: nothing is sent until one is installed."))),
    fault, el("div", { class: "actions" }, el("button", { class: "primary" }, _("Save")),
      button(_("Cancel"), { class: "secondary" }, () => dialog.close()))));
}

export class Mails {
  constructor() {
    this.state = el("span");
    this.change = button(_("Mails"), { class: "secondary small" }, () => askForMails(this.mail, () => this.load()));
    this.element = el("p", { class: "mails beside", hidden: true }, this.state, " ", this.change);
    this.load();
  }

  async load() {
    try {
      this.mail = (await ask("mail")).mail;
      setText(this.state, stateText(this.mail));
      this.element.hidden = false;
    } catch (error) {
      this.element.hidden = true;
    }
  }

  show(mayChange) {
    this.change.hidden = !mayChange;
  }
}
