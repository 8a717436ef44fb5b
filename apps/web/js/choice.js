// What is chosen, on its way to the server: entries one by one, or rows of a list that the server keeps.

import { childOf, encodeName, parentOf, pathLists } from "./path.js";

const SOME = "*"; // the name of any row

export class Choice {
  // entries: [{id, ...}]; or rows: {listing, ranges, count, folder}, `ranges` as the programs take them.
  constructor(entries, rows = null) {
    this.entries = entries;
    this.rows = rows;
  }

  static of(what) {
    return what instanceof Choice ? what : new Choice(what);
  }

  get count() {
    return this.rows?.count ?? this.entries.length;
  }

  // The only one of it, if it is one.
  get single() {
    return !this.rows && this.entries.length === 1 ? this.entries[0] : undefined;
  }

  // Ids: of entries, or one that stands for any row.
  get samples() {
    return this.rows ? [childOf(this.rows.folder, encodeName(SOME))] : this.entries.map(({ id }) => id);
  }

  get folders() {
    return [...new Set(this.samples.map(parentOf))];
  }

  // What says it to a program: as many portions as it takes, each {params, count, entries}.
  portions() {
    if (this.rows) {
      const { listing, ranges, count } = this.rows;
      return [{ params: { listing, ranges }, count, entries: [] }];
    }
    let rest = this.entries;
    return pathLists(this.entries.map(({ id }) => id)).map((lines) => {
      const entries = rest.slice(0, lines.length);
      rest = rest.slice(lines.length);
      return { params: { paths_raw: lines.join("\n") }, count: entries.length, entries };
    });
  }

  // Without the entries that `test` refuses; rows are in one folder all of them.
  only(test) {
    return this.rows ? this : new Choice(this.entries.filter(test));
  }
}
