// Starts the page.

import { setupAccess } from "./access.js";
import { setupAccount } from "./account.js";
import { readAddress } from "./address.js";
import { setupActivity } from "./activity.js";
import { get } from "./api.js";
import { broughtOr } from "./beside.js";
import {
  browser,
  columns,
  goUp,
  loadShares,
  open,
  openAt,
  refresh,
  setFilter,
  setKind,
  setSort,
  shareEntry,
} from "./browser.js";
import { applyDensity } from "./columns.js";
import { context, runCommand } from "./commands.js";
import { showWhyOf } from "./dialogs.js";
import { $, h, keepFocus, loadIcons } from "./dom.js";
import { setupDragAndDrop } from "./dragdrop.js";
import { arrived, emit, on } from "./events.js";
import { filterHome, homeNode, paintVolume } from "./home.js";
import { setupKeys } from "./keys.js";
import { setupLinkMarks } from "./link_marks.js";
import "./links.js";
import { isUnreachable, untilReachable } from "./network.js";
import { newFolder } from "./operations.js";
import { isDeleted, isSearch, parentOf } from "./path.js";
import { setupPathbar } from "./pathbar.js";
import { setupPlaces } from "./places.js";
import { setupPointer } from "./pointer.js";
import { setupPrefs } from "./prefs.js";
import { preview, previewed } from "./preview.js";
import { setupRubber } from "./rubber.js";
import { openSearch, searchAgain, searchFor, setupSearch } from "./search.js";
import { setupSession } from "./session.js";
import { setupSettings } from "./settings.js";
import { entryAt } from "./sources.js";
import {
  emptyBin,
  emptyFolder,
  failedState,
  nothingMatches,
  noShares,
  nothingFound,
  staleNotice,
  stillSearching,
} from "./states.js";
import { loadStrings, t } from "./strings.js";
import { setupTasks } from "./tasks.js";
import { setupToolbar } from "./toolbar.js";
import { setupTree } from "./tree.js";
import { chooseFiles, uploadsRunning } from "./uploads.js";
import { View } from "./view.js";

const ASK_EACH = 100;
const LOOK_AHEAD = 400; // milliseconds of movement
const FARTHEST = 400; // rows
const TOO_FAST = 2; // rows in a millisecond
const FOLLOW_AFTER = 1500; // what was just listed is fresh
let stateNode = null;
let homeShown = null;
let scrollTimer = null;
let lastAsk = { at: 0, first: 0 };

function setState(node) {
  stateNode?.remove();
  stateNode = node;
  if (node) $("content").append(node);
}

// The place changed: another list, or the shares.
function showPlace() {
  homeShown?.remove();
  homeShown = null;
  setState(null);
  const home = browser.id === "/";
  $("up-button").disabled = home;
  paintNotice(browser.listing);
  $("view").hidden = home;
  if (home) {
    homeShown = homeNode();
    $("content").append(homeShown);
    if (browser.shares.length === 0) setState(noShares());
  } else {
    browser.view.show(browser.listing, browser.selection, browser.mode, columns());
    paintListing();
  }
  // The keyboard works from the start.
  if (document.activeElement === document.body) (homeShown ?? $("view")).focus({ preventScroll: true });
  paintVolume($("volume"), shareEntry(browser.id));
}

function paintListing() {
  const { listing, view } = browser;
  if (!listing) return;
  view.render();
  setState(stateOf(listing));
  paintNotice(listing);
  if (listing.ready && !listing.error) listing.need(...view.inSight);
}

// A list whose server is away for a while stays; it is asked for again once the server is back.
function isStale({ error, ready }) {
  return error !== null && ready && (isUnreachable(error) || error.key === "page:logged_out");
}

function paintNotice(listing) {
  const stale = listing !== null && isStale(listing);
  if (stale && $("notice").hidden) $("notice").replaceChildren(...staleNotice(listing.error, () => refresh()));
  if (stale && isUnreachable(listing.error))
    untilReachable().then(() => listing === browser.listing && listing.error && refresh());
  keepFocus($("notice"), () => {
    $("notice").hidden = !stale;
  });
}

