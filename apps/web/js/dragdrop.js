// Files from outside dropped on the page, and entries dragged to another folder.

import { browser, shareEntry } from "./browser.js";
import { context } from "./commands.js";
import { toast, toastFailure } from "./dialogs.js";
import { $, h, icon, plainName } from "./dom.js";
import { isInBin, isReadOnlyShare } from "./entries.js";
import { iconOf } from "./icons.js";
import { decode } from "./path.js";
import { crumbId, labelOf } from "./pathbar.js";
import { transfer } from "./transfer.js";
import { treeId } from "./tree.js";
import { t } from "./strings.js";
import { fromDrop, holdsFiles } from "./upload_files.js";
import { startUpload } from "./uploads.js";

const MOST_AS_TEXT = 1000; // paths for other programs

let veil = null;
let marked = null;
let depth = 0;
let dragged = null; // a choice

// What is chosen goes along when a chosen row is dragged.
function begin(event) {
  const index = browser.view.indexOf(event.target);
  if (index < 0) return;
  const { selection, view } = browser;
  if (!selection.has(index)) selection.pick(index);
  const choice = selection.now;
  if (!choice) {
    toast({ text: t("chosen.wait"), kind: "failed" });
    return event.preventDefault();
  }
  dragged = choice;
  const { entries } = choice;
  const paths = entries.slice(0, MOST_AS_TEXT).map((entry) => decode(entry.id));
  event.dataTransfer.setData("text/plain", paths.join("\n"));
  event.dataTransfer.effectAllowed = "copyMove";
  const ghost = h(
    "div.ghost",
    {},
    icon(iconOf(entries[0] ?? view.listing.item(index)), "file-icon"),
    choice.single ? plainName(choice.single.name) : t("select.count", { count: choice.count }),
  );
  document.body.append(ghost);
  event.dataTransfer.setDragImage(ghost, -8, -8);
  setTimeout(() => ghost.remove());
  for (const [at, row] of view.rows) row.classList.toggle("moving", selection.has(at));
  return undefined;
}

function overWithin(event) {
  const target = folderUnder(event.target);
  const fits =
    target &&
    target.node &&
    !isDragged(target) &&
    (copies(event) || dragged.folders.some((folder) => folder !== target.id));
  mark(fits ? target.node : null);
  if (!fits) return;
  event.preventDefault();
  event.dataTransfer.dropEffect = copies(event) ? "copy" : "move";
}

// A row that is chosen moves itself.
function isDragged({ id, node }) {
  if (dragged.rows) return browser.selection.has(node.index ?? -1);
  return dragged.entries.some((entry) => entry.id === id);
}

// Nothing can be taken away from where one may only read.
function copies(event) {
  return event.ctrlKey || !context().canChange;
}

export function setupDragAndDrop() {
  addEventListener("dragenter", (event) => {
    if (holdsFiles(event.dataTransfer)) ++depth;
  });
  addEventListener("dragleave", (event) => {
    if (holdsFiles(event.dataTransfer) && --depth <= 0) clear();
  });
  addEventListener("dragstart", begin);
  addEventListener("dragend", () => {
    for (const node of document.querySelectorAll(".row.moving")) node.classList.remove("moving");
    dragged = null;
    clear();
  });
  addEventListener("dragover", over);
  addEventListener("drop", drop);
}

// The folder under the pointer that takes something: a row, a tree item, a part of the path, else the folder on screen.
function folderUnder(node) {
  const target = pointedAt(node);
  const share = target && shareEntry(target.id);
  return share && !isReadOnlyShare(share) && !isInBin(target.id) ? target : null;
}

function pointedAt(node) {
  const index = browser.view.indexOf(node);
  const entry = index >= 0 ? browser.listing?.item(index) : undefined;
  if (entry?.isFolder) return { id: entry.id, node: browser.view.rowAt(index) };
  const id = treeId(node) ?? crumbId(node) ?? node.closest?.(".card")?.dataset.id;
  if (id && id !== "/") return { id, node: node.closest(".tree-line, .crumb, .card") };
  return context().folder ? { id: browser.id, node: null } : null;
}

function over(event) {
  if (dragged) return overWithin(event);
  if (!holdsFiles(event.dataTransfer)) return undefined;
  event.preventDefault();
  const target = folderUnder(event.target);
  event.dataTransfer.dropEffect = target ? "copy" : "none";
  mark(target?.node ?? null);
  if (target && !target.node) showVeil(target.id);
  else veil?.remove();
  return undefined;
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
  if (dragged && marked) {
    event.preventDefault();
    transfer(copies(event) ? "copy" : "move", dragged, folderUnder(event.target).id);
    return;
  }
  if (!holdsFiles(event.dataTransfer)) return;
  event.preventDefault();
  const target = folderUnder(event.target);
  clear();
  if (!target) return;
  try {
    startUpload(await fromDrop(event.dataTransfer)(), target.id);
  } catch (failure) {
    toastFailure(failure); // such as a folder that the browser may not read
  }
}
