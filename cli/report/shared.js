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

// Converts a song's times to those of a player, which drops the encoder delay.
function toPlayerTime(song) {
  const convert = (ms) => Math.max(ms - song.offset_ms, 0);
  for (const key of ["hl_pos_ms", "hl_end_ms", "region_end_ms", "beats_ms", "searched_ms"]) {
    if (key in song) song[key] = Array.isArray(song[key]) ? song[key].map(convert) : convert(song[key]);
  }
  return song;
}

// Returns a new SVG element, appended to the parent if there is one.
function shape(name, attributes, parent) {
  const made = document.createElementNS("http://www.w3.org/2000/svg", name);
  for (const key in attributes) made.setAttribute(key, attributes[key]);
  parent?.append(made);
  return made;
}

// Draws a line through points, which are pairs of x and y. A style of the class may fill it.
function drawLine(kind, points, parent) {
  return shape("polyline", { class: kind, points: points.join(" ") }, parent);
}

function download(name, type, content) {
  const link = element("a");
  link.href = URL.createObjectURL(new Blob([content], { type }));
  link.download = name;
  link.click();
  setTimeout(() => URL.revokeObjectURL(link.href), 1000);
}
