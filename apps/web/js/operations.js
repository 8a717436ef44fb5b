// What is done to files at once: new folder, rename, properties.

import { post } from "./api.js";
import { browser, refresh, shareEntry } from "./browser.js";
import { askText, dialog, loaded, toast, toastFailure } from "./dialogs.js";
import { h, icon, nameNode, plainName } from "./dom.js";
import { isOffline, typeOf } from "./entries.js";
import { emit } from "./events.js";
import { formatFullTime, formatMode, formatSize } from "./format.js";
import { iconOf } from "./icons.js";
import { askInPlace } from "./in_place.js";
import { childOf, decode, encodeName, isDeleted, isSearch, nameOf, parentOf, splitExtension, taskOf } from "./path.js";
import { entryAt } from "./sources.js";
import { t } from "./strings.js";
import { whyNode } from "./why.js";

export function checkName(text) {
  if (text === "") return t("name.empty");
  if (text.includes("/")) return t("name.slash");
  if (text === "." || text === "..") return t("name.dots");
  return new TextEncoder().encode(text).length > 255 ? t("name.long") : "";
}

// Asks for a name and makes a folder in `folder`. Its id, or nothing.
export async function makeFolder(folder) {
  const made = await askText({
    title: t("newFolder.title"),
    label: t("name.label"),
    value: t("newFolder.name"),
    action: t("newFolder.action"),
    check: checkName,
    submit: async (name) => {
      const id = childOf(folder, encodeName(name));
      await post("operation", { action: "mkdir", path_raw: id });
      return id;
    },
  });
  if (made) emit("folders-changed", { ids: [folder] });
  return made;
}

export async function newFolder() {
  const folder = browser.id;
  const made = await makeFolder(folder);
  if (made && browser.id === folder) await refresh(made);
}

// An empty file, in the editor.
export async function newText() {
  const folder = browser.id;
  const name = await askText({
    title: t("newText.title"),
    label: t("name.label"),
    value: t("newText.name"),
    selectTo: splitExtension(t("newText.name"))[0].length,
    action: t("newFolder.action"),
    check: checkName,
    submit: async (text) => {
      const { store } = await import("./editor.js");
      await store(childOf(folder, encodeName(text)), new Uint8Array(), { "If-None-Match": "*" }).catch((failure) => {
        throw failure.code === 1806 ? { ...failure, code: 414, path: text } : failure;
      });
    },
  });
  if (!name) return;
  const id = childOf(folder, encodeName(name));
  if (browser.id === folder) await refresh(id);
  const { edit } = await import("./editor.js");
  await edit({ id, name, parent: folder, kind: "text" });
}

// The search on screen, whose results follow what is done to them.
export function searchTask() {
  return isSearch(browser.id) && !isDeleted(browser.id) ? taskOf(browser.id) : undefined;
}

export async function rename(entry) {
  let undo;
  const unchanged = entry.name.replace(/[\r\n]/g, ""); // as a field shows it
  const [stem] = entry.isFolder ? [entry.name] : splitExtension(entry.name);
  const asked = {
    title: t("rename.title"),
    label: t("name.label"),
    value: entry.name,
    selectTo: stem.length,
    action: t("rename.action"),
    check: (text) => (text === unchanged ? "" : checkName(text)),
    submit: async (name) => {
      if (name === unchanged) return entry.id;
      ({ undo } = await post("operation", {
        action: "rename",
        path_raw: entry.id,
        name_raw: encodeName(name),
        taskid: searchTask(),
      }));
      return childOf(entry.parent, encodeName(name));
    },
  };
  const index = browser.listing.indexOf(entry.id);
  browser.view.reveal(index < 0 ? browser.selection.cursor : index);
  const row = index < 0 ? null : browser.view.rowAt(index);
  const renamed = await (row ? askInPlace(row, asked) : askText(asked));
  if (!renamed || renamed === entry.id) return;
  if (entry.isFolder) emit("folders-changed", { ids: [entry.parent] });
  const folders = entry.isFolder ? [entry.parent] : [];
  if (undo) emit("renamed", { id: undo, title: t("rename.done", { from: entry.name, to: nameOf(renamed) }), folders });
  await refresh(renamed);
}

export function copyPath(id) {
  return copyText(decode(id), t("path.copied"));
}

export async function copyText(text, said) {
  try {
    await navigator.clipboard.writeText(text);
  } catch {
    // Without a secure connection there is no clipboard: the old way.
    const area = h("textarea.visually-hidden");
    area.value = text;
    (document.querySelector("dialog[open]") ?? document.body).append(area);
    area.select();
    document.execCommand("copy");
    area.remove();
  }
  toast({ text: said });
}

export async function showSpaceOf(id) {
  return (await loaded(import("./space.js")))?.showSpace(id);
}

// What a folder holds, counted while its properties are shown.
function contentNode({ id }) {
  const more = h("button.button.outlined", { type: "button", onclick: () => showSpaceOf(id) }, icon("space"), t("command.space"));
  const node = h("div", {});
  loaded(import("./sizes.js")).then((sizes) => sizes && node.replaceWith(sizes.sizesNode([{ id }], { without: 1, more: [h("p.size-actions", {}, more)] })));
  return node;
}

// Of an entry, or of the folder with an id.
export async function showProperties(what) {
  let entry = what;
  try {
    if (typeof what === "string") entry = parentOf(what) === "/" ? shareEntry(what) : await entryAt(what);
  } catch (failure) {
    return toastFailure(failure, what);
  }
  if (!entry) return undefined;
  const line = (key, value) => value && [h("dt", {}, t(`properties.${key}`)), h("dd", {}, value)];
  return dialog({
    title: t("command.properties"),
    className: "properties",
    fill: () => [
      h(
        "div.hero",
        {},
        icon(iconOf(entry), "file-icon"),
        h(
          "div.grow",
          {},
          h("b", {}, nameNode(entry.name)),
          h("span.soft", {}, typeOf(entry)),
        ),
      ),
      h(
        "dl",
        {},
        line("path", h("code", {}, plainName(decode(entry.id)))),
        line("size", entry.size !== null && `${formatSize(entry.size)} (${t("size.bytes", { count: entry.size })})`),
        line("modified", formatFullTime(entry.mtime)),
        line("created", formatFullTime(entry.time?.crtime)),
        line("owner", entry.owner && `${entry.owner} · ${entry.group}`),
        line("mode", entry.perm?.posix !== undefined && h("code", {}, `${formatMode(entry.perm.posix)}`)),
        line(
          "volume",
          entry.volume &&
            t("volume.free", { free: formatSize(entry.volume.freespace), total: formatSize(entry.volume.totalspace) }),
        ),
      ),
      entry.isFolder && !isOffline(entry) ? contentNode(entry) : "",
      whyNode(entry.id),
      h(
        "footer",
        {},
        h(
          "button.button.outlined",
          { type: "button", onclick: () => copyPath(entry.id) },
          icon("copy"),
          t("command.copyPath"),
        ),
      ),
    ],
  });
}
