// Files from outside dropped on the page.

import { browser } from "./browser.js";
import { crumbId } from "./pathbar.js";
import { context } from "./commands.js";
import { $, h, icon } from "./dom.js";
import { labelOf } from "./pathbar.js";
import { treeId } from "./tree.js";
import { t } from "./strings.js";
import { fromDrop, holdsFiles } from "./upload_files.js";
import { startUpload } from "./uploads.js";

let veil = null;
let marked = null;
let depth = 0;

export function setupDragAndDrop() {
  addEventListener("dragenter", (event) => {
    if (holdsFiles(event.dataTransfer)) ++depth;
  });
  addEventListener("dragleave", (event) => {
    if (holdsFiles(event.dataTransfer) && --depth <= 0) clear();
  });
  addEventListener("dragover", over);
  addEventListener("drop", drop);
}

// The folder under the pointer: a row, a tree item, a part of the path, else the folder on screen.
export function folderUnder(node) {
  const index = browser.view.indexOf(node);
  const entry = index >= 0 ? browser.listing?.item(index) : undefined;
  if (entry?.isFolder) return { id: entry.id, node: browser.view.rowAt(index) };
  const id = treeId(node) ?? crumbId(node) ?? node.closest?.(".card")?.dataset.id;
  if (id && id !== "/") return { id, node: node.closest(".tree-line, .crumb, .card") };
  return context().canWrite ? { id: browser.id, node: null } : null;
}

function over(event) {
  if (!holdsFiles(event.dataTransfer)) return;
  event.preventDefault();
  const target = folderUnder(event.target);
  event.dataTransfer.dropEffect = target ? "copy" : "none";
  mark(target?.node ?? null);
  if (target && !target.node) showVeil(target.id);
  else veil?.remove();
}

export function mark(node) {
  if (marked === node) return;
  marked?.classList.remove("drop");
  node?.classList.add("drop");
  marked = node;
}

function showVeil(id) {
  veil ??= h("div.drop-veil");
  if (veil.isConnected) return;
  veil.replaceChildren(icon("upload"), h("span", {}, t("drop.here", { folder: labelOf(id) })));
  $("content").append(veil);
}

function clear() {
  depth = 0;
  veil?.remove();
  mark(null);
}

async function drop(event) {
  if (!holdsFiles(event.dataTransfer)) return;
  event.preventDefault();
  const target = folderUnder(event.target);
  clear();
  if (!target) return;
  startUpload(await fromDrop(event.dataTransfer)(), target.id);
}
