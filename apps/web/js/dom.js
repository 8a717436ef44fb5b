// Making elements. Text only ever enters the document as text.

// h("div.card#id", {title: "x", onclick: f, role: "row"}, child, "text", [more])
export function h(selector, attributes = {}, ...children) {
  const [tag, ...marks] = selector.split(/(?=[.#])/);
  const node = document.createElement(tag || "div");
  for (const mark of marks) {
    if (mark[0] === "#") node.id = mark.slice(1);
    else node.classList.add(mark.slice(1));
  }
  set(node, attributes);
  node.append(...children.flat(Infinity).filter((child) => child !== null && child !== undefined && child !== false));
  return node;
}

export function set(node, attributes) {
  for (const [name, value] of Object.entries(attributes)) {
    if (name.startsWith("on")) node.addEventListener(name.slice(2), value);
    else if (value === false || value === null || value === undefined) node.removeAttribute(name);
    else node.setAttribute(name, value === true ? "" : value);
  }
  return node;
}

// The icons become part of the document: drawn at once, asked for once.
export async function loadIcons() {
  const text = await (await fetch(new URL("../icons.svg", import.meta.url))).text();
  const sprite = new DOMParser().parseFromString(text, "image/svg+xml").documentElement;
  sprite.setAttribute("class", "sprite");
  sprite.setAttribute("aria-hidden", "true");
  document.body.prepend(document.adoptNode(sprite));
}

// The rules of what is not always there. What it returns is settled once they apply, or cannot be had.
export function loadStyle(name) {
  const href = new URL(`../css/${name}.css`, import.meta.url).href;
  if (document.querySelector(`link[href="${href}"]`)) return undefined;
  const link = h("link", { rel: "stylesheet", href });
  document.querySelector("link[href$='css/contrast.css']").before(link); // which has the last word
  return new Promise((resolve) => (link.onload = link.onerror = resolve));
}

export function icon(name, className = "icon") {
  const svg = document.createElementNS("http://www.w3.org/2000/svg", "svg");
  svg.setAttribute("class", className);
  svg.setAttribute("aria-hidden", "true");
  const use = document.createElementNS("http://www.w3.org/2000/svg", "use");
  use.setAttribute("href", `#i-${name}`);
  svg.append(use);
  return svg;
}

export function iconButton(name, label, onclick, extra = {}) {
  return h("button.icon-button", { type: "button", "aria-label": label, title: label, onclick, ...extra }, icon(name));
}

// Two fields for days, of which the second is not before the first.
export function dayRange(first, second) {
  const from = h("input.input", { type: "date", ...first });
  const to = h("input.input", { type: "date", ...second });
  const follow = () => set(to, { min: from.value > (second.min ?? "") ? from.value : second.min });
  from.addEventListener("input", follow);
  follow();
  return [from, to];
}

export const $ = (id) => document.getElementById(id);

// What `change` takes away may have held the keyboard: it goes on with what came in its place, else with the list.
export function keepFocus(box, change) {
  const held = box.contains(document.activeElement) ? document.activeElement : null;
  change();
  if (!held || held === document.activeElement) return;
  const name = ["id", "data-command", "data-sort", "aria-label"].find((one) => held.hasAttribute(one));
  const like = name && box.querySelector(`[${name}="${CSS.escape(held.getAttribute(name))}"]`);
  (held.isConnected ? held : (like ?? box.closest("dialog")?.querySelector("button") ?? $("view"))).focus({ preventScroll: true });
}

const BIDI = {
  "\u202A": "LRE",
  "\u202B": "RLE",
  "\u202C": "PDF",
  "\u202D": "LRO",
  "\u202E": "RLO",
  "\u2066": "LRI",
  "\u2067": "RLI",
  "\u2068": "FSI",
  "\u2069": "PDI",
  "\u200E": "LRM",
  "\u200F": "RLM",
  "\u061C": "ALM",
};
const CONTROLS = { 7: "BEL", 8: "BS", 9: "TAB", 10: "LF", 11: "VT", 12: "FF", 13: "CR", 27: "ESC", 127: "DEL" };
const ODD = /[\u0000-\u001F\u007F-\u009F\u202A-\u202E\u2066-\u2069\u200E\u200F\u061C\uFFFD]/u;
const ODD_RUN = /([\u0000-\u001F\u007F-\u009F\u202A-\u202E\u2066-\u2069\u200E\u200F\u061C\uFFFD])/u;
const PLAIN = /^[\u0020-\u024F]*$/u;
const TAIL = 8;

// A name for people: characters that would hide, move or break text show as marks.
export function nameNode(name, cutInside = true) {
  const node = h("bdi.name");
  if (!ODD.test(name)) {
    const cut = name.length - TAIL;
    // The end, with the extension, stays in sight when the name is cut.
    if (cutInside && cut > 5 && PLAIN.test(name)) {
      node.append(h("span.stem", {}, name.slice(0, cut)), h("span.tail", {}, name.slice(cut)));
    } else {
      node.append(h("span.stem", {}, name));
    }
    return node;
  }
  const stem = h("span.stem");
  for (const piece of name.split(ODD_RUN)) {
    if (piece === "") continue;
    stem.append(piece.length === 1 && ODD.test(piece) ? h("span.mark", {}, markOf(piece)) : piece);
  }
  node.append(stem);
  return node;
}

export function plainName(name) {
  return name.replace(new RegExp(ODD, "gu"), (piece) => (piece === "\uFFFD" ? piece : `[${markOf(piece)}]`));
}

function markOf(character) {
  const code = character.codePointAt(0);
  if (character === "\uFFFD") return "?";
  return CONTROLS[code] ?? BIDI[character] ?? code.toString(16).toUpperCase().padStart(2, "0");
}

export function announce(text) {
  const live = $("live");
  live.textContent = "";
  requestAnimationFrame(() => {
    live.textContent = text;
  });
}

// Lets the browser do what waits: for work that comes in slices.
export function breathe() {
  return globalThis.scheduler?.yield?.() ?? new Promise((resolve) => setTimeout(resolve));
}
