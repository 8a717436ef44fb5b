// Files for whoever made the link: chosen or dropped, sent one after the other. What was sent before is nowhere to be seen.

import { drawing, make, sizeText, texts } from "./parts.js";
import { sendFile } from "./requests.js";

const TRIES = 20; // while too many others send
const OVER = new Set([401, 403, 404]); // nothing more can be sent

export class SendView {
  // `room`: what the link still takes; onOver(status): it takes nothing more, or not from here.
  constructor({ name, files_left: files, bytes_left: bytes }, onOver) {
    Object.assign(this, { files, bytes, onOver, queue: [], running: null });
    this.input = make("input.hidden-input", { type: "file", multiple: "", id: "files", change: () => this.chosen() });
    this.list = make("ul.sending", { "aria-label": texts.yourFiles });
    this.note = make("p.soft", { role: "status" });
    this.zone = make(
      "label.zone",
      { for: "files" },
      drawing("upload"),
      make("b", {}, texts.chooseFiles),
      make("span.soft", {}, texts.dropFiles),
    );
    this.node = make(
      "div.receives",
      {},
      make("h1", {}, make("bdi", {}, name)),
      make("p.soft", {}, texts.sendHint),
      this.input,
      this.zone,
      this.note,
      this.list,
    );
    this.paintRoom();
    this.leaving = (event) => this.running && event.preventDefault();
    addEventListener("beforeunload", this.leaving);
    // Anywhere on the page: a file that misses the zone must not replace it.
    this.onDrag = (event) => {
      event.preventDefault();
      this.zone.classList.toggle("over", event.type === "dragover");
      if (event.type === "drop") this.dropped(event.dataTransfer);
    };
    for (const type of ["dragover", "dragleave", "drop"]) document.addEventListener(type, this.onDrag);
  }

  // The link is over, or asks for its password: what runs is let go.
  end() {
    removeEventListener("beforeunload", this.leaving);
    for (const type of ["dragover", "dragleave", "drop"]) document.removeEventListener(type, this.onDrag);
    this.running?.stop.abort();
    this.queue = [];
  }

  paintRoom() {
    const full = this.files <= 0 || this.bytes <= 0;
    this.input.hidden = full;
    this.zone.hidden = full;
    const room = texts.room[this.files === 1 ? 0 : 1];
    this.note.textContent = full
      ? texts.full
      : room.replace("{count}", this.files.toLocaleString()).replace("{size}", sizeText(this.bytes));
  }

  chosen() {
    this.add([...this.input.files]);
    this.input.value = "";
  }

  dropped(transfer) {
    const isFolder = (item) => item.kind === "file" && item.webkitGetAsEntry?.()?.isDirectory;
    const folders = new Set([...transfer.items].flatMap((item) => (isFolder(item) ? [item.webkitGetAsEntry().name] : [])));
    this.add([...transfer.files].filter((file) => !folders.has(file.name) || file.size > 0 || file.type !== ""));
    if (folders.size > 0) this.note.textContent = texts.noFolders;
  }

  add(files) {
    for (const file of files) {
      const entry = { file, stop: null, tries: 0 };
      entry.bar = make("progress", { max: "1", value: "0", "aria-label": file.name });
      entry.said = make("span.soft", {}, texts.waits);
      entry.actions = make("span.actions");
      const about = make("div.grow", {}, make("bdi", {}, file.name), make("span.soft.size-of", {}, sizeText(file.size)), entry.bar, entry.said);
      entry.node = make("li", {}, about, entry.actions);
      this.list.append(entry.node);
      this.offer(entry, texts.cancel, "close", () => this.drop(entry));
      this.queue.push(entry);
    }
    this.next();
  }

  offer(entry, label, name, click) {
    const button = make("button.round", { type: "button", "aria-label": `${label}: ${entry.file.name}`, title: label, click }, drawing(name));
    const held = entry.actions.contains(document.activeElement);
    entry.actions.replaceChildren(button);
    if (held) button.focus();
  }

  drop(entry) {
    this.queue = this.queue.filter((one) => one !== entry);
    entry.stop?.abort();
    entry.node.remove();
  }

  async next() {
    if (this.running || this.queue.length === 0) return;
    const entry = this.queue.shift();
    this.running = entry;
    entry.stop = new AbortController();
    const status = await this.send(entry);
    this.running = null;
    if (OVER.has(status)) return this.onOver(status);
    this.next();
  }

  async send(entry) {
    const { file, bar, said } = entry;
    entry.said.textContent = texts.sends;
    const { status, code } = await sendFile(file, entry.stop.signal, (share) => {
      bar.value = share;
    });
    if (status === 200) {
      this.files -= 1;
      this.bytes -= file.size;
      this.paintRoom();
      bar.remove();
      said.textContent = texts.sent;
      entry.actions.replaceChildren(drawing("done"));
      entry.node.classList.add("sent");
    } else if (status === 429 && ++entry.tries < TRIES && !entry.stop.signal.aborted) {
      said.textContent = texts.busy;
      await new Promise((done) => setTimeout(done, 3000));
      if (!entry.stop.signal.aborted) return this.send(entry);
    } else if (!entry.stop.signal.aborted) {
      bar.remove();
      entry.node.classList.add("failed");
      said.textContent = code === 1809 ? texts.tooMuch : status === 400 ? texts.badFile : texts.notSent;
      this.offer(entry, texts.again, "again", () => {
        entry.node.remove();
        this.add([file]);
      });
    }
    return status;
  }
}
