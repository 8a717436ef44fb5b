// The bar above the list: what can be done here, or with what is chosen.

import { browser, setKind, sortEverywhere } from "./browser.js";
import { heldItems } from "./clipboard.js";
import { DELETED_SORTS } from "./columns.js";
import { command, context, keysOf, runCommand, shortcutText } from "./commands.js";
import { $, h, icon, iconButton, keepFocus } from "./dom.js";
import { emit, on } from "./events.js";
import { openMenu } from "./menu.js";
import { searchStatus } from "./search.js";
import { formatSize } from "./format.js";
import { t } from "./strings.js";

const SORTS = ["name", "size", "mtime", "type", "user"];
const SORTS_OF_RESULTS = ["name", "ppath", "size", "mtime", "type"];
const KINDS = ["all", "file", "dir"];
const ON_CHOSEN = [
  "open",
  "edit",
  "showInFolder",
  "download",
  "share",
  "receive",
  "itemLinks",
  "cut",
  "copy",
  "copyTo",
  "moveTo",
  "rename",
  "compress",
  "extract",
  "extractOwn",
  "restore",
  "delete",
];
const IN_BAR = ["download", "share", "copyTo", "moveTo", "restore", "rename", "delete"];
let painted = "";

export function setupToolbar(setSort) {
  const paint = () => paintToolbar(setSort);
  for (const name of ["shown", "selection", "listing", "shares", "access"]) on(name, paint);
}

function shortcutOf(found) {
  const [keys] = keysOf(found);
  return keys && shortcutText(keys);
}

function menuItem(id) {
  const found = command(id);
  if (!found?.when(context())) return null;
  return {
    label: t(`command.${id}`),
    icon: found.icon,
    danger: found.danger,
    run: () => runCommand(id),
    shortcut: shortcutOf(found),
  };
}

export function contextItems() {
  const items = (ids) => ids.map(menuItem).filter(Boolean);
  if (context().count === 0) {
    return [
      ...items(["newFolder", "newText", "upload", "uploadFolder"]),
      "-",
      ...items(["undo", "paste", "selectAll", "refresh"]),
      "-",
      ...items(["favour", "unfavour", "emptyBin", "space", "versions", "permissions", "properties"]),
    ];
  }
  return [
    ...items(ON_CHOSEN.slice(0, 5)),
    "-",
    ...items(ON_CHOSEN.slice(5, 9)),
    "-",
    ...items(["rename", "compress", "extract", "extractOwn", "restore"]),
    "-",
    ...items(["delete", "deleteForever"]),
    "-",
    ...items(["favour", "unfavour", "copyPath", "space", "versions", "permissions", "properties"]),
  ];
}

function button(id, className = "") {
  const found = command(id);
  if (!found?.when(context())) return null;
  const keys = shortcutOf(found);
  return h(
    `button.button${className}`,
    { type: "button", "data-command": id, title: t(`command.${id}`) + (keys ? ` (${keys})` : ""), onclick: () => runCommand(id) },
    icon(found.icon),
    h("span", {}, t(`command.${id}`)),
  );
}

