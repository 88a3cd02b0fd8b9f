// A table whose rows stay the same elements as long as they are shown, so that what comes in from
// elsewhere takes away neither the focus nor a selection.
import { button, el, fill, setAttribute } from "./dom.js";
import { _, format } from "./text.js";

const PAGE = 60; // rows shown at once: more are slow to lay out, and nobody reads them

// A column is {key, label, make(cell), isSortable}; make returns what shows a row in that cell.
export class Table {
  constructor({ caption, columns, sorted }) {
    this.columns = columns;
    this.rows = new Map(); // by their keys, in their order
    this.spare = []; // making a row takes more time than filling it
    this.shown = PAGE;
    this.keyOf = (row) => row.id;
    this.heads = new Map();
    this.body = el("tbody");
    this.more = el("div", { class: "more" });
    const head = columns.map((column) => this.makeHead(column, sorted));
    this.table = el("table", {}, el("caption", { class: "unseen" }, caption),
      el("thead", {}, el("tr", {}, ...head)), this.body);
    this.element = el("div", { class: "table" }, this.table, this.more);
  }

  makeHead(column, sorted) {
    const cell = el("th", { scope: "col", class: "c-" + column.key });
    if (column.isSortable) {
      cell.append(button(column.label, { class: "sort" }, () => sorted(column.key)));
    } else {
      cell.append(el("span", {}, column.label));
    }
    this.heads.set(column.key, cell);
    return cell;
  }

  showOrder(key, isDescending) {
    for (const [name, cell] of this.heads) {
      setAttribute(cell, "aria-sort", name !== key ? null : isDescending ? "descending" : "ascending");
    }
  }

  makeRow() {
    const element = el("tr");
    const updates = this.columns.map((column) => {
      const cell = el("td", { class: "c-" + column.key, "data-label": column.label });
      element.append(cell);
      return column.make(cell);
    });
    return { element, update: (row) => updates.forEach((update) => update(row, element)) };
  }

  // Another choice of rows: from the first page on, and in the elements as they stand, since the focus
  // is where the choice is made, and filling rows takes less time than moving them.
  showOthers(rows) {
    this.shown = PAGE;
    const free = [...this.rows.values()];
    this.showIn(rows, () => free.shift() || this.spare.pop() || this.makeRow());
  }

  // The same rows as they are now.
  show(rows) {
    const { rows: before } = this;
    const keys = new Set(rows.slice(0, this.shown).map(this.keyOf));
    const free = [...before].filter(([key]) => !keys.has(key)).map(([, built]) => built);
    this.showIn(rows, (key) => before.get(key) || free.pop() || this.spare.pop() || this.makeRow());
  }

  showIn(rows, rowFor) {
    this.last = rows;
    const kept = new Map();
    for (const row of rows.slice(0, this.shown)) {
      const key = this.keyOf(row);
      const built = rowFor(key);
      built.update(row);
      kept.set(key, built);
    }
    const used = new Set(kept.values());
    this.spare.push(...[...this.rows.values()].filter((built) => !used.has(built)));
    this.rows = kept;
    this.place([...kept.values()].map((built) => built.element));
    const left = rows.length - kept.size;
    fill(this.more, left > 0 ? button(format(_("Show $0 more"), Math.min(left, PAGE)),
      { class: "secondary" }, () => this.showMore()) : null);
  }

  // Moving an element takes the focus from it, so only what stands elsewhere is moved.
  place(elements) {
    elements.forEach((element, i) => {
      if (this.body.children[i] !== element) this.body.insertBefore(element, this.body.children[i] || null);
    });
    while (this.body.children.length > elements.length) this.body.lastElementChild.remove();
  }

  showMore() {
    this.shown += PAGE;
    this.show(this.last);
  }
}
