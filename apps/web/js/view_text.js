// Texts to read: in the encoding that they are in, or that somebody says, in pieces when they are long; code in colours,
// Markdown as it is meant.

import { readReply, send, urlOf } from "./api.js";
import { h, loadStyle } from "./dom.js";
import { formatSize } from "./format.js";
import "./later.js";
import { splitExtension } from "./path.js";
import { t } from "./strings.js";
import { detect, ENCODINGS } from "./text_codec.js";

const PIECE = 256 * 1024;
const LONGEST = 4; // bytes of a character
const MOST_COLOURED = 150 * 1000; // characters

// The node of a text; null for what is not one. `source`: what says to a program which file, where that is not by its id alone.
export async function textNode(entry, signal) {
  loadStyle("documents");
  const reader = new Reader(entry, signal);
  return (await reader.read(0)) ? reader.node : null;
}

class Reader {
  constructor(entry, signal) {
    Object.assign(this, { entry, signal, encoding: null, offset: 0, source: false });
    this.isMarkdown = /^\.(md|markdown)$/i.test(splitExtension(entry.name)[1]);
    this.body = h("div.text-shown");
    this.encodings = h(
      "select.input",
      { "aria-label": t("editor.encoding"), onchange: () => this.show(this.encodings.value) },
      Object.entries(ENCODINGS).map(([value, label]) => h("option", { value }, label)),
    );
    this.part = h("span.soft", { role: "status" });
    const button = (label, run) => h("button.button", { type: "button", onclick: run }, t(label));
    this.toggle = button("preview.source", () => this.turn());
    this.steps = [button("preview.piece.previous", () => this.move(-1)), button("preview.piece.next", () => this.move(1))];
    this.node = h("div.text-part", {}, this.body, h("div.text-tools", {}, this.encodings, this.isMarkdown && this.toggle, this.steps[0], this.part, this.steps[1]));
  }

  get pieces() {
    return Math.max(1, Math.ceil(this.entry.size / PIECE));
  }

  // Whether it is a text.
  async read(offset) {
    const range = { Range: `bytes=${offset}-${offset + PIECE + LONGEST - 2}` };
    const response = await send(urlOf("download", this.entry.source ?? { path_raw: this.entry.id }), { headers: range, signal: this.signal });
    if (!response.ok) readReply(response.status, await response.text());
    const bytes = new Uint8Array(await response.arrayBuffer());
    this.encoding ??= detect(bytes, this.entry.size > bytes.length);
    if (this.encoding === null) return false;
    Object.assign(this, { offset, bytes });
    await this.show(this.encoding);
    return true;
  }

  async move(by) {
    const to = this.offset + by * PIECE;
    if (to >= 0 && to < this.entry.size) await this.read(to);
    this.body.firstChild.focus();
  }

  turn() {
    this.source = !this.source;
    this.show(this.encoding);
  }

  async show(encoding) {
    this.encoding = encoding;
    const text = new TextDecoder(encoding).decode(this.whole());
    const [before, after] = this.steps;
    before.hidden = after.hidden = this.part.hidden = this.pieces === 1;
    before.disabled = this.offset === 0;
    after.disabled = this.offset + PIECE >= this.entry.size;
    const number = this.offset / PIECE + 1;
    this.part.textContent = t("preview.piece", { number, count: this.pieces, size: formatSize(PIECE) });
    this.encodings.value = encoding;
    this.toggle.textContent = t(this.source ? "preview.rendered" : "preview.source");
    const rendered = this.isMarkdown && !this.source && this.pieces === 1;
    this.toggle.hidden = this.pieces > 1;
    this.body.replaceChildren(rendered ? await this.markdown(text) : await this.plain(text));
  }

  // The characters that begin in this piece: no piece begins or ends within one.
  whole() {
    const { bytes, encoding, offset } = this;
    if (encoding !== "utf-8") return bytes.subarray(0, PIECE);
    const follows = (i) => (bytes[i] & 0xc0) === 0x80;
    let first = 0;
    let end = Math.min(PIECE, bytes.length);
    while (offset > 0 && first < LONGEST - 1 && follows(first)) ++first;
    while (end < bytes.length && follows(end)) ++end;
    return bytes.subarray(first, end);
  }

  async markdown(text) {
    const { renderMarkdown } = await import("./view_markdown.js");
    return renderMarkdown(text, this.entry);
  }

  async plain(text) {
    const node = h("pre.scrolls", { tabindex: 0, "aria-label": this.entry.name });
    const pieces = text.length > MOST_COLOURED || this.offset > 0 ? null : await this.colours(text);
    if (pieces) node.append(...pieces.map(([piece, classes]) => (classes ? h("span", { class: classes }, piece) : piece)));
    else node.textContent = text;
    return node;
  }

  async colours(text) {
    try {
      const { colour } = await import("../third/colours.js");
      return await colour(this.entry.name, text);
    } catch {
      return null; // without them it is read as well
    }
  }
}

