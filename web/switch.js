// A cell of a table with a switch.
import { el, setAttribute } from "./dom.js";
import { _, format } from "./text.js";

// For a column of a table. `set(row, isOn)` tells whether it was done, `nameOf(row)` what is switched.
export function switchCell({ mayChange, set, nameOf }) {
  const wishes = new Map(); // how what is being switched shall be, by its id: the element may show another row by then

  // One request at a time; who switches again meanwhile gets what he chose last.
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
