// Small pictures of image files, in place of their icon once they are there. Of a photo the one that the camera put into
// its head is enough; else the whole file is fetched, unless it is large.

import { urlOf } from "./api.js";
import { h } from "./dom.js";
import { embeddedPicture } from "./exif.js";
import { canShowImage } from "./icons.js";

const LARGEST = 4 * 1024 * 1024;
const LARGEST_HERE = 32 * 1024 * 1024;
const HEAD = 128 * 1024;
const AT_ONCE = 4;
const SIDE = 224; // pixels: twice what is shown
const MOST_KEPT = 300;
const JPEG = /\.jpe?g$/i;

const kept = new Map(); // what was looked at lately: id and time -> canvas
const waiting = [];
let running = 0;

export function thumbnailOf(entry, drawn) {
  if (entry.isFolder || !entry.size || !canShowImage(entry.name)) return drawn;
  const headed = JPEG.test(entry.name) && entry.size > HEAD;
  if (!headed && entry.size > LARGEST) return drawn;
  const frame = h("span.thumbnail", {}, drawn);
  if (headed) fromHead(entry, frame, drawn);
  else whole(entry, frame, drawn);
  return frame;
}

function show(frame, drawn, picture) {
  frame.append(picture);
  frame.classList.add("loaded");
  drawn.remove();
}

function whole(entry, frame, drawn) {
  const image = h("img", { alt: "", loading: "lazy", decoding: "async", draggable: "false" });
  image.addEventListener("load", () => show(frame, drawn, image));
  image.addEventListener("error", () => image.remove());
  image.src = urlOf("download", { path_raw: entry.id });
  frame.append(image);
}

function fromHead(entry, frame, drawn) {
  const key = `${entry.id} ${entry.mtime}`;
  const known = kept.get(key);
  if (known) return show(frame, drawn, copyOf(known));
  waiting.unshift({ entry, frame, drawn, key }); // what came into sight last is what is looked at
  return next();
}

function next() {
  while (running < AT_ONCE && waiting.length > 0) {
    const job = waiting.shift();
    ++running;
    load(job).finally(() => {
      --running;
      next();
    });
  }
}

async function load({ entry, frame, drawn, key }) {
  await new Promise(requestAnimationFrame);
  if (!frame.isConnected) return; // scrolled by
  const canvas = await head(entry).catch(() => null);
  if (!canvas) {
    if (entry.size <= LARGEST) whole(entry, frame, drawn);
    return;
  }
  kept.set(key, canvas);
  if (kept.size > MOST_KEPT) kept.delete(kept.keys().next().value);
  show(frame, drawn, copyOf(canvas));
}

async function head(entry) {
  const response = await fetch(urlOf("download", { path_raw: entry.id }), { headers: { Range: `bytes=0-${HEAD - 1}` } });
  if (response.status !== 206) return response.body?.cancel().then(() => null);
  const found = embeddedPicture(new Uint8Array(await response.arrayBuffer()));
  if (!found) return null;
  const bitmap = await createImageBitmap(new Blob([found.jpeg], { type: "image/jpeg" }));
  return upright(bitmap, found);
}

// Turned as the camera was held, without the bars that fill a small picture up to its own shape.
function upright(bitmap, { orientation, width, height }) {
  const ratio = width > 0 && height > 0 ? width / height : bitmap.width / bitmap.height;
  const across = Math.min(bitmap.width, bitmap.height * ratio);
  const down = across / ratio;
  const turned = orientation >= 5;
  const canvas = h("canvas", { width: turned ? down : across, height: turned ? across : down, role: "presentation" });
  const pen = canvas.getContext("2d");
  pen.translate(canvas.width / 2, canvas.height / 2);
  if (turned) pen.rotate(Math.PI / 2);
  if ([3, 4, 7, 8].includes(orientation)) pen.rotate(Math.PI);
  if ([2, 4, 5, 7].includes(orientation)) pen.scale(turned ? 1 : -1, turned ? -1 : 1);
  pen.drawImage(bitmap, (bitmap.width - across) / 2, (bitmap.height - down) / 2, across, down, -across / 2, -down / 2, across, down);
  return canvas;
}

function copyOf(canvas) {
  const copy = h("canvas", { width: canvas.width, height: canvas.height, role: "presentation" });
  copy.getContext("2d").drawImage(canvas, 0, 0);
  return copy;
}

// Of a file that is yet to be sent.
export function thumbnailOfFile(file, drawn) {
  const frame = h("span.thumbnail", {}, drawn);
  if (!canShowImage(file.name) || file.size > LARGEST_HERE) return drawn;
  createImageBitmap(file, { resizeHeight: SIDE, resizeQuality: "medium" }).then(
    (bitmap) => show(frame, drawn, upright(bitmap, { orientation: 1 })),
    () => {}, // it keeps its icon
  );
  return frame;
}
