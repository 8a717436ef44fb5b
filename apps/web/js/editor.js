// The editor of texts. What a text was written in stays: encoding, byte order mark, line ends, the last line's end.

import { ApiError, MISSING, readReply, send, urlOf } from "./api.js";
import { refresh } from "./browser.js";
import { choose, toast, toastFailure } from "./dialogs.js";
import { h, icon, iconButton, nameNode } from "./dom.js";
import { iconOf } from "./icons.js";
import "./later.js";
import { childOf, decode as decodeName, encodeName, lastOf, splitExtension } from "./path.js";
import { t } from "./strings.js";
import { compareTexts } from "./text_compare.js";
import { canEncode, decode, detect, ENCODINGS, encode, lineEnds, Unencodable } from "./text_codec.js";
import { loadEditor, textView } from "./text_view.js";

export const LARGEST = 2 * 1024 * 1024;

const CHANGED = 1806; // codes of a save that was refused
const IN_USE = 1807;
const MOST_COPIES = 100;

let open = null;

// Opens the editor on a file: {id, name, kind}. Ends when it is closed again.
export async function edit(entry) {
  if (open) return;
  open = new Editor(entry);
  try {
    await open.run();
  } catch (failure) {
    toastFailure(failure, entry.id);
  } finally {
    open = null;
  }
}

addEventListener("beforeunload", (event) => {
  if (open?.changed) event.preventDefault();
});

// The file as it is now: {bytes, tag}. Fails with MISSING when it is gone.
async function fetchText(id) {
  const response = await send(urlOf("download", { path_raw: id }));
  if (!response.ok) readReply(response.status, await response.text());
  if (Number(response.headers.get("Content-Length")) > LARGEST) {
    await response.body.cancel();
    throw new ApiError({ key: "page:text_large", path: decodeName(id) });
  }
  return { bytes: new Uint8Array(await response.arrayBuffer()), tag: response.headers.get("ETag") };
}

// Stores bytes on a condition; the reply's file.
export async function store(id, bytes, condition) {
  const response = await send(urlOf("upload", { path_raw: id }), { method: "PUT", body: bytes, headers: condition });
  return readReply(response.status, await response.text()).files[0];
}

class Editor {
  constructor(entry) {
    this.entry = entry;
    this.saved = null; // the text as it was read or stored last
  }

  get changed() {
    return this.view !== undefined && this.view.text() !== this.saved;
  }

  async run() {
    const [library, { bytes, tag }] = await Promise.all([loadEditor(), fetchText(this.entry.id)]);
    this.library = library;
    this.tag = tag;
    const encoding = detect(bytes);
    if (!encoding) throw new ApiError({ key: "page:no_text", path: this.entry.name });
    this.bytes = bytes;
    this.build();
    this.read(encoding);
    document.body.append(this.node);
    this.node.showModal();
    this.view.focus();
    // The way back leads out of the editor first.
    history.pushState({ ...history.state, editor: true }, "", location.href);
    const back = () => history.state?.editor || this.leave(true);
    addEventListener("popstate", back);
    await new Promise((resolve) => this.node.addEventListener("close", resolve));
    removeEventListener("popstate", back);
    if (history.state?.editor) {
      history.back();
      await new Promise((resolve) => addEventListener("popstate", resolve, { once: true }));
    }
    this.view.destroy();
    this.node.remove();
  }

