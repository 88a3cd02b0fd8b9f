// A table whose rows stay the same elements as long as they are shown, so that an update keeps the
// focus and a selection.
import { button, el, focusIn, isFocusLost, place, setAttribute, setText } from "./dom.js";
import { format, ngettext } from "./text.js";

const PAGE = 60; // rows shown at once: more are slow to lay out

// A column is {key, label, make(cell), isSortable}; make gives a function that shows a row there.
export class Table {
  constructor({ caption, columns, sorted }) {
    this.columns = columns;
    this.rows = new Map(); // by their keys, in their order
    this.spare = []; // unused rows: making one takes longer than filling it
    this.shown = PAGE;
    this.keyOf = (row) => row.id;
    this.heads = new Map();
    this.body = el("tbody");
    this.more = button("", { class: "secondary" }, () => this.showMore());
    this.left = el("div", { class: "more", hidden: true }, this.more);
    const head = columns.map((column) => this.makeHead(column, sorted));
    this.table = el("table", {}, el("caption", { class: "unseen" }, caption),
      el("thead", {}, el("tr", {}, ...head)), this.body);
    this.element = el("div", { class: "table" }, this.table, this.left);
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

  // Shows another choice of rows, from the first page on. It fills the elements in their order,
  // which is faster than moving them; the focus is where the choice is made, not in a row.
  showOthers(rows) {
    this.shown = PAGE;
    const free = [...this.rows.values()];
    this.showIn(rows, () => free.shift() || this.spare.pop() || this.makeRow());
  }

  // Shows the same rows, updated.
  show(rows) {
    const { rows: before } = this;
    const keys = new Set(rows.slice(0, this.shown).map(this.keyOf));
    const free = [...before].filter(([key]) => !keys.has(key)).map(([, built]) => built);
    this.showIn(rows, (key) => before.get(key) || free.pop() || this.spare.pop() || this.makeRow());
  }

  showIn(rows, rowFor) {
    this.last = rows;
    const focused = this.focused();
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
    place(this.body, [...kept.values()].map((built) => built.element));
    const left = rows.length - kept.size;
    const next = Math.min(left, PAGE);
    setText(this.more, format(ngettext("Show $0 more", "Show $0 more", next), next));
    this.left.hidden = left === 0;
    if (focused && isFocusLost()) this.giveFocus(focused);
  }

  // Which row and cell the focus is in.
  focused() {
    const cell = document.activeElement && document.activeElement.closest("td");
    if (!cell || !this.body.contains(cell)) return null;
    return { row: [...this.body.children].indexOf(cell.parentElement), cell: cell.cellIndex };
  }

  // For a row that is gone: to the same cell of the row in its place.
  giveFocus({ row, cell }) {
    const instead = this.body.children[Math.min(row, this.body.children.length - 1)];
    if (instead && !focusIn(instead.children[cell])) focusIn(instead);
  }

  showMore() {
    const before = this.body.children.length;
    this.shown += PAGE;
    this.show(this.last);
    if (this.body.children[before]) focusIn(this.body.children[before]);
  }
}
