// How much is in what was chosen: counted by a task of the server, shown while it goes on.

import { encodeParams, get, isAbort, post, PROGRAMS, sendOnce } from "./api.js";
import { Choice } from "./choice.js";
import { dialog } from "./dialogs.js";
import { h, icon, keepFocus, loadStyle, plainName } from "./dom.js";
import { describe } from "./errors.js";
import { formatSize } from "./format.js";
import "./later.js";
import { t } from "./strings.js";

const FIRST_LOOK = 150;
const LONGEST_PAUSE = 600;
const MOST_NAMED = 10;
const NUMBERS = ["size", "disk", "files", "folders", "others", "mounts", "linked", "links_unknown", "unreadable"];

loadStyle("space");

const pause = (wait) => new Promise((resolve) => setTimeout(resolve, wait));

// Measures entries or a choice: {state, failure, errors, measured}, all that "measured" of the task has for a single
// portion, its sums for several. `onProgress` is given the same while it goes on; an abort of `signal` ends it.
export async function measure(what, { signal, onProgress }) {
  const done = [];
  for (const { params } of Choice.of(what).portions()) {
    const task = await measurePortion(params, signal, (now) => onProgress(resultOf([...done, now])));
    done.push(task);
    if (task.state !== "done") break;
  }
  return resultOf(done);
}

async function measurePortion(params, signal, onProgress) {
  const { taskid } = await post("operation", { action: "measure", ...params });
  const cancel = () =>
    sendOnce(`${PROGRAMS}operation`, { method: "POST", body: encodeParams({ action: "cancel", taskid }), keepalive: true }).catch(() => {});
  if (signal.aborted) cancel();
  signal.addEventListener("abort", cancel);
  addEventListener("pagehide", cancel);
  try {
    for (let wait = FIRST_LOOK; ; wait = Math.min(LONGEST_PAUSE, 1.5 * wait)) {
      const task = await get("operation", { action: "status", taskid });
      if (task.finished) {
        await post("operation", { action: "clear", taskid }).catch(() => {});
        return task;
      }
      onProgress(task);
      await pause(wait);
    }
  } catch (failure) {
    cancel();
    throw failure;
  } finally {
    signal.removeEventListener("abort", cancel);
    removeEventListener("pagehide", cancel);
  }
}

function resultOf(tasks) {
  const last = tasks.at(-1);
  const found = tasks.map((task) => task.measured ?? {});
  const sums = Object.fromEntries(NUMBERS.map((name) => [name, found.reduce((sum, one) => sum + (one[name] ?? 0), 0)]));
  return {
    state: last.state,
    errors: tasks.flatMap((task) => task.errors ?? []),
    leftOut: tasks.reduce((sum, task) => sum + (task.errors_left_out ?? 0), 0),
    measured: tasks.length === 1 ? { ...found[0], ...sums } : sums,
  };
}

// "5 files, 4 folders"; a folder that was chosen is none of what it holds.
export function countsOf({ files, folders, others }, without = 0) {
  const parts = [
    t("sizes.files", { count: files }),
    folders > without && t("sizes.folders", { count: folders - without }),
    others > 0 && t("sizes.others", { count: others }),
  ];
  return parts.filter(Boolean).join(", ");
}

// What there is to say of the counting itself.
export function notesOf({ state, errors, leftOut, measured }) {
  const note = (text, list = [], more = 0) =>
    h(
      "li",
      {},
      icon("warning", "icon small"),
      h(
        "span",
        {},
        text,
        list.length > 0 &&
          h(
            "span.soft",
            {},
            list.slice(0, MOST_NAMED).map((one) => h("span", { title: plainName(one.path) }, describe(one).title)),
            more + list.length > MOST_NAMED && h("span", {}, t("activity.more_errors", { count: more + list.length - MOST_NAMED })),
          ),
      ),
    );
  const { unreadable, unreadable_first: first = [], mounts, linked, links_unknown: unknown } = measured;
  const notes = [
    state === "cancelled" && note(t("sizes.cancelled")),
    state === "failed" && note(t("sizes.failed")),
    errors.length > 0 && note(t("sizes.missed", { count: errors.length + leftOut }), errors, leftOut),
    unreadable > 0 && note(t("sizes.unreadable", { count: unreadable }), first, unreadable - first.length),
    mounts > 0 && note(t("sizes.mounts", { count: mounts })),
    linked > 0 && note(t("sizes.linked", { count: linked })),
    unknown > 0 && note(t("sizes.links_unknown", { count: unknown })),
  ];
  return h("ul.size-notes", {}, notes.filter(Boolean));
}

// That it goes on, and the way to end it. `update` takes what measure() reports.
export function runningNode(onCancel) {
  const text = h("span.grow", {}, t("sizes.counting"));
  const node = h(
    "div.size-running",
    {},
    h("div.progress.unknown", { role: "progressbar", "aria-label": t("sizes.counting") }, h("i")),
    text,
    h("button.button.outlined", { type: "button", onclick: onCancel }, t("dialog.cancel")),
  );
  const update = ({ measured }) => {
    text.textContent = t("sizes.so_far", { size: formatSize(measured.size), counts: countsOf(measured) });
  };
  return { node, update };
}

// A part of a dialog that counts what was chosen as soon as it is there. `without`: how many of the folders are what
// was chosen; `more`: nodes below. It ends with the dialog.
export function sizesNode(what, { without = 0, more = [] } = {}) {
  const lines = h("dl");
  const said = h("p.visually-hidden", { role: "status" });
  const rest = h("div", {});
  const node = h("section.sizes", {}, h("h3", {}, t("sizes.title")), lines, rest, said, ...more);
  const again = (text) => h("button.link", { type: "button", onclick: start }, t(text));
  const line = (key, value) => [h("dt", {}, t(`properties.${key}`)), h("dd", {}, value)];
  const show = (result) => {
    const { measured } = result;
    const size = `${formatSize(measured.size)} (${t("size.bytes", { count: measured.size })})`;
    lines.replaceChildren(
      ...line("size", size),
      ...line("disk", formatSize(measured.disk)),
      ...line("contains", countsOf(measured, without)),
    );
    keepFocus(rest, () => rest.replaceChildren(notesOf(result), result.state === "done" ? "" : again("space.again")));
    said.textContent = `${size}, ${countsOf(measured, without)}`;
  };
  const start = async () => {
    const ending = new AbortController();
    const running = runningNode(() => ending.abort());
    node.setAttribute("aria-busy", "true");
    keepFocus(rest, () => rest.replaceChildren(running.node));
    requestAnimationFrame(() => node.closest("dialog")?.addEventListener("close", () => ending.abort()));
    try {
      show(await measure(what, { signal: ending.signal, onProgress: running.update }));
    } catch (failure) {
      if (isAbort(failure)) return;
      rest.replaceChildren(h("p", { role: "alert" }, describe(failure).title, " ", again("state.retry")));
    }
    node.removeAttribute("aria-busy");
  };
  start();
  return node;
}

// The properties of many.
export function showMany(choice) {
  return dialog({
    title: t("command.properties"),
    className: "properties",
    fill: () => [
      h(
        "div.hero",
        {},
        icon("kind-misc", "file-icon"),
        h("div.grow", {}, h("b", {}, t("task.items.some", { count: choice.count }))),
      ),
      sizesNode(choice),
    ],
  });
}

