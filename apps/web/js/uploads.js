// Uploads: a few at once, the rest in a queue. What stands in the way of a file is asked about once.

import { post } from "./api.js";
import { Card } from "./activity.js";
import { browser, go, refresh } from "./browser.js";
import { takenNames } from "./conflicts.js";
import { toastFailure } from "./dialogs.js";
import { h } from "./dom.js";
import { describe } from "./errors.js";
import { emit, on } from "./events.js";
import { formatDuration, formatSize } from "./format.js";
import { childOf, decode, encodeName } from "./path.js";
import { labelOf } from "./pathbar.js";
import { t } from "./strings.js";
import { fromInput } from "./upload_files.js";
import { Job } from "./upload_job.js";
import { takePack } from "./upload_pack.js";

const AT_ONCE = 3;
const EXISTS = 414;
const REPAINT = 100; // milliseconds between two looks at all files of an upload

const queue = [];
const batches = new Set(); // whose cards are there
let running = 0;

export function chooseFiles(folders) {
  const input = h("input", { type: "file", multiple: true, webkitdirectory: folders });
  const target = browser.id;
  input.addEventListener("change", () => startUpload(fromInput(input), target));
  input.click();
}

export async function startUpload(found, target) {
  if (found.length === 0) return;
  const batch = new Batch(found, target);
  try {
    await batch.makeEmptyFolders();
    await batch.lookForConflicts(target, batch.jobs, 0);
  } catch (failure) {
    if (failure.code !== undefined) toastFailure(failure, target);
  }
  batch.enqueue(batch.jobs);
}

function pump() {
  while (running < AT_ONCE && queue.length > 0) {
    if (queue[0].state !== "waiting") {
      queue.shift();
      continue;
    }
    const next = takePack(queue) ?? queue.shift();
    ++running;
    next.run().then((left = []) => {
      --running;
      queue.unshift(...left);
      next.batch.paintSoon();
      pump();
    });
  }
}

class Batch {
  constructor(found, target) {
    this.target = target;
    this.answers = {}; // by kind of conflict, once somebody said so for all
    this.jobs = found.filter((one) => one.file).map((one) => new Job(this, one));
    this.emptyFolders = found.filter((one) => !one.file);
    this.made = 0; // of them
    this.paused = 0; // files that wait for the connection
    this.bytes = this.jobs.reduce((sum, job) => sum + job.file.size, 0);
    this.begun = performance.now();
    batches.add(this);
    const onRemove = () => batches.delete(this);
    this.card = new Card({ iconName: "upload", onCancel: () => this.cancel(), onRemove, title: this.title() });
  }

  title() {
    const folder = labelOf(this.target);
    if (this.jobs.length === 1) return t("upload.title.one", { name: decode(this.jobs[0].name), folder });
    if (this.jobs.length > 0) return t("upload.title", { count: this.jobs.length, folder });
    return t("upload.title.folders", { count: this.emptyFolders.length, folder });
  }

  async makeEmptyFolders() {
    for (const { parts } of this.emptyFolders) {
      const id = parts.reduce((folder, part) => childOf(folder, encodeName(part)), this.target);
      await post("operation", { action: "mkdir", parents: "true", path_raw: id }).catch((failure) => {
        if (failure.code !== EXISTS) throw failure;
      });
      ++this.made;
    }
  }

  // Files that would meet others are found before their bytes go anywhere. In a folder that is not there yet nothing is
  // taken, however much goes into it.
  async lookForConflicts(folder, jobs, depth) {
    const inside = Map.groupBy(jobs, (job) => encodeName(job.parts[depth]));
    const taken = await takenNames(folder, [...inside.keys()]);
    for (const [name, there] of taken) {
      const deeper = inside.get(name).filter((job) => job.parts.length > depth + 1);
      for (const job of inside.get(name)) if (!deeper.includes(job)) job.meets = there;
      if (deeper.length > 0 && there.isFolder) await this.lookForConflicts(childOf(folder, name), deeper, depth + 1);
    }
  }

