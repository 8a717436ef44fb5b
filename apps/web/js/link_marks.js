// Which rows of the folder on screen the user has public links for: that comes with the list of the folder.

import { get } from "./api.js";
import { browser } from "./browser.js";
import { on } from "./events.js";
import { idIn, isSearch } from "./path.js";

let marked = new Set();

export function hasLink(id) {
  return marked.has(id);
}

export function setupLinkMarks() {
  on("place", () => {
    marked = new Set();
  });
  on("came-links", ({ id, answer }) => take(id, answer));
  on("links", ask);
}

// One was made, changed or revoked.
async function ask() {
  const folder = browser.id;
  if (folder === "/" || isSearch(folder)) return;
  const answer = await get("link", { action: "list", folder_raw: folder }).catch(() => null);
  if (answer) take(folder, answer); // else rows without a mark
}

function take(folder, { items }) {
  if (folder !== browser.id) return;
  const before = marked;
  marked = new Set(items.map((link) => idIn(link)));
  const changed = [...marked, ...before].filter((id) => marked.has(id) !== before.has(id));
  if (changed.length > 0) browser.view.renew(new Set(changed));
}
