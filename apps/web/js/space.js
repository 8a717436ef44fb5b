// What takes the space of a folder or share: a picture of its parts, and the largest files and folders below.

import { isAbort, MISSING } from "./api.js";
import { go, goTo } from "./browser.js";
import { dialog, toast, toastFailure } from "./dialogs.js";
import { h, icon, iconButton, nameNode, plainName } from "./dom.js";
import { describe } from "./errors.js";
import { formatSize } from "./format.js";
import { folderKindOf, kindOfName } from "./icons.js";
import "./later.js";
import { ancestry, idIn, nameOf, parentOf } from "./path.js";
import { labelOf } from "./pathbar.js";
import { countsOf, measure, notesOf, runningNode } from "./sizes.js";
import { entryAt } from "./sources.js";
import { locale, t } from "./strings.js";
import { treemap } from "./treemap.js";

const MOST_TILES = 40;
const LEAST_SHARE = 1 / 250; // of a tile
const MOST_ROWS = 100; // of a list at once
const LISTS = ["parts", "largest_files", "largest_folders"];

export function showSpace(id) {
  return dialog({
    title: t("command.space"),
    className: "space",
    fill: (close) => new SpaceView(close).start(id),
  });
}

class SpaceView {
  constructor(close) {
    this.close = close;
    this.known = new Map(); // id -> what was measured
    this.list = "parts";
    this.path = h("ol");
    this.body = h("div.space-body");
    this.said = h("p.visually-hidden", { role: "status" });
    this.again = iconButton("refresh", t("space.again"), () => this.enter(this.id, true));
  }

  start(id) {
    this.enter(id);
    requestAnimationFrame(() => {
      const node = this.body.closest("dialog");
      node?.addEventListener("close", () => this.ending?.abort());
      node?.addEventListener("keydown", (event) => {
        if (event.key !== "Backspace" || parentOf(this.id) === "/") return;
        event.preventDefault();
        this.enter(parentOf(this.id));
      });
    });
    return [h("nav.space-path", { "aria-label": t("path.label") }, this.path, this.again), this.body, this.said];
  }

  // Shows a folder: as it was measured before, unless `again`.
  async enter(id, again = false) {
    const held = this.body.contains(document.activeElement) && document.activeElement.closest(".treemap, .space-rows")?.className;
    this.ending?.abort();
    const ending = (this.ending = new AbortController());
    this.id = id;
    this.paintPath(held !== false);
    if (again) this.known.delete(id);
    if (!this.known.has(id)) {
      const running = runningNode(() => ending.abort());
      this.body.replaceChildren(running.node);
      this.body.setAttribute("aria-busy", "true");
      try {
        const result = await measure([{ id }], { signal: ending.signal, onProgress: running.update });
        if (ending !== this.ending) return;
        this.known.set(id, result);
      } catch (failure) {
        if (isAbort(failure) || ending !== this.ending) return;
        this.fail(failure);
        return;
      }
    }
    this.paint(this.known.get(id));
    if (held) (this.body.querySelector(`.${held} button`) ?? this.path.querySelector("[aria-current]"))?.focus();
  }

  fail(failure) {
    this.known.delete(this.id);
    const { title, hint } = describe(failure, `/${nameOf(this.id)}`);
    this.body.removeAttribute("aria-busy");
    this.body.replaceChildren(
      h("div.space-failure", { role: "alert" }, icon("warning"), h("b", {}, title), hint && h("p", {}, hint)),
    );
  }

  paintPath(focus) {
    const crumbs = ancestry(this.id).map((id) =>
      h(
        "li",
        {},
        h(
          "button.crumb",
          { type: "button", autofocus: id === this.id, "aria-current": id === this.id ? "location" : null, onclick: () => id !== this.id && this.enter(id) },
          plainName(labelOf(id)),
        ),
      ),
    );
    this.path.replaceChildren(...crumbs);
    if (focus) this.path.querySelector("[aria-current]").focus();
  }

