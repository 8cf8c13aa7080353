"use strict";
const byId = (id) => document.getElementById(id);

// Formats a time as m:ss.t, with hours if needed.
function clock(ms) {
  const tenths = Math.max(0, Math.round(ms / 100));
  const [h, m, s] = [tenths / 36000, tenths / 600 % 60, tenths / 10 % 60].map(Math.floor);
  const two = (number) => String(number).padStart(2, "0");
  return `${h > 0 ? `${h}:${two(m)}` : m}:${two(s)}.${tenths % 10}`;
}

function element(name, ...content) {
  const made = document.createElement(name);
  made.append(...content);
  return made;
}

// Returns a new SVG element, appended to the parent unless that is null.
function shape(name, attributes, parent) {
  const made = document.createElementNS("http://www.w3.org/2000/svg", name);
  for (const key in attributes) made.setAttribute(key, attributes[key]);
  if (parent !== null) parent.append(made);
  return made;
}

function download(name, type, content) {
  const link = element("a");
  link.href = URL.createObjectURL(new Blob([content], { type }));
  link.download = name;
  link.click();
  setTimeout(() => URL.revokeObjectURL(link.href), 1000);
}
