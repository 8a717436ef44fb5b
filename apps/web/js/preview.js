// A look at a file: pictures, text, sound and film; of everything else what it is.

import { addressOf, readAddress } from "./address.js";
import { ApiError, urlOf } from "./api.js";
import { browser } from "./browser.js";
import { command, context, runCommand } from "./commands.js";
import { h, icon, iconButton, nameNode, plainName } from "./dom.js";
import { describe } from "./errors.js";
import { extensionOf, isArchive, mayBeText } from "./entries.js";
import { formatSize, formatTime } from "./format.js";
import { canShowImage, iconOf } from "./icons.js";
import { download } from "./download.js";
import { t } from "./strings.js";
import { isDrawn, smallPicture } from "./thumbnails.js";

const LARGEST_IMAGE = 64 * 1024 * 1024;
const SMALLER = 2048; // pixels
const LARGEST_AHEAD = 16 * 1024 * 1024;
const MOST_PASSED = 2000; // files that are no pictures
// What the server lets a browser show as a document of its own.
const IN_TAB = new Set(["JPG", "JPEG", "PNG", "GIF", "WEBP", "AVIF", "TXT", "LOG", "MD", "CSV"]);

let shown = null;

// The id of the file that is looked at.
export function previewed() {
  return shown?.entry.id;
}

// `there`: the address names it already.
export function preview(entry, there = false) {
  if (shown) return fill(entry);
  const node = h("dialog.preview", { "aria-label": t("preview.title") });
  const title = h("div.preview-title");
  const stage = h("div.stage");
  const tab = h("a.icon-button", { target: "_blank", rel: "noopener", "aria-label": t("preview.tab"), title: t("preview.tab") }, icon("tab"));
  node.append(
    h(
      "header",
      {},
      title,
      ...["edit", "share", "delete"].map((id) =>
        iconButton(command(id).icon, t(`command.${id}`), () => act(id), { "data-does": id }),
      ),
      tab,
      iconButton("download", t("command.download"), () => download([shown.entry])),
      iconButton("close", t("dialog.close"), () => node.close()),
    ),
    stage,
    iconButton("back", t("preview.previous"), () => step(-1), { "data-step": "previous" }),
    iconButton("forward", t("preview.next"), () => step(1), { "data-step": "next" }),
  );
  node.addEventListener("close", () => {
    shown.abort.abort();
    node.remove();
    shown = null;
    if (history.state?.preview) {
      leaving = true;
      history.back();
    } else if (readAddress().file !== null) {
      history.replaceState(null, "", addressOf(browser.id));
    }
  });
  node.addEventListener("click", (event) => {
    if (event.target === node || event.target === stage) node.close();
  });
  node.addEventListener("keydown", (event) => {
    const by = { ArrowLeft: -1, ArrowRight: 1, ArrowUp: -1, ArrowDown: 1 }[event.key];
    if (by && !event.target.closest(".scrolls, select, video, audio")) step(by);
    if (event.key !== " " || event.target.closest("button, select, input, video, audio")) return;
    event.preventDefault(); // or the same key would open it again
    node.close();
  });
  shown = { node, title, stage, tab, abort: new AbortController(), entry };
  fill(entry);
  document.body.append(node);
  node.showModal();
  node.focus();
  if (!leaving && !there) enter();
  return undefined;
}

// The way back leads out of the preview first. A step back takes a while: who opens the next preview meanwhile gets in
// once it is done.
let leaving = false;

function enter() {
  history.pushState({ preview: true }, "", addressOf(browser.id, shown.entry.id));
}

addEventListener("popstate", (event) => {
  if (leaving) {
    leaving = false;
    if (shown) enter();
  } else if (!event.state?.preview && readAddress().file === null) {
    shown?.node.close();
  }
});

// The next file of the list, or the next of a kind; the selection goes along. `play`: it begins by itself.
function step(by, { kind = null, play = false } = {}) {
  const { listing, selection } = browser;
  for (let i = selection.cursor + by; i >= 0 && i < listing.total; i += by) {
    const entry = listing.item(i);
    if (!entry) break;
    if (entry.isFolder || (kind !== null && entry.kind !== kind)) continue;
    return show(entry, i, play);
  }
  return undefined;
}

function show(entry, index, play = false) {
  browser.selection.pick(index);
  browser.view.reveal(index);
  fill(entry, play);
  if (!leaving) history.replaceState(history.state, "", addressOf(browser.id, entry.id));
}

// Behind the last picture the first one comes again.
async function nextPicture() {
  const { listing, selection } = browser;
  const { entry: from } = shown;
  const { cursor } = selection;
  for (let by = 1; by <= Math.min(listing.total, MOST_PASSED); ++by) {
    const i = (cursor + by) % listing.total;
    const entry = listing.item(i) ?? (await listing.at(i));
    if (shown?.entry !== from || listing !== browser.listing) return;
    if (entry && !entry.isFolder && canShowImage(entry.name)) return void show(entry, i);
  }
}

