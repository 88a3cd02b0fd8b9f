// Dialogs, and notes about what was done.
import { button, el, fill, newId } from "./dom.js";
import { _ } from "./text.js";

// A dialog with a heading; `close` of it ends it. The browser keeps the focus inside, closes it by
// Escape and gives the focus back.
export function openDialog(title, ...content) {
  const id = newId();
  const dialog = el("dialog", { "aria-labelledby": id }, el("h2", { id }, title), ...content);
  dialog.addEventListener("close", () => dialog.remove());
  document.body.append(dialog);
  dialog.showModal();
  return dialog;
}

// Whether it was agreed to. The button that changes nothing has the focus.
export function confirm({ title, text, action, isDangerous = false }) {
  return new Promise((resolve) => {
    let answer = false;
    const cancel = button(_("Cancel"), { class: "secondary", autofocus: true }, () => dialog.close());
    const agree = button(action, { class: isDangerous ? "danger" : "primary" }, () => {
      answer = true;
      dialog.close();
    });
    const dialog = openDialog(title, el("p", {}, text), el("div", { class: "actions" }, agree, cancel));
    dialog.addEventListener("close", () => resolve(answer));
  });
}

// Read out when they appear, and there until they are dismissed or the next one comes.
const place = el("div", { class: "notes" });

export function notesPlace() {
  return place;
}

export function clearNotes() {
  fill(place);
}

function note(kind, role, text) {
  fill(place, el("div", { class: "note " + kind, role }, el("p", {}, text),
    button(_("Dismiss"), { class: "plain" }, clearNotes)));
}

export function tellFault(text) {
  note("bad", "alert", text);
}

export function tell(text) {
  note("good", "status", text);
}

// Does something that may be refused. Whether it was done.
export async function attempt(step) {
  try {
    await step();
    return true;
  } catch (error) {
    tellFault(error.message);
    return false;
  }
}
