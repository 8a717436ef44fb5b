// A long list that lies on the server: pages are fetched where somebody looks, and kept until the list changes.
//
// A list is one part or several, one after the other (folders, then files). fetchPart(part, {offset, limit, brief,
// signal}) answers {total, items}; brief items have a name and no properties. `longest`: how many come at once.

import { isAbort } from "./api.js";

export const PAGE = 200;
const AHEAD = 60;

export class Listing {
  constructor(parts, fetchPart, onChange, longest = Infinity) {
    this.parts = parts.map((part) => ({ part, total: null, pages: new Map(), stale: null }));
    this.fetchPart = fetchPart;
    this.onChange = onChange;
    this.longest = longest;
    this.requests = new Map();
    this.error = null;
    this.extra = null;
    this.all = null;
    this.kept = null; // the id of the list that the server keeps
    this.onGone = () => {};
  }

  // Whether a row shows as it is in this list, and not as it was before the last refresh.
  isFresh(index) {
    const place = this.place(index);
    return place !== null && place.one.pages.has(Math.floor(place.offset / PAGE));
  }

  get ready() {
    return this.parts.every((one) => one.total !== null);
  }

  get total() {
    return this.parts.reduce((sum, one) => sum + (one.total ?? 0), 0);
  }

  item(index) {
    const place = this.place(index);
    if (!place) return undefined;
    const page = Math.floor(place.offset / PAGE);
    return (place.one.pages.get(page) ?? place.one.stale?.get(page))?.[place.offset % PAGE];
  }

  // The row, once it has come; nothing when it does not.
  async at(index) {
    await Promise.all(this.pagesOf(index, index).map(({ one, page }) => this.load(this.keyOf(one, page))));
    return this.item(index);
  }

  // The entries of the rows first..last when all of them are there, else nothing.
  loaded(first, last) {
    const entries = [];
    for (let index = first; index <= last; ++index) {
      const entry = this.item(index);
      if (!entry) return null;
      entries.push(entry);
    }
    return entries;
  }

  place(index) {
    let offset = index;
    for (const one of this.parts) {
      if (offset < (one.total ?? 0)) return { one, offset };
      offset -= one.total ?? 0;
    }
    return null;
  }

  // The rows first..last are in sight. Fetches what is missing around them, cancels what has been passed by.
  need(first, last) {
    this.seen = [first, last];
    const wanted = new Set();
    // How many there are is known from the first page.
    for (const one of this.parts) {
      if (!one.total && !one.pages.has(0)) wanted.add(this.keyOf(one, 0));
    }
    for (const { one, page } of this.pagesOf(Math.max(0, first - AHEAD), last + AHEAD))
      wanted.add(this.keyOf(one, page));
    for (const [key, request] of this.requests) {
      if (!wanted.has(key)) request.stop.abort();
    }
    return Promise.all([...wanted].map((key) => this.load(key)));
  }

  pagesOf(first, last) {
    const pages = [];
    let start = 0;
    for (const one of this.parts) {
      const total = one.total ?? 0;
      const from = Math.max(first, start) - start;
      const to = Math.min(last, start + total - 1) - start;
      for (let page = Math.floor(from / PAGE); page <= Math.floor(to / PAGE) && to >= from; ++page)
        pages.push({ one, page });
      start += total;
    }
    return pages;
  }

  keyOf(one, page) {
    return `${this.parts.indexOf(one)}:${page}`;
  }

  // What is on its way is waited for, not asked for again.
  load(key) {
    const [part, page] = key.split(":").map(Number);
    const one = this.parts[part];
    if (one.pages.has(page)) return undefined;
    if (!this.requests.has(key)) {
      const request = { stop: new AbortController() };
      this.requests.set(key, request);
      request.done = this.fetchPage(one, page, request.stop.signal).finally(() => {
        if (this.requests.get(key) === request) this.requests.delete(key);
      });
    }
    return this.requests.get(key).done;
  }

  async fetchPage(one, page, signal) {
    try {
      const reply = await this.fetchPart(one.part, { offset: page * PAGE, limit: PAGE, signal });
      if (!signal.aborted) this.take(one, page, reply);
    } catch (failure) {
      if (isAbort(failure) || signal.aborted) return;
      if (failure.data?.listing && this.kept !== null) return this.beginAgain(true);
      this.error = failure;
      this.onChange(this);
    }
  }

