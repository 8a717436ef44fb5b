// Where one is: the folder on screen, its listing, what is chosen in it.

import { get, MISSING } from "./api.js";
import { announce } from "./dom.js";
import { entryOf } from "./entries.js";
import { emit } from "./events.js";
import { isSearch, normalisePlace, parentOf } from "./path.js";
import { pref, setPref } from "./prefs.js";
import { COLUMNS } from "./rows.js";
import { Selection } from "./selection.js";
import { entryAt, folderListing, searchResults } from "./sources.js";
import { t } from "./strings.js";

const FIRST_LOOK = 60;
// Most folders are there within this; only slower ones show that something is going on.
const PATIENCE = 150;
const MOST_TO_FIND = 1000;

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
  const choice = toChoose ? { id: toChoose, far: true } : parentOf(from) === id ? { id: from } : null;
  toChoose = null;
  emit("place", id);
  if (id === "/") {
    browser.listing = null;
    browser.selection.reset();
    emit("shown");
    return;
  }
  await show(id, mine, choice);
  if (mine !== turn) return;
  if (browser.listing?.ready) announce(t("announce.opened", { count: browser.listing.total }));
  else if (browser.listing?.error?.code === MISSING) openFile(id, mine);
}

// The path of a file leads to the file in its folder.
async function openFile(id, mine) {
  const entry = await entryAt(id).catch(() => undefined);
  if (mine !== turn || !entry || entry.isFolder) return;
  toChoose = id;
  location.replace(`#${entry.parent}`);
}

// `wanted`: {id, far} of the entry to choose; `far` when it is worth looking for in all of the folder.
async function show(id, mine, wanted) {
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
  if (!wanted) return;
  const isWanted = (entry) => entry.id === wanted.id;
  let index = listing.find(isWanted);
  if (index < 0 && wanted.far) index = (await listing.entries([[0, listing.total - 1]])).findIndex(isWanted);
  if (mine === turn && index >= 0) choose(index);
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
  if (mine === turn && browser.listing.ready) announce(t("status.items", { count: browser.listing.total }));
}

// After something was changed: what is there stays until the new state has come; what was chosen stays chosen.
export async function refresh(chooseIds = null) {
  if (browser.id === "/") return loadShares();
  const { listing, selection, view } = browser;
  if (!listing) return undefined;
  const chosen = chooseIds ?? idsOf(selection);
  const cursorId = chooseIds ? chooseIds[0] : listing.item(selection.cursor)?.id;
  const before = listing.total;
  await listing.refresh(...(view.inSight ?? [0, FIRST_LOOK]));
  if (listing !== browser.listing) return undefined;
  // Too many to look for: all that a search finds stay all, others stay in a list that is as long as before.
  if (!chosen && isSearch(browser.id) && selection.count === before) return selection.all(listing.total);
  if (!chosen && listing.total === before) return undefined;
  const wanted = new Set(chosen ?? []);
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

// Of what is chosen; null when that is much, or has never been looked at.
function idsOf(selection) {
  if (selection.count > MOST_TO_FIND) return null;
  const ids = [];
  for (const [first, last] of selection.ranges.list) {
    for (let i = first; i <= last; ++i) ids.push(browser.listing.item(i)?.id);
  }
  return ids.every(Boolean) ? ids : null;
}

export function selectedEntries() {
  return browser.listing ? browser.listing.entries(browser.selection.ranges.list) : Promise.resolve([]);
}

export { columns };
