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

let lastId = 0;
export function newId() {
  lastId += 1;
  return "id" + lastId;
}
