// What is done to files at once: new folder, new text, rename.

import { post } from "./api.js";
import { browser, refresh } from "./browser.js";
import { askText, loaded, toast } from "./dialogs.js";
import { h } from "./dom.js";
import { emit } from "./events.js";
import { askInPlace } from "./in_place.js";
import { childOf, decode, encodeName, isDeleted, isSearch, nameOf, splitExtension, taskOf } from "./path.js";
import { t } from "./strings.js";

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
