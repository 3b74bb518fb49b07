// What all pages share: the data, elements and numbers.
"use strict";

const data = JSON.parse(document.getElementById("data").textContent);

const shapes = new Set(["svg", "g", "path", "line", "text", "circle", "rect"]);

/** An element with attributes (a function is a listener) and children. */
function make(name, attributes = {}, ...children) {
  const element = shapes.has(name) ? document.createElementNS("http://www.w3.org/2000/svg", name)
    : document.createElement(name);
  for (const [key, value] of Object.entries(attributes)) {
    if (typeof value === "function") element.addEventListener(key, value);
    else if (value !== null && value !== false) element.setAttribute(key, value === true ? "" : value);
  }
  element.append(...children.filter((child) => child !== null));
  return element;
}

const numberFormat = new Intl.NumberFormat("en");
const formatNumber = (number) => numberFormat.format(number);
const counted = (number, one, many = `${one}s`) => `${formatNumber(number)} ${number === 1 ? one : many}`;
