// The pointer in the list: choosing, opening, the context menu.

import { browser, go, setSort } from "./browser.js";
import { openColumnMenu } from "./columns.js";
import { runCommand } from "./commands.js";
import { preview } from "./preview.js";
import { openMenu } from "./menu.js";
import { contextItems } from "./toolbar.js";

export function setupPointer() {
  const { root } = browser.view;
  root.addEventListener("click", clicked);
  // A link in a row takes the keyboard from the list no more than the row does.
  root.addEventListener("focusin", (event) => {
    if (event.target.closest("a")) root.focus({ preventScroll: true });
  });
  root.addEventListener("dblclick", (event) => {
    if (indexOf(event) >= 0 && !event.target.closest("button") && !event.ctrlKey && !event.shiftKey) runCommand("open");
  });
  // What stands in place of a list, when it is empty, lies beside it.
  root.parentElement.addEventListener("contextmenu", (event) => {
    if (root.hidden) return;
    event.preventDefault();
    if (event.target.closest(".header")) return openColumnMenu({ x: event.clientX, y: event.clientY });
    if (event.target === root && isFromKeyboard(event)) return menuAtCursor();
    const index = indexOf(event);
    if (index < 0) browser.selection.clear();
    else if (!browser.selection.has(index)) browser.selection.pick(index);
    openMenu(contextItems(), { x: event.clientX, y: event.clientY });
  });
}

function isFromKeyboard(event) {
  return event.button !== 2 && !event.ctrlKey && event.pointerType !== "touch";
}

function menuAtCursor() {
  const { listing, selection, view } = browser;
  if (selection.count === 0 && listing.item(selection.cursor)) selection.pick(selection.cursor);
  view.reveal(selection.cursor);
  const box = (view.rowAt(selection.cursor) ?? view.root).getBoundingClientRect();
  openMenu(contextItems(), { x: box.left + 48, y: box.top + 30 });
}

function indexOf(event) {
  const index = browser.view.indexOf(event.target);
  return index >= 0 && browser.listing?.item(index) ? index : -1;
}

function clicked(event) {
  if (event.target.closest("a")) event.preventDefault();
  const { selection, listing } = browser;
  const choice = event.target.closest("[data-columns]");
  if (choice) return openColumnMenu({ anchor: choice });
  const sort = event.target.closest("[data-sort]");
  if (sort) return setSort(sort.dataset.sort);
  if (event.target.closest("[data-all]"))
    return selection.count === listing.total ? selection.clear() : selection.all();
  const index = indexOf(event);
  if (index < 0) return selection.clear();
  const shift = event.shiftKey;
  const ctrl = event.ctrlKey || event.metaKey;
  if (event.target.closest(".more")) {
    if (!selection.has(index)) selection.pick(index);
    const box = event.target.closest(".more").getBoundingClientRect();
    return openMenu(contextItems(), { x: box.left, y: box.bottom + 2 });
  }
  if (event.target.closest(".check")) return selection.pick(index, shift ? { shift, ctrl: true } : { ctrl: true });
  if (event.pointerType === "touch") return tapped(index);
  return selection.pick(index, { shift, ctrl });
}

// A finger opens; once something is chosen it chooses more.
function tapped(index) {
  const { selection, listing } = browser;
  if (selection.count > 0) return selection.pick(index, { ctrl: true });
  const entry = listing.item(index);
  selection.cursor = index;
  return entry.isFolder ? go(entry.id) : preview(entry);
}