  build() {
    this.state = h("span", { role: "status" });
    this.name = h("b", {}, nameNode(this.entry.name));
    this.save = h("button.button.primary", { type: "button", onclick: () => this.store() }, t("editor.save"));
    this.encodings = h(
      "select.input",
      { "aria-label": t("editor.encoding"), onchange: () => this.changeEncoding(this.encodings.value) },
      Object.entries(ENCODINGS).map(([value, label]) => h("option", { value }, label)),
    );
    this.ends = h("span.soft");
    this.notice = h("p.editor-notice", { hidden: true });
    this.body = h("div.editor-body");
    this.node = h(
      "dialog.editor",
      { "aria-label": t("editor.title") },
      h(
        "header",
        {},
        icon(iconOf(this.entry), "file-icon"),
        h("div.grow.editor-name", {}, this.name, this.state),
        iconButton("search", t("editor.find"), () => this.view.find()),
        this.save,
        iconButton("close", t("dialog.close"), () => this.leave()),
      ),
      this.notice,
      this.body,
      h("footer", {}, this.encodings, this.ends),
    );
    this.node.addEventListener("cancel", (event) => {
      event.preventDefault();
      this.leave();
    });
    this.node.addEventListener("keydown", (event) => {
      if (!(event.ctrlKey || event.metaKey) || event.key.toLowerCase() !== "s" || event.altKey) return;
      event.preventDefault();
      this.store();
    });
  }

  // Shows the bytes as they read in an encoding.
  read(encoding) {
    const found = decode(this.bytes, encoding);
    const ends = lineEnds(found.text);
    this.found = found;
    this.readOnly = !found.exact;
    this.saved = found.text;
    this.view?.destroy();
    this.view = textView(this.library, {
      parent: this.body,
      text: found.text,
      name: this.entry.name,
      // Mixed ends: a line ends with "\n", and a "\r" before it shows as a character of its own.
      separator: ends === "mixed" || ends === null ? "\n" : ends,
      readOnly: this.readOnly,
      onChange: () => this.paint(),
    });
    this.encodings.value = encoding;
    const names = { "\r\n": "CRLF", "\n": "LF", "\r": "CR", mixed: t("editor.mixed") };
    this.ends.textContent = [found.bom && t("editor.bom"), ends && names[ends]].filter(Boolean).join(" · ");
    this.notice.hidden = found.exact;
    this.notice.textContent = t(canEncode(encoding) ? "editor.inexact" : "editor.only_read", { encoding: ENCODINGS[encoding] });
    this.paint();
  }

  paint() {
    const { changed } = this;
    this.state.textContent = t(this.readOnly ? "editor.read_only" : changed ? "editor.changed" : "editor.unchanged");
    this.save.disabled = this.readOnly || !changed || Boolean(this.storing);
    // Read in another encoding would be what is stored, not what was written here.
    this.encodings.disabled = changed;
  }

  changeEncoding(encoding) {
    this.read(encoding);
    this.view.focus();
  }

  // Whether the text is stored. What was typed since another storing began follows it.
  store() {
    if (this.storing) return (this.following ??= this.storing.then(() => this.storeFollowing()));
    if (this.readOnly || !this.changed) return Promise.resolve(!this.changed);
    this.storing = this.put({ "If-Match": this.tag })
      .catch((failure) => {
        this.explain(failure);
        return false;
      })
      .finally(() => {
        this.storing = null;
        this.paint();
      });
    this.paint();
    return this.storing;
  }

  storeFollowing() {
    this.following = null;
    return this.store();
  }

  async put(condition) {
    const text = this.view.text();
    const bytes = encode(text, this.found);
    if (bytes.length > LARGEST) throw new ApiError({ key: "page:text_large", path: this.entry.name });
    try {
      const file = await store(this.entry.id, bytes, condition);
      this.keep(text, bytes, file.etag ?? (await fetchText(this.entry.id)).tag);
    } catch (failure) {
      if (failure.code !== CHANGED) throw failure;
      return this.settle(text, bytes);
    }
    return true;
  }

  keep(text, bytes, tag) {
    Object.assign(this, { saved: text, bytes, tag });
    refresh();
  }

