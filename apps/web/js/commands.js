// Everything that can be done, once: for the toolbar, the menus, the keyboard and the list of shortcuts.

import { mayDownload, mayModify, mayWriteIn } from "./access.js";
import { browser, chosenItems, go, goTo, goUp, refresh, setMode, shareEntry } from "./browser.js";
import { Choice } from "./choice.js";
import { loaded } from "./dialogs.js";
import { isInBin, isOffline, isReadOnlyShare, mayBeText } from "./entries.js";
import { download } from "./download.js";
import { copyPath, newFolder, newText, rename, showSpaceOf } from "./operations.js";
import { isDeleted, isSearch, parentOf } from "./path.js";
import { editPath } from "./pathbar.js";
import { preview } from "./preview.js";
import { entryAt } from "./sources.js";
import { t } from "./strings.js";
import { chooseFiles } from "./uploads.js";

const commands = new Map();

const MAC = navigator.platform.startsWith("Mac");

// {id, icon, keys: ["Delete"], macKeys, group, when(context), run(context)}; the label is the text "command.ID".
export function addCommand(command) {
  commands.set(command.id, { when: () => true, keys: [], ...command });
}

// Those of this machine; a Mac has more of its own.
export function keysOf({ keys, macKeys = [] }) {
  return MAC ? [...macKeys, ...keys] : keys;
}

export function command(id) {
  return commands.get(id);
}

export function allCommands() {
  return [...commands.values()];
}

// What commands decide by.
export function context() {
  const { selection, listing } = browser;
  const count = listing?.ready ? selection.count : 0;
  const share = shareEntry(browser.id);
  const folder = browser.id !== "/" && Boolean(listing?.ready);
  const deleted = isDeleted(browser.id);
  const search = isSearch(browser.id) && !deleted;
  const first = selection.first ?? (selection.rows && listing.item(selection.cursor));
  const onRow = listing?.item(selection.cursor);
  const home = (search || deleted) && first ? shareEntry(first.id) : share;
  const lies = (search || deleted) && first ? first.id : browser.id;
  const writable = search || deleted || mayWriteIn(browser.id);
  return {
    folder,
    search,
    count,
    canChange: count > 0 && home !== undefined && !isReadOnlyShare(home) && writable && mayModify(lies),
    canPermit: home !== undefined && !isReadOnlyShare(home) && mayModify(lies), // as far as the share goes
    canDownload: count > 0 && mayDownload(lies),
    // What is chosen by name alone has its properties in its row.
    single: selection.single && selection.single.id === onRow?.id ? onRow : selection.single,
    canWrite: folder && share !== undefined && !isReadOnlyShare(share) && writable,
    inBin: deleted || isInBin(browser.id),
    deleted,
  };
}

export function runCommand(id) {
  const found = commands.get(id);
  const now = context();
  if (found?.when(now)) found.run(now);
}

export function shortcutText(keys) {
  const names = {
    Mod: MAC ? "⌘" : t("key.ctrl"),
    Shift: t("key.shift"),
    ArrowUp: "↑",
    ArrowLeft: "←",
    ArrowRight: "→",
    Delete: t("key.delete"),
    Backspace: t("key.backspace"),
    Enter: t("key.enter"),
    Escape: t("key.escape"),
    " ": t("key.space"),
  };
  return keys
    .split("+")
    .map((key) => names[key] ?? (key.length === 1 ? key.toUpperCase() : key))
    .join(MAC ? "" : "+");
}

const some = ({ count }) => count > 0;
const one = ({ single }) => single !== undefined;

