// Paths of shares. Everywhere in the page a path is an "id": the bytes of the share-relative path, percent-encoded as
// the programs do it. So a name in any encoding can be kept, compared, put into the address bar and sent back.

const decoder = new TextDecoder("utf-8");
const encoder = new TextEncoder();

export function encodeName(name) {
  return encodeURIComponent(name.toWellFormed()).replace(/[!'()*]/g, hexOf);
}

function hexOf(character) {
  return "%" + character.charCodeAt(0).toString(16).toUpperCase();
}

// From a path as people type it.
export function encodePath(path) {
  return path.split("/").map(encodeName).join("/");
}

// An address that somebody may have edited: whatever it holds, the answer is an id.
export function normaliseId(text) {
  const parts = text.split("/").filter((part) => part !== "");
  return parts.length === 0 ? "/" : "/" + parts.map(normalisePart).join("/");
}

function normalisePart(part) {
  const whole = part.replace(/%(?![0-9A-Fa-f]{2})/g, "%25");
  return whole.replace(/%[0-9A-Fa-f]{2}|[^A-Za-z0-9\-._~]/gu, (piece) =>
    piece.length === 3 && piece[0] === "%" ? piece.toUpperCase() : encodeName(piece),
  );
}

// A search stands in the address as "?", its task, and behind "&" what was asked for.
export function isSearch(place) {
  return place.startsWith("?");
}

// All recycle bins as one list: among the places a search, of which the answer is there at once.
export const DELETED = "?deleted";

export function isDeleted(place) {
  return place === DELETED;
}

export function taskOf(search) {
  return search.slice(1).split("&", 1)[0];
}

export function normalisePlace(text) {
  return isSearch(text) ? text : normaliseId(text);
}

// Readable; bytes that are no UTF-8 show as U+FFFD.
export function decode(id) {
  const bytes = encoder.encode(id);
  const out = new Uint8Array(bytes.length);
  let length = 0;
  for (let i = 0; i < bytes.length; ++i) {
    const escaped = bytes[i] === 0x25;
    out[length++] = escaped ? parseInt(id.slice(i + 1, i + 3), 16) : bytes[i];
    if (escaped) i += 2;
  }
  return decoder.decode(out.subarray(0, length));
}

export function parentOf(id) {
  const end = id.lastIndexOf("/");
  return end <= 0 ? "/" : id.slice(0, end);
}

export function lastOf(id) {
  return id.slice(id.lastIndexOf("/") + 1);
}

export function nameOf(id) {
  return decode(lastOf(id));
}

export function childOf(id, encodedName) {
  return (id === "/" ? "" : id) + "/" + encodedName;
}

export function isWithin(id, ancestor) {
  return ancestor === "/" || id === ancestor || id.startsWith(ancestor + "/");
}

// "/a/b/c" gives "/a", "/a/b", "/a/b/c".
export function ancestry(id) {
  const parts = id.split("/").filter((part) => part !== "");
  return parts.map((_, i) => "/" + parts.slice(0, i + 1).join("/"));
}

export function shareOf(id) {
  return `/${id.split("/", 2)[1]}`;
}

const LONGEST_LIST = 900_000; // bytes in a form, below what the web server takes

// Lines of text for a field of a form; in several lists when one form cannot hold them all. lineOf(item, before): `before`
// is the item of the line above, if any.
export function inForms(items, lineOf = (item) => item) {
  const lists = [];
  let room = 0;
  let before = null;
  for (const item of items) {
    let line = lineOf(item, before);
    // In a form a "%" and a "/" take three bytes, and so does the end of a line.
    const bytes = (text) => text.length + 2 * text.split(/[%/~]/).length + 2;
    if (room < bytes(line)) {
      lists.push([]);
      room = LONGEST_LIST;
      line = lineOf(item, null);
    }
    room -= bytes(line);
    before = item;
    lists.at(-1).push(line);
  }
  return lists;
}

// Ids as the lines of "paths_raw", a folder said once.
export function pathLists(ids) {
  return inForms(ids, (id, before) => (before !== null && parentOf(before) === parentOf(id) ? lastOf(id) : id));
}

// A name (encoded) as a pattern: a character that means something in one stands for any.
export function patternOf(name) {
  return decode(name).replace(/[,\\*?[\]\uFFFD]/g, "?");
}

// Patterns of names with accents, in both forms in which systems write these.
export function inBothForms(patterns) {
  return [...new Set([patterns, patterns.normalize("NFC"), patterns.normalize("NFD")])].join(",");
}

// Of a reply's object, whose readable text is in `key`.
export function idIn(object, key = "path") {
  return object[key + "_raw"] ?? encodePath(object[key]);
}

// "name.tar.gz" gives ["name", ".tar.gz"]; names that begin with a dot have no extension.
export function splitExtension(name) {
  const match = /^(.+?)((?:\.tar)?\.[^.\s]{1,10})$/isu.exec(name);
  return match ? [match[1], match[2]] : [name, ""];
}