  explain(failure) {
    if (failure instanceof Unencodable) {
      const line = this.view.text().slice(0, failure.at).split(/\r\n|\n|\r/).length;
      this.view.goTo(failure.at);
      toast({
        text: t("editor.unencodable", { character: failure.character, line, encoding: ENCODINGS[this.found.encoding] }),
        hint: t("editor.unencodable.hint"),
        kind: "failed",
        actions: [{ label: t("editor.as_utf8"), run: () => this.storeAsUtf8() }],
      });
    } else if (failure.code === IN_USE) {
      toast({
        text: t("code:1807", { name: this.entry.name }),
        hint: t("code:1807.hint"),
        kind: "failed",
        actions: [{ label: t("editor.keep_both"), run: () => this.storeBeside().catch((again) => this.explain(again)) }],
      });
    } else {
      toastFailure(failure, this.entry.id);
    }
  }

  async storeAsUtf8() {
    const before = this.found;
    this.found = { ...before, encoding: "utf-8", bom: before.bom && before.encoding.startsWith("utf-") };
    if (await this.store()) this.encodings.value = "utf-8";
    else this.found = before;
  }

  // Somebody else changed the file meanwhile: both texts, and which of them it shall be.
  async settle(mine, bytes) {
    let theirs = null;
    try {
      theirs = await fetchText(this.entry.id);
    } catch (failure) {
      if (failure.code !== MISSING) throw failure;
    }
    if (theirs === null) return this.settleGone();
    const encoding = detect(theirs.bytes) ?? this.found.encoding;
    const read = decode(theirs.bytes, encoding);
    if (read.text === mine && encoding === this.found.encoding && read.bom === this.found.bom) {
      this.keep(mine, bytes, theirs.tag);
      return true;
    }
    const way = await compareTexts(this.library, { name: this.entry.name, theirs: read.text, mine });
    if (way === "mine") return this.put({ "If-Match": theirs.tag });
    if (way === "both") return this.storeBeside();
    if (way !== "theirs") return false;
    Object.assign(this, { bytes: theirs.bytes, tag: theirs.tag });
    this.read(encoding);
    this.view.focus();
    refresh();
    return true;
  }

  async settleGone() {
    const again = await choose({
      title: t("editor.gone", { name: this.entry.name }),
      body: h("p", {}, t("editor.gone.text")),
      buttons: [
        { label: t("dialog.cancel"), value: false },
        { label: t("editor.gone.again"), value: true, kind: "primary" },
      ],
    });
    return again ? this.put({ "If-None-Match": "*" }) : false;
  }

  // Under a name of its own beside the file, which is what is edited from then on.
  async storeBeside() {
    const text = this.view.text();
    const bytes = encode(text, this.found);
    const [stem, extension] = splitExtension(this.entry.name);
    for (let count = 2; count < MOST_COPIES; ++count) {
      const name = `${stem} (${count})${extension}`;
      const id = childOf(this.entry.parent, encodeName(name));
      try {
        await store(id, bytes, { "If-None-Match": "*" });
      } catch (failure) {
        if (failure.code === CHANGED) continue;
        throw failure;
      }
      this.entry = { ...this.entry, id, name };
      this.name.replaceChildren(nameNode(name));
      this.keep(text, bytes, (await fetchText(id)).tag);
      this.paint();
      toast({ text: t("editor.beside", { name }) });
      return true;
    }
    throw new ApiError({ key: "page:unknown", path: lastOf(this.entry.id) });
  }

  // `gone`: the browser's way back was taken already.
  async leave(gone = false) {
    if (!this.node.open) return; // it is being left
    if (gone && this.changed) history.pushState({ ...history.state, editor: true }, "", location.href);
    if (this.asking) return;
    this.asking = true;
    const way = this.changed ? await this.ask() : "leave";
    this.asking = false;
    if (way === "leave" || (way === "save" && (await this.store()))) this.node.close();
    else this.view.focus();
  }

  ask() {
    return choose({
      title: t("editor.leave"),
      body: h("p", {}, t("editor.leave.text", { name: this.entry.name })),
      buttons: [
        { label: t("editor.leave.stay"), value: null },
        { label: t("editor.leave.discard"), value: "leave", kind: "danger" },
        { label: t("editor.save"), value: "save", kind: "primary" },
      ],
    });
  }
}