  enqueue(jobs) {
    queue.push(...jobs);
    this.paint();
    pump();
  }

  // What failed, once more: one file, or all of them.
  retry(jobs = this.jobs) {
    const failed = jobs.filter((job) => job.state === "failed");
    for (const job of failed) job.reset();
    if (this.card.finished) this.card.begin();
    this.enqueue(failed);
  }

  async pauseFor(waiting) {
    ++this.paused;
    this.paintSoon();
    try {
      return await waiting;
    } finally {
      --this.paused;
      this.paintSoon();
    }
  }

  cancel() {
    for (const job of this.jobs) job.cancel();
    this.paint();
  }

  paintSoon() {
    this.painting ??= setTimeout(() => this.paint(), REPAINT);
  }

  paint() {
    clearTimeout(this.painting);
    this.painting = undefined;
    if (this.card.finished) return;
    const states = { waiting: 0, running: 0, done: 0, skipped: 0, failed: 0, cancelled: 0 };
    let loaded = 0;
    for (const job of this.jobs) {
      ++states[job.state];
      loaded += ["running", "waiting"].includes(job.state) ? job.loaded : job.file.size;
    }
    const failed = this.jobs.filter((job) => job.state === "failed");
    this.card.showErrors(failed.map((job) => this.failureOf(job)));
    if (states.waiting + states.running > 0) this.paintRunning(states, loaded);
    else this.finish(states);
  }

  paintRunning(states, loaded) {
    const seconds = ((performance.now() - this.begun) / 1000) * ((this.bytes - loaded) / Math.max(1, loaded));
    const left = states.waiting + states.running;
    const detail = [
      t("upload.progress", { done: this.jobs.length - left, count: this.jobs.length }),
      t("size.of", { done: formatSize(loaded), total: formatSize(this.bytes) }),
      loaded > 0 && this.paused === 0 && formatDuration(seconds),
    ];
    const note = this.paused > 0 ? t("upload.paused") : "";
    this.card.progress(this.bytes > 0 ? loaded / this.bytes : null, detail.filter(Boolean).join(" · "), note);
    this.changed(2000);
  }

  finish({ done, skipped, failed, cancelled }) {
    this.changed(0);
    const detail = [
      this.jobs.length > 0 ? t("upload.done", { count: done }) : t("task.done", { count: this.made }),
      skipped > 0 && t("upload.skipped", { count: skipped }),
      failed > 0 && t("upload.failed", { count: failed }),
    ];
    const kind = failed > 0 || this.made < this.emptyFolders.length ? "failed" : cancelled > 0 ? "stopped" : "good";
    const actions = [
      done > 0 && { label: t("activity.show"), run: () => go(this.target) },
      failed > 0 && { label: t("state.retry"), run: () => this.retry() },
    ];
    const text = cancelled > 0 ? t("upload.cancelled", { count: done }) : detail.filter(Boolean).join(" · ");
    this.card.finish(kind, text, actions.filter(Boolean));
  }

  failureOf(job) {
    const path = decode(job.id);
    const again = this.jobs.length > 1 ? () => this.retry([job]) : null; // else the card's own button does
    return { id: job.id, path, ...describe(job.failure, path), again };
  }

  // The list follows, though not at every file.
  changed(wait) {
    if (wait > 0 && this.timer) return;
    clearTimeout(this.timer);
    this.timer = setTimeout(() => {
      this.timer = null;
      emit("folders-changed", { ids: [this.target] });
      if (browser.id === this.target) refresh();
    }, wait);
  }
}

// Whether this page is at work on the upload of that id.
export function isUploading(id) {
  return [...batches].some((batch) => batch.jobs.some((job) => job.upload === id && ["waiting", "running"].includes(job.state)));
}

// Somebody else is logged in: what waits is not theirs, and cannot be sent.
let over = false;
on("start-anew", () => {
  over = true;
  for (const job of queue.splice(0)) job.cancel();
});

export function uploadsRunning() {
  return !over && running + queue.length > 0;
}
