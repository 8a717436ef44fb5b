// Which rows of the folder on screen the user has public links for: asked once a folder, after its first rows are drawn.

import { get } from "./api.js";
import { browser } from "./browser.js";
import { arrived, on } from "./events.js";
import { idIn, isSearch } from "./path.js";

let shown = null; // the folder that the marks are of
let marked = new Set();
let none = false; // the user has no link at all: nothing to ask until one is made

export function hasLink(id) {
  return marked.has(id);
}

export function setupLinkMarks() {
  on("place", () => {
    marked = new Set();
    shown = null;
  });
  on("shown", () => shown !== browser.id && !none && ask());
  on("links", () => {
    none = false;
    ask();
  });
}

async function ask() {
  const folder = browser.id;
  shown = folder;
  if (folder === "/" || isSearch(folder)) return;
  await arrived;
  const answer = await get("link", { action: "list", folder_raw: folder }).catch(() => null);
  if (!answer || shown !== folder) return; // rows without a mark
  none = answer.total === 0;
  const before = marked;
  marked = new Set(answer.items.map((link) => idIn(link)));
  const changed = [...marked, ...before].filter((id) => marked.has(id) !== before.has(id));
  if (changed.length > 0) browser.view.renew(new Set(changed));
}
