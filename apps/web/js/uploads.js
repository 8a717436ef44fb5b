// Uploads: a few at once, the rest in a queue. What stands in the way of a file is asked about once.

import { ApiError, post, readReply, urlOf } from "./api.js";
import { Card } from "./activity.js";
import { browser, refresh } from "./browser.js";
import { askConflict, takenNames } from "./conflicts.js";
import { toastFailure } from "./dialogs.js";
import { h } from "./dom.js";
import { describe } from "./errors.js";
import { emit } from "./events.js";
import { formatDuration, formatSize } from "./format.js";
import { childOf, decode, encodeName, nameOf, parentOf, splitExtension } from "./path.js";
import { labelOf } from "./pathbar.js";
import { t } from "./strings.js";
import { fromInput } from "./upload_files.js";

const AT_ONCE = 3;
const EXISTS = 414;

const queue = [];
let running = 0;
let asking = Promise.resolve();

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
    await batch.lookForConflicts();
  } catch (failure) {
    if (failure.code !== undefined) toastFailure(failure, target);
  }
  queue.push(...batch.jobs);
  batch.paint();
  pump();
}

function pump() {
  while (running < AT_ONCE && queue.length > 0) {
    const job = queue.shift();
    if (job.state !== "waiting") continue;
    ++running;
    job.run().finally(() => {
      --running;
      job.batch.paint();
      pump();
    });
  }
}

class Batch {
  constructor(found, target) {
    this.target = target;
    this.policy = null; // "skip", "overwrite" or "both", once somebody said so for all
    this.jobs = found.filter((one) => one.file).map((one) => new Job(this, one));
    this.emptyFolders = found.filter((one) => !one.file);
    this.made = 0; // of them
    this.bytes = this.jobs.reduce((sum, job) => sum + job.file.size, 0);
    this.begun = performance.now();
    this.card = new Card({
      iconName: "upload",
      onCancel: () => this.cancel(),
      title:
        this.jobs.length > 0
          ? t("upload.title", { count: this.jobs.length, folder: labelOf(target) })
          : t("upload.title.folders", { count: this.emptyFolders.length, folder: labelOf(target) }),
    });
  }

  async makeEmptyFolders() {
    for (const { parts } of this.emptyFolders) {
      await post("operation", { action: "mkdir", parents: "true", path_raw: idFor(this.target, parts) }).catch(
        (failure) => {
          if (failure.code !== EXISTS) throw failure;
        },
      );
      ++this.made;
    }
  }

  // Files that would meet others are found before their bytes go anywhere.
  async lookForConflicts() {
    const folders = Map.groupBy(this.jobs, (job) => parentOf(job.id));
    for (const [folder, jobs] of folders) {
      const taken = await takenNames(
        folder,
        jobs.map((job) => job.name),
      );
      for (const job of jobs) job.meets = taken.has(job.name);
    }
  }

  cancel() {
    for (const job of this.jobs) job.cancel();
    this.paint();
  }

