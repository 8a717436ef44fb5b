// Asks for the rows that come into sight next.

import { browser } from "./browser.js";

const ASK_EACH = 100;
const LOOK_AHEAD = 400; // milliseconds of movement
const FARTHEST = 400; // rows
const TOO_FAST = 2; // rows in a millisecond

let timer = null;
let lastAsk = { at: 0, first: 0 };

// While the list moves, pages are asked for from time to time, with those that come into sight next at this speed.
// What flies by faster than it could come is never fetched.
export function lookAhead() {
  timer ??= setTimeout(askAhead, Math.max(0, lastAsk.at + ASK_EACH - performance.now()));
}

function askAhead() {
  timer = null;
  if (!browser.listing) return undefined;
  const now = performance.now();
  const [first, last] = browser.view.inSight;
  const speed = (first - lastAsk.first) / Math.max(1, now - lastAsk.at);
  const ahead = Math.max(-FARTHEST, Math.min(FARTHEST, Math.round(speed * LOOK_AHEAD)));
  lastAsk = { at: now, first };
  if (Math.abs(speed) > TOO_FAST) return lookAhead();
  browser.listing.need(first + Math.min(0, ahead), last + Math.max(0, ahead));
  return undefined;
}