addCommand({
  id: "open",
  icon: "folder-open",
  keys: ["Enter"],
  group: "open",
  when: one,
  run: ({ single }) => (single.isFolder ? go(single.id) : preview(single)),
});
addCommand({
  id: "preview",
  icon: "eye",
  keys: [" "],
  group: "open",
  when: ({ single }) => single && !single.isFolder,
  run: ({ single }) => preview(single),
});
addCommand({
  id: "edit",
  icon: "rename",
  keys: ["F4"],
  group: "change",
  when: ({ single, canChange, canDownload, inBin }) => single && mayBeText(single) && canChange && canDownload && !inBin,
  run: async ({ single }) => (await import("./editor.js")).edit(single),
});
addCommand({
  id: "download",
  icon: "download",
  keys: ["Mod+s"],
  group: "open",
  when: ({ canDownload }) => canDownload,
  run: async () => download(await chosenItems()),
});
addCommand({
  id: "rename",
  icon: "rename",
  keys: ["F2"],
  group: "change",
  when: ({ single, canChange, inBin }) => single && canChange && !inBin,
  run: ({ single }) => rename(single),
});
addCommand({
  id: "showInFolder",
  icon: "folder-open",
  group: "open",
  when: ({ single, search }) => single && search,
  run: ({ single }) => goTo(single),
});
addCommand({ id: "copyPath", icon: "path", group: "info", when: one, run: ({ single }) => copyPath(single.id) });
addCommand({
  id: "properties",
  icon: "info",
  keys: ["Alt+Enter"],
  group: "info",
  when: ({ count, folder, search }) => count > 0 || (folder && !search),
  run: async ({ single, count }) => {
    if (single || count === 0) return (await loaded(import("./properties.js")))?.showProperties(single ?? browser.id);
    const sizes = await loaded(import("./sizes.js"));
    return sizes?.showMany(await chosenItems());
  },
});
addCommand({
  id: "space",
  icon: "space",
  keys: ["Alt+s"],
  group: "info",
  when: ({ single, count, folder, search }) => (single ? single.isFolder && !isOffline(single) : count === 0 && folder && !search),
  run: ({ single }) => showSpaceOf(single?.id ?? browser.id),
});
addCommand({
  id: "versions",
  icon: "restore",
  keys: ["Alt+v"],
  group: "info",
  when: ({ single, count, folder, search, inBin }) => folder && !inBin && (single ? !isOffline(single) : count === 0 && !search),
  run: async ({ single, canPermit }) => {
    const module = await loaded(import("./versions.js"));
    await module?.showVersions(single ?? { id: browser.id, isFolder: true }, canPermit);
  },
});
addCommand({
  id: "permissions",
  icon: "lock",
  keys: ["Alt+p"],
  group: "info",
  when: ({ count, folder, search, inBin }) => folder && !inBin && (count > 0 || (!search && parentOf(browser.id) !== "/")),
  run: async ({ count, canPermit }) => {
    const choice = count > 0 ? await chosenItems() : new Choice([await entryAt(browser.id).catch(() => ({ id: browser.id }))]);
    const form = await loaded(import("./permissions.js"));
    await form?.showPermissions(choice, canPermit);
  },
});
addCommand({
  id: "upload",
  icon: "upload",
  keys: ["Mod+u"],
  group: "new",
  when: ({ canWrite, inBin }) => canWrite && !inBin,
  run: () => chooseFiles(false),
});
addCommand({
  id: "uploadFolder",
  icon: "upload",
  group: "new",
  when: ({ canWrite, inBin }) => canWrite && !inBin,
  run: () => chooseFiles(true),
});
addCommand({
  id: "newFolder",
  icon: "new-folder",
  keys: ["Alt+n"],
  group: "new",
  when: ({ canWrite, inBin }) => canWrite && !inBin,
  run: () => newFolder(),
});
addCommand({
  id: "newText",
  icon: "new-text",
  keys: ["Alt+t"],
  group: "new",
  when: ({ canWrite, inBin }) => canWrite && !inBin,
  run: () => newText(),
});
addCommand({
  id: "selectAll",
  icon: "check",
  keys: ["Mod+a"],
  group: "select",
  when: ({ folder }) => folder,
  run: () => browser.selection.all(),
});
addCommand({
  id: "selectNone",
  icon: "close",
  keys: ["Escape"],
  group: "select",
  when: some,
  run: () => browser.selection.clear(),
});
addCommand({ id: "refresh", icon: "refresh", keys: ["Alt+r"], group: "view", run: () => refresh() });
addCommand({
  id: "viewList",
  icon: "list",
  keys: ["Alt+1"],
  group: "view",
  when: ({ folder }) => folder,
  run: () => setMode("list"),
});
addCommand({
  id: "viewGrid",
  icon: "grid",
  keys: ["Alt+2"],
  group: "view",
  when: ({ folder }) => folder,
  run: () => setMode("grid"),
});
addCommand({
  id: "up",
  icon: "up",
  keys: ["Backspace", "Alt+ArrowUp"],
  macKeys: ["Mod+ArrowUp"],
  group: "go",
  when: () => browser.id !== "/",
  run: goUp,
});
addCommand({ id: "back", icon: "back", keys: ["Alt+ArrowLeft"], group: "go", run: () => history.back() });
addCommand({ id: "forward", icon: "forward", keys: ["Alt+ArrowRight"], group: "go", run: () => history.forward() });
addCommand({ id: "editPath", icon: "rename", keys: ["Mod+l"], group: "go", run: editPath });
