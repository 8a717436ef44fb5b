// One row of the list, or one tile of the grid.

import { addressOf } from "./address.js";
import { h, icon, nameNode, plainName } from "./dom.js";
import { isLocked, isOffline, shownName } from "./entries.js";
import { formatSize, formatTime } from "./format.js";
import { iconOf } from "./icons.js";
import { hasLink } from "./link_marks.js";
import { t } from "./strings.js";
import { thumbnailOf } from "./thumbnails.js";

export function makeHeader(columns) {
  return h(
    "div.row.header",
    { role: "row", "aria-rowindex": 1 },
    h(
      "span.check-cell",
      { role: "columnheader" },
      h("button.check", { type: "button", "data-all": "", "aria-label": t("select.all") }),
    ),
    columns.map((column) =>
      h(
        `span.cell.${column.id}`,
        { role: "columnheader", "aria-sort": column.sorted ?? "none" },
        column.sort === null
          ? h("span.sort", {}, t(`column.${column.id}`))
          : h(
              "button.sort",
              { type: "button", "data-sort": column.sort },
              t(`column.${column.id}`),
              icon("chevron-down", "icon arrow"),
            ),
      ),
    ),
    h(
      "span.more-cell",
      { role: "columnheader" },
      h(
        "button.columns-button",
        { type: "button", "data-columns": "", "aria-label": t("columns.open"), title: t("columns.open"), "aria-haspopup": "menu" },
        icon("columns"),
      ),
    ),
  );
}

export function makeRow(index, mode) {
  const row = h("div.row", { id: `row-${index}`, role: "row", "aria-rowindex": index + (mode === "list" ? 2 : 1) });
  row.index = index;
  return row;
}

export function fillRow(row, index, entry, mode, columns) {
  row.entry = entry;
  row.filled = true;
  row.classList.toggle("waiting", !entry);
  row.classList.toggle("gone", entry?.gone === true);
  row.classList.toggle("locked", Boolean(entry && isLocked(entry)));
  row.draggable = Boolean(entry);
  if (!entry) {
    row.removeAttribute("aria-label");
    const bones = ["icon", "name", "more"].map((part) => h(`span.bone.bone-${part}`));
    row.replaceChildren(h("span.cell-box", { role: "gridcell" }, bones));
    row.querySelector(".bone-name").style.width = `${18 + ((index * 37) % 24)}%`;
    return;
  }
  row.replaceChildren(...(mode === "list" ? listCells(entry, columns) : tileParts(entry)));
  row.setAttribute("aria-label", spoken(entry));
}

// A row in words: without the buttons in it, with what its pictures say.
function spoken(entry) {
  return [
    plainName(shownName(entry)),
    isLocked(entry) && t("mark.locked"),
    hasLink(entry.id) && t("mark.link"),
    isOffline(entry) && t("mark.offline"),
    entry.size === null ? t("type.folder") : formatSize(entry.size),
    formatTime(entry.mtime),
  ]
    .filter(Boolean)
    .join(", ");
}

// For a new tab, for the address to be copied; whatever else is done with a row the page does itself.
function link(entry, attributes, ...children) {
  const href = entry.isFolder ? addressOf(entry.id) : addressOf(entry.parent, entry.id);
  return h("a.label", { href, tabindex: -1, draggable: "false", ...attributes }, children);
}

function check() {
  return h("button.check", { type: "button", tabindex: -1, "aria-label": t("select.one") });
}

function more() {
  return h(
    "button.more",
    { type: "button", tabindex: -1, "aria-label": t("menu.open"), title: t("menu.open") },
    icon("dots"),
  );
}

function badges(entry) {
  return [
    isLocked(entry) && h("span.badge", { title: t("mark.locked") }, icon("lock")),
    hasLink(entry.id) && h("span.badge", { title: t("mark.link") }, icon("link")),
    isOffline(entry) && h("span.badge.warn", { title: t("mark.offline") }, icon("offline")),
  ];
}

function listCells(entry, columns) {
  const cells = columns.map((column) =>
    column.id === "name"
      ? null
      : h(
          `span.cell.${column.id}`,
          { role: "gridcell", title: column.title?.(entry) ?? null },
          column.id === "folder" ? nameNode(column.text(entry)) : column.text(entry),
        ),
  );
  // What a narrow screen shows in place of the columns.
  const folder = columns.find((column) => column.id === "folder");
  const sub = [folder?.text(entry), formatTime(entry.mtime), entry.size === null ? null : formatSize(entry.size)]
    .filter(Boolean)
    .join(" · ");
  return [
    h("span.check-cell", { role: "gridcell" }, check()),
    h(
      "span.cell.name",
      { role: "gridcell", title: plainName(entry.name) },
      picture(entry, "file-icon"),
      link(entry, {}, nameNode(shownName(entry)), h("span.sub", {}, sub)),
      badges(entry),
    ),
    ...cells.filter(Boolean),
    h("span.more-cell", { role: "gridcell" }, more()),
  ];
}

function tileParts(entry) {
  const parts = [
    check(),
    more(),
    h("span.tile-picture", {}, picture(entry, "file-icon large"), badges(entry)),
    link(
      entry,
      { title: plainName(entry.name) },
      nameNode(shownName(entry), false),
      h("span.sub", {}, entry.size === null ? t("type.folder") : formatSize(entry.size)),
    ),
  ];
  return [h("span.cell-box", { role: "gridcell" }, parts)];
}

function picture(entry, className) {
  const drawn = icon(iconOf(entry), className);
  return className.includes("large") ? thumbnailOf(entry, drawn) : drawn;
}
