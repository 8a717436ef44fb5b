// Searches: asked in the panel, running on the server, their results in the list.

import { post } from "./api.js";
import { browser, go, refresh } from "./browser.js";
import { addCommand } from "./commands.js";
import { loaded, toastFailure } from "./dialogs.js";
import { $, announce, h, iconButton } from "./dom.js";
import { describe } from "./errors.js";
import { on } from "./events.js";
import { formatTime } from "./format.js";
import { isDeleted, isSearch, normaliseId, taskOf } from "./path.js";
import { firstPage, keepFirstPage } from "./sources.js";
import { t } from "./strings.js";

const POLLS = [100, 200, 400, 700]; // the first rows are few, and more come soon
let asked = {};
let timer = null;
let polls = 0;

export function setupSearch() {
  on("listing", watch);
  on("shown", watch);
  on("place", (id) => {
    clearTimeout(timer);
    polls = 0;
    if (!isSearch(id) || isDeleted(id)) return closePanel();
    asked = recall(id) ?? asked;
    if (asked.folder) browser.lastFolder = normaliseId(asked.folder);
    return undefined;
  });
  $("panel").addEventListener("keydown", (event) => {
    if (event.key === "Escape") closePanel();
  });
  $("search-button").addEventListener("click", () => ($("panel").hidden ? openSearch() : closePanel()));
}

addCommand({ id: "search", icon: "search", keys: ["Mod+Shift+f"], group: "go", run: openSearch });
addCommand({
  id: "stopSearch",
  icon: "stop",
  group: "go",
  when: ({ search }) => search && browser.listing?.extra?.finished === false,
  run: stopSearch,
});
addCommand({ id: "closeSearch", icon: "close", group: "go", when: ({ search }) => search, run: closeSearch });

let maker = null; // what makes and reads the form, loaded when it is wanted

export async function openSearch() {
  maker ??= await loaded(import("./search_form.js"));
  if (!maker) return;
  const form = maker.searchForm(asked, start);
  form.addEventListener("reset", (event) => {
    event.preventDefault();
    asked = {};
    openSearch();
  });
  $("panel").replaceChildren(
    h("header", {}, h("h2", {}, t("command.search")), iconButton("close", t("dialog.close"), closePanel)),
    form,
  );
  $("panel").hidden = false;
  $("search-button").setAttribute("aria-expanded", "true");
  form.elements.name.focus();
  form.elements.name.select();
}

function closePanel() {
  if ($("panel").contains(document.activeElement)) $("search-button").focus();
  $("panel").hidden = true;
  $("search-button").setAttribute("aria-expanded", "false");
}

// By name alone, below the folder on screen.
export function searchFor(name) {
  asked = { name, where: browser.lastFolder === "/" ? "all" : "below" };
  searchAgain();
}

async function start(values) {
  const complaint = $("panel").querySelector(".complaint");
  const params = maker.paramsOf(values);
  complaint.textContent = maker.isEmptySearch(params) ? t("search.nothing") : "";
  if (complaint.textContent) return;
  const filled = Object.entries({ ...values, folder: browser.lastFolder }).filter(([, value]) => value !== "");
  asked = Object.fromEntries(filled);
  const before = isSearch(browser.id) && !isDeleted(browser.id) ? browser.id : null;
  try {
    const page = firstPage(browser.sort);
    const { taskid, first } = await post("search", { action: "start", ...params, ...page });
    if (first) keepFirstPage(taskid, page, first);
    if (matchMedia("(max-width: 760px)").matches) closePanel();
    if (before) clean(before);
    go(`?${taskid}&${new URLSearchParams(asked)}`);
  } catch (failure) {
    const said = describe(failure);
    complaint.textContent = [
      failure.data?.parameter && t("search.wrong", { field: t(`search.${failure.data.parameter.split("_")[0]}`) }),
      said.title,
    ].filter(Boolean)[0];
  }
}

// What was asked for stands in the address; nothing in one of a former version.
function recall(id) {
  const fields = [...new URLSearchParams(id.slice(taskOf(id).length + 1))];
  return fields.length > 0 ? Object.fromEntries(fields) : null;
}

// What the address asks for, once more: the server keeps no results for good.
export async function searchAgain() {
  await openSearch();
  $("panel").querySelector("form")?.requestSubmit();
}

// As long as it runs, what is in sight is asked for again.
function watch() {
  const { listing, id } = browser;
  clearTimeout(timer);
  if (!isSearch(id) || !listing?.ready || listing.extra?.finished) {
    if (isSearch(id) && listing?.extra?.finished && listing.told !== true) tell(listing);
    return;
  }
  timer = setTimeout(async () => {
    if (listing !== browser.listing) return;
    polls += 1;
    await refresh();
    watch();
  }, POLLS[Math.min(polls, POLLS.length - 1)]);
}

function tell(listing) {
  listing.told = true;
  if (listing.extra.failed) toastFailure({ ...listing.extra.failure, path: "" });
  announce(t("search.found", { count: listing.total }));
}

async function stopSearch() {
  await post("search", { action: "stop", taskid: taskOf(browser.id) }).catch((failure) => toastFailure(failure));
  refresh();
}

function clean(id) {
  post("search", { action: "clean", taskid: taskOf(id) }).catch(() => {});
}

function closeSearch() {
  clean(browser.id);
  closePanel();
  go(browser.lastFolder);
}

// What answered, and of when it is.
function wayOf({ shares = {}, indexes = {} }) {
  const ways = new Set(Object.values(shares));
  if (ways.size === 0) return "";
  const old = Object.values(indexes).filter(({ live }) => !live);
  const part = ways.size > 1 ? "both" : [...ways][0];
  if (part === "walk") return t("search.by.walk");
  if (old.length === 0) return t(`search.by.${part}.live`);
  return t(`search.by.${part}`, { time: formatTime(Math.min(...old.map(({ updated }) => updated))) });
}

export function searchStatus(listing) {
  const { finished, stopped } = listing.extra ?? {};
  const found = t("search.found", { count: listing.total });
  if (!finished) {
    const early = listing.total > 0 && t("search.preliminary");
    return h("span.running", {}, h("i.spinner"), [t("search.running"), found, early].filter(Boolean).join(" "));
  }
  return h("span", {}, [found, stopped && t("search.stopped"), wayOf(listing.extra)].filter(Boolean).join(" · "));
}
