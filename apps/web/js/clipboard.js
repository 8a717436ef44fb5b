// What was copied or cut, until it is pasted.

import { emit } from "./events.js";

let held = null; // {entries: Map by id, cut}

export function hold(entries, cut) {
  held = { entries: new Map(entries.map((entry) => [entry.id, entry])), cut };
  emit("selection");
}

export function letGo() {
  held = null;
  emit("selection");
}

export function heldItems() {
  return held;
}

export function isCut(id) {
  return held !== null && held.cut && held.entries.has(id);
}
