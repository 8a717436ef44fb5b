// The rows (or tiles) of a long list: only those in sight are in the document.

import { isCut } from "./clipboard.js";
import { fitColumns } from "./columns.js";
import { h, keepFocus, set } from "./dom.js";
import { same } from "./prefs.js";
import { makeRow, fillRow, makeHeader } from "./rows.js";

// Browsers lose precision beyond some ten million pixels; longer lists scroll at a scale.
const TALLEST = 12_000_000;
const OVERSCAN = 6;
const WAITING_ROWS = 12;
const TILE = { width: 132, height: 152, gap: 6 };

export class View {
  constructor(root, { onScrolled }) {
    this.root = root;
    this.canvas = h("div.canvas", { role: "presentation" });
    this.rows = new Map();
    this.listing = null;
    this.selection = null;
    this.mode = "list";
    this.onScrolled = onScrolled;
    root.addEventListener("scroll", () => this.scrolled(), { passive: true });
    new ResizeObserver(() => {
      this.fit();
      this.render();
    }).observe(root);
  }

  show(listing, selection, mode, columns) {
    this.listing = listing;
    this.selection = selection;
    this.mode = mode;
    this.all = columns;
    this.columns = [];
    this.rows.clear();
    this.canvas.replaceChildren();
    this.header = null;
    if (mode === "list") this.fit();
    else this.dress();
    this.root.scrollTop = 0;
    this.render();
  }

  // The columns that there is room for; rows are made anew when these are others.
  fit() {
    if (this.mode !== "list" || !this.all) return;
    const { fitting, template } = fitColumns(this.all, this.root.clientWidth);
    this.root.style.setProperty("--columns", template);
    if (this.header && fitting.length === this.columns.length) return;
    this.columns = fitting;
    this.header = makeHeader(fitting);
    for (const row of this.rows.values()) row.filled = false;
    this.dress();
  }

  // Others are wanted, or rows of another height.
  setColumns(columns) {
    const line = this.measure().top / this.shape.height;
    this.all = columns;
    this.header = null;
    this.fit();
    this.root.scrollTop = (line * this.shape.height) / this.measure().scale;
    this.render();
  }

  dress() {
    this.root.className = `view ${this.mode} ${this.columns.map((column) => `has-${column.id}`).join(" ")}`;
    keepFocus(this.root, () => this.root.replaceChildren(...(this.header ? [this.header] : []), this.canvas));
  }

  // How many there are per line, how high a line is, how many lines there are.
  get shape() {
    const style = getComputedStyle(this.root);
    if (this.mode === "list") {
      return { across: 1, height: parseFloat(style.getPropertyValue("--row-height")) || 36, width: 0 };
    }
    const room = this.root.clientWidth - parseFloat(style.paddingLeft) - parseFloat(style.paddingRight);
    const across = Math.max(2, Math.floor((room + TILE.gap) / (TILE.width + TILE.gap)));
    return { across, height: TILE.height + TILE.gap, width: room / across };
  }

  get count() {
    if (this.listing.ready) return this.listing.total;
    return this.listing.error ? 0 : WAITING_ROWS;
  }

  measure() {
    const { across, height, width } = this.shape;
    const lines = Math.ceil(this.count / across);
    // Below the header, which stays in sight, and its margin.
    const room = this.root.clientHeight - this.canvas.offsetTop;
    const whole = lines * height;
    const shown = Math.min(whole, TALLEST);
    const scale = shown > room ? (whole - room) / (shown - room) : 1;
    return { across, height, width, room, shown, scale, top: this.root.scrollTop * scale };
  }

  render() {
    if (!this.listing) return;
    const box = this.measure();
    this.canvas.style.height = `${box.shown}px`;
    const firstLine = Math.max(0, Math.floor(box.top / box.height) - OVERSCAN);
    const lastLine = Math.ceil((box.top + box.room) / box.height) + OVERSCAN;
    const first = firstLine * box.across;
    const last = Math.min(this.count, (lastLine + 1) * box.across) - 1;
    for (const [index, row] of this.rows) {
      if (index >= first && index <= last) continue;
      row.remove();
      this.rows.delete(index);
    }
    for (let index = first; index <= last; ++index) this.place(index, box);
    set(this.root, {
      "aria-rowcount": this.listing.ready ? this.listing.total + (this.mode === "list" ? 1 : 0) : -1,
      "aria-busy": String(!this.listing.ready),
    });
    this.inSight = [
      Math.floor(box.top / box.height) * box.across,
      Math.ceil((box.top + box.room) / box.height) * box.across,
    ];
    this.paintSelection();
  }

  // What these entries show besides themselves is another.
  renew(ids) {
    for (const row of this.rows.values()) if (row.entry && ids.has(row.entry.id)) row.filled = false;
    this.render();
  }

  place(index, box) {
    let row = this.rows.get(index);
    if (!row) {
      row = makeRow(index, this.mode);
      this.rows.set(index, row);
      this.canvas.append(row);
    }
    const entry = this.listing.ready ? this.listing.item(index) : undefined;
    // What shows the same stays: a click may be under way on it.
    if (!row.editing && !(row.filled && same(row.entry, entry))) fillRow(row, index, entry, this.mode, this.columns);
    else if (!row.editing) row.entry = entry;
    const y = Math.floor(index / box.across) * box.height - box.top + box.top / box.scale;
    const x = (index % box.across) * box.width;
    row.style.transform = `translate(${x}px, ${y}px)`;
    if (box.width) row.style.width = `${box.width - TILE.gap}px`;
  }

  paintSelection() {
    for (const [index, row] of this.rows) {
      const chosen = this.selection.has(index);
      const cursor = index === this.selection.cursor;
      if (row.classList.contains("selected") !== chosen || !row.hasAttribute("aria-selected")) {
        row.classList.toggle("selected", chosen);
        row.setAttribute("aria-selected", String(chosen));
      }
      row.classList.toggle("cursor", cursor);
      row.classList.toggle("cut", row.entry !== undefined && isCut(row.entry.id, this.listing, index));
      row.classList.toggle("above-selected", chosen && this.selection.has(index + 1));
      row.classList.toggle("below-selected", chosen && this.selection.has(index - 1));
    }
    this.header?.classList.toggle(
      "all",
      this.listing.ready && this.listing.total > 0 && this.selection.count === this.listing.total,
    );
    const active = this.rows.get(this.selection.cursor);
    if (active) this.root.setAttribute("aria-activedescendant", active.id);
    else this.root.removeAttribute("aria-activedescendant");
  }

  scrolled() {
    if (this.frame) return;
    this.frame = requestAnimationFrame(() => {
      this.frame = null;
      this.render();
      this.onScrolled();
    });
  }

  // Brings a row into sight.
  reveal(index, where = "nearest") {
    const box = this.measure();
    const line = Math.floor(index / box.across);
    const y = line * box.height;
    let top = box.top;
    if (where === "center") top = y - (box.room - box.height) / 2;
    else if (y < top) top = y;
    else if (y + box.height > top + box.room) top = y + box.height - box.room;
    if (top !== box.top) this.root.scrollTop = top / box.scale;
    this.render();
  }

  rowAt(index) {
    return this.rows.get(index);
  }

  indexOf(node) {
    const row = node.closest?.(".row");
    return row && this.canvas.contains(row) ? row.index : -1;
  }

  linesPerPage() {
    const { room, height } = this.measure();
    return Math.max(1, Math.floor(room / height) - 1);
  }
}
