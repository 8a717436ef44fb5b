// Where one is: the folder on screen, its listing, what is chosen in it.

import { readAddress } from "./address.js";
import { get, MISSING, session } from "./api.js";
import { bring } from "./beside.js";
import { chosenColumns, COLUMNS } from "./columns.js";
import { toast, toastFailure } from "./dialogs.js";
import { heldItems } from "./clipboard.js";
import { announce } from "./dom.js";
import { entryOf } from "./entries.js";
import { emit, on } from "./events.js";
import { isDeleted, isSearch, lastOf, parentOf, taskOf } from "./path.js";
import { pref, setPref } from "./prefs.js";
import { Selection } from "./selection.js";
import { deletedListing, entryAt, folderListing, renewKept, rowsOfNames, searchResults } from "./sources.js";
import { t } from "./strings.js";

const FIRST_LOOK = 60;
// Most folders are there within this; only slower ones show that something is going on.
const PATIENCE = 150;

const USUAL_ORDER = { by: "name", ascending: true };
const MOST_ORDERS = 100;
const LAST_DELETED = { by: "deleted", ascending: false };

export const browser = {
  id: "/", // of the folder, or of a search (see path.js)
  lastFolder: "/",
  shares: [],
  user: "",
  listing: null,
  selection: new Selection({
    onChange: () => emit("selection"),
    onFailure: (failure) => (failure ? toastFailure(failure, browser.id) : toast({ text: t("chosen.again"), kind: "failed" })),
  }),
  mode: pref("mode", "list"),
  sort: pref("sort", USUAL_ORDER),
  filter: "",
  kind: "all", // of what a search shows: "file", "dir"
  view: null,
};

const remembered = new Map();
let turn = 0;

// `beside`: what else is to come with them.
export async function loadShares(beside) {
  const asked = { action: "shares", additional: "perm,volume_status,mount_point_type,sync_share", with: beside };
  const reply = await get("list", asked);
  bring(reply.with);
  session.user = browser.user = reply.user ?? "";
  browser.shares = reply.items.map(entryOf);
  emit("shares");
}

export function shareEntry(id) {
  const share = id.split("/")[1];
  return browser.shares.find((entry) => entry.encodedName === share);
}

// Opening goes through the address, so that back and forward work.
export function go(id) {
  if (readAddress().place === id) open(id);
  else location.hash = id;
}

let toChoose = null;

// The folder that holds the entry, with it chosen.
export function goTo(entry) {
  toChoose = entry.id;
  go(entry.parent);
}

// What the address says: a place, and in it an entry that is chosen.
export function openAt(place, id) {
  toChoose = id;
  return open(place);
}

export function goUp() {
  if (browser.id !== "/") go(isSearch(browser.id) ? browser.lastFolder : parentOf(browser.id));
}