function stateOf(listing) {
  if (listing.error && !isStale(listing)) {
    const { id } = browser;
    if (isDeleted(id)) return failedState(listing.error, "", { retry: () => open(id), back: goUp });
    if (isSearch(id)) return failedState(listing.error, "", { retry: searchAgain, back: goUp });
    const back = parentOf(id) === "/" ? null : goUp;
    return failedState(listing.error, undefined, { retry: () => open(id), back, why: () => showWhyOf(id) });
  }
  if (!listing.ready || listing.total > 0) return null;
  if (isDeleted(browser.id) && browser.filter === "") return emptyBin();
  if (isSearch(browser.id) && browser.filter === "" && browser.kind === "all")
    return listing.extra.finished ? nothingMatches(openSearch) : stillSearching();
  if (browser.filter !== "" || browser.kind !== "all") {
    const text = browser.filter;
    return nothingFound(text, clearFilter, text !== "" && !isSearch(browser.id) && (() => searchFor(text)));
  }
  const { canWrite, inBin } = context();
  return inBin ? emptyBin() : emptyFolder({ canWrite, upload: () => chooseFiles(false), newFolder });
}

function clearFilter() {
  $("find").value = "";
  if (document.activeElement !== $("find")) document.querySelector(".top").classList.remove("finding");
  if (browser.kind !== "all") setKind("all");
  setFilter("");
  if (homeShown) filterHome(homeShown, "");
}

// While the list moves, pages are asked for from time to time, with those that come into sight next at this speed.
// What flies by faster than it could come is never fetched.
function scrolled() {
  scrollTimer ??= setTimeout(askAhead, Math.max(0, lastAsk.at + ASK_EACH - performance.now()));
}

function askAhead() {
  scrollTimer = null;
  if (!browser.listing) return undefined;
  const now = performance.now();
  const [first, last] = browser.view.inSight;
  const speed = (first - lastAsk.first) / Math.max(1, now - lastAsk.at);
  const ahead = Math.max(-FARTHEST, Math.min(FARTHEST, Math.round(speed * LOOK_AHEAD)));
  lastAsk = { at: now, first };
  if (Math.abs(speed) > TOO_FAST) return scrolled();
  browser.listing.need(first + Math.min(0, ahead), last + Math.max(0, ahead));
  return undefined;
}

function setupFind() {
  const input = $("find");
  let timer = null;
  input.addEventListener("input", () => {
    clearTimeout(timer);
    if (browser.id !== "/") timer = setTimeout(() => setFilter(input.value.trim()), 180);
    else if (homeShown) filterHome(homeShown, input.value.trim());
  });
  input.addEventListener("keydown", (event) => {
    if (event.key === "Escape") {
      clearFilter();
      $("view").focus();
    }
    if (event.key === "ArrowDown") $("view").focus();
    // Here is only what lies in this folder: Enter looks below it, and from the start in all shares.
    if (event.key === "Enter" && input.value.trim() !== "" && !isDeleted(browser.id)) {
      clearTimeout(timer);
      searchFor(input.value.trim());
    }
  });
  $("find-clear").addEventListener("click", () => {
    clearTimeout(timer);
    clearFilter();
    input.focus();
  });
  on("clear-filter", clearFilter);
  on("place", () => {
    clearTimeout(timer);
    input.value = "";
    document.querySelector(".top").classList.remove("finding");
  });
}

