// A long list that lies on the server: pages are fetched where somebody looks, and let go again when passed by.
//
// A list is one part or several, one after the other (folders, then files). fetchPart(part, offset, limit, signal)
// answers {total, items}.

import { isAbort } from "./api.js";

const PAGE = 200;
const AHEAD = 60;
const AT_ONCE = 100; // pages of one request

export class Listing {
  constructor(parts, fetchPart, onChange) {
    this.parts = parts.map((part) => ({ part, total: null, pages: new Map(), stale: null }));
    this.fetchPart = fetchPart;
    this.onChange = onChange;
    this.requests = new Map();
    this.error = null;
    this.extra = null;
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
      const reply = await this.fetchPart(one.part, page * PAGE, PAGE, signal);
      if (!signal.aborted) this.take(one, page, reply);
    } catch (failure) {
      if (isAbort(failure) || signal.aborted) return;
      this.error = failure;
      this.onChange(this);
    }
  }

  take(one, page, reply) {
    this.error = null;
    // The folder has changed meanwhile: what was fetched before may have moved.
    if (one.total !== null && one.total !== reply.total) {
      one.stale = one.pages;
      one.pages = new Map();
    }
    one.total = reply.total;
    one.pages.set(page, reply.items);
    this.extra = reply;
    this.onChange(this);
  }

  // Fetches again what is in sight; until it comes, what is there stays.
  refresh(first, last) {
    this.cancel();
    for (const one of this.parts) {
      one.stale = one.pages;
      one.pages = new Map();
    }
    this.error = null;
    return this.need(first, last);
  }

  cancel() {
    for (const { stop } of this.requests.values()) stop.abort();
    this.requests.clear();
  }

  // The entries of index ranges [from, to], whether they were loaded or not.
  async entries(ranges) {
    const entries = [];
    for (const [from, to] of ranges) {
      await this.fill(from, to);
      for (let i = from; i <= to; ++i) {
        const entry = this.item(i);
        if (entry) entries.push(entry);
      }
    }
    return entries;
  }

  // A long request costs the server hardly more than a short one: pages that lie together come together.
  async fill(from, to) {
    const missing = this.pagesOf(from, to).filter(({ one, page }) => !one.pages.has(page));
    while (missing.length > 0) {
      const [{ one, page }] = missing;
      const next = missing.findIndex((other, i) => i === AT_ONCE || other.one !== one || other.page !== page + i);
      const count = missing.splice(0, next < 0 ? missing.length : next).length;
      const { items } = await this.fetchPart(one.part, page * PAGE, count * PAGE);
      for (let i = 0; i < count; ++i) one.pages.set(page + i, items.slice(i * PAGE, (i + 1) * PAGE));
    }
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