function columns() {
  return chosenColumns(isSearch(browser.id), browser.sort, isDeleted(browser.id));
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
  if (!isSearch(id)) {
    browser.lastFolder = id;
    browser.sort = orderOf(id);
  }
  if (isDeleted(id) && !isDeleted(from)) browser.sort = LAST_DELETED;
  else if (isDeleted(from) && isSearch(id) && !isDeleted(id)) browser.sort = pref("sort", USUAL_ORDER);
  const choice = toChoose ? { id: toChoose, far: true } : parentOf(from) === id ? { id: from } : null;
  toChoose = null;
  emit("place", id);
  if (id === "/") {
    browser.listing = null;
    browser.selection.reset(null);
    emit("shown");
    return;
  }
  await show(id, mine, choice);
  if (mine !== turn) return;
  emit("opened", id);
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

function listingOf(id) {
  if (isDeleted(id)) return deletedListing(browser, changed);
  return isSearch(id) ? searchResults(taskOf(id), browser, changed) : folderListing(id, browser, changed);
}

// `wanted`: {id, far} of the entry to choose; `far` when it is worth looking for in all of the folder. `keep`: what is
// chosen stays chosen.
async function show(id, mine, wanted, keep = false) {
  const listing = listingOf(id);
  listing.onGone = (kept) => browser.selection.lose(kept) && toast({ text: t("chosen.lost"), kind: "failed" });
  const saved = remembered.get(id);
  renewKept([heldItems()?.choice.rows?.listing]);
  await Promise.race([listing.need(0, FIRST_LOOK), new Promise((resolve) => setTimeout(resolve, PATIENCE))]);
  if (mine !== turn) return listing.cancel();
  browser.listing = listing;
  if (keep) browser.selection.follow(listing);
  else browser.selection.reset(listing);
  emit("shown");
  if (!listing.ready && !listing.error) await listing.need(0, FIRST_LOOK);
  if (mine !== turn || !listing.ready) return;
  if (saved) restore(saved);
  if (keep) await checkChosen(listing, browser.filter === "" && browser.kind === "all" ? "chosen.gone" : "chosen.hidden");
  else if (wanted) await choose(listing, wanted.id, wanted.far);
}

function restore({ top, cursor }) {
  browser.view.root.scrollTop = top;
  browser.selection.stand(Math.min(cursor, Math.max(0, browser.listing.total - 1)));
  browser.view.render();
}

// Chooses an entry and shows it; one that has not been loaded is looked for in all of the list when it is worth that.
async function choose(listing, id, far) {
  let index = listing.indexOf(id);
  let entry = listing.item(index);
  if (index < 0 && far && listing.kept) {
    [index] = await rowsOfNames(listing, [lastOf(id)]).catch(() => [-1]);
    entry = index < 0 ? undefined : await listing.at(index);
    if (entry?.id !== id) return;
  } else if (index < 0 && far) {
    const all = await listing.names(0, Infinity).catch(() => []);
    index = all.findIndex((one) => one.id === id);
    entry = all[index];
  }
  if (index < 0 || listing !== browser.listing) return;
  browser.selection.only(entry, index);
  browser.view.reveal(index);
}

// What is chosen but no longer in the list leaves the choice, and that is said.
async function checkChosen(listing, words) {
  const { selection } = browser;
  if (selection.rows) return carryChosen(listing, words);
  const chosen = (await selection.choice()).entries;
  if (chosen.length === 0) return;
  const idsOf = (entries) => new Set(entries.map((entry) => entry.id));
  let here = idsOf(listing.fresh());
  const asked = chosen.filter((entry) => !here.has(entry.id));
  if (asked.length > 0 && listing.kept) {
    const rows = await rowsOfNames(listing, asked.map((entry) => lastOf(entry.id))).catch(() => asked);
    asked.forEach((entry, i) => rows[i] !== -1 && here.add(entry.id));
  } else if (asked.length > 0) here = idsOf(await listing.names(0, Infinity).catch(() => chosen));
  const left = chosen.filter((entry) => !here.has(entry.id) && selection.chosen.has(entry.id));
  if (left.length === 0 || listing !== browser.listing) return;
  selection.remove(left.map((entry) => entry.id));
  toast({ text: t(words, { count: left.length, name: left[0].name }) });
}

// The same for rows of a list that the server keeps.
async function carryChosen(listing, words) {
  const { selection } = browser;
  const left = await selection.carry().catch((failure) => {
    toastFailure(failure, browser.id);
    return { count: 0 };
  });
  // What is lost is said whatever is shown by now; what only left, for the list that it left.
  if (left === null) toast({ text: t("chosen.lost"), kind: "failed" });
  else if (left.count > 0 && listing === browser.listing) toast({ text: t(words, left) });
}

const RENEW = 10 * 60 * 1000; // a list that the server keeps is gone after an hour at rest

// What is on screen, and what is to be pasted, stays.
function renew() {
  renewKept([browser.listing?.kept, heldItems()?.choice.rows?.listing, browser.selection.rows?.kept]);
}

setInterval(renew, RENEW);

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
  keepOrder(browser.id);
  reopen();
}

// A folder keeps its own order; results of a search have none to keep.
function orderOf(id) {
  return pref("orders", {})[id] ?? pref("sort", USUAL_ORDER);
}

function keepOrder(id) {
  if (isSearch(id)) return;
  const { [id]: _, ...others } = pref("orders", {});
  setPref("orders", Object.fromEntries([...Object.entries(others), [id, browser.sort]].slice(-MOST_ORDERS)));
}

// The order on screen is that of all folders from now on.
export function sortEverywhere() {
  setPref("sort", browser.sort);
  setPref("orders", {});
}

// What was chosen in another browser.
on("prefs", (names) => {
  if (names.includes("mode")) setMode(pref("mode", browser.mode));
  if (isSearch(browser.id) || browser.id === "/") return;
  const { by, ascending } = orderOf(browser.id);
  if (by === browser.sort.by && ascending === browser.sort.ascending) return;
  browser.sort = { by, ascending };
  reopen();
});

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
  await show(browser.id, mine, null, true);
  if (mine === turn && browser.listing.ready) announce(t("status.items", { count: browser.listing.total }));
}

// After something was changed: what is there stays until the new state has come; what was chosen stays chosen.
export async function refresh(chooseId = null) {
  if (browser.id === "/") return loadShares();
  const { listing, selection, view } = browser;
  if (!listing) return undefined;
  const cursorId = listing.item(selection.cursor)?.id;
  // Only by name an order holds as long as the names do.
  await listing.refresh(...(view.inSight ?? [0, FIRST_LOOK]), browser.sort.by !== COLUMNS.name.sort);
  if (listing !== browser.listing || listing.error) return undefined;
  if (chooseId) return choose(listing, chooseId, true);
  const cursor = listing.indexOf(cursorId);
  selection.move(cursor >= 0 ? cursor : Math.min(selection.cursor, Math.max(0, listing.total - 1)));
  // A search that runs takes nothing away, and is asked again and again.
  if (isSearch(browser.id) && !listing.extra?.finished) return undefined;
  return checkChosen(listing, "chosen.gone");
}

export function chosenItems() {
  return browser.selection.choice();
}

export { columns };
