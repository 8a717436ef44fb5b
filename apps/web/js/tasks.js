// Work that goes on in the background of the server: copy, move, delete, restore, compress, extract. It outlives the
// page; what runs is shown again after a reload, and in every tab.

import { get, MISSING, post } from "./api.js";
import { Card } from "./activity.js";
import { broughtOr } from "./beside.js";
import { browser, go, refresh } from "./browser.js";
import { addCommand } from "./commands.js";
import { Choice } from "./choice.js";
import { askText, toast, toastFailure } from "./dialogs.js";
import { plainName } from "./dom.js";
import { describe } from "./errors.js";
import { arrived, emit, on } from "./events.js";
import { formatSize } from "./format.js";
import { idIn, isWithin, nameOf } from "./path.js";
import { labelOf } from "./pathbar.js";
import { searchTask } from "./operations.js";
import { forget, note, noteOf } from "./task_notes.js";
import { t } from "./strings.js";
import { canUndo, isUndone, lastDone } from "./undo.js";

const POLL = 600;
const LOCKED = 1403;
const BUSY = 420;
const ICONS = {
  copy: "copy",
  move: "move",
  delete: "trash",
  restore: "restore",
  recover: "restore",
  empty: "trash",
  compress: "archive",
  extract: "extract",
  permit: "lock",
  undo: "restore",
};

const cards = new Map(); // task -> {card, order}
const tabs = new BroadcastChannel("orvel.tasks");
let timer = null;

export async function setupTasks() {
  tabs.addEventListener("message", look);
  addEventListener("focus", look);
  on("renamed", (what) => {
    canUndo(what);
    toast({ text: what.title, actions: [{ label: t("activity.undo"), run: () => undo(what) }] });
  });
  await arrived;
  const ask = () => get("operation", { action: "status" }).catch(() => ({ tasks: [] }));
  const { tasks } = await broughtOr("tasks", ask);
  for (const task of tasks.filter(hasCard)) {
    // What ended well while nobody looked needs no word any more, nor what somebody has seen already.
    if (task.finished && (isGood(task) || noteOf(task.taskid).seen)) clear(task.taskid);
    else show(task);
  }
}

// Starts `action` on entries or a choice. `params` go with it. `affected`: folders whose content it changes; `target`: where
// what comes of it can be seen. `refused(failure)`: whether it saw to that itself. Whether it began.
export async function startTask(action, what, { params = {}, affected = [], target = null, bin = false, refused } = {}) {
  const choice = Choice.of(what);
  const folders = [...new Set([...affected, ...choice.folders])];
  for (const { params: chosen, count, entries } of choice.portions()) {
    const some = choice.rows ? choice : new Choice(entries);
    try {
      const asked = { action, ...chosen, ...params, taskid: searchTask() };
      const { taskid } = await post("operation", asked);
      note(taskid, { count, name: some.single && nameOf(some.single.id), target, bin });
      show({ taskid, action, state: "running", items_done: 0, progress: 0 }, { choice: some, params, folders, target });
      tabs.postMessage(taskid);
    } catch (failure) {
      if (await refused?.(failure)) return false;
      if (failure.data?.listing) toast({ text: t("chosen.lost"), kind: "failed" });
      else toastFailure(failure, some.single?.id ?? choice.folders[0]);
      return false;
    }
  }
  return true;
}

// order: {choice, params, folders, target} of what this page started.
function show(task, order = { folders: [] }) {
  const { taskid } = task;
  const before = cards.get(taskid); // a look may find what was begun before the reply says so
  if (before) {
    before.order = order;
    return update(task);
  }
  const card = new Card({
    iconName: ICONS[task.action] ?? "activity",
    title: titleOf(task),
    onRemove: () => {
      cards.delete(taskid);
      clear(taskid);
    },
    onCancel: () => post("operation", { action: "cancel", taskid }).then((now) => update({ ...now }), toastFailure),
  });
  cards.set(taskid, { card, order });
  update(task);
  return watch();
}

function titleOf(task) {
  const { count = task.items_total ?? 0, name, target, undone = "" } = noteOf(task.taskid);
  if (task.action === "undo") return t("task.of.undo", { what: undone });
  const what = name === undefined ? t("task.items.some", { count }) : t("task.item", { name });
  const key = target && ["copy", "move", "extract"].includes(task.action) ? "to" : "of";
  return t(`task.${key}.${task.action}`, { what, folder: target ? labelOf(target) : "" });
}

function clear(taskid) {
  forget(taskid);
  post("operation", { action: "clear", taskid }).catch(() => {});
}

function watch() {
  clearTimeout(timer);
  if ([...cards.values()].every(({ card }) => card.finished)) return;
  timer = setTimeout(look, POLL);
}

// Also what other tabs have started.
async function look() {
  const asked = [...cards.keys()]; // what begins meanwhile may be missing in the answer
  const { tasks } = await get("operation", { action: "status" }).catch(() => ({ tasks: null }));
  if (tasks) {
    for (const task of tasks) {
      if (cards.has(task.taskid)) update(task);
      else if (!task.finished && hasCard(task)) show(task);
    }
    // A record that is gone has nothing more to tell.
    const known = new Set(tasks.map((task) => task.taskid));
    for (const taskid of asked) {
      const { card } = cards.get(taskid) ?? {};
      if (card && !known.has(taskid) && !card.finished) card.finish("good", "");
    }
  }
  watch();
}

// Who counts looks at a dialog meanwhile.
function hasCard(task) {
  return task.action !== "measure";
}

function isGood(task) {
  return task.state === "done" && !(task.items_failed > 0);
}

