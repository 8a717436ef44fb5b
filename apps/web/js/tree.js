// Shares and folders at the left.

import { get } from "./api.js";
import { browser, go } from "./browser.js";
import { h, icon, keepFocus, nameNode, plainName } from "./dom.js";
import { isOffline, isReadOnlyShare } from "./entries.js";
import { arrived, on } from "./events.js";
import { folderKindOf } from "./icons.js";
import { ancestry, idIn, parentOf } from "./path.js";
import { labelOf } from "./pathbar.js";
import { t } from "./strings.js";

// More sub-folders than this are for the list, not for the tree.
const MOST = 400;

const root = document.getElementById("tree");
const nodes = new Map(); // id -> {item, group, loaded}; `item` is the line that has the role
let brought = new Map(); // sub-folders that came with the first list, each of use once
let current = "/";

export function setupTree() {
  on("shares", paintShares);
  on("place", follow);
  on("folders-changed", ({ ids }) => ids.forEach(reload));
  on("came-above", ({ answer }) => {
    brought = new Map(answer.folders.map((folder) => [idIn(folder), folder.items]));
  });
  root.addEventListener("click", clicked);
  root.addEventListener("keydown", keydown);
}

function paintShares() {
  const open = [...nodes].filter(([, node]) => node.item.getAttribute("aria-expanded") === "true").map(([id]) => id);
  nodes.clear();
  root.replaceChildren(...browser.shares.map((share) => makeItem(share.id, labelOf(share.id), share.kind, 1, share)));
  for (const id of open) expand(id);
  follow(current);
}

function makeItem(id, label, kind, level, share = null) {
  const group = h("ul", { role: "group", hidden: true });
  const item = h(
    "div.tree-line",
    {
      role: "treeitem",
      "aria-expanded": "false",
      "aria-level": level,
      "aria-label": [plainName(label), ...marksOf(share).map((mark) => mark.title)].join(", "),
      tabindex: -1,
    },
    h("button.twist", { type: "button", tabindex: -1, "aria-hidden": "true" }, icon("chevron-right", "icon small")),
    icon(`kind-${kind}`, "file-icon"),
    nameNode(label),
    share && h("span.marks", {}, marksOf(share)),
  );
  item.style.setProperty("--level", level);
  item.dataset.id = id;
  nodes.set(id, { item, group, loaded: false });
  return h("li", { role: "none" }, item, group);
}

function marksOf(share) {
  if (!share) return [];
  return [
    isOffline(share) && h("span.tag.warn", { title: t("mark.offline") }, icon("offline")),
    isReadOnlyShare(share) && h("span.tag", { title: t("share.read") }, icon("read-only")),
  ].filter(Boolean);
}

async function expand(id) {
  const node = nodes.get(id);
  if (!node) return;
  node.item.setAttribute("aria-expanded", "true");
  node.group.hidden = false;
  if (!node.loaded) await load(id, node);
}

async function load(id, node) {
  node.loaded = true;
  let items = brought.get(id);
  brought.delete(id);
  try {
    items ??= (await get("operation", { action: "subfolders", path_raw: id })).items;
  } catch {
    // The list says why when somebody goes there.
    node.loaded = false;
    node.item.removeAttribute("aria-expanded");
    return;
  }
  const level = Number(node.item.getAttribute("aria-level")) + 1;
  const kept = new Map([...node.group.children].map((child) => [child.firstChild.dataset.id, child]));
  const lines = items.slice(0, MOST).map((folder) => {
    const child = idIn(folder);
    return kept.get(child) ?? makeItem(child, labelOf(child), folderKindOf(child, folder.mount_type ?? ""), level);
  });
  if (items.length > MOST) lines.push(moreItem(id, items.length - MOST, level));
  // Lines that stay are not taken out: one may hold the keyboard.
  const { children } = node.group;
  if (lines.length !== children.length || lines.some((line, i) => line !== children[i]))
    keepFocus(node.group, () => node.group.replaceChildren(...lines));
  if (items.length === 0) node.item.removeAttribute("aria-expanded");
  paintCurrent();
}

function moreItem(id, count, level) {
  const line = h("div.tree-line.soft", { role: "treeitem", tabindex: -1 }, t("tree.more", { count }));
  line.style.setProperty("--level", level + 1);
  line.dataset.id = id;
  return h("li", { role: "none" }, line);
}

function reload(id) {
  const node = nodes.get(id);
  if (!node?.loaded)
    return node?.item.setAttribute("aria-expanded", node.item.getAttribute("aria-expanded") ?? "false");
  return load(id, node);
}

function collapse(id) {
  const node = nodes.get(id);
  node.item.setAttribute("aria-expanded", "false");
  node.group.hidden = true;
}

// Opens the way down to the folder on screen.
async function follow(id) {
  current = id;
  paintCurrent();
  await arrived;
  for (const one of ancestry(parentOf(id))) {
    if (!nodes.has(one) || current !== id) break;
    await expand(one);
  }
  paintCurrent(true);
}

function paintCurrent(reveal = false) {
  for (const [id, { item }] of nodes) {
    const here = id === current;
    item.classList.toggle("current", here);
    item.setAttribute("aria-selected", String(here));
    item.tabIndex = here ? 0 : -1;
    if (here && reveal) item.scrollIntoView({ block: "nearest" });
  }
  if (!nodes.has(current)) root.querySelector("[role=treeitem]")?.setAttribute("tabindex", "0");
}

function clicked(event) {
  const item = event.target.closest("[role=treeitem]");
  if (!item) return;
  const { id } = item.dataset;
  if (event.target.closest(".twist")) toggle(id);
  else {
    go(id);
    if (nodes.get(id)?.item.getAttribute("aria-expanded") === "false") expand(id);
  }
}

function toggle(id) {
  const state = nodes.get(id)?.item.getAttribute("aria-expanded");
  if (state === "true") collapse(id);
  else if (state === "false") expand(id);
}

function keydown(event) {
  const item = event.target.closest("[role=treeitem]");
  if (!item || event.ctrlKey || event.altKey || event.metaKey) return;
  const seen = [...root.querySelectorAll("[role=treeitem]")].filter((one) => one.offsetParent !== null);
  const at = seen.indexOf(item);
  const { id } = item.dataset;
  const open = item.getAttribute("aria-expanded") === "true";
  const moves = {
    ArrowDown: () => seen[at + 1]?.focus(),
    ArrowUp: () => seen[at - 1]?.focus(),
    Home: () => seen[0].focus(),
    End: () => seen.at(-1).focus(),
    ArrowRight: () => (open ? seen[at + 1]?.focus() : toggle(id)),
    ArrowLeft: () => (open ? collapse(id) : nodes.get(parentOf(id))?.item.focus()),
    Enter: () => go(id),
    " ": () => go(id),
  };
  if (!moves[event.key]) return;
  event.preventDefault();
  event.stopPropagation();
  moves[event.key]();
}

export function treeId(node) {
  return node.closest?.("[role=treeitem]")?.dataset.id ?? null;
}
