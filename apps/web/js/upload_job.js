// One file on its way to the server. A connection that breaks is waited for; nothing is stored twice.

import { askConflict, cannotReplace } from "./conflicts.js";
import { isPassing, isUnreachable, untilServed } from "./network.js";
import { childOf, encodeName, lastOf, nameOf, parentOf, splitExtension } from "./path.js";
import { entryAt } from "./sources.js";
import { modifiedOf, sendFiles } from "./upload_request.js";

const EXISTS = 414;
const LARGE = 8 * 1024 * 1024; // goes on where it was cut off; smaller ones begin anew
const MOST_TRIES = 20;
const MOST_IN_VAIN = 4; // tries that brought no byte across although the server answers: the file cannot be read
let asking = Promise.resolve();

export class Job {
  constructor(batch, { file, parts }) {
    const id = parts.reduce((folder, part) => childOf(folder, encodeName(part)), batch.target);
    Object.assign(this, { batch, file, parts, id, name: lastOf(id) });
    this.meets = null; // what has its name already
    this.alone = false; // not with others in one request
    this.sent = false; // it may have arrived before
    this.upload = null; // of a large file: its id
    this.arrived = 0; // of that: bytes on the server's disk
    this.reset();
  }

  reset() {
    Object.assign(this, { state: "waiting", loaded: 0, failure: null });
  }

  // What went with others comes to the queue again.
  again() {
    if (this.state === "running") this.reset();
  }

  get pair() {
    const { size, lastModified } = this.file;
    return { name: this.name, comes: { isFolder: false, size, mtime: lastModified / 1000, file: this.file }, there: this.meets };
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
        this.meets = await this.found();
      }
    }
    // One question at a time; the answer to one may be meant for all.
    const answer = await (asking = asking.catch(() => {}).then(() => this.answer()));
    if (this.state === "cancelled") return undefined;
    if (answer === "both") return this.sendBeside();
    if (answer === "overwrite") return this.send("overwrite");
    this.state = answer === null ? "cancelled" : "skipped";
    if (this.upload) this.discard();
    return undefined;
  }

  async found() {
    const entry = await entryAt(this.id);
    return { isFolder: entry?.isFolder ?? false, size: entry?.size ?? null, mtime: entry?.mtime ?? 0 };
  }

  async answer() {
    const { batch } = this;
    // Somebody who cancelled is not asked about the others that already stood in line.
    if (this.state === "cancelled") return null;
    const kind = cannotReplace(this.pair) ? "clash" : "file";
    if (batch.answers[kind]) return batch.answers[kind];
    const others = batch.jobs.filter((one) => one !== this && ["waiting", "running"].includes(one.state));
    const known = others.filter((one) => one.meets !== null).length;
    const said = await askConflict({ folder: parentOf(this.id), pairs: [this.pair], more: others.length > 0, known });
    if (said?.all) batch.answers[kind] = said.answer;
    if (!said) batch.cancel();
    return said?.answer ?? null;
  }

  async sendBeside() {
    if (this.isLarge) return this.send("keep_both");
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

  // Tries again when the connection broke, as often as something came across; what is on the server's disk is no attempt
  // in vain.
  async send(overwrite) {
    let inVain = 0;
    for (let tries = 1; ; ++tries) {
      const { arrived } = this;
      try {
        return await (this.isLarge ? this.putLarge(overwrite) : this.put(overwrite));
      } catch (failure) {
        if (this.arrived > arrived) tries = 1;
        // The try before may have arrived whole, and only its answer got lost.
        if (failure.code === EXISTS && this.sent && (await this.found()).size === this.file.size) return this.stored();
        inVain = this.loaded > 0 ? 0 : inVain + 1;
        if (!isPassing(failure) || tries === MOST_TRIES || inVain === MOST_IN_VAIN) throw failure;
        this.sent ||= isUnreachable(failure);
        this.loaded = 0;
        if (!(await this.batch.pauseFor(untilServed(failure)))) throw failure;
        if (this.state === "cancelled") return undefined;
      }
    }
  }

  stored() {
    if (this.state === "cancelled") return;
    this.loaded = this.file.size;
    this.state = "done";
  }

  async put(overwrite) {
    const reply = await sendFiles({
      method: "PUT",
      params: { path_raw: this.id, overwrite, mtime: modifiedOf(this.file) },
      type: "application/octet-stream",
      body: this.file,
      onBegin: (request) => {
        this.request = request;
      },
      onProgress: ({ loaded }) => {
        this.loaded = loaded;
        this.batch.paintSoon();
      },
    });
    if (reply) this.stored();
  }

  get isLarge() {
    return this.file.size >= LARGE;
  }

  async putLarge(conflict) {
    const { sendResumable } = await import("./upload_resume.js");
    const done = await sendResumable(this.id, this.file, {
      conflict,
      known: this.upload,
      onUpload: (id) => {
        this.upload = id;
        if (this.state === "cancelled") this.discard();
        return this.state !== "cancelled";
      },
      onBegin: (request) => {
        this.request = request;
      },
      onOffset: (bytes, onDisk = false) => {
        this.loaded = bytes;
        if (onDisk) this.arrived = bytes;
        this.batch.paintSoon();
      },
      wait: (promise) => this.batch.pauseFor(promise).then(() => this.state !== "cancelled"),
    });
    if (!done || this.state === "cancelled") return;
    this.id = done.path;
    if (done.skipped) this.state = "skipped";
    else this.stored();
  }

  async discard() {
    const { discard } = await import("./upload_resume.js");
    if (this.upload) discard(this.upload).catch(() => {});
  }

  cancel() {
    if (this.state !== "waiting" && this.state !== "running") return;
    this.state = "cancelled";
    this.request?.abort();
    if (this.upload) this.discard();
  }
}