function update(task) {
  const { card, order } = cards.get(task.taskid) ?? {};
  if (!card || card.finished) return;
  card.retitle(titleOf(task));
  const errors = (task.errors ?? []).map((one) => ({ id: idIn(one), path: one.path, ...describe(one, one.path) }));
  card.showErrors(errors, task.errors_left_out ?? 0);
  if (task.finished) return finish(task, card, order);
  const detail = [
    task.items_total > 1 && t("task.items", { done: task.items_done ?? 0, count: task.items_total }),
    task.bytes_total > 0 && t("size.of", { done: formatSize(task.bytes_done), total: formatSize(task.bytes_total) }),
  ];
  const current = task.current ? plainName(task.current.slice(task.current.lastIndexOf("/") + 1)) : "";
  card.progress(
    task.progress > 0 || task.items_done > 0 ? task.progress : null,
    detail.filter(Boolean).join(" · "),
    current,
  );
  return undefined;
}

function finish(task, card, order) {
  const { target, bin } = noteOf(task.taskid);
  const parts = [
    task.state === "cancelled" && t("task.cancelled"),
    t("task.done", { count: task.items_done ?? 0 }),
    task.items_skipped > 0 && t("upload.skipped", { count: task.items_skipped }),
    task.items_failed > 0 && t("upload.failed", { count: task.items_failed }),
    bin && task.items_done > 0 && t("task.binned"),
    order.back?.leftOut > 0 && t("undo.left_out", { count: order.back.leftOut }),
    task.new_count > 0 && t("task.new", { count: task.new_count, name: nameOf(idIn(task.new[0])) }),
  ];
  const kind = task.state === "cancelled" ? "stopped" : isGood(task) ? "good" : "failed";
  const again = retryOf(task, order);
  const back = order.back ?? { id: task.taskid, title: titleOf(task), folders: order.folders, leftOut: task.undo_left_out };
  if (task.undo_count > 0 && order.choice) canUndo(back);
  const actions = [
    target && task.items_done > 0 && { label: t("activity.show"), run: () => go(target) },
    (task.undo_count > 0 || (order.back && !isGood(task))) && {
      label: t(order.back ? "state.retry" : "activity.undo"),
      run: () => {
        card.remove();
        undo(back);
      },
    },
    again && {
      label: t(isLocked(task) ? "extract.password.ask" : "state.retry"),
      run: async () => {
        const password = isLocked(task) ? await askPassword(again.choice.samples[0]) : undefined;
        if (password === null) return;
        card.remove();
        startTask(task.action, again.choice, { ...again, params: { ...again.params, password }, target, bin });
      },
    },
  ];
  card.finish(kind, parts.filter(Boolean).join(" · "), actions.filter(Boolean));
  if (!document.hidden) note(task.taskid, { seen: true });
  emit("folders-changed", { ids: [...new Set([...order.folders, browser.id])] });
  refresh();
}

// Undoes what was done, item by item; what has changed since stays, and is named. {id, title, folders, leftOut}
export async function undo(what) {
  const { id, title, folders } = what;
  isUndone(id);
  cards.get(id)?.card.remove();
  try {
    const { taskid } = await post("operation", { action: "undo", taskid: id, search: searchTask() });
    note(taskid, { undone: title });
    show({ taskid, action: "undo", state: "running", items_done: 0, progress: 0 }, { folders, back: what });
    tabs.postMessage(taskid);
  } catch (failure) {
    if (failure.code === MISSING) return toast({ text: t("undo.gone"), kind: "failed" });
    canUndo(what);
    toastFailure(failure.code === BUSY ? { key: "page:undo_busy" } : failure);
  }
  return undefined;
}

// Whether what failed is an archive whose password is not known.
const isLocked = (task) => task.action === "extract" && task.errors?.some(({ code }) => code === LOCKED);

function askPassword(id) {
  return askText({
    title: t("extract.password.title", { name: nameOf(id) }),
    label: t("extract.password"),
    type: "password",
    action: t("extract.again"),
    check: (text) => (text === "" ? t("extract.password.empty") : ""),
    submit: (text) => text,
  });
}

// Of rows, of which the names are known only here: the ones that lie in their folder.
function failedOf(choice, failed, isOne) {
  if (!choice.rows) return choice.only(({ id }) => isOne(id));
  const depth = choice.samples[0].split("/").length;
  const ids = failed.filter((id) => isWithin(id, choice.rows.folder)).map((id) => id.split("/").slice(0, depth).join("/"));
  return new Choice([...new Set(ids)].map((id) => ({ id })));
}

// What of a task that did not end well can be tried again, and how: nothing that is done already is done twice. Folders
// that were copied beside others would come a second time, so only what failed as a whole is tried then.
function retryOf(task, { choice, params, folders }) {
  if (isGood(task) || !choice) return null;
  const failed = (task.errors ?? []).map((one) => idIn(one));
  const beside = params.conflict === "keep_both" && task.action !== "restore";
  const all = !beside && (task.state === "cancelled" || task.errors_left_out > 0);
  const isOne = (id) => failed.some((one) => (beside ? one === id : isWithin(one, id)));
  const some = all ? choice : failedOf(choice, failed, isOne);
  if (some.count === 0 || task.action === "compress") return null;
  const goesOn = { error: "skip", keep_both: beside ? "keep_both" : "skip" };
  const conflict = params.conflict && (goesOn[params.conflict] ?? params.conflict);
  return { choice: some, params: { ...params, conflict }, affected: folders };
}

addCommand({
  id: "undo",
  icon: "restore",
  keys: ["Mod+z"],
  group: "change",
  when: () => lastDone() !== undefined,
  run: () => undo(lastDone()),
});
