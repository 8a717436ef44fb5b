// Work that goes on in the background of the server: copy, move, delete, restore, compress, extract. It outlives the
// page; what runs is shown again after a reload.

import { get, post } from "./api.js";
import { Card } from "./activity.js";
import { browser, refresh } from "./browser.js";
import { toastFailure } from "./dialogs.js";
import { plainName } from "./dom.js";
import { describe } from "./errors.js";
import { emit } from "./events.js";
import { formatSize } from "./format.js";
import { parentOf, pathLists } from "./path.js";
import { searchTask } from "./operations.js";
import { t } from "./strings.js";

const POLL = 600;
const ICONS = {
  copy: "copy",
  move: "move",
  delete: "trash",
  restore: "restore",
  empty: "trash",
  compress: "archive",
  extract: "extract",
};

const cards = new Map(); // task -> {card, affected: [folder]}
let timer = null;

export async function setupTasks() {
  const { tasks } = await get("operation", { action: "status" }).catch(() => ({ tasks: [] }));
  for (const task of tasks) {
    // What ended well while nobody looked needs no word any more.
    if (task.finished && task.state === "done" && task.items_failed === 0) clear(task.taskid);
    else show(task, []);
  }
}

// Starts `action` on the paths (ids). `affected`: folders whose content it changes.
export async function startTask(action, ids, params, affected) {
  const folders = new Set([...affected, ...ids.map(parentOf)]);
  for (const lines of pathLists(ids)) {
    try {
      const { taskid } = await post("operation", { action, paths_raw: lines.join("\n"), ...params, taskid: searchTask() });
      show({ taskid, action, state: "running", items_total: lines.length, items_done: 0, progress: 0 }, [...folders]);
    } catch (failure) {
      toastFailure(failure, ids[0]);
      return false;
    }
  }
  return true;
}

function show(task, affected) {
  const card = new Card({
    iconName: ICONS[task.action] ?? "activity",
    title: titleOf(task),
    onRemove: () => {
      cards.delete(task.taskid);
      clear(task.taskid);
    },
    onCancel: () =>
      post("operation", { action: "cancel", taskid: task.taskid }).then((now) => update({ ...now }), toastFailure),
  });
  cards.set(task.taskid, { card, affected });
  update(task);
  watch();
}

function titleOf(task) {
  return t(`task.${task.action}`, { count: task.items_total ?? 0 });
}

function clear(taskid) {
  post("operation", { action: "clear", taskid }).catch(() => {});
}

function watch() {
  clearTimeout(timer);
  if ([...cards.values()].every(({ card }) => card.finished)) return;
  timer = setTimeout(async () => {
    const { tasks } = await get("operation", { action: "status" }).catch(() => ({ tasks: null }));
    if (tasks) {
      for (const task of tasks) update(task);
      // A record that is gone has nothing more to tell.
      const known = new Set(tasks.map((task) => task.taskid));
      for (const [taskid, { card }] of cards) {
        if (!known.has(taskid) && !card.finished) card.finish("good", "");
      }
    }
    watch();
  }, POLL);
}

function update(task) {
  const { card, affected } = cards.get(task.taskid) ?? {};
  if (!card || card.finished) return;
  card.title.textContent = titleOf(task);
  const errors = (task.errors ?? []).map((one) => ({ path: one.path, text: describe(one, one.path).title }));
  card.showErrors(errors, task.errors_left_out ?? 0);
  if (!task.finished) {
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
    return;
  }
  const parts = [
    t("task.done", { count: task.items_done ?? 0 }),
    task.items_skipped > 0 && t("upload.skipped", { count: task.items_skipped }),
    task.items_failed > 0 && t("upload.failed", { count: task.items_failed }),
  ];
  const kind =
    task.state === "cancelled" ? "stopped" : task.state === "failed" || task.items_failed > 0 ? "failed" : "good";
  card.finish(kind, [task.state === "cancelled" && t("task.cancelled"), ...parts].filter(Boolean).join(" · "));
  emit("folders-changed", { ids: [...new Set([...affected, browser.id])] });
  refresh();
}
