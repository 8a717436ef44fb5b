// What was copied or cut, until it is pasted.

import { emit } from "./events.js";

let held = null; // {ids: Set, cut}

export function hold(ids, cut) {
  held = { ids: new Set(ids), cut };
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
  return held !== null && held.cut && held.ids.has(id);
}
