// Elements. What is no element is put in as text, never as markup.

const SVG = "http://www.w3.org/2000/svg";

function build(element, attributes, children) {
  for (const [name, value] of Object.entries(attributes || {})) {
    if (value === null || value === undefined || value === false) continue;
    if (name === "on") {
      for (const [event, listener] of Object.entries(value)) element.addEventListener(event, listener);
    } else if (name === "value" || name === "checked" || name === "disabled" || name === "hidden") {
      element[name] = value;
    } else {
      element.setAttribute(name, value === true ? "" : String(value));
    }
  }
  element.append(...children.flat().filter((child) => child !== null && child !== undefined));
  return element;
}

// el("button", {class: "plain", on: {click: go}}, "Go")
export function el(tag, attributes, ...children) {
  return build(document.createElement(tag), attributes, children);
}

export function svg(tag, attributes, ...children) {
  return build(document.createElementNS(SVG, tag), attributes, children);
}

export function fill(element, ...children) {
  element.replaceChildren(...children.flat().filter((child) => child !== null && child !== undefined));
}

// Only what differs is written, so that a selection and the focus stay.
export function setText(element, text) {
  if (element.textContent !== text) element.textContent = text;
}

export function setAttribute(element, name, value) {
  if (value === null || value === undefined) {
    element.removeAttribute(name);
  } else if (element.getAttribute(name) !== String(value)) {
    element.setAttribute(name, String(value));
  }
}

export function button(label, attributes, click) {
  return el("button", { type: "button", ...attributes, on: { click } }, label);
}

// The children in that order. Moving an element takes the focus from it, so only what stands elsewhere
// is moved.
export function place(parent, elements) {
  elements.forEach((element, i) => {
    if (parent.children[i] !== element) parent.insertBefore(element, parent.children[i] || null);
  });
  while (parent.children.length > elements.length) parent.lastElementChild.remove();
}

const CAN_HAVE_FOCUS = "a[href], button, input, select, textarea, [tabindex='0']";

// The first thing there that can be used.
export function focusIn(element) {
  const found = [...element.querySelectorAll(CAN_HAVE_FOCUS)].find((one) => !one.disabled && one.checkVisibility());
  if (found) found.focus();
  return Boolean(found);
}

// Whether the focused element is gone or hidden, so that a keyboard user would start again.
export function isFocusLost() {
  const { activeElement } = document;
  return !activeElement || activeElement === document.body || !activeElement.checkVisibility();
}

let lastId = 0;
export function newId() {
  lastId += 1;
  return "id" + lastId;
}
