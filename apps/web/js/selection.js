// Which rows are chosen, and where the keyboard stands.

import { Ranges } from "./ranges.js";

export class Selection {
  constructor(onChange) {
    this.ranges = new Ranges();
    this.cursor = 0;
    this.anchor = 0;
    this.onChange = onChange;
  }

  get count() {
    return this.ranges.count;
  }

  has(index) {
    return this.ranges.has(index);
  }

  // A click or a key on a row: alone, to add or take away (ctrl), or everything from the last one on (shift).
  pick(index, { shift = false, ctrl = false } = {}) {
    if (shift) {
      if (!ctrl) this.ranges.clear();
      this.ranges.add(Math.min(this.anchor, index), Math.max(this.anchor, index));
    } else if (ctrl) {
      this.ranges.toggle(index);
      this.anchor = index;
    } else {
      this.ranges.set(index, index);
      this.anchor = index;
    }
    this.cursor = index;
    this.onChange();
  }

  move(index) {
    this.cursor = index;
    this.onChange();
  }

  all(total) {
    this.ranges.set(0, total - 1);
    this.onChange();
  }

  clear() {
    this.ranges.clear();
    this.onChange();
  }

  reset() {
    this.cursor = 0;
    this.anchor = 0;
    this.clear();
  }

  // What was chosen as ids is looked up again in a list that has changed.
  restore(indexes, cursor) {
    this.ranges.clear();
    for (const index of indexes) this.ranges.add(index, index);
    if (cursor !== null) this.cursor = this.anchor = cursor;
    this.onChange();
  }
}