  paint(result) {
    const { measured, errors } = result;
    this.body.removeAttribute("aria-busy");
    // Nothing was counted: the folder is gone, or closed.
    if (errors.length > 0) return this.fail(errors[0]);
    const sum = `${formatSize(measured.size)} · ${countsOf(measured, 1)}`;
    this.rows = h("ul.space-rows");
    this.tabs = h(
      "div.space-tabs",
      { role: "group", "aria-label": t("space.lists") },
      LISTS.map((list) =>
        h("button.button", { type: "button", "data-list": list, onclick: () => this.paintList(list, measured) }, t(`space.${list}`)),
      ),
    );
    this.body.replaceChildren(
      h("p.space-sum", {}, h("b", {}, sum), h("span.soft", {}, t("space.disk", { size: formatSize(measured.disk) }))),
      this.picture(measured),
      notesOf(result),
      this.tabs,
      this.rows,
    );
    this.paintList(this.list, measured);
    this.said.textContent = sum;
    return undefined;
  }

  picture(measured) {
    const all = measured.parts ?? [];
    const box = h("ul.treemap", { "aria-label": t("space.picture") });
    if (!measured.parts) return "";
    if (measured.size === 0) return h("p.soft.space-empty", {}, t("space.empty"));
    const shown = all.filter(({ size }, i) => i < MOST_TILES && size / measured.size >= LEAST_SHARE);
    const left = measured.size - shown.reduce((sum, { size }) => sum + size, 0);
    const count = all.length - shown.length + (measured.rest?.count ?? 0);
    const tiles = shown.map((part) => ({ size: part.size, part }));
    if (left / measured.size >= LEAST_SHARE) tiles.push({ size: left, count });
    tiles.sort((a, b) => b.size - a.size);
    const narrow = innerWidth < 640;
    const places = treemap(tiles.map(({ size }) => size), narrow ? 1 : 2, 1);
    tiles.forEach((tile, i) => box.append(this.tile(tile, places[i], measured.size, narrow ? 300 : 340)));
    const buttons = [...box.querySelectorAll("button")];
    buttons.forEach((button, i) => button.setAttribute("tabindex", i === 0 ? 0 : -1));
    box.addEventListener("keydown", (event) => moveAmong(buttons, event));
    return box;
  }

  tile({ size, part, count }, place, total, side) {
    const label = part ? nameNode(labelOf(idIn(part)), false) : t("space.rest", { count });
    const text = h("span.tile-text", {}, h("b", {}, label), h("span", {}, `${formatSize(size)} · ${percent(size / total)}`));
    const content = part
      ? h("button.tile", { type: "button", title: this.tip(part, total), onclick: () => this.choose(part) }, text)
      : h("div.tile", { title: t("space.rest", { count }) }, text);
    content.classList.add(part?.kind ?? "rest");
    // What is too small for letters is read out all the same.
    if (place.height * side < 40 || place.width * side * 2 < 64) content.classList.add("small");
    const node = h("li", {}, content);
    for (const [name, value] of Object.entries(place)) node.style[name] = `${100 * value}%`;
    return node;
  }

  tip(part, total) {
    return `${plainName(labelOf(idIn(part)))} – ${formatSize(part.size)} (${percent(part.size / total)})`;
  }

  paintList(list, measured) {
    this.list = list;
    for (const button of this.tabs.children) button.setAttribute("aria-pressed", String(button.dataset.list === list));
    const all = measured[list] ?? [];
    const rows = all.map((part) => () => this.row(part, measured, list !== "parts"));
    if (list === "parts" && measured.rest?.count > 0) rows.push(() => this.restRow(measured));
    this.rows.replaceChildren();
    const more = () => {
      this.rows.querySelector(".more-rows")?.remove();
      const before = this.rows.children.length;
      this.rows.append(...rows.splice(0, MOST_ROWS).map((make) => make()));
      if (rows.length > 0)
        this.rows.append(h("li.more-rows", {}, h("button.button.outlined", { type: "button", onclick: () => more().focus() }, t("space.more", { count: rows.length }))));
      return this.rows.children[before]?.querySelector("button") ?? this.tabs.firstChild;
    };
    more();
    if (all.length === 0) this.rows.append(h("li.soft.space-empty", {}, t("space.none")));
  }

