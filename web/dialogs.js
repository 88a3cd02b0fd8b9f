// Dialogs, and notes about what was done.
import { button, el, fill, isFocusLost, newId } from "./dom.js";
import { oneAtATime } from "./turns.js";
import { _ } from "./text.js";

// A dialog with a heading; `close` of it ends it. The browser keeps the focus inside, closes it by
// Escape and gives the focus back, to the view when what had it has gone.
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

// A form in a dialog: `save` is called once for however many clicks, and throws what stands in the way.
// `more` are buttons beside the usual ones, each made for the dialog.
export function openForm({ title, fields, save, subject = null, more = () => [] }) {
  const fault = el("p", { class: "fault", role: "alert" });
  let isSaving = false; // what is saved may take another id by that
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

// Read out when they appear. What was done stays until it is dismissed, the next one comes, or a second view
// is shown: the first may be the one that it led to. What was not done stays until something else is, or
// another view is shown.
const place = el("div", { class: "notes" });

export function notesPlace() {
  return place;
}

let viewsLeft = 0; // that are shown before the note goes

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

// Does something that may be refused. Whether it was done.
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
