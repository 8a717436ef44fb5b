// Where one is: the folder on screen, its listing, what is chosen in it.

import { get } from "./api.js";
import { announce } from "./dom.js";
import { entryOf } from "./entries.js";
import { emit } from "./events.js";
import { isSearch, normalisePlace, parentOf } from "./path.js";
import { pref, setPref } from "./prefs.js";
import { COLUMNS } from "./rows.js";
import { Selection } from "./selection.js";
import { folderListing, searchResults } from "./sources.js";
import { t } from "./strings.js";

const FIRST_LOOK = 60;
// Most folders are there within this; only slower ones show that something is going on.
const PATIENCE = 150;

export const browser = {
  id: "/", // of the folder, or "?" and the task of a search
  lastFolder: "/",
  shares: [],
  user: "",
  listing: null,
  selection: new Selection(() => emit("selection")),
  mode: pref("mode", "list"),
  sort: pref("sort", { by: "name", ascending: true }),
  filter: "",
  kind: "all", // of what a search shows: "file", "dir"
  view: null,
};

const remembered = new Map();
let turn = 0;

export async function loadShares() {
  const reply = await get("list", { action: "shares", additional: "perm,volume_status,mount_point_type,sync_share" });
  browser.user = reply.user ?? "";
  browser.shares = reply.items.map(entryOf);
  emit("shares");
}

export function shareEntry(id) {
  const share = id.split("/")[1];
  return browser.shares.find((entry) => entry.encodedName === share);
}

// Opening goes through the address, so that back and forward work.
export function go(id) {
  if (normalisePlace(location.hash.slice(1)) === id) open(id);
  else location.hash = id;
}

let toChoose = null;

// The folder that holds the entry, with it chosen.
export function goTo(entry) {
  toChoose = entry.id;
  go(entry.parent);
}

export function goUp() {
  if (browser.id !== "/") go(isSearch(browser.id) ? browser.lastFolder : parentOf(browser.id));
}

function columns() {
  const { name, folder, size, mtime, type, owner } = COLUMNS;
  return (isSearch(browser.id) ? [name, folder, size, mtime, type] : [name, size, mtime, type, owner]).map(
    (column) => ({
      ...column,
      sorted: column.sort !== browser.sort.by ? null : browser.sort.ascending ? "ascending" : "descending",
    }),
  );
}

function changed(listing) {
  if (listing !== browser.listing) return;
  emit("listing");
}

function remember() {
  if (!browser.listing?.ready || browser.filter !== "") return;
  remembered.set(browser.id, { top: browser.view.root.scrollTop, cursor: browser.selection.cursor });
}

export async function open(id) {
  const mine = ++turn;
  const from = browser.id;
  remember();
  browser.listing?.cancel();
  browser.filter = "";
  browser.kind = "all";
  browser.id = id;
  if (!isSearch(id)) browser.lastFolder = id;
  // A folder has no column of folders.
  if (!isSearch(id) && browser.sort.by === COLUMNS.folder.sort) browser.sort = { by: "name", ascending: true };
  const choice = toChoose ?? (parentOf(from) === id ? from : null);
  toChoose = null;
  emit("place", id);
  if (id === "/") {
    browser.listing = null;
    browser.selection.reset();
    emit("shown");
    return;
  }
  await show(id, mine, choice);
  if (mine === turn && browser.listing?.ready) announce(t("announce.opened", { count: browser.listing.total }));
}

async function show(id, mine, cameFrom) {
  const listing = isSearch(id) ? searchResults(id.slice(1), browser, changed) : folderListing(id, browser, changed);
  const saved = remembered.get(id);
  await Promise.race([listing.need(0, FIRST_LOOK), new Promise((resolve) => setTimeout(resolve, PATIENCE))]);
  if (mine !== turn) return listing.cancel();
  browser.listing = listing;
  browser.selection.reset();
  emit("shown");
  if (!listing.ready && !listing.error) await listing.need(0, FIRST_LOOK);
  if (mine !== turn || !listing.ready) return;
  if (saved) restore(saved);
  if (cameFrom) {
    const index = listing.find((entry) => entry.id === cameFrom);
    if (index >= 0) choose(index);
  }
}

function restore({ top, cursor }) {
  browser.view.root.scrollTop = top;
  browser.selection.cursor = browser.selection.anchor = Math.min(cursor, Math.max(0, browser.listing.total - 1));
  browser.view.render();
}

function choose(index) {
  browser.selection.pick(index);
  browser.view.reveal(index);
}

export function setMode(mode) {
  browser.mode = mode;
  setPref("mode", mode);
  const [first] = browser.view.inSight ?? [0];
  emit("shown");
  if (browser.listing?.ready && first > 0) browser.view.reveal(first);
}

export function setSort(by) {
  const ascending = browser.sort.by === by ? !browser.sort.ascending : true;
  browser.sort = { by, ascending };
  setPref("sort", browser.sort);
  reopen();
}

export function setKind(kind) {
  browser.kind = kind;
  reopen();
}

export function setFilter(text) {
  if (browser.filter === text) return;
  browser.filter = text;
  reopen();
}

async function reopen() {
  if (browser.id === "/") return;
  const mine = ++turn;
  browser.listing?.cancel();
  remembered.delete(browser.id);
  await show(browser.id, mine, null);
}

// After something was changed: what is there stays until the new state has come; what was chosen stays chosen.
export async function refresh(chooseIds = null) {
  if (browser.id === "/") return loadShares();
  const { listing, selection, view } = browser;
  if (!listing) return undefined;
  const chosen = chooseIds ?? idsOf(selection.ranges.list.length > 0 && selection.count <= 1000 ? selection : null);
  const cursorId = chooseIds ? chooseIds[0] : listing.item(selection.cursor)?.id;
  await listing.refresh(...(view.inSight ?? [0, FIRST_LOOK]));
  if (listing !== browser.listing) return undefined;
  const wanted = new Set(chosen);
  const indexes = [];
  let cursor = null;
  for (let i = 0; i < listing.total && i < 20000 && (wanted.size > indexes.length || cursor === null); ++i) {
    const id = listing.item(i)?.id;
    if (id === cursorId) cursor = i;
    if (id && wanted.has(id)) indexes.push(i);
  }
  selection.restore(indexes, cursor ?? Math.min(selection.cursor, Math.max(0, listing.total - 1)));
  if (chooseIds && cursor !== null) view.reveal(cursor);
  return undefined;
}

function idsOf(selection) {
  if (!selection) return [];
  const ids = [];
  for (const [first, last] of selection.ranges.list) {
    for (let i = first; i <= last; ++i) ids.push(browser.listing.item(i)?.id);
  }
  return ids.filter(Boolean);
}

export function selectedEntries() {
  return browser.listing ? browser.listing.entries(browser.selection.ranges.list) : Promise.resolve([]);
}

export { columns };