  row(part, { path, path_raw: raw, size }, withFolder) {
    const id = idIn(part);
    const kind = part.kind === "folder" || part.kind === "mount" ? folderKindOf(id) : kindOfName(nameOf(id));
    const top = path === undefined ? "/" : idIn({ path, path_raw: raw });
    const parent = parentOf(id);
    const about = [
      withFolder && parent !== top && plainName(decodeBelow(parent, top)),
      part.kind === "folder" && countsOf({ ...part, others: 0 }, 1),
      part.kind === "mount" && t("space.mount"),
      part.unreadable > 0 && t("sizes.unreadable", { count: part.unreadable }),
    ];
    const bar = h("i.share-bar", { "aria-hidden": "true" }, h("i"));
    bar.firstChild.style.width = `${size > 0 ? (100 * part.size) / size : 0}%`;
    const isFolder = part.kind === "folder";
    return h(
      "li.space-row",
      {},
      h(
        "button.row-main",
        { type: "button", title: isFolder ? t("space.enter") : t("space.show"), onclick: () => this.choose(part) },
        icon(`kind-${kind}`, "file-icon"),
        h("span.row-text", {}, h("b", {}, nameNode(labelOf(id))), h("span.soft", {}, about.filter(Boolean).join(" · ")), bar),
        h("span.row-size", {}, formatSize(part.size), h("span.soft", {}, size > 0 ? percent(part.size / size) : "")),
      ),
      isFolder && iconButton("folder-open", t("space.show_named", { name: nameOf(id) }), () => this.show(id)),
    );
  }

  restRow({ rest, size }) {
    return h(
      "li.space-row",
      {},
      h(
        "span.row-main",
        {},
        icon("dots", "file-icon"),
        h("span.row-text", {}, h("b", {}, t("space.rest", { count: rest.count }))),
        h("span.row-size", {}, formatSize(rest.size), h("span.soft", {}, percent(rest.size / size))),
      ),
    );
  }

  choose(part) {
    return part.kind === "folder" ? this.enter(idIn(part)) : this.show(idIn(part));
  }

  // Goes to it in its folder, if it is still there.
  async show(id) {
    let entry;
    try {
      entry = await entryAt(id);
    } catch (failure) {
      if (failure.code !== MISSING) return toastFailure(failure, id);
    }
    if (!entry) return toast({ text: t("space.gone", { name: nameOf(id) }), kind: "failed" });
    this.close();
    return entry.isFolder ? go(id) : goTo(entry);
  }
}

function percent(share) {
  return share.toLocaleString(locale, { style: "percent", maximumFractionDigits: share < 0.1 ? 1 : 0 });
}

// A folder's path below the one that was measured.
function decodeBelow(id, top) {
  return ancestry(id)
    .slice(top === "/" ? 0 : ancestry(top).length)
    .map(nameOf)
    .join("/");
}

// One of many takes the keyboard; arrows lead to the others.
function moveAmong(buttons, event) {
  const at = buttons.indexOf(document.activeElement);
  const to = { ArrowRight: at + 1, ArrowDown: at + 1, ArrowLeft: at - 1, ArrowUp: at - 1, Home: 0, End: buttons.length - 1 }[event.key];
  if (at < 0 || to === undefined) return;
  event.preventDefault();
  const next = buttons[Math.min(buttons.length - 1, Math.max(0, to))];
  buttons[at].setAttribute("tabindex", -1);
  next.setAttribute("tabindex", 0);
  next.focus();
}
