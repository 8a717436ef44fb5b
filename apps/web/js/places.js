// Folders that somebody wants to find again: favourites, and where they were.

import { browser } from "./browser.js";
import { addCommand } from "./commands.js";
import { emit, on } from "./events.js";
import { isSearch } from "./path.js";
import { pref, setPref } from "./prefs.js";

const MOST_FAVOURITES = 50;
const MOST_RECENT = 8;
const RECENT_REST = 10_000; // milliseconds: going around is not worth a request a folder

const isFolderPlace = (id) => id !== "/" && !isSearch(id);

addCommand({ id: "favour", icon: "star", group: "go", when: (now) => placeOf(now) && !isFavourite(placeOf(now)), run: toggle });
addCommand({ id: "unfavour", icon: "star", group: "go", when: (now) => placeOf(now) && isFavourite(placeOf(now)), run: toggle });

// The chosen folder, or the one on screen where nothing is chosen.
function placeOf({ count, single }) {
  if (count > 0) return single?.isFolder ? single.id : null;
  return isFolderPlace(browser.id) ? browser.id : null;
}

export function favourites() {
  return pref("favourites", []);
}

// Where the home page leads back to; what is a favourite stands there already.
export function recentPlaces() {
  return pref("recent", []).filter((id) => !isFavourite(id));
}

function isFavourite(id) {
  return favourites().includes(id);
}

function toggle(now) {
  const id = placeOf(now);
  if (isFavourite(id)) dropFavourite(id);
  else setPref("favourites", [...favourites(), id].slice(-MOST_FAVOURITES));
  emit("places");
}

export function dropFavourite(id) {
  setPref(
    "favourites",
    favourites().filter((one) => one !== id),
  );
}

export function setupPlaces() {
  const keep = () => {
    const { id, listing } = browser;
    const [last] = pref("recent", []);
    if (!isFolderPlace(id) || !listing?.ready || listing.error || last === id) return;
    const others = pref("recent", []).filter((one) => one !== id);
    setPref("recent", [id, ...others].slice(0, MOST_RECENT), RECENT_REST);
  };
  for (const name of ["shown", "listing"]) on(name, keep); // a slow one comes later
}
