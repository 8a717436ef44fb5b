// Markdown as it is meant: nothing of it is ever taken for the page's own. HTML in it is shown as text, and of what the
// renderer makes only these elements and attributes come into the document.

import { addressOf } from "./address.js";
import { urlOf } from "./api.js";
import { h } from "./dom.js";
import { canShowImage } from "./icons.js";
import { childOf, encodeName, nameOf, parentOf } from "./path.js";

const ELEMENTS = new Set(
  "h1 h2 h3 h4 h5 h6 p br hr ul ol li blockquote pre code em strong s table thead tbody tr th td a img".split(" "),
);
const SAFE = /^(https?:|mailto:)/i;
const HAS_SCHEME = /^([a-z][a-z0-9+.-]*:|\/\/)/i;

export async function renderMarkdown(text, entry) {
  const { MarkdownIt } = await import("../third/markdown.js");
  const html = new MarkdownIt({ html: false, linkify: true }).render(text);
  const made = new DOMParser().parseFromString(html, "text/html").body;
  return h("article.markdown.scrolls", { tabindex: 0, "aria-label": entry.name }, childrenOf(made, entry));
}

function childrenOf(node, entry) {
  return [...node.childNodes].flatMap((child) => {
    if (child.nodeType === Node.TEXT_NODE) return [child.data];
    if (child.nodeType !== Node.ELEMENT_NODE) return [];
    const name = child.localName;
    if (!ELEMENTS.has(name)) return childrenOf(child, entry);
    if (name === "a") return [linkOf(child, entry)];
    if (name === "img") return [pictureOf(child, entry)];
    return [h(name, { start: name === "ol" ? child.getAttribute("start") : null }, childrenOf(child, entry))];
  });
}

// The id of what an address without a scheme names, beside the document; null for any other.
function besideOf(address, entry) {
  if (address === "" || address.startsWith("#") || HAS_SCHEME.test(address) || address.startsWith("/")) return null;
  let id = entry.parent ?? parentOf(entry.id);
  for (const part of address.split(/[?#]/)[0].split("/")) {
    if (part === "..") id = parentOf(id);
    else if (part !== "." && part !== "") id = childOf(id, encodeName(unescaped(part)));
  }
  return id === "/" || id === "" ? null : id;
}

function unescaped(part) {
  try {
    return decodeURIComponent(part);
  } catch {
    return part;
  }
}

function linkOf(link, entry) {
  const address = link.getAttribute("href") ?? "";
  const children = childrenOf(link, entry);
  if (SAFE.test(address)) return h("a", { href: address, target: "_blank", rel: "noopener noreferrer" }, children);
  const beside = besideOf(address, entry);
  return beside ? h("a", { href: addressOf(parentOf(beside), beside), target: "_blank", rel: "noopener" }, children) : h("span", {}, children);
}

// Pictures from elsewhere would tell that somebody reads this.
function pictureOf(picture, entry) {
  const alt = picture.getAttribute("alt") ?? "";
  const beside = besideOf(picture.getAttribute("src") ?? "", entry);
  if (!beside || !canShowImage(nameOf(beside))) return h("span.soft", {}, alt);
  return h("img", { src: urlOf("download", { path_raw: beside }), alt, loading: "lazy" });
}
