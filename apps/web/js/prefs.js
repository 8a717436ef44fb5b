// What somebody chose: in this browser at once, and on the server, where it is the same in every browser. Without storage
// (private windows) or server it lasts as long as the page.

import { get, PROGRAMS, sendOnce } from "./api.js";
import { broughtOr } from "./beside.js";
import { arrived, emit } from "./events.js";

const PREFIX = "orvel.";
// These follow their owner; the theme is the screen's.
const OWN = ["mode", "sort", "orders", "columns", "density", "language", "favourites", "recent"];
const REST = 1500; // milliseconds; changes within go to the server together
const held = new Map();
const unsent = new Map();
let known = false; // what the server has
let timer = null;
let due = Infinity; // when the server is to have what is unsent

export function pref(name, fallback) {
  if (held.has(name)) return held.get(name) ?? fallback;
  try {
    return JSON.parse(localStorage.getItem(PREFIX + name)) ?? fallback;
  } catch {
    return fallback;
  }
}

function hold(name, value) {
  held.set(name, value);
  try {
    if (value === null) localStorage.removeItem(PREFIX + name);
    else localStorage.setItem(PREFIX + name, JSON.stringify(value));
  } catch {
    // Held above.
  }
}

// `rest`: how long the server may wait for it, in milliseconds.
export function setPref(name, value, rest = REST) {
  hold(name, value);
  if (!OWN.includes(name)) return;
  unsent.set(name, value);
  const wanted = performance.now() + rest;
  if (wanted > due) return;
  due = wanted;
  clearTimeout(timer);
  timer = setTimeout(send, rest);
}

// Once it is known who is logged in. What another user of this browser chose is forgotten; what the server has counts.
export async function setupPrefs(user) {
  if (pref("owner", user) !== user) OWN.forEach((name) => hold(name, null));
  hold("owner", user);
  addEventListener("pagehide", send);
  addEventListener("online", send);
  await arrived;
  const ask = () => get("preferences", { action: "get" }).catch(() => ({}));
  const { values } = await broughtOr("preferences", ask);
  if (!values) return;
  known = true;
  const changed = OWN.filter((name) => !unsent.has(name) && name in values && !same(values[name], pref(name, null)));
  changed.forEach((name) => hold(name, values[name]));
  if (changed.length > 0) emit("prefs", changed);
  send();
}

export function same(one, other) {
  return JSON.stringify(one) === JSON.stringify(other);
}

// What could not be sent goes with the next change.
async function send() {
  clearTimeout(timer);
  due = Infinity;
  if (!known || unsent.size === 0) return;
  const values = Object.fromEntries(unsent);
  unsent.clear();
  const body = new URLSearchParams({ action: "set", values: JSON.stringify(values) });
  const response = await sendOnce(`${PROGRAMS}preferences`, { method: "POST", body, keepalive: true }).catch(() => null);
  if (response?.ok) return;
  for (const [name, value] of Object.entries(values)) if (!unsent.has(name)) unsent.set(name, value);
}
