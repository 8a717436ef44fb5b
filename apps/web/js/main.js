// Starts the page.

import { setupAccess } from "./access.js";
import { setupActivity } from "./activity.js";
import { browser, columns, goUp, loadShares, open, refresh, setSort, shareEntry } from "./browser.js";
import { context, runCommand } from "./commands.js";
import { setWhy } from "./dialogs.js";
import { $, h, keepFocus, loadIcons } from "./dom.js";
import { setupDragAndDrop } from "./dragdrop.js";
import { on } from "./events.js";
import { homeNode, paintVolume } from "./home.js";
import { clearFilter, setupFind } from "./find.js";
import { setupKeys } from "./keys.js";
import { lookAhead } from "./look_ahead.js";
import "./links.js";
import { isUnreachable, untilReachable } from "./network.js";
import { newFolder } from "./operations.js";
import { isSearch, normalisePlace, parentOf } from "./path.js";
import { setupPathbar } from "./pathbar.js";
import { setupPointer } from "./pointer.js";
import { openSearch, searchFor, setupSearch } from "./search.js";
import { setupSettings } from "./settings.js";
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
import { showWhy } from "./why.js";

let stateNode = null;
let homeShown = null;

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
    if (isSearch(id)) return failedState(listing.error, "", { retry: openSearch, back: goUp });
    const back = parentOf(id) === "/" ? null : goUp;
    return failedState(listing.error, undefined, { retry: () => open(id), back, why: () => showWhy(id) });
  }
  if (!listing.ready || listing.total > 0) return null;
  if (isSearch(browser.id) && browser.filter === "" && browser.kind === "all")
    return listing.extra.finished ? nothingMatches(openSearch) : stillSearching();
  if (browser.filter !== "" || browser.kind !== "all") {
    const text = browser.filter;
    return nothingFound(text, clearFilter, text !== "" && !isSearch(browser.id) && (() => searchFor(text)));
  }
  const { canWrite, inBin } = context();
  return inBin ? emptyBin() : emptyFolder({ canWrite, upload: () => chooseFiles(false), newFolder });
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
  on("place", close);
  addEventListener("keydown", (event) => {
    if (event.key === "Escape") close();
  });
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
  browser.view = new View($("view"), { onScrolled: lookAhead });
  setWhy(showWhy);
  on("shown", showPlace);
  on("listing", paintListing);
  on("selection", () => browser.listing && browser.view.listing === browser.listing && browser.view.paintSelection());
  on("access", () => {
    if (browser.id !== "/") paintListing();
  });
  on("shares", () => {
    if (browser.id === "/" && homeShown) showPlace();
  });
  setupAccess();
  setupToolbar(setSort);
  setupPathbar();
  setupTree();
  setupPointer();
  setupKeys();
  setupFind();
  setupSidebar();
  setupSettings();
  setupSearch();
  setupActivity();
  setupDragAndDrop();
  addEventListener("hashchange", () => open(normalisePlace(location.hash.slice(1))));
  addEventListener("beforeunload", (event) => {
    if (uploadsRunning()) event.preventDefault();
  });
  addEventListener("focus", () => {
    if (context().folder) refresh();
  });
  try {
    await loadShares();
  } catch (failure) {
    setState(failedState(failure, undefined, { retry: () => location.reload() }));
    return;
  }
  document.body.classList.add("started");
  setupTasks();
  open(normalisePlace(location.hash.slice(1)));
}

start().catch((failure) => {
  $("broken").hidden = false;
  throw failure;
});
