// Copying, moving, deleting, packing: what the user says, as tasks.

import { browser, selectedEntries } from "./browser.js";
import { heldItems, hold, letGo } from "./clipboard.js";
import { addCommand } from "./commands.js";
import { askConflict, takenNames } from "./conflicts.js";
import { askText, confirm, dismissToasts, toast, toastFailure } from "./dialogs.js";
import { isInBin, isRecycleBin } from "./entries.js";
import { checkName } from "./operations.js";
import { childOf, encodeName, isWithin, lastOf, nameOf, parentOf, shareOf, splitExtension } from "./path.js";
import { pickFolder } from "./picker.js";
import { get } from "./api.js";
import { startTask } from "./tasks.js";
import { t } from "./strings.js";

const ARCHIVE = /\.(zip|tar|tar\.gz|tgz|tar\.bz2|tbz2?|tar\.xz|txz)$/i;
const EXISTS = { skip: "skip", overwrite: "overwrite", both: "keep_both" };

// Copies or moves entries into a folder; what stands in the way is asked about before anything happens. Whether it began.
export async function transfer(action, entries, target) {
  const into = entries.find(({ id }) => isWithin(target, id));
  if (into) {
    toastFailure({ code: 1005, key: "error:error_select_conflict", path: `/${nameOf(into.id)}` });
    return false;
  }
  const moving = action === "move" ? entries.filter(({ id }) => parentOf(id) !== target) : entries;
  if (moving.length === 0) return false;
  try {
    const beside = action === "copy" && moving.every(({ id }) => parentOf(id) === target);
    const conflict = beside ? "keep_both" : await conflictFor(target, moving);
    if (!conflict) return false;
    const ids = moving.map(({ id }) => id);
    const begun = await startTask(action, ids, {
      params: { target_raw: target, conflict },
      affected: [target],
      target,
    });
    if (begun && action === "move") browser.selection.remove(ids); // they leave, and are known to
    return begun;
  } catch (failure) {
    toastFailure(failure, target);
    return false;
  }
}

// entries: {id, isFolder, size, mtime}
async function conflictFor(target, entries) {
  const byName = new Map(entries.map((entry) => [lastOf(entry.id), entry]));
  const taken = await takenNames(target, [...byName.keys()]);
  if (taken.size === 0) return "error";
  const pairs = [...taken].map(([name, there]) => ({ name, there, comes: byName.get(name) }));
  const said = await askConflict({ folder: target, pairs });
  return said ? EXISTS[said.answer] : null;
}

async function to(action) {
  const entries = await selectedEntries();
  if (entries.length === 0) return;
  const target = await pickFolder({
    title: t(`${action}.title`, { count: entries.length }),
    action: t(`${action}.action`),
    start: parentOf(entries[0].id),
  });
  if (target) transfer(action, entries, target);
}

async function take(cut) {
  const entries = await selectedEntries();
  if (entries.length === 0) return;
  hold(entries, cut);
  toast({ text: t(cut ? "held.cut" : "held.copy", { count: entries.length }) });
}

async function paste() {
  const { entries, cut } = heldItems();
  dismissToasts();
  const begun = await transfer(cut ? "move" : "copy", [...entries.values()], browser.id);
  if (begun && cut) letGo();
}

// Nothing when the names of what was chosen could not be had: that has been said.
async function chosenIds() {
  return (await selectedEntries()).map((entry) => entry.id);
}

const bins = new Map(); // share -> whether it has a recycle bin

async function hasBin(share) {
  if (!bins.has(share)) {
    const reply = await get("list", { action: "folder", path_raw: share, pattern: "#recycle", filetype: "dir" }).catch(
      () => ({ items: [] }),
    );
    bins.set(
      share,
      reply.items.some((item) => item.name === "#recycle"),
    );
  }
  return bins.get(share);
}

async function remove(forGood) {
  const entries = await selectedEntries();
  const ids = entries.map((entry) => entry.id);
  if (ids.length === 0) return;
  const inBin = ids.every(isInBin);
  const kept = !forGood && !inBin && (await Promise.all([...new Set(ids.map(shareOf))].map(hasBin))).every(Boolean);
  const what = { count: ids.length, name: entries.length === 1 ? entries[0].name : "" };
  if (
    !kept &&
    !(await confirm({
      title: t("delete.title", what),
      text: t(forGood || inBin ? "delete.text" : "delete.nobin", what),
      action: t("command.deleteForever"),
      kind: "danger",
    }))
  )
    return;
  browser.selection.clear();
  const binsOf = [...new Set(ids.map((id) => `${shareOf(id)}/%23recycle`))];
  await startTask("delete", ids, {
    params: { permanent: kept ? undefined : "true" },
    affected: kept ? binsOf : [],
    target: kept ? binsOf[0] : null,
    bin: kept,
  });
}