async function fill(entry, play = false) {
  shown.abort.abort();
  const abort = new AbortController();
  Object.assign(shown, { entry, abort });
  const about = [entry.size !== null && formatSize(entry.size), formatTime(entry.mtime), placeOf(entry)].filter(Boolean).join(" · ");
  shown.title.replaceChildren(
    icon(iconOf(entry), "file-icon"),
    h("div.grow", {}, h("b", {}, nameNode(entry.name)), h("span", {}, about)),
  );
  shown.tab.hidden = !IN_TAB.has(extensionOf(entry));
  shown.tab.href = urlOf("download", { path_raw: entry.id, inline: 1 });
  const held = shown.stage.contains(document.activeElement) ? document.activeElement.getAttribute("aria-label") : null;
  if (held !== null) shown.node.focus(); // keys are heard there
  shown.stage.replaceChildren(h("div.progress.unknown.slow", {}, h("i")));
  for (const button of shown.node.querySelectorAll("[data-does]"))
    button.hidden = browser.selection.single?.id !== entry.id || !command(button.dataset.does).when(context());
  const content = await contentOf(entry, abort.signal).catch((failure) => message(entry, describe(failure).title));
  if (abort.signal.aborted) return;
  shown.stage.replaceChildren(content);
  if (content.matches("img")) {
    fetchBeside();
    const { pictureTools } = await import("./view_picture.js");
    if (abort.signal.aborted) return;
    shown.stage.append(pictureTools(shown.stage, content, abort.signal, { step, next: nextPicture }));
    if (held !== null) shown.stage.querySelector(`[aria-label="${CSS.escape(held)}"]`)?.focus();
  } else if (canShowImage(entry.name)) {
    (await import("./slideshow.js")).arm(nextPicture, abort.signal);
  }
  if (play) content.play?.().catch(() => {}); // where the browser lets nothing begin by itself
  // Pictures and films lie on a dark ground, what is read on that of the page.
  shown.node.classList.toggle("paper", !content.matches("img, video"));
}

// "3 of 40": which row of the list it is.
function placeOf(entry) {
  const { listing, selection } = browser;
  if (listing?.item(selection.cursor)?.id !== entry.id || listing.total < 2) return "";
  return t("preview.place", { number: selection.cursor + 1, count: listing.total });
}

// The pictures before and behind this one, so that a step finds them there.
function fetchBeside() {
  const { listing, selection } = browser;
  for (const by of [1, -1]) {
    const entry = listing?.item(selection.cursor + by);
    if (!entry || !canShowImage(entry.name) || !(entry.size > 0 && entry.size <= LARGEST_AHEAD)) continue;
    h("img", { src: source(entry) });
  }
}

async function contentOf(entry, signal) {
  if (entry.size === 0) return message(entry, t("preview.empty"));
  if (canShowImage(entry.name) && entry.size <= LARGEST_IMAGE) return imageOf(entry, source(entry), "preview.broken");
  // What browsers do not show, and what is too large to be fetched for it.
  if ((entry.kind === "image" || entry.kind === "raw") && isDrawn(entry.name)) return imageOf(entry, smallPicture(entry, SMALLER), "preview.none");
  if (entry.kind === "audio" || entry.kind === "video") return mediaOf(entry, signal);
  if (entry.kind === "pdf") return pdfOf(entry, signal);
  if (isArchive(entry)) return (await import("./view_archive.js")).archiveNode(entry, signal);
  if (mayBeText(entry)) return textOf(entry, signal);
  return message(entry, t("preview.none"));
}

// What the list does with what is chosen there: the file on screen.
async function act(id) {
  if (id === "delete") shown.node.close();
  if (id !== "edit") return runCommand(id);
  const { entry } = shown;
  await (await import("./editor.js")).edit(entry);
  if (shown?.entry === entry) fill(browser.listing?.item(browser.listing.indexOf(entry.id)) ?? entry);
}

function source(entry) {
  return urlOf("download", { path_raw: entry.id });
}

function imageOf(entry, address, failure) {
  return new Promise((resolve) => {
    const image = h("img", { alt: plainName(entry.name), draggable: "false" });
    image.addEventListener("load", () => resolve(image));
    image.addEventListener("error", () => resolve(message(entry, t(failure))));
    image.src = address;
  });
}

function mediaOf(entry, signal) {
  return new Promise((resolve) => {
    const player = h(entry.kind, { controls: true, preload: "metadata" });
    player.addEventListener("loadedmetadata", async () => {
      resolve(player);
      const { addSubtitles, keepPlace } = await import("./view_media.js");
      if (signal.aborted) return;
      keepPlace(player, entry.id, signal);
      if (entry.kind === "video") addSubtitles(player, entry, signal).catch(() => {}); // the film goes without
      else player.addEventListener("ended", () => step(1, { kind: "audio", play: true }), { signal });
    });
    player.addEventListener("error", () => resolve(message(entry, t("preview.broken"))));
    signal.addEventListener("abort", () => player.pause());
    player.src = source(entry);
  });
}

async function textOf(entry, signal) {
  const { textNode } = await import("./view_text.js");
  return (await textNode(entry, signal)) ?? message(entry, t("preview.none"));
}

async function pdfOf(entry, signal) {
  const { pdfNode } = await import("./view_pdf.js");
  return pdfNode(entry, signal).catch((failure) => {
    if (failure instanceof ApiError) throw failure;
    return message(entry, t("preview.broken"));
  });
}

function message(entry, text) {
  return h(
    "div.no-preview",
    {},
    icon(iconOf(entry), "file-icon huge"),
    h("p", {}, text),
    h(
      "button.button.outlined",
      { type: "button", onclick: () => download([entry]) },
      icon("download"),
      t("command.download"),
    ),
  );
}
