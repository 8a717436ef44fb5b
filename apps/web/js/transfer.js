// Copying, moving, deleting, packing: what the user says, as tasks.

import { browser, selectedEntries } from "./browser.js";
import { heldItems, hold, letGo } from "./clipboard.js";
import { addCommand } from "./commands.js";
import { askConflict, takenNames } from "./conflicts.js";
import { askText, confirm, dismissToasts, toast, toastFailure } from "./dialogs.js";
import { isInBin, isRecycleBin } from "./entries.js";
import { checkName } from "./operations.js";
import { childOf, encodeName, isWithin, nameOf, parentOf, shareOf, splitExtension } from "./path.js";
import { pickFolder } from "./picker.js";
import { get } from "./api.js";
import { startTask } from "./tasks.js";
import { t } from "./strings.js";

const ARCHIVE = /\.(zip|tar|tar\.gz|tgz|tar\.bz2|tbz2?|tar\.xz|txz)$/i;
const EXISTS = { skip: "skip", overwrite: "overwrite", both: "keep_both" };

// Copies or moves ids into a folder; what stands in the way is asked about before anything happens. Whether it began.
export async function transfer(action, ids, target) {
  const into = ids.find((id) => isWithin(target, id));
  if (into) {
    toastFailure({ code: 1005, key: "error:error_select_conflict", path: `/${nameOf(into)}` });
    return false;
  }
  const moving = action === "move" ? ids.filter((id) => parentOf(id) !== target) : ids;
  if (moving.length === 0) return false;
  try {
    const beside = action === "copy" && moving.every((id) => parentOf(id) === target);
    const conflict = beside ? "keep_both" : await conflictFor(target, moving);
    if (!conflict) return false;
    const begun = await startTask(action, moving, { target_raw: target, conflict }, [target]);
    if (begun && action === "move") browser.selection.remove(moving); // they leave, and are known to
    return begun;
  } catch (failure) {
    toastFailure(failure, target);
    return false;
  }
}

async function conflictFor(target, ids) {
  const names = ids.map((id) => id.slice(id.lastIndexOf("/") + 1));
  const taken = [...(await takenNames(target, names))];
  if (taken.length === 0) return "error";
  const said = await askConflict({ name: taken[0], folder: target, more: false, count: taken.length });
  return said ? EXISTS[said.answer] : null;
}

// Nothing when the names of what was chosen could not be had: that has been said.
async function chosenIds() {
  return (await selectedEntries()).map((entry) => entry.id);
}

async function to(action) {
  const ids = await chosenIds();
  if (ids.length === 0) return;
  const target = await pickFolder({
    title: t(`${action}.title`, { count: ids.length }),
    action: t(`${action}.action`),
    start: parentOf(ids[0]),
  });
  if (target) transfer(action, ids, target);
}

async function take(cut) {
  const ids = await chosenIds();
  if (ids.length === 0) return;
  hold(ids, cut);
  toast({ text: t(cut ? "held.cut" : "held.copy", { count: ids.length }) });
}

async function paste() {
  const { ids, cut } = heldItems();
  dismissToasts();
  const begun = await transfer(cut ? "move" : "copy", [...ids], browser.id);
  if (begun && cut) letGo();
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
  await startTask(
    "delete",
    ids,
    { permanent: kept ? undefined : "true" },
    kept ? ids.map((id) => `${shareOf(id)}/%23recycle`) : [],
  );
}

async function restore() {
  const ids = await chosenIds();
  if (ids.length === 0) return;
  browser.selection.clear();
  await startTask("restore", ids, { conflict: "keep_both" }, [shareOf(ids[0])]);
}

async function emptyBin() {
  if (await confirm({ title: t("bin.title"), text: t("bin.text"), action: t("command.emptyBin"), kind: "danger" })) {
    await startTask("empty", [`${shareOf(browser.id)}/%23recycle`], {}, [browser.id]);
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
  const conflict = await conflictFor(folder, [target]);
  if (conflict) await startTask("compress", ids, { target_raw: target, conflict }, [folder]);
}

async function extract({ single }) {
  const target = await pickFolder({ title: t("extract.title"), action: t("extract.action"), start: single.parent });
  if (target) await startTask("extract", [single.id], { target_raw: target, conflict: "keep_both" }, [target]);
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
addCommand({ id: "copyTo", icon: "copy", group: "change", when: chosen, run: () => to("copy") });
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
