// Fields of forms: a label, an input, a hint, and what is wrong with it.
import { el, fill, newId, setAttribute } from "./dom.js";
import { weekdayText } from "./moments.js";
import { DAYS } from "./words.js";
import { _ } from "./text.js";

// `places` are the members of a task that the field is about.
export class Field {
  constructor(label, input, { places = [], hint = null } = {}) {
    const id = newId();
    this.input = input;
    this.places = places;
    this.fault = el("p", { class: "fault", id: id + "-fault" });
    const said = [id + "-fault", hint ? id + "-hint" : null].filter((part) => part).join(" ");
    input.setAttribute("aria-describedby", said);
    input.id = id;
    this.element = el("div", { class: "field" }, el("label", { for: id }, label), input,
      hint ? el("p", { class: "hint", id: id + "-hint" }, hint) : null, this.fault);
  }

  has(place) {
    return this.places.some((own) => place === own || place.startsWith(own + "[") || place.startsWith(own + "."));
  }

  // Whether the input is no number or no complete date, for which the browser gives an empty value.
  isUnreadable() {
    return [this.input, ...this.input.querySelectorAll("input")].some((input) => input.validity && input.validity.badInput);
  }

  tell(texts) {
    fill(this.fault, texts.join(" "));
    setAttribute(this.input, "aria-invalid", texts.length > 0 ? "true" : null);
  }
}

// Several inputs under one label.
export class Group extends Field {
  constructor(label, inputs, options = {}) {
    super(label, el("div", { class: "group", role: "group" }, ...inputs), options);
    const id = newId();
    const heading = this.element.querySelector("label");
    const span = el("span", { class: "label", id }, label);
    heading.replaceWith(span);
    this.input.setAttribute("aria-labelledby", id);
  }

  focus() {
    this.input.querySelector("input, select").focus();
  }
}

export function check(label, isChecked) {
  const input = el("input", { type: "checkbox", checked: isChecked });
  return { input, element: el("label", { class: "check" }, input, label) };
}

export function select(choices, value) {
  const input = el("select", {}, ...choices.map(([key, label]) => el("option", { value: key }, label)));
  input.value = value;
  return input;
}

// The days of the week. `chosen` has the names of those that are on, as in schedules.
export class DaysField extends Group {
  constructor(chosen, options) {
    const boxes = DAYS.map((day, i) => check(weekdayText(i, "short"), chosen.includes(day)));
    boxes.forEach((box, i) => box.input.setAttribute("aria-label", weekdayText(i, "long")));
    super(_("Days"), boxes.map((box) => box.element), options);
    this.boxes = boxes;
  }

  value() {
    return DAYS.filter((day, i) => this.boxes[i].input.checked);
  }
}
