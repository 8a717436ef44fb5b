// What is chosen, as the entries themselves: a row number means something else as soon as somebody changes the folder.
//
// Rows that were never loaded are chosen as rows of the list that the server keeps, in which each number stays what it
// is; for another list of the folder the server says which rows the same names have there. Of a list that is not kept
// they are asked for the moment they are chosen; until their names have come, they count as chosen and nothing is done
// with them.

import { isAbort, post } from "./api.js";
import { Choice } from "./choice.js";
import { countOf, holds, parse, textOf, withoutRow, withRange } from "./ranges.js";

export class Selection {
  // onChange: to paint; onFailure(failure): names could not be had, null when the folder has changed meanwhile.
  constructor({ onChange, onFailure }) {
    this.onChange = onChange;
    this.onFailure = onFailure;
    this.listing = null;
    this.chosen = new Map(); // id -> entry
    this.pending = null; // {first, last, stop, done}
    this.rows = null; // {kept, ranges}: then nothing is in `chosen`
    this.carried = null; // a promise while the rows are looked for in another list
    this.cursor = 0;
    this.anchor = { index: 0, id: undefined };
  }

  get count() {
    if (this.rows) return countOf(this.rows.ranges);
    return this.chosen.size + (this.pending ? this.pending.last - this.pending.first + 1 : 0);
  }

  // The only chosen entry, else nothing.
  get single() {
    return this.chosen.size === 1 && !this.pending ? this.chosen.values().next().value : undefined;
  }

  get first() {
    return this.chosen.values().next().value;
  }

  // Whether the row shows as chosen.
  has(index) {
    if (this.rows) return this.rows.kept === this.listing?.kept && holds(this.rows.ranges, index);
    if (this.pending && index >= this.pending.first && index <= this.pending.last) return true;
    const entry = this.chosen.size > 0 ? this.listing?.item(index) : undefined;
    return entry !== undefined && this.chosen.has(entry.id);
  }

  // All that is chosen, once it is known.
  async choice() {
    while (this.pending || this.carried) await (this.pending?.done ?? this.carried);
    return this.now;
  }

  // The same at once; nothing while it is not known.
  get now() {
    if (this.pending || this.carried) return null;
    if (!this.rows) return new Choice([...this.chosen.values()]);
    const { kept, ranges } = this.rows;
    return new Choice([], { listing: kept, ranges: textOf(ranges), count: countOf(ranges), folder: this.listing.folder });
  }

  // The list has another order, or is as it is by now: looks for the rows there. {count, name} of what it lacks; null
  // when the list in which they were chosen is gone, and with it what was chosen.
  carry() {
    const { rows, listing } = this;
    if (!rows || rows.kept === listing.kept || !listing.kept) return Promise.resolve({ count: 0 });
    const asked = { action: "carry", listing: rows.kept, ranges: textOf(rows.ranges), into: listing.kept };
    const work = post("list", asked).then(
      ({ ranges, left, names }) => {
        if (this.carried === work && this.rows === rows) {
          const found = parse(ranges);
          this.rows = found.length > 0 ? { kept: asked.into, ranges: found } : null;
        }
        return { count: left, name: names[0] };
      },
      (failure) => {
        if (this.carried === work && this.rows === rows) this.rows = null;
        if (failure.data?.listing) return null;
        throw failure;
      },
    );
    this.carried = work;
    return work.finally(() => {
      if (this.carried === work) this.carried = null;
      this.onChange();
    });
  }

  // The list that the server kept is gone: what was chosen by rows has no names any more. Whether there was such.
  lose(kept) {
    if (this.rows?.kept !== kept) return false;
    this.rows = null;
    this.onChange();
    return true;
  }

  // A click or a key on a row: alone, to add or take away (ctrl), or everything from the last one on (shift).
  pick(index, { shift = false, ctrl = false } = {}) {
    const entry = this.listing.item(index);
    const here = { index, id: entry?.id, end: index === this.listing.total - 1 };
    this.cursor = index;
    if (ctrl && this.rows) return this.pickRow(here, shift);
    if (ctrl && this.pending) return this.pickLater(here, { shift, ctrl });
    this.stop();
    if (!ctrl) this.forget();
    if (shift) this.choose(this.anchor, here);
    else {
      this.anchor = here;
      if (!entry) return this.awaitRow(index);
      if (ctrl && this.chosen.has(entry.id)) this.chosen.delete(entry.id);
      else this.chosen.set(entry.id, entry);
    }
    return this.onChange();
  }

  // One row more or less, or a range more, of those that are chosen as rows.
  pickRow(here, shift) {
    const { kept, ranges } = this.rows;
    if (this.carried || kept !== this.listing.kept) return;
    const { index } = here;
    if (shift) this.rows.ranges = withRange(ranges, ...[this.anchor.index, index].sort((a, b) => a - b));
    else {
      this.anchor = here;
      this.rows.ranges = holds(ranges, index) ? withoutRow(ranges, index) : withRange(ranges, index, index);
    }
    if (this.rows.ranges.length === 0) this.rows = null;
    this.onChange();
  }

  // What is being asked for stays when more is added to it.
  async pickLater({ index, id }, keys) {
    await this.pending.done;
    if (this.listing.item(index)?.id === id) this.pick(index, keys);
  }

  // The entry at that row, and nothing else.
  only(entry, index) {
    this.stop();
    this.forget();
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
    this.forget();
    this.choose({ index: 0 }, { index: this.listing.total - 1, end: true });
    this.onChange();
  }

  clear() {
    this.stop();
    this.forget();
    this.onChange();
  }

  forget() {
    this.chosen.clear();
    this.rows = null;
    this.carried = null;
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
    if (this.chooseRows(from, to)) return undefined;
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

  // Whether they could be chosen as rows, with what is chosen already.
  chooseRows(from, to) {
    const { listing } = this;
    if (!listing.kept || !this.isStill(from) || !this.isStill(to)) return false;
    let ranges = withRange([], from.index, to.index);
    for (const id of this.chosen.keys()) {
      const row = listing.indexOf(id);
      if (row < 0) return false;
      ranges = withRange(ranges, row, row);
    }
    this.chosen.clear();
    this.rows = { kept: listing.kept, ranges };
    return true;
  }

  // Whether the row is the one that was seen when the range was begun.
  isStill({ index, id }) {
    return id === undefined || (this.listing.isFresh(index) && this.listing.item(index)?.id === id);
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
