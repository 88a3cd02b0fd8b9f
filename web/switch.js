// A cell of a table with a switch.
import { el, setAttribute } from "./dom.js";
import { _, format } from "./text.js";

// For a column of a table. `set(row, isOn)` gives whether it succeeded, `nameOf(row)` a name.
export function switchCell({ mayChange, set, nameOf }) {
  const wishes = new Map(); // wanted states by id, while requests run

  // One request at a time. If the switch is used meanwhile, the last choice is applied next.
  async function follow(row, isOn) {
    const isGoing = wishes.has(row.id);
    wishes.set(row.id, isOn);
    if (isGoing) return;
    let isDone = true;
    for (let wanted = null; isDone && wanted !== wishes.get(row.id);) {
      wanted = wishes.get(row.id);
      isDone = await set(row, wanted);
    }
    wishes.delete(row.id);
  }

  return (cell) => {
    let shown = null;
    const box = el("input", { type: "checkbox", role: "switch" });
    const show = () => { box.checked = wishes.has(shown.id) ? wishes.get(shown.id) : shown.enabled; };
    box.addEventListener("change", () => {
      const row = shown;
      follow(row, box.checked).then(show);
    });
    cell.append(box);
    return (row) => {
      shown = row;
      box.disabled = !mayChange();
      show();
      setAttribute(box, "aria-label", format(_("$0 is switched on"), nameOf(row)));
    };
  };
}
