// Copying, moving, deleting, packing: what the user says, as tasks.

import { browser, chosenItems, shareEntry } from "./browser.js";
import { Choice } from "./choice.js";
import { heldItems, hold, letGo } from "./clipboard.js";
import { addCommand } from "./commands.js";
import { askConflict, takenOf } from "./conflicts.js";
import { confirm, dismissToasts, loaded, toast, toastFailure } from "./dialogs.js";
import { isArchive, isInBin, isReadOnlyShare, isRecycleBin } from "./entries.js";
import { checkName } from "./operations.js";
import { childOf, encodeName, isDeleted, isWithin, lastOf, nameOf, parentOf, shareOf, splitExtension } from "./path.js";
import { get } from "./api.js";
import { startTask } from "./tasks.js";
import { t } from "./strings.js";

const EXISTS = { skip: "skip", overwrite: "overwrite", both: "keep_both" };

// Copies or moves entries into a folder; what stands in the way is asked about before anything happens. Whether it began.
export async function transfer(action, choice, target) {
  const into = choice.entries.find(({ id }) => isWithin(target, id));
  if (into) {
    toastFailure({ code: 1005, key: "error:error_select_conflict", path: `/${nameOf(into.id)}` });
    return false;
  }
  const isThere = choice.samples.every((id) => parentOf(id) === target);
  if (choice.count === 0 || (action === "move" && isThere)) return false;
  const moving = action === "move" ? choice.only(({ id }) => parentOf(id) !== target) : choice;
  try {
    const beside = action === "copy" && isThere;
    const conflict = beside ? "keep_both" : await conflictFor(target, moving);
    if (!conflict) return false;
    const begun = await startTask(action, moving, {
      params: { target_raw: target, conflict },
      affected: [target],
      target,
    });
    // They leave, and are known to.
    if (begun && action === "move" && moving.rows) browser.selection.lose(moving.rows.listing);
    else if (begun && action === "move") browser.selection.remove(moving.entries.map(({ id }) => id));
    return begun;
  } catch (failure) {
    toastFailure(failure, target);
    return false;
  }
}

async function conflictFor(target, choice) {
  const byName = new Map(choice.entries.map((entry) => [lastOf(entry.id), entry]));
  const taken = await takenOf(target, choice);
  if (taken.size === 0) return "error";
  // Of rows nothing is known but their names: whether a folder meets a file shows when they are worked on.
  const comesAs = (name, { isFolder }) => byName.get(name) ?? { isFolder, size: null };
  const pairs = [...taken].map(([name, there]) => ({ name, there, comes: comesAs(name, there) }));
  const said = await askConflict({ folder: target, pairs });
  return said ? EXISTS[said.answer] : null;
}

async function pickFolder(asked) {
  const picker = await loaded(import("./picker.js"));
  return picker?.pickFolder(asked);
}

async function to(action) {
  const choice = await chosenItems();
  if (choice.count === 0) return;
  const target = await pickFolder({
    title: t(`${action}.title`, { count: choice.count }),
    action: t(`${action}.action`),
    start: choice.folders[0],
  });
  if (target) transfer(action, choice, target);
}

async function take(cut) {
  const choice = await chosenItems();
  if (choice.count === 0) return;
  hold(choice, cut);
  toast({ text: t(cut ? "held.cut" : "held.copy", { count: choice.count }) });
}

async function paste() {
  const { choice, cut } = heldItems();
  dismissToasts();
  const begun = await transfer(cut ? "move" : "copy", choice, browser.id);
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
  const choice = await chosenItems();
  const { samples, count } = choice;
  if (count === 0) return;
  const shares = [...new Set(samples.map(shareOf))];
  const inBin = isDeleted(browser.id) || samples.every(isInBin);
  const kept = !forGood && !inBin && (await Promise.all(shares.map(hasBin))).every(Boolean);
  const what = { count, name: choice.single?.name ?? "" };
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
  const binsOf = shares.map((share) => `${share}/%23recycle`);
  await startTask("delete", choice, {
    params: { permanent: kept ? undefined : "true" },
    affected: kept ? binsOf : [],
    target: kept ? binsOf[0] : null,
    bin: kept,
  });
}

async function restore() {
  const choice = await chosenItems();
  if (choice.count === 0) return;
  const shares = [...new Set(choice.samples.map(shareOf))];
  const from = choice.single?.deleted?.from;
  browser.selection.clear();
  await startTask("restore", choice, {
    params: { conflict: "keep_both" },
    affected: shares,
    target: from ?? (choice.single ? parentOf(choice.single.id).replace("/%23recycle", "") : shares[0]),
  });
}

async function emptyBin() {
  const all = isDeleted(browser.id);
  const found = all ? (await browser.listing.allNames()).map(({ id }) => shareOf(id)) : [shareOf(browser.id)];
  const shares = [...new Set(found)].filter((share) => !isReadOnlyShare(shareEntry(share)));
  const text = t(all ? "deleted.empty" : "bin.text");
  if (await confirm({ title: t("bin.title"), text, action: t("command.emptyBin"), kind: "danger" })) {
    for (const share of shares) await startTask("empty", [{ id: share }], { affected: [browser.id] });
  }
}

async function compress() {
  const choice = await chosenItems();
  if (choice.count === 0) return;
  const [folder] = choice.folders;
  const stem = choice.single ? splitExtension(nameOf(choice.single.id))[0] : nameOf(folder);
  const asked = await loaded(import("./pack_dialog.js"));
  const pack = await asked?.askPack({ count: choice.count, stem, check: checkName });
  if (!pack) return;
  const target = childOf(folder, encodeName(pack.name));
  const conflict = await conflictFor(folder, new Choice([{ id: target, isFolder: false }]));
  const params = { target_raw: target, conflict, format: pack.format, password: pack.password };
  if (conflict) await startTask("compress", choice, { params, affected: [folder] });
}

async function extract({ single }) {
  const target = await pickFolder({ title: t("extract.title"), action: t("extract.action"), start: single.parent });
  if (target) await extractTo(single, target);
}

async function extractTo(single, target, own_folder) {
  const params = { target_raw: target, conflict: "keep_both", own_folder };
  await startTask("extract", [single], { params, affected: [target], target });
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
  when: ({ single, inBin }) => single && !inBin && isArchive(single),
  run: extract,
});
addCommand({
  id: "extractOwn",
  icon: "extract",
  group: "change",
  when: ({ single, inBin, canWrite, search }) => single && !inBin && !search && canWrite && isArchive(single),
  run: ({ single }) => extractTo(single, single.parent, "true"),
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
  when: ({ folder, canWrite, deleted }) => folder && (deleted ? browser.listing.total > 0 && browser.filter === "" : canWrite && isRecycleBin(browser.id)),
  run: emptyBin,
});
