// What is chosen, as the entries themselves: a row number means something else as soon as somebody changes the folder.
// Rows that were never loaded are asked for the moment they are chosen; until their names have come, they count as
// chosen and nothing is done with them.

import { isAbort } from "./api.js";

export class Selection {
  // onChange: to paint; onFailure(failure): names could not be had, null when the folder has changed meanwhile.
  constructor({ onChange, onFailure }) {
    this.onChange = onChange;
    this.onFailure = onFailure;
    this.listing = null;
    this.chosen = new Map(); // id -> entry
    this.pending = null; // {first, last, stop, done}
    this.cursor = 0;
    this.anchor = { index: 0, id: undefined };
  }

  get count() {
    return this.chosen.size + (this.pending ? this.pending.last - this.pending.first + 1 : 0);
  }

  // The only chosen entry, else nothing.
  get single() {
    return this.count === 1 && !this.pending ? this.chosen.values().next().value : undefined;
  }

  get first() {
    return this.chosen.values().next().value;
  }

  // Whether the row shows as chosen.
  has(index) {
    if (this.pending && index >= this.pending.first && index <= this.pending.last) return true;
    const entry = this.chosen.size > 0 ? this.listing?.item(index) : undefined;
    return entry !== undefined && this.chosen.has(entry.id);
  }

  // Every chosen entry, once all their names are known.
  async entries() {
    while (this.pending) await this.pending.done;
    return [...this.chosen.values()];
  }

  // A click or a key on a row: alone, to add or take away (ctrl), or everything from the last one on (shift).
  pick(index, { shift = false, ctrl = false } = {}) {
    const entry = this.listing.item(index);
    const here = { index, id: entry?.id, end: index === this.listing.total - 1 };
    this.cursor = index;
    if (ctrl && this.pending) return this.pickLater(here, { shift, ctrl });
    this.stop();
    if (!ctrl) this.chosen.clear();
    if (shift) this.choose(this.anchor, here);
    else {
      this.anchor = here;
      if (!entry) return this.awaitRow(index);
      if (ctrl && this.chosen.has(entry.id)) this.chosen.delete(entry.id);
      else this.chosen.set(entry.id, entry);
    }
    return this.onChange();
  }

  // What is being asked for stays when more is added to it.
  async pickLater({ index, id }, keys) {
    await this.pending.done;
    if (this.listing.item(index)?.id === id) this.pick(index, keys);
  }

  // The entry at that row, and nothing else.
  only(entry, index) {
    this.stop();
    this.chosen.clear();
    this.chosen.set(entry.id, entry);
    this.cursor = index;
    this.anchor = { index, id: entry.id };
    this.onChange();
  }

  move(index) {
    this.cursor = index;
    this.onChange();
  }

  all() {
    this.stop();
    this.chosen.clear();
    this.choose({ index: 0 }, { index: this.listing.total - 1, end: true });
    this.onChange();
  }

  clear() {
    this.stop();
    this.chosen.clear();
    this.onChange();
  }

  remove(ids) {
    for (const id of ids) this.chosen.delete(id);
    this.onChange();
  }

  // Another place: nothing is chosen there.
  reset(listing) {
    this.listing = listing;
    this.cursor = 0;
    this.anchor = { index: 0, id: undefined };
    this.clear();
  }

  // The same place in another order: what is chosen stays, and what is being asked for comes.
  follow(listing) {
    this.listing = listing;
    this.cursor = 0;
    this.anchor = { index: 0, id: undefined };
    this.onChange();
  }

  stand(index) {
    this.cursor = index;
    this.anchor = { index, id: this.listing.item(index)?.id };
  }

  stop() {
    this.pending?.stop.abort();
    this.pending = null;
  }

  // The row under the keyboard, which has not come yet: chosen once it is there, if the keyboard still stands on it.
  async awaitRow(index) {
    this.onChange();
    const { listing } = this;
    const entry = await listing.at(index);
    if (!entry || listing !== this.listing || this.cursor !== index || this.count > 0) return;
    this.anchor = { index, id: entry.id };
    this.chosen.set(entry.id, entry);
    this.onChange();
  }

  choose(one, other) {
    const [from, to] = one.index <= other.index ? [one, other] : [other, one];
    const loaded = this.listing.loaded(from.index, to.index);
    if (loaded && isBetween(loaded, from, to)) return this.add(loaded);
    const stop = new AbortController();
    const pending = { first: from.index, last: to.index, stop };
    this.pending = pending;
    pending.done = this.between(from, to, stop.signal)
      .then(
        (entries) => {
          if (this.pending !== pending) return;
          this.pending = null;
          if (entries) this.add(entries);
          else this.onFailure(null);
        },
        (failure) => {
          if (this.pending !== pending || isAbort(failure)) return;
          this.pending = null;
          this.onFailure(failure);
        },
      )
      .finally(() => this.onChange());
    return undefined;
  }

  add(entries) {
    for (const entry of entries) this.chosen.set(entry.id, entry);
  }

  // The entries from one row to another, as they lie now. Whoever chose them saw the two ends: these have to be the ends
  // still, wherever they lie. Null when one of them is gone.
  async between(from, to, signal) {
    const { listing } = this;
    const some = await listing.names(from.index, to.end ? Infinity : to.index, signal);
    if (isBetween(some, from, to)) return some;
    const all = await listing.names(0, Infinity, signal);
    const placeOf = ({ id, index }) =>
      id === undefined ? Math.min(index, all.length - 1) : all.findIndex((entry) => entry.id === id);
    const [first, last] = [placeOf(from), placeOf(to)].sort((a, b) => a - b);
    return first < 0 ? null : all.slice(first, last + 1);
  }
}

function isBetween(entries, from, to) {
  const isAt = (end, entry) => end.id === undefined || end.id === entry?.id;
  return isAt(from, entries[0]) && isAt(to, entries.at(-1));
}