  take(one, page, reply) {
    this.error = null;
    this.count(one, reply.total);
    one.pages.set(page, reply.items);
    one.stale?.delete(page);
    this.extra = reply;
    this.onChange(this);
  }

  // The folder has changed meanwhile: what was fetched before may have moved.
  count(one, total) {
    if (one.total !== null && one.total !== total) {
      one.stale = one.pages;
      one.pages = new Map();
      this.all = null;
    }
    one.total = total;
  }

  // Another list takes the place of the one that the server kept; until it comes, what is there stays.
  async beginAgain(gone = false) {
    const { kept } = this;
    this.kept = null;
    if (gone) this.onGone(kept);
    await this.fetchAgain(...this.seen);
  }

  // Fetches again what is in sight; until it comes, what is there stays. `anew`: in the order that it has by now, even
  // when no name has changed.
  async refresh(first, last, anew = false) {
    if (this.kept !== null && (anew || (await this.hasChanged()))) {
      this.kept = null;
      first = Math.min(first, Math.max(0, this.total - 1));
    }
    return this.fetchAgain(first, last);
  }

  // Whether the folder has other names by now than when it was listed.
  async hasChanged() {
    try {
      return (await this.fetchPart(this.parts[0].part, { offset: 0, limit: 1, brief: true })).changed;
    } catch (failure) {
      if (!failure.data?.listing) return false; // what is fetched next says it
      this.onGone(this.kept);
      return true;
    }
  }

  fetchAgain(first, last) {
    this.cancel();
    this.all = null;
    for (const one of this.parts) {
      one.stale = new Map([...(one.stale ?? []), ...one.pages]);
      one.pages = new Map();
    }
    return this.need(first, last);
  }

  // What cannot be kept is asked for as it is at each moment.
  become(parts, fetchPart) {
    this.cancel();
    this.parts = parts.map((part) => ({ part, total: null, pages: new Map(), stale: null }));
    this.fetchPart = fetchPart;
    this.kept = null;
    return this.need(...this.seen);
  }

  cancel() {
    for (const { stop } of this.requests.values()) stop.abort();
    this.requests.clear();
  }

  // The rows first..last as they are on the server now, by name alone, whether they were loaded or not.
  async names(first, last, signal) {
    const found = [];
    let start = 0;
    for (const one of this.parts) {
      const total = one.total ?? 0;
      const from = Math.max(first, start) - start;
      // To the end is to the end as it is now.
      const to = last === Infinity ? Infinity : Math.min(last, start + total - 1) - start;
      if (to >= from) found.push(await this.namesOf(one, from, to, signal));
      start += total;
    }
    return found.flat();
  }

  // All of them, asked for once while the list stays as it is.
  allNames() {
    this.all ??= this.names(0, Infinity).catch((failure) => {
      this.all = null;
      throw failure;
    });
    return this.all;
  }

  async namesOf(one, from, to, signal) {
    let found = [];
    for (let offset = from; offset <= to; ) {
      const most = Math.min(this.longest, to - offset + 1);
      const limit = Number.isFinite(most) ? most : 0; // 0: everything
      const reply = await this.fetchPart(one.part, { offset, limit, brief: true, signal });
      if (one.total !== reply.total) {
        this.count(one, reply.total);
        this.onChange(this);
      }
      found = found.concat(reply.items);
      offset += reply.items.length;
      if (reply.items.length === 0 || offset >= reply.total) break;
    }
    return found;
  }

  // The row of an entry that has been fetched since the last refresh; -1.
  indexOf(id) {
    let start = 0;
    for (const one of this.parts) {
      for (const [page, items] of one.pages) {
        const at = items.findIndex((entry) => entry.id === id);
        if (at >= 0) return start + page * PAGE + at;
      }
      start += one.total ?? 0;
    }
    return -1;
  }

  fresh() {
    return this.parts.flatMap((one) => [...one.pages.values()].flat());
  }

  // The index of the first loaded entry that `test` accepts, from `start` on and round; -1.
  find(test, start = 0) {
    const total = this.total;
    for (let i = 0; i < Math.min(total, 20000); ++i) {
      const index = (start + i) % total;
      const entry = this.item(index);
      if (entry && test(entry)) return index;
    }
    return -1;
  }
}
