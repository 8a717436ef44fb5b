// What stands behind "#": the place, and after "!" the file that is looked at, by its name in the folder or, where a
// search found it, by its whole path. No id holds a "!".

import { childOf, isSearch, lastOf, normaliseId, normalisePlace, parentOf } from "./path.js";

export function addressOf(place, file = null) {
  if (file === null) return `#${place}`;
  return `#${place}!${parentOf(file) === place ? lastOf(file) : file}`;
}

// {place, file}: ids, `file` null for none. Whatever somebody typed there is read as something.
export function readAddress() {
  const [place, ...rest] = location.hash.slice(1).split("!");
  const id = normalisePlace(place);
  const file = rest.join("!");
  if (file === "") return { place: id, file: null };
  const whole = file.startsWith("/") || isSearch(id);
  return { place: id, file: whole ? normaliseId(file) : childOf(id, lastOf(normaliseId(file))) };
}