async function restore() {
  const ids = await chosenIds();
  if (ids.length === 0) return;
  browser.selection.clear();
  await startTask("restore", ids, {
    params: { conflict: "keep_both" },
    affected: [shareOf(ids[0])],
    target: ids.length === 1 ? parentOf(ids[0]).replace("/%23recycle", "") : shareOf(ids[0]),
  });
}

async function emptyBin() {
  if (await confirm({ title: t("bin.title"), text: t("bin.text"), action: t("command.emptyBin"), kind: "danger" })) {
    await startTask("empty", [`${shareOf(browser.id)}/%23recycle`], { affected: [browser.id] });
  }
}

async function compress() {
  const ids = await chosenIds();
  if (ids.length === 0) return;
  const folder = parentOf(ids[0]);
  const stem = ids.length === 1 ? splitExtension(nameOf(ids[0]))[0] : nameOf(folder);
  const name = await askText({
    title: t("compress.title", { count: ids.length }),
    label: t("name.label"),
    value: `${stem}.zip`,
    selectTo: stem.length,
    action: t("command.compress"),
    check: checkName,
    submit: async (text) => (/\.zip$/i.test(text) ? text : `${text}.zip`),
  });
  if (!name) return;
  const target = childOf(folder, encodeName(name));
  const conflict = await conflictFor(folder, [{ id: target, isFolder: false }]);
  if (conflict) await startTask("compress", ids, { params: { target_raw: target, conflict }, affected: [folder] });
}

async function extract({ single }) {
  const target = await pickFolder({ title: t("extract.title"), action: t("extract.action"), start: single.parent });
  if (!target) return;
  const params = { target_raw: target, conflict: "keep_both" };
  await startTask("extract", [single.id], { params, affected: [target], target });
}

const chosen = ({ count }) => count > 0;
const changeable = ({ canChange, inBin }) => canChange && !inBin;
addCommand({ id: "cut", icon: "cut", keys: ["Mod+x"], group: "change", when: changeable, run: () => take(true) });
addCommand({ id: "copy", icon: "copy", keys: ["Mod+c"], group: "change", when: chosen, run: () => take(false) });
addCommand({
  id: "paste",
  icon: "paste",
  keys: ["Mod+v"],
  group: "change",
  when: ({ canWrite, inBin }) => heldItems() !== null && canWrite && !inBin,
  run: paste,
});
addCommand({ id: "copyTo", icon: "copy-to", group: "change", when: chosen, run: () => to("copy") });
addCommand({ id: "moveTo", icon: "move", group: "change", when: changeable, run: () => to("move") });
addCommand({
  id: "compress",
  icon: "archive",
  group: "change",
  when: ({ count, canChange, search, inBin }) => count > 0 && canChange && !search && !inBin,
  run: compress,
});
addCommand({
  id: "extract",
  icon: "extract",
  group: "change",
  when: ({ single, inBin }) => single && !inBin && !single.isFolder && ARCHIVE.test(single.name),
  run: extract,
});
addCommand({
  id: "restore",
  icon: "restore",
  group: "change",
  when: ({ count, canChange, inBin }) => count > 0 && canChange && inBin,
  run: restore,
});
addCommand({
  id: "delete",
  icon: "trash",
  keys: ["Delete"],
  macKeys: ["Mod+Backspace"],
  group: "change",
  danger: true,
  when: ({ canChange }) => canChange,
  run: () => remove(false),
});
addCommand({
  id: "deleteForever",
  icon: "trash",
  keys: ["Shift+Delete"],
  group: "change",
  danger: true,
  when: changeable,
  run: () => remove(true),
});
addCommand({
  id: "emptyBin",
  icon: "trash",
  group: "change",
  danger: true,
  when: ({ folder, canWrite }) => folder && canWrite && isRecycleBin(browser.id),
  run: emptyBin,
});