function paintToolbar(setSort) {
  const bar = $("toolbar");
  const now = context();
  bar.hidden = browser.id === "/";
  $("status").hidden = bar.hidden;
  // Painted anew only when something else can be done; the count changes in place.
  const key = [
    browser.id,
    browser.mode,
    browser.sort.by,
    now.folder,
    now.canWrite,
    now.canChange,
    now.canDownload,
    heldItems() !== null,
    now.inBin,
    now.deleted && [browser.filter !== "", browser.listing?.total > 0],
    now.count > 0,
    now.count === 1,
    now.search && browser.listing?.extra?.finished,
    browser.kind,
    now.single?.isFolder,
    now.single?.name,
  ].join("|");
  if (key !== painted) {
    painted = key;
    const left =
      now.count > 0
        ? [
            h(
              "span.chosen-count",
              {},
              iconButton("close", t("command.selectNone"), () => runCommand("selectNone")),
              h("span#chosen-count"),
            ),
            ...IN_BAR.map((id) => button(id, id === "delete" ? ".quiet-danger" : "")),
            iconButton("dots", t("menu.more"), (event) => openMenu(contextItems(), { anchor: event.currentTarget }), {
              "aria-haspopup": "menu",
            }),
          ]
        : now.search
          ? [button("stopSearch"), button("search"), kindButton(), button("closeSearch")]
          : [uploadButton(now), button("newFolder"), button("newText"), button("paste"), button("emptyBin")];
    const right = [
      sortButton(setSort),
      h(
        "span.view-switch",
        { role: "group", "aria-label": t("view.choose") },
        ["list", "grid"].map((mode) =>
          iconButton(mode, t(`view.${mode}`), () => runCommand(mode === "list" ? "viewList" : "viewGrid"), {
            "aria-pressed": String(browser.mode === mode),
          }),
        ),
      ),
    ];
    keepFocus(bar, () => bar.replaceChildren(...[...left, h("span.grow"), ...right].filter(Boolean)));
    bar.classList.toggle("on-chosen", now.count > 0);
    bar.classList.toggle("grid-mode", browser.mode === "grid");
  }
  if (now.count > 0) $("chosen-count").textContent = t("select.count", { count: now.count });
  $("view").classList.toggle("choosing", now.count > (matchMedia("(pointer: coarse)").matches ? 0 : 1));
  paintStatus(now);
}

function uploadButton({ canWrite, inBin }) {
  if (inBin) return null;
  if (!canWrite)
    return h(
      "span.soft.hint-readonly",
      {},
      browser.listing?.ready ? [icon("read-only", "icon small"), t("share.read")] : "",
    );
  return h(
    "button.button.primary",
    {
      type: "button",
      "aria-haspopup": "menu",
      onclick: (event) =>
        openMenu([menuItem("upload"), menuItem("uploadFolder")].filter(Boolean), { anchor: event.currentTarget }),
    },
    icon("upload"),
    h("span", {}, t("command.uploadMenu")),
  );
}

// What of the results is shown.
function kindButton() {
  const items = KINDS.map((kind) => ({
    label: t(`search.type.${kind}`),
    checked: browser.kind === kind,
    run: () => setKind(kind),
  }));
  return h(
    "button.button",
    { type: "button", "aria-haspopup": "menu", onclick: (event) => openMenu(items, { anchor: event.currentTarget }) },
    icon("filter"),
    h("span", {}, t(`search.type.${browser.kind}`)),
  );
}

function sortButton(setSort) {
  return iconButton(
    "sort",
    t("sort.by", { column: t(`sort.${browser.sort.by}`) }),
    (event) =>
      openMenu(
        [
          ...(context().deleted ? DELETED_SORTS : context().search ? SORTS_OF_RESULTS : SORTS).map((by) => ({
            label: t(`sort.${by}`),
            checked: browser.sort.by === by,
            run: () => setSort(by),
          })),
          "-",
          !context().search && !context().deleted && { label: t("sort.everywhere"), run: sortEverywhere },
        ].filter(Boolean),
        { anchor: event.currentTarget },
      ),
    { id: "sort-button", "aria-haspopup": "menu" },
  );
}

function paintStatus(now) {
  const { count, folder } = now;
  const { listing } = browser;
  const parts = [];
  if (folder) {
    parts.push(now.search ? searchStatus(listing) : h("span", {}, t("status.items", { count: listing.total })));
    if (count > 0) parts.push(h("span", {}, [t("select.count", { count }), sizeOfChosen()].filter(Boolean).join(", ")));
    if (listing.extra?.cut) parts.push(h("span", {}, t("deleted.cut")));
    if (listing.extra?.failed?.length > 0) parts.push(h("span", {}, t("deleted.failed", { names: listing.extra.failed.join(", ") })));
    if (browser.filter) parts.push(filterChip());
  }
  keepFocus($("status"), () => $("status").replaceChildren(...parts));
}

function filterChip() {
  const clear = iconButton("close", t("filter.clear"), () => emit("clear-filter"));
  return h("span.filter-chip", {}, t("status.filtered", { text: browser.filter }), clear);
}

function sizeOfChosen() {
  const { selection } = browser;
  if (selection.pending || selection.rows) return "";
  let sum = 0;
  for (const { size } of selection.chosen.values()) {
    if (size === null) return "";
    sum += size;
  }
  return formatSize(sum);
}
