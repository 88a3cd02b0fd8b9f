// Whether failures are mailed, and to whom.
import { button, el, setText } from "./dom.js";
import { openForm } from "./dialogs.js";
import { Field, check } from "./fields.js";
import { change } from "./tool.js";
import { _, format, visible } from "./text.js";

function withoutMailer() {
  return _("This machine has no program that sends mail: nothing is sent until one is installed.");
}

function wishText({ is_on: isOn, to, fault }) {
  if (!isOn) return _("Failures are not mailed.");
  if (fault) return format(_("To whom failures are mailed is not known: $0"), visible(fault));
  return to === null ? _("Failures are mailed to the owners of the tasks.") : format(_("Failures are mailed to $0."), visible(to));
}

function stateText(mail) {
  return mail.is_on && !mail.has_mailer ? wishText(mail) + " " + withoutMailer() : wishText(mail);
}

function askForMails(mail) {
  const isOn = check(_("Mail when a task fails, and when it runs well again"), mail.is_on || !mail.to);
  const address = new Field(_("Address"), el("input", { type: "email", value: mail.to || "" }),
    { hint: _("Left empty, each failure is mailed to the owner of its task, on this machine, where somebody must read it.") });
  openForm({
    title: _("Mails"),
    fields: [el("p", {}, isOn.element), address.element,
      mail.has_mailer ? null : el("div", { class: "note warn" },
        el("p", {}, withoutMailer()))],
    save: () => {
      const to = address.input.value.trim();
      return change(isOn.input.checked ? ["mail", "on", ...(to === "" ? ["--to-owners"] : ["--to=" + to])] : ["mail", "off"]);
    },
  });
}

export class Mails {
  constructor() {
    this.state = el("span");
    this.change = button(_("Mails"), { class: "secondary small" }, () => askForMails(this.mail));
    this.element = el("p", { class: "mails beside", hidden: true }, this.state, " ", this.change);
  }

  show({ mail, mayChange }) {
    this.mail = mail;
    this.element.hidden = mail === null;
    this.change.hidden = !mayChange;
    if (mail !== null) setText(this.state, stateText(mail));
  }
}
