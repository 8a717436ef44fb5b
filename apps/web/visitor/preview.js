// A look at one file, over the folder that it lies in.

import { kindOf } from "./kinds.js";
import { aboutText, drawing, make, nameNode, picture, texts } from "./parts.js";
import { fileAddress, limits, lookAddress } from "./requests.js";

const TEXT_START = 256 * 1024;
const SWIPE = 60; // pixels
let shown = null;

// onStep(by): another file is wanted; onClose: whoever looked has had enough.
export function openPreview(item, { onStep, onClose }) {
  if (!shown) {
    const bar = make("header");
    const stage = make("div.stage");
    const step = (name, by) =>
      make(`button.round.${name}`, { type: "button", "aria-label": texts[name], click: () => onStep(by) }, drawing(name));
    const dialog = make("dialog.preview", { "aria-label": texts.preview }, bar, stage, step("previous", -1), step("next", 1));
    shown = { dialog, bar, stage };
    dialog.addEventListener("cancel", (event) => {
      event.preventDefault();
      onClose();
    });
    dialog.addEventListener("click", (event) => {
      if (event.target === stage) onClose();
    });
    dialog.addEventListener("keydown", (event) => {
      const by = { ArrowLeft: -1, ArrowRight: 1 }[event.key];
      if (by && !event.target.closest("pre, audio, video")) onStep(by);
    });
    let from = null;
    stage.addEventListener("pointerdown", (event) => {
      from = event.pointerType === "touch" ? event.clientX : null;
    });
    stage.addEventListener("pointerup", (event) => {
      const by = from === null ? 0 : event.clientX - from;
      if (Math.abs(by) > SWIPE) onStep(by < 0 ? 1 : -1);
    });
    document.body.append(dialog);
    dialog.showModal();
  }
  const { bar, stage } = shown;
  const get = make("a.round", { href: fileAddress(item), download: "", "aria-label": texts.download }, drawing("download"));
  const close = make("button.round", { type: "button", "aria-label": texts.close, click: onClose }, drawing("close"));
  bar.replaceChildren(make("div.grow", {}, make("b", {}, nameNode(item)), make("span.soft", {}, aboutText(item))), get, close);
  shown.item = item;
  const content = contentOf(item);
  stage.replaceChildren(content);
}

export function closePreview() {
  shown?.dialog.remove();
  shown = null;
}

function contentOf(item) {
  const kind = kindOf(item);
  const source = lookAddress(item);
  const why = limits.left === null ? texts.noPreview : texts.noLook;
  const none = make("div.none", {}, picture(item.icon), make("p", {}, why), make("a.button", { href: fileAddress(item), download: "" }, texts.download));
  if (limits.left !== null || kind === "other" || !(item.additional?.size > 0)) return none;
  if (kind === "text") return textOf(item, source, none);
  const node = kind === "image" ? make("img", { alt: item.name }) : make(kind, { controls: "", preload: "metadata", "aria-label": item.name });
  node.addEventListener("error", () => node.replaceWith(none));
  node.src = source;
  return node;
}

function textOf(item, source, none) {
  const text = make("pre", { tabindex: "0" });
  fetch(source, { headers: { Range: `bytes=0-${TEXT_START - 1}` }, credentials: "same-origin" })
    .then(async (answer) => {
      const bytes = new Uint8Array(await answer.arrayBuffer());
      if (!answer.ok || bytes.includes(0)) return text.replaceWith(none);
      text.textContent = new TextDecoder().decode(bytes);
      if (item.additional.size > TEXT_START) text.append("\n\n", make("em", {}, texts.beginning));
      return undefined;
    })
    .catch(() => text.replaceWith(none));
  return text;
}
