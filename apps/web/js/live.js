// The folder on screen follows what others do in it: the server is asked whether it has other names by now, and whether
// the rows in sight are as they were.

import { ApiError, readReply, sendOnce, urlOf } from "./api.js";
import { browser, refresh } from "./browser.js";
import { entryOf } from "./entries.js";
import { on } from "./events.js";
import { PAGE } from "./listing.js";
import { isPassing } from "./network.js";
import { same } from "./prefs.js";
import { ADDITIONAL } from "./sources.js";

const PRESENT = 120_000; // milliseconds since somebody was at the page
const PAUSES = [
  [PRESENT, 1200],
  [600_000, 5000],
  [Infinity, 10_000],
];
const HIDDEN = 30_000;
const LONGEST = 120_000;
const REST = 4; // times as long as the answer took
const MOST_ROWS = 100;
const HELD = 400; // after a press nothing moves: the second click of two is meant for the same row
const LOOK_AGAIN = 250;

let touched = performance.now();
let pressed = 0; // pointers that are down
let pressedAt = -Infinity;
let dragging = false;
let timer = null;
let asking = false;
let failures = 0;
let notBefore = 0; // as the server wishes
let known = { rows: "", state: "" }; // what the server said of which rows
let anchor = null; // the row that stays where it is, while the list is fetched anew

export function follow() {
  for (const type of ["pointerdown", "pointermove", "keydown", "wheel", "touchstart", "focus"])
    addEventListener(type, touch, { capture: true, passive: true });
  for (const [type, change] of [["pointerdown", 1], ["pointerup", -1], ["pointercancel", -1]])
    addEventListener(type, () => press(change), { capture: true, passive: true });
  addEventListener("dragstart", () => (dragging = true), { capture: true });
  for (const type of ["dragend", "drop"]) addEventListener(type, () => (dragging = false), { capture: true });
  document.addEventListener("visibilitychange", () => plan(document.hidden ? HIDDEN : 0));
  on("listing", stay);
  plan(0);
}

function touch() {
  const away = performance.now() - touched;
  touched = performance.now();
  if (away > PRESENT) plan(0);
}

function press(change) {
  pressed = Math.max(0, pressed + change);
  pressedAt = performance.now();
}

// The next question. Never two at once.
function plan(pause) {
  clearTimeout(timer);
  const now = performance.now();
  if (!asking) timer = setTimeout(ask, Math.max(pause, notBefore - now));
}

function usualPause() {
  const away = performance.now() - touched;
  return document.hidden ? HIDDEN : PAUSES.find(([limit]) => away <= limit)[1];
}

async function ask() {
  const { listing } = browser;
  if (isHeld()) return plan(LOOK_AGAIN);
  const began = performance.now();
  if (isFollowed(listing)) {
    asking = true;
    try {
      await look(listing);
      failures = 0;
    } catch (failure) {
      ++failures;
      // What cannot be had any more says so itself.
      if (!isPassing(failure) && listing === browser.listing) await refresh().catch(() => {});
    }
    asking = false;
  }
  const took = performance.now() - began;
  return plan(Math.min(LONGEST, Math.max(usualPause() * 2 ** Math.min(failures, 6), REST * took)));
}

function isFollowed(listing) {
  return Boolean(listing?.folder === browser.id && listing.kept && listing.ready && !listing.error && listing.requests.size === 0);
}

// While a hand is on the list, or something lies over it, it stays as it is.
function isHeld() {
  const at = performance.now();
  if (pressed > 0 && at - pressedAt > LONGEST) pressed = 0; // it was let go where nobody saw it
  return (
    pressed > 0 ||
    dragging ||
    at - pressedAt < HELD ||
    document.querySelector("dialog[open], .menu") !== null ||
    [...browser.view.rows.values()].some((row) => row.editing)
  );
}

async function look(listing) {
  const { kept } = listing;
  const [first, last] = browser.view.inSight;
  const limit = Math.min(MOST_ROWS, Math.max(1, last - first + 1));
  const rows = `${kept} ${first} ${limit}`;
  const state = known.rows === rows ? known.state : "";
  const reply = await get({ action: "changes", listing: kept, offset: first, limit, state, additional: ADDITIONAL });
  // A list that is another one by now, or one that must not move, is asked about again.
  if (listing !== browser.listing || listing.kept !== kept || listing.requests.size > 0 || isHeld()) return;
  if (reply.changed) return relist(listing);
  known = { rows, state: reply.state };
  if (reply.items) replace(listing, first, reply.items.map(entryOf));
}

// A question of its own, which asks for no password, and is no use of the session when nobody is there.
async function get(asked) {
  const headers = performance.now() - touched > PRESENT ? { "Orvel-Idle": "1" } : {};
  const response = await sendOnce(urlOf("list", asked), { headers, signal: AbortSignal.timeout(LONGEST) }).catch((failure) => {
    throw failure instanceof ApiError ? failure : new ApiError({ key: "page:unreachable" });
  });
  const seconds = Number(response.headers.get("Retry-After"));
  if (seconds > 0) notBefore = performance.now() + Math.min(LONGEST, seconds * 1000);
  const text = await response.text().catch(() => "");
  if (text === "") throw new ApiError({ key: "page:unreachable" });
  return readReply(response.status, text);
}

// Rows as they are by now, where they stand.
function replace(listing, first, entries) {
  const { selection } = browser;
  let changed = false;
  entries.forEach((entry, i) => {
    const place = listing.place(first + i);
    const page = place?.one.pages.get(Math.floor(place.offset / PAGE));
    const before = page?.[place.offset % PAGE];
    if (before?.id !== entry.id || same(before, entry)) return;
    page[place.offset % PAGE] = entry;
    if (selection.chosen.has(entry.id)) selection.chosen.set(entry.id, entry);
    changed = true;
  });
  if (changed) listing.onChange(listing);
}

async function relist(listing) {
  anchor = anchorOf(listing);
  try {
    await refresh();
    for (const id of listing === browser.listing ? (anchor?.others ?? []) : []) if (stayAt(listing, id)) break;
  } finally {
    anchor = null;
  }
}

// The row below the pointer, else the first in sight of a list that was scrolled; and those that may stand for it.
function anchorOf(listing) {
  const { view } = browser;
  const [first, last] = view.inSight;
  const hovered = view.indexOf(view.root.querySelector(".row:hover") ?? view.root);
  if (hovered < 0 && view.root.scrollTop === 0) return null;
  const index = hovered < 0 ? first : hovered;
  const ids = [];
  const tops = new Map();
  for (let i = first; i <= last; ++i) {
    const id = listing.item(i)?.id;
    if (id === undefined) continue;
    ids.push(id);
    tops.set(id, topOf(i));
  }
  const others = ids.sort((one, other) => Math.abs(tops.get(one) - topOf(index)) - Math.abs(tops.get(other) - topOf(index)));
  return { id: listing.item(index)?.id, others, tops };
}

// How far below the upper edge its line begins.
function topOf(index) {
  const { across, height, top } = browser.view.measure();
  return Math.floor(index / across) * height - top;
}

// Before anything is painted.
function stay(listing = browser.listing) {
  if (anchor && stayAt(listing, anchor.id)) anchor = null;
}

function stayAt(listing, id) {
  const index = listing?.indexOf(id) ?? -1;
  if (index < 0) return false;
  const { view } = browser;
  const moved = topOf(index) - anchor.tops.get(id);
  if (moved !== 0) {
    view.root.scrollTop += moved / view.measure().scale;
    view.render();
  }
  return true;
}
