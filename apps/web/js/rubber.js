// A frame drawn with the mouse: what it touches is chosen, with what was chosen before when Ctrl is held.

import { browser } from "./browser.js";
import { $, h } from "./dom.js";

const BEGINS = 5; // pixels: less is a click
const EDGE = 28; // pixels from the edge where the list begins to move
const STEP = 40; // milliseconds

let band = null; // {x, y} in the content, {clientX, clientY} of the pointer, node, chosen: Set of indexes

export function setupRubber() {
  const { root } = browser.view;
  root.addEventListener("pointerdown", (event) => {
    if (event.pointerType !== "mouse" || event.button !== 0 || !browser.listing?.ready || !isFree(event.target)) return;
    const row = event.target.closest(".row");
    if (row) row.draggable = false;
    const at = pointIn(event);
    band = { ...at, row, first: event, ctrl: event.ctrlKey || event.metaKey, node: null, chosen: new Set() };
    addEventListener("pointermove", moved);
    addEventListener("pointerup", end);
    addEventListener("pointercancel", end);
  });
}

// Where nothing is to be dragged: beside the rows, and in a list beside the names of rows that are not chosen.
function isFree(target) {
  const { root } = browser.view;
  const row = target.closest(".row");
  if (!row) return root.contains(target) && !target.closest("button, a, input");
  if (row.matches(".header, .selected") || browser.mode !== "list") return false;
  return !target.closest("button, a, input, .file-icon, .cell.name .label");
}

// In the whole list, as high as it would be.
function pointIn({ clientX, clientY }) {
  const { root, canvas } = browser.view;
  const box = root.getBoundingClientRect();
  return { x: clientX - box.left - canvas.offsetLeft, y: clientY - box.top - canvas.offsetTop + browser.view.measure().top };
}

function moved(event) {
  const { clientX, clientY } = event;
  if (!band.node) {
    if (Math.hypot(clientX - band.first.clientX, clientY - band.first.clientY) < BEGINS) return;
    band.node = h("div.rubber");
    $("content").append(band.node);
    if (!band.ctrl) browser.selection.clear();
    band.timer = setInterval(scroll, STEP);
  }
  band.pointer = { clientX, clientY };
  paint();
}

function scroll() {
  const { root } = browser.view;
  const { top, bottom } = root.getBoundingClientRect();
  const { clientY } = band.pointer;
  const by = clientY < top + EDGE ? clientY - top - EDGE : clientY > bottom - EDGE ? clientY - bottom + EDGE : 0;
  if (by === 0) return;
  root.scrollTop += by;
  paint();
}

function paint() {
  const { view, mode } = browser;
  const { across, height, width, top, room } = view.measure();
  const here = pointIn(band.pointer);
  const frame = {
    left: Math.min(band.x, here.x),
    right: Math.max(band.x, here.x),
    top: Math.min(band.y, here.y),
    bottom: Math.max(band.y, here.y),
  };
  const shift = view.canvas.offsetTop;
  Object.assign(band.node.style, {
    left: `${frame.left + view.canvas.offsetLeft}px`,
    width: `${frame.right - frame.left}px`,
    top: `${Math.max(0, frame.top - top) + shift}px`,
    height: `${Math.max(0, Math.min(room, frame.bottom - top) - Math.max(0, frame.top - top))}px`,
  });
  const lines = [Math.max(0, Math.floor(frame.top / height)), Math.floor(frame.bottom / height)];
  const columns = mode === "list" ? [0, 0] : [Math.max(0, Math.floor(frame.left / width)), Math.min(across - 1, Math.floor(frame.right / width))];
  choose(lines, columns, across);
}

function choose([first, last], [left, right], across) {
  const { listing, selection } = browser;
  const touched = new Set();
  for (let line = first; line <= last; ++line) {
    for (let column = left; column <= right; ++column) {
      const index = line * across + column;
      if (index < listing.total && listing.item(index)) touched.add(index);
    }
  }
  for (const index of touched) {
    if (band.chosen.has(index) || selection.has(index)) continue;
    band.chosen.add(index);
    selection.pick(index, { ctrl: true });
  }
  for (const index of band.chosen) {
    if (touched.has(index)) continue;
    band.chosen.delete(index);
    if (selection.has(index)) selection.pick(index, { ctrl: true });
  }
}

function end() {
  removeEventListener("pointermove", moved);
  removeEventListener("pointerup", end);
  removeEventListener("pointercancel", end);
  clearInterval(band.timer);
  if (band.row) band.row.draggable = true;
  if (band.node) {
    band.node.remove();
    // The click that follows does not count as one.
    const swallow = (event) => event.stopPropagation();
    addEventListener("click", swallow, { capture: true, once: true });
    setTimeout(() => removeEventListener("click", swallow, { capture: true }));
  }
  band = null;
}
