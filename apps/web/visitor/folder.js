// What a shared folder holds, as a list or as tiles.

import { kindOf, thumbnail } from "./kinds.js";
import { aboutText, drawing, make, nameNode, picture, sizeText, texts, timeText } from "./parts.js";
import { fileAddress, limits, list, pathField } from "./requests.js";

const COLUMNS = [["name", texts.name], ["size", texts.size], ["mtime", texts.changed]];
const order = { by: "name", direction: "asc" };
let mode = remembered();

function remembered() {
  try {
    return localStorage.getItem("orvel.visitor");
  } catch {
    return null; // a window that keeps nothing
  }
}

function remember(value) {
  mode = value;
  try {
    localStorage.setItem("orvel.visitor", value);
  } catch {
    // As long as the page lasts.
  }
}

export function placeAddress(item, more = {}) {
  return `#${encodeURIComponent(JSON.stringify({ ...pathField(item), ...more }))}`;
}

export class Folder {
  // onFailure(status): a page of it could not be had.
  constructor(path, onFailure) {
    Object.assign(this, { path, onFailure, items: [], total: 0, place: null, node: make("section.folder") });
  }

  // The first page. Whether it came; what it is of stands in `place`.
  async load() {
    const { status, json } = await list(this.path, 0, order);
    if (status !== 200 || !json.success) return this.fail(status);
    this.place = json.place;
    this.items = json.data.items;
    this.total = json.data.total;
    // Whoever has not said how, sees a folder of pictures as pictures.
    const pictures = this.items.filter((item) => kindOf(item) === "image").length;
    this.mode = mode ?? (limits.left === null && pictures * 2 > this.items.length ? "gallery" : "list");
    this.paint();
    return true;
  }

  async more() {
    const { status, json } = await list(this.path, this.items.length, order);
    if (status !== 200 || !json.success) return this.fail(status);
    this.items.push(...json.data.items);
    this.total = json.data.items.length === 0 ? this.items.length : json.data.total;
    return this.paint();
  }

  fail(status) {
    this.onFailure(status === 200 ? 404 : status);
    return false;
  }

  // The file beside `item`, and nothing past the ends.
  beside(item, by) {
    const files = this.items.filter((one) => !one.isdir);
    return files[files.findIndex((one) => one.name === item.name) + by];
  }

  sort(by) {
    order.direction = order.by === by && order.direction === "asc" ? "desc" : "asc";
    order.by = by;
    this.load();
  }

  paint() {
    const held = this.node.contains(document.activeElement) ? document.activeElement.dataset.key : null;
    const more = this.items.length < this.total && make("button", { type: "button", click: () => this.more() }, texts.more);
    const shown = this.mode === "list" ? this.table() : make("ul.tiles", {}, ...this.items.map(tile));
    this.node.replaceChildren(this.bar(), shown, ...(more ? [more] : []));
    if (held) this.node.querySelector(`[data-key="${held}"]`)?.focus();
  }

  bar() {
    const choice = make("select", { "aria-label": texts.sort, "data-key": "select" });
    for (const [by, name] of COLUMNS) {
      for (const direction of ["asc", "desc"]) {
        const option = make("option", { value: `${by} ${direction}` }, `${name} ${direction === "asc" ? "↑" : "↓"}`);
        option.selected = order.by === by && order.direction === direction;
        choice.append(option);
      }
    }
    choice.addEventListener("change", () => {
      [order.by, order.direction] = choice.value.split(" ");
      this.load();
    });
    const modes = ["list", "gallery"].map((one) =>
      make(
        "button.plain",
        {
          type: "button",
          "aria-label": texts[one],
          "aria-pressed": String(this.mode === one),
          "data-key": one,
          click: () => {
            remember(one);
            this.mode = one;
            this.paint();
          },
        },
        drawing(one),
      ),
    );
    const count = texts.count[this.total === 1 ? 0 : 1].replace("{count}", this.total.toLocaleString());
    return make("div.bar", {}, make("span.soft.grow", {}, count), choice, ...modes);
  }

  table() {
    const heads = COLUMNS.map(([by, name]) => {
      const sorted = order.by === by ? { asc: "ascending", desc: "descending" }[order.direction] : "none";
      const button = make("button.plain", { type: "button", "data-key": by, click: () => this.sort(by) }, name);
      return make(`th.${by}`, { scope: "col", "aria-sort": sorted }, button);
    });
    const body = make("tbody", {}, ...this.items.map(row));
    return make("table", {}, make("thead", {}, make("tr", {}, ...heads, make("td"))), body);
  }
}

// A folder opens, a file is looked at; with the keys of the browser for a new tab or for saving a file is had itself.
function anchor(item, ...children) {
  if (item.isdir) return make("a", { href: placeAddress(item) }, ...children);
  const look = (event) => {
    if (event.ctrlKey || event.metaKey || event.shiftKey || event.altKey) return;
    event.preventDefault();
    location.hash = placeAddress(item, { look: 1 });
    history.replaceState({ inside: true }, ""); // the way back leads here
  };
  return make("a", { href: fileAddress(item), click: look }, ...children);
}

function row(item) {
  const get = make("a.round", { href: fileAddress(item), download: "", "aria-label": `${texts.download}: ${item.name}` }, drawing("download"));
  return make(
    "tr",
    {},
    make("td.name", {}, make("div", {}, thumbnail(item, picture(item.icon)), anchor(item, nameNode(item), make("span.soft.sub", {}, aboutText(item))))),
    make("td.size", {}, item.isdir ? "" : sizeText(item.additional?.size ?? 0)),
    make("td.mtime", {}, timeText(item.additional?.time)),
    make("td.get", {}, get),
  );
}

function tile(item) {
  return make("li", {}, anchor(item, make("span.frame", {}, thumbnail(item, picture(item.icon))), nameNode(item), make("span.soft", {}, aboutText(item))));
}
