// Dialogs, and notes about what was done.
import { button, el, fill, isFocusLost, newId } from "./dom.js";
import { oneAtATime } from "./turns.js";
import { _ } from "./text.js";

// A modal dialog with a heading, which close() ends. The browser keeps the focus inside, closes it
// by Escape, and returns the focus. The view gets it where the element that had it is gone.
export function openDialog(title, ...content) {
  const id = newId();
  const dialog = el("dialog", { "aria-labelledby": id }, el("h2", { id }, title), ...content);
  dialog.addEventListener("close", () => {
    dialog.remove();
    if (isFocusLost()) document.querySelector("main").focus();
  });
  document.body.append(dialog);
  dialog.showModal();
  return dialog;
}

// Closes the dialog, and says why, when what it is about has gone. `subject` is {model, isThere, gone}.
function closeWithout({ model, isThere, gone }, dialog) {
  const look = () => {
    if (isThere()) return;
    dialog.close();
    tellFault(gone);
  };
  model.addEventListener("changed", look);
  dialog.addEventListener("close", () => model.removeEventListener("changed", look));
}

// Whether it was agreed to. The button that changes nothing has the focus.
export function confirm({ title, text, action, subject = null, isDangerous = false }) {
  return new Promise((resolve) => {
    let answer = false;
    const cancel = button(_("Cancel"), { class: "secondary", autofocus: true }, () => dialog.close());
    const agree = button(action, { class: isDangerous ? "danger" : "primary" }, () => {
      answer = true;
      dialog.close();
    });
    const dialog = openDialog(title, el("p", {}, text), el("div", { class: "actions" }, agree, cancel));
    if (subject) closeWithout(subject, dialog);
    dialog.addEventListener("close", () => resolve(answer));
  });
}

// A form in a dialog: `save` is not called again while it runs, gives false to keep the dialog
// open, and throws an error to show. `more` makes further buttons for the dialog.
export function openForm({ title, fields, save, subject = null, more = () => [] }) {
  const fault = el("p", { class: "fault", role: "alert" });
  let isSaving = false; // saving may change the id
  const submit = oneAtATime(async () => {
    isSaving = true;
    try {
      if (await save() !== false) dialog.close();
    } catch (error) {
      fill(fault, error.message);
    }
    isSaving = false;
  });
  const actions = el("div", { class: "actions" }, el("button", { class: "primary" }, _("Save")));
  const dialog = openDialog(title, el("form", { novalidate: true, on: { submit: (event) => {
    event.preventDefault();
    submit();
  } } }, ...fields, fault, actions));
  actions.append(...more(dialog), button(_("Cancel"), { class: "secondary" }, () => dialog.close()));
  if (subject) closeWithout({ ...subject, isThere: () => isSaving || subject.isThere() }, dialog);
}

// Screen readers announce notes. A note of success stays until it is dismissed, the next one comes,
// or the second view after it is shown: the first may be where the action led. A note of a fault
// stays until the next action, or another view.
const place = el("div", { class: "notes" });

export function notesPlace() {
  return place;
}

let viewsLeft = 0; // that are shown before the note is removed

export function clearFaults() {
  if (place.querySelector(".bad")) fill(place);
}

export function clearNotesOfView() {
  if (viewsLeft === 0) fill(place);
  else viewsLeft -= 1;
}

function note(kind, role, text, views) {
  viewsLeft = views;
  fill(place, el("div", { class: "note " + kind, role }, el("p", {}, text),
    button(_("Dismiss"), { class: "plain" }, () => fill(place))));
}

export function tellFault(text, { isOfNextView = false } = {}) {
  note("bad", "alert", text, isOfNextView ? 1 : 0);
}

export function tell(text) {
  note("good", "status", text, 1);
}

// Runs a step and shows its error. Whether it succeeded.
export async function attempt(step) {
  clearFaults();
  try {
    await step();
    return true;
  } catch (error) {
    tellFault(error.message);
    return false;
  }
}
