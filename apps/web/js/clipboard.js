// What was copied or cut, until it is pasted.

import { emit } from "./events.js";
import { holds, parse } from "./ranges.js";

let held = null; // {choice, ids, ranges, cut}

export function hold(choice, cut) {
  const ids = new Set(choice.entries.map((entry) => entry.id));
  held = { choice, ids, ranges: choice.rows ? parse(choice.rows.ranges) : [], cut };
  emit("selection");
}

export function letGo() {
  held = null;
  emit("selection");
}

export function heldItems() {
  return held;
}

// A row of a listing.
export function isCut(id, listing, index) {
  if (held === null || !held.cut) return false;
  return held.ids.has(id) || (held.choice.rows?.listing === listing.kept && holds(held.ranges, index));
}