function setupSidebar() {
  const button = $("menu-button");
  const close = () => {
    if (!$("side").classList.contains("open")) return;
    if ($("side").contains(document.activeElement)) button.focus();
    $("side").classList.remove("open");
    document.querySelector(".side-scrim").remove();
    button.setAttribute("aria-expanded", "false");
  };
  button.addEventListener("click", () => {
    $("side").classList.add("open");
    document.body.append(h("div.side-scrim", { onclick: close }));
    button.setAttribute("aria-expanded", "true");
    $("tree").querySelector("[tabindex='0']")?.focus();
  });
  on("place", (id) => {
    close();
    if (isDeleted(id)) $("deleted-link").setAttribute("aria-current", "page");
    else $("deleted-link").removeAttribute("aria-current");
  });
  addEventListener("keydown", (event) => {
    if (event.key === "Escape") close();
  });
}

// Also on the way back and forward: a file that is looked at lies over its folder, which stays as it is.
let shownFirst = false;

async function followAddress() {
  const { place, file } = readAddress();
  if (place !== browser.id || !shownFirst) {
    shownFirst = true;
    await (file ? openAt(place, file) : open(place));
  }
  if (file === null || previewed() === file || readAddress().file !== file) return;
  const index = browser.listing?.indexOf(file) ?? -1;
  if (index >= 0) browser.selection.only(browser.listing.item(index), index);
  const entry = browser.selection.single?.id === file ? browser.selection.single : await entryAt(file).catch(() => null);
  if (entry && readAddress().file === file) preview(entry, true);
}

function fillTexts() {
  for (const node of document.querySelectorAll("[data-text]")) node.textContent = t(node.dataset.text);
  for (const node of document.querySelectorAll("[data-label]")) {
    node.setAttribute("aria-label", t(node.dataset.label));
    if (node.tagName === "BUTTON") node.title = t(node.dataset.label);
  }
  for (const node of document.querySelectorAll("[data-placeholder]")) node.placeholder = t(node.dataset.placeholder);
  for (const node of document.querySelectorAll("[data-run]"))
    node.addEventListener("click", () => runCommand(node.dataset.run));
}

async function start() {
  await Promise.all([loadStrings(), loadIcons()]);
  fillTexts();
  browser.view = new View($("view"), { onScrolled: scrolled });
  on("shown", showPlace);
  on("listing", paintListing);
  on("selection", () => browser.listing && browser.view.listing === browser.listing && browser.view.paintSelection());
  on("columns", () => {
    if (browser.listing) browser.view.setColumns(columns());
  });
  on("access", () => {
    if (browser.id !== "/") paintListing();
  });
  for (const name of ["shares", "prefs", "places"])
    on(name, () => {
      if (browser.id === "/" && homeShown) showPlace();
    });
  on("prefs", () => {
    applyDensity();
    emit("columns");
  });
  applyDensity();
  setupAccess();
  setupLinkMarks();
  setupToolbar(setSort);
  setupPathbar();
  setupTree();
  setupPointer();
  setupRubber();
  setupKeys();
  setupFind();
  setupSidebar();
  setupSettings();
  setupAccount();
  setupSession();
  setupSearch();
  setupActivity();
  setupDragAndDrop();
  setupPlaces();
  addEventListener("hashchange", followAddress);
  addEventListener("beforeunload", (event) => {
    if (uploadsRunning()) event.preventDefault();
  });
  addEventListener("focus", () => {
    if (context().folder) refresh();
  });
  try {
    await loadShares("preferences,tasks,uploads");
  } catch (failure) {
    setState(failedState(failure, undefined, { retry: () => location.reload() }));
    return;
  }
  setupPrefs(browser.user);
  document.body.classList.add("started");
  setupTasks();
  followAddress().finally(() => emit("arrived"));
  arrived.then(showLeft);
  arrived.then(() => setTimeout(() => import("./live.js").then(({ follow }) => follow(), () => {}), FOLLOW_AFTER));
}

// Only whoever left an upload unfinished needs what shows it.
async function showLeft() {
  const { items } = await broughtOr("uploads", () => get("tus", {}).catch(() => ({ items: [] })));
  if (items.length > 0) (await import("./unfinished.js")).showUnfinished();
}

start().catch((failure) => {
  $("broken").hidden = false;
  throw failure;
});