  paint() {
    if (this.card.finished) return;
    const count = (...states) => this.jobs.filter((job) => states.includes(job.state)).length;
    const failed = this.jobs.filter((job) => job.state === "failed");
    const left = count("waiting", "running");
    const loaded = this.jobs.reduce(
      (sum, job) => sum + (job.state === "running" || job.state === "waiting" ? job.loaded : job.file.size),
      0,
    );
    this.card.showErrors(
      failed.map((job) => ({ path: decode(job.id), text: describe(job.failure, decode(job.id)).title })),
    );
    if (left > 0) {
      const seconds = ((performance.now() - this.begun) / 1000) * ((this.bytes - loaded) / Math.max(1, loaded));
      const detail = [
        t("upload.progress", { done: this.jobs.length - left, count: this.jobs.length }),
        t("size.of", { done: formatSize(loaded), total: formatSize(this.bytes) }),
        loaded > 0 && formatDuration(seconds),
      ];
      this.card.progress(this.bytes > 0 ? loaded / this.bytes : null, detail.filter(Boolean).join(" · "));
      this.changed(2000);
      return;
    }
    this.changed(0);
    const done = count("done");
    const detail = [
      this.jobs.length > 0 ? t("upload.done", { count: done }) : t("task.done", { count: this.made }),
      count("skipped") > 0 && t("upload.skipped", { count: count("skipped") }),
      failed.length > 0 && t("upload.failed", { count: failed.length }),
    ];
    const kind =
      failed.length > 0 || this.made < this.emptyFolders.length ? "failed" : count("cancelled") > 0 ? "stopped" : "good";
    this.card.finish(
      kind,
      count("cancelled") > 0 ? t("upload.cancelled", { count: done }) : detail.filter(Boolean).join(" · "),
    );
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

function idFor(target, parts) {
  return parts.reduce((id, part) => childOf(id, encodeName(part)), target);
}

class Job {
  constructor(batch, { file, parts }) {
    Object.assign(this, { batch, file, id: idFor(batch.target, parts), state: "waiting", loaded: 0, meets: false });
    this.name = this.id.slice(this.id.lastIndexOf("/") + 1);
  }

  async run() {
    this.state = "running";
    try {
      await this.place();
    } catch (failure) {
      if (this.state === "running") this.state = "failed";
      this.failure = failure;
    }
  }

  async place() {
    if (!this.meets) {
      try {
        return await this.send("error");
      } catch (failure) {
        if (failure.code !== EXISTS) throw failure;
      }
    }
    // One question at a time; the answer to one may be meant for all.
    const answer = await (asking = asking.catch(() => {}).then(() => this.answer()));
    if (this.state === "cancelled") return undefined;
    if (answer === "both") return this.sendBeside();
    if (answer === "overwrite") return this.send("overwrite");
    this.state = answer === null ? "cancelled" : "skipped";
    return undefined;
  }

  answer() {
    // Somebody who cancelled is not asked about the others that already stood in line.
    return this.state === "cancelled" ? null : (this.batch.policy ?? ask(this));
  }

  async sendBeside() {
    const [stem, extension] = splitExtension(nameOf(this.id));
    const folder = parentOf(this.id);
    for (let n = 2; ; ++n) {
      this.id = childOf(folder, encodeName(`${stem} (${n})${extension}`));
      try {
        return await this.send("error");
      } catch (failure) {
        if (failure.code !== EXISTS || n > 999) throw failure;
      }
    }
  }

  // What fetch() cannot: tell how far the body is.
  send(overwrite) {
    return new Promise((resolve, reject) => {
      const request = new XMLHttpRequest();
      this.request = request;
      request.open("PUT", urlOf("upload", { path_raw: this.id, overwrite }));
      request.setRequestHeader("Content-Type", "application/octet-stream");
      request.upload.addEventListener("progress", (event) => {
        this.loaded = event.loaded;
        this.batch.paint();
      });
      request.addEventListener("load", () => {
        try {
          readReply(request.status, request.responseText);
          this.state = "done";
          resolve();
        } catch (failure) {
          reject(failure);
        }
      });
      request.addEventListener("error", () => reject(new ApiError({ key: "page:upload_broken" })));
      request.addEventListener("abort", () => resolve());
      request.send(this.file);
    });
  }

  cancel() {
    if (this.state !== "waiting" && this.state !== "running") return;
    this.state = "cancelled";
    this.request?.abort();
  }
}

async function ask(job) {
  const more = job.batch.jobs.some((one) => one !== job && ["waiting", "running"].includes(one.state));
  const said = await askConflict({ name: job.name, folder: parentOf(job.id), more });
  if (said?.all) job.batch.policy = said.answer;
  if (!said) job.batch.cancel();
  return said?.answer ?? null;
}

export function uploadsRunning() {
  return running + queue.length > 0;
}
