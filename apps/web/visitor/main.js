// The view of a public link: the password, where one is, and what is shown behind it.

import { Folder, placeAddress } from "./folder.js";
import { aboutText, drawing, make, nameNode, picture, texts } from "./parts.js";
import { closePreview, openPreview } from "./preview.js";
import { fileAddress, limits, logIn, pathField, state } from "./requests.js";
import { SendView } from "./send.js";

let view = null;
let folder = null; // what is shown, a Folder
let sending = null; // a SendView, where the link receives
let asked = 0; // places asked for; the last one is shown

function show(...children) {
  if (sending && !children.includes(sending.node)) {
    sending.end();
    sending = null;
  }
  view.replaceChildren(...children);
}

// How many downloads are left, where that is limited.
function leftLine() {
  return limits.left === null ? null : make("p.soft.left", { id: "left", role: "status" });
}

function notice(text, hint = "") {
  closePreview();
  folder = null;
  show(make("div.notice", { role: "alert" }, make("h1", {}, text), make("p", {}, hint)));
}

function noticeOf(status) {
  if (status === 403) notice(texts.blocked);
  else if (status === 401) askPassword(); // the log-in has ended
  else if (status === 404) notice(texts.gone, texts.goneHint);
  else notice(texts.failed);
}

function askPassword() {
  closePreview();
  folder = null;
  const input = make("input", { type: "password", id: "password", autocomplete: "current-password", required: "" });
  const button = make("button", { type: "submit" }, texts.open);
  const wrong = make("p.wrong", { role: "alert" });
  const submit = async (event) => {
    event.preventDefault();
    button.disabled = true;
    const { status } = await logIn(input.value, (seconds) => {
      wrong.textContent = texts.wait.replace("{seconds}", seconds);
    });
    if (status === 200) return open();
    button.disabled = false;
    wrong.textContent = status === 403 ? texts.wrong : status === 404 ? texts.gone : texts.failed;
    return input.select();
  };
  const form = make("form", { submit }, make("label", { for: "password" }, texts.password), input, button, wrong);
  show(make("div.door", {}, make("h1", {}, texts.title), form));
  input.focus();
}

// The place below the shared folder stands behind "#", so that the browser's own way back works.
function placeOf(hash) {
  try {
    const place = JSON.parse(decodeURIComponent(hash.slice(1)) || "{}");
    return typeof place === "object" && place !== null ? place : {};
  } catch {
    return {};
  }
}

function above({ path, path_raw: raw }) {
  const cut = (text) => (text ?? "").slice(0, Math.max(0, (text ?? "").lastIndexOf("/")));
  return raw === undefined ? { path: cut(path) } : { path_raw: cut(raw) };
}

const sameText = (one, other) => JSON.stringify(pathField(one)) === JSON.stringify(pathField(other));

async function open() {
  const mine = ++asked;
  const place = placeOf(location.hash);
  const path = place.look ? above(place) : place;
  if (!folder || !sameText(folder.path, path)) {
    closePreview();
    const now = await state();
    if (mine !== asked) return undefined;
    if (now.status !== 200) return noticeOf(now.status);
    if (!now.json.data.logged_in) return askPassword();
    if (now.json.data.receives) return showReceiving(now.json.data.receives);
    const wanted = new Folder(path, noticeOf);
    if (!(await wanted.load()) || mine !== asked) return undefined;
    folder = wanted;
    if (folder.place.file) showFile(folder.items[0] ?? { name: folder.place.name });
    else showFolder();
  }
  const item = place.look && folder.items.find((one) => sameText(one, place));
  return item ? look(item) : closePreview();
}

function showReceiving(receives) {
  sending ??= new SendView(receives, noticeOf);
  show(sending.node);
  document.title = receives.name;
}

function look(item) {
  openPreview(item, {
    onStep: (by) => {
      const next = folder.beside(item, by);
      if (!next) return;
      history.replaceState(history.state, "", placeAddress(next, { look: 1 }));
      look(next);
    },
    onClose: () => {
      if (history.state?.inside) history.back();
      else location.hash = placeAddress(folder.path);
    },
  });
}

function showFile(item) {
  const get = make("a.button", { href: fileAddress({}), download: "" }, texts.download);
  const see = make("button.outlined", { type: "button", click: () => openPreview(item, { onStep() {}, onClose: closePreview }) }, texts.preview);
  const choice = make("div.choice", {}, limits.left === null ? see : null, get);
  show(make("div.single", {}, picture(item.icon ?? "misc.png"), make("h1", {}, nameNode(item)), make("p.soft", {}, aboutText(item)), choice, leftLine()));
  paintLeft();
}

// The folders on the way to this one, from the shared one.
function crumbs({ path = "", path_raw: raw }) {
  const names = path.split("/").filter((name) => name !== "");
  const bytes = raw?.split("/").filter((name) => name !== "");
  const links = [make("a", { href: "#" }, texts.top)];
  names.slice(0, -1).forEach((name, at) => {
    const way = (parts) => `/${parts.slice(0, at + 1).join("/")}`;
    links.push(make("a", { href: placeAddress(bytes ? { path_raw: way(bytes) } : { path: way(names) }) }, make("bdi", {}, name)));
  });
  return make("nav.way", { "aria-label": texts.way }, ...links);
}

function showFolder() {
  const { place, total } = folder;
  const get = total > 0 && make("a.button", { href: fileAddress(place), download: "" }, drawing("download"), texts.downloadAll);
  const head = make("header", {}, make("h1", {}, nameNode(place)), ...(get ? [get] : []));
  const way = place.path ? [crumbs(place)] : [];
  const left = leftLine();
  show(...way, head, ...(left ? [left] : []), total > 0 ? folder.node : make("p.empty", {}, texts.empty));
  paintLeft();
  document.title = place.name;
}

// A link for so many downloads: when they are over, the page says so instead of a download that fails.
async function guard(event) {
  const get = event.target.closest?.("a[download]");
  if (!get || limits.left === null) return;
  event.preventDefault();
  const { status } = await state();
  if (status !== 200) return noticeOf(status);
  if (limits.left === 0) return notice(texts.usedUp, texts.usedUpHint);
  location.assign(get.href);
  limits.left -= 1;
  paintLeft();
  return undefined;
}

function paintLeft() {
  const line = document.getElementById("left");
  if (line) line.textContent = texts.left[limits.left === 1 ? 0 : 1].replace("{count}", limits.left.toLocaleString());
}

export function start() {
  view = make("main");
  const mark = make("img", { src: new URL("../favicon.svg", import.meta.url), alt: "", width: "26", height: "26" });
  document.body.append(make("div.brand", { role: "banner" }, mark, "Orvel"), view);
  addEventListener("hashchange", open);
  document.addEventListener("click", guard, true);
  open();
}
