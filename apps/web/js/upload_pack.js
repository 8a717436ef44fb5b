// Small files on their way in one request: by itself each would cost far more than its bytes.

import { isPassing, isUnreachable, untilServed } from "./network.js";
import { parentOf } from "./path.js";
import { modifiedOf, sendFiles } from "./upload_request.js";

const SMALL = 256 * 1024;
const MOST_FILES = 100;
const MOST_BYTES = 4 * 1024 * 1024;
const ODD = /["%\\\r\n]/; // what a form writes in another way

function fits(job) {
  return job.state === "waiting" && !job.alone && !job.meets && job.file.size <= SMALL && !ODD.test(job.parts.at(-1));
}

// Takes from the front of the queue what can go together: nothing, or at least two files of one folder.
export function takePack(queue) {
  const [first] = queue;
  let bytes = 0;
  let count = 0;
  for (const job of queue) {
    if (!fits(job) || job.batch !== first.batch || parentOf(job.id) !== parentOf(first.id)) break;
    bytes += job.file.size;
    if (count === MOST_FILES || bytes > MOST_BYTES) break;
    ++count;
  }
  return count < 2 ? null : new Pack(queue.splice(0, count));
}

class Pack {
  constructor(jobs) {
    this.jobs = jobs;
    [{ batch: this.batch }] = jobs;
  }

  // Resolves with the files that have to go once more. Which one it was that could not be stored, it shows by itself;
  // of those after it the server has seen nothing.
  async run() {
    for (const job of this.jobs) job.state = "running";
    const left = await this.send().catch((failure) => this.failed(failure));
    for (const job of left) job.again();
    return left.filter((job) => job.state === "waiting");
  }

  async send() {
    const reply = await sendFiles({
      method: "POST",
      body: this.form(),
      onBegin: (request) => {
        for (const job of this.jobs) job.request = request;
      },
      onProgress: ({ loaded, total }) => {
        for (const job of this.jobs) job.loaded = job.file.size * (loaded / total);
        this.batch.paintSoon();
      },
    });
    return reply ? this.stored(reply.files.length) : [];
  }

  form() {
    const form = new FormData();
    form.append("path_raw", parentOf(this.jobs[0].id));
    form.append("overwrite", "error");
    for (const { file, parts } of this.jobs) {
      const modified = modifiedOf(file);
      if (modified !== undefined) form.append("mtime", modified);
      form.append("file", file, parts.at(-1));
    }
    return form;
  }

  // The first ones; gives the rest.
  stored(count) {
    for (const job of this.jobs.slice(0, count)) job.stored();
    return this.jobs.slice(count);
  }

  async failed(failure) {
    const left = this.stored(failure.data?.files?.length ?? 0);
    // They may have arrived, and only the answer got lost.
    if (isUnreachable(failure)) for (const job of left) Object.assign(job, { alone: true, sent: true });
    const goesOn = isPassing(failure) && (await this.batch.pauseFor(untilServed(failure)));
    if (!goesOn && left.length > 0) left[0].alone = true;
    return left;
  }
}
