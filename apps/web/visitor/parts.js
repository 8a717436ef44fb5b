// What everything here is made of: elements, texts, numbers.

export const texts = window.visitorTexts;
const locale = navigator.languages.find((tag) => tag.startsWith(window.g_Lang)) ?? window.g_Lang;
const UNITS = ["B", "KB", "MB", "GB", "TB"];

// Text from names goes into the page as text alone, never as markup.
export function make(selector, attributes = {}, ...children) {
  const [tag, ...classes] = selector.split(".");
  const element = document.createElement(tag);
  element.classList.add(...classes);
  for (const [name, value] of Object.entries(attributes)) {
    if (typeof value === "function") element.addEventListener(name, value);
    else if (value !== null) element.setAttribute(name, value);
  }
  element.append(...children.filter((child) => child !== null && child !== ""));
  return element;
}

// A line drawing of 24 units: no address is asked for.
const DRAWINGS = {
  close: "M6 6l12 12M18 6 6 18",
  previous: "M15 5l-7 7 7 7",
  next: "M9 5l7 7-7 7",
  download: "M12 4.3v11M7 10.6l5 4.9 5-4.9M4.5 15.5v2.7a1.8 1.8 0 0 0 1.8 1.8h11.4a1.8 1.8 0 0 0 1.8-1.8v-2.7",
  upload: "M12 15.5V4.5M7 9.2l5-4.9 5 4.9M4.5 15.5v2.7a1.8 1.8 0 0 0 1.8 1.8h11.4a1.8 1.8 0 0 0 1.8-1.8v-2.7",
  done: "M5 12.5l4.5 4.5L19 7.5",
  again: "M19 12a7 7 0 1 1-2.2-5.1M19 4v4h-4",
  list: "M9 6.5h11M9 12h11M9 17.5h11M4.6 6.5h.01M4.6 12h.01M4.6 17.5h.01",
  gallery: "M4.5 4.5h6v6h-6zM13.5 4.5h6v6h-6zM4.5 13.5h6v6h-6zM13.5 13.5h6v6h-6z",
};

export function drawing(name) {
  const svg = document.createElementNS("http://www.w3.org/2000/svg", "svg");
  svg.setAttribute("viewBox", "0 0 24 24");
  svg.setAttribute("class", "drawing");
  svg.setAttribute("aria-hidden", "true");
  const path = document.createElementNS("http://www.w3.org/2000/svg", "path");
  path.setAttribute("d", DRAWINGS[name]);
  svg.append(path);
  return svg;
}

export function sizeText(bytes) {
  let unit = 0;
  let value = bytes;
  while (value >= 1000 && unit < UNITS.length - 1) {
    value /= 1024;
    unit += 1;
  }
  const digits = unit === 0 || value >= 100 ? 0 : value >= 10 ? 1 : 2;
  return `${value.toLocaleString(locale, { maximumFractionDigits: digits })} ${UNITS[unit]}`;
}

export function timeText(time) {
  if (!time) return "";
  const date = new Date(time.mtime * 1000);
  const year = date.getFullYear() === new Date().getFullYear() ? undefined : "numeric";
  return date.toLocaleDateString(locale, { day: "numeric", month: "short", year });
}

// Size and day of a file in one line.
export function aboutText(item) {
  const { size, time } = item.additional ?? {};
  return [item.isdir ? texts.folder : sizeText(size ?? 0), timeText(time)].filter((text) => text !== "").join(" · ");
}

export function nameNode(item) {
  return make("bdi", {}, item.name);
}

// Pictures of extensions stand apart from those of what has none.
const GENERAL = ["misc.png", "folder.png", "recycle_bin.png", "isomountpoint.png", "remotemountpoint.png"];

export function picture(icon) {
  const file = GENERAL.includes(icon) ? icon : `files_ext/${encodeURIComponent(icon)}`;
  return make("img.picture", { src: new URL(`../images/${file}`, import.meta.url), alt: "" });
}
