// Small pictures of image files, in place of their icon once they are there.

import { urlOf } from "./api.js";
import { h } from "./dom.js";
import { canShowImage, KINDS } from "./icons.js";
import { splitExtension } from "./path.js";

// What the appliance draws small.
const DRAWN = new Set(`jpg jpeg png webp gif tif tiff heic heif avif pdf ${KINDS.raw} ${KINDS.video}`.split(" "));
const EDGE = 256;
// Of all else that a browser shows the whole file is fetched: larger ones keep their icon.
const LARGEST = 4 * 1024 * 1024;

export function isDrawn(name) {
  return DRAWN.has(splitExtension(name)[1].slice(1).toLowerCase());
}

// The version makes another address of a file that has changed: what the browser keeps is not shown for it.
export function smallPicture(entry, size) {
  return urlOf("thumbnail", { path_raw: entry.id, size, version: `${entry.size}-${entry.mtime}` });
}

function sourcesOf(entry) {
  const sources = [];
  if (isDrawn(entry.name)) sources.push(smallPicture(entry, window.devicePixelRatio > 1 ? 2 * EDGE : EDGE));
  if (canShowImage(entry.name) && entry.size <= LARGEST) sources.push(urlOf("download", { path_raw: entry.id }));
  return sources;
}

export function thumbnailOf(entry, drawn) {
  const sources = entry.isFolder || !entry.size ? [] : sourcesOf(entry);
  if (sources.length === 0) return drawn;
  const frame = h("span.thumbnail", {}, drawn);
  const image = h("img", { alt: "", loading: "lazy", decoding: "async", draggable: "false" });
  image.addEventListener("load", () => {
    frame.classList.add("loaded");
    drawn.remove();
  });
  image.addEventListener("error", () => {
    if (sources.length === 0) image.remove();
    else image.src = sources.shift();
  });
  image.src = sources.shift();
  frame.append(image);
  return frame;
}

const LARGEST_HERE = 32 * 1024 * 1024;

// Of a file that is yet to be sent.
export function thumbnailOfFile(file, drawn) {
  if (!canShowImage(file.name) || file.size > LARGEST_HERE) return drawn;
  const frame = h("span.thumbnail", {}, drawn);
  createImageBitmap(file, { resizeHeight: EDGE, resizeQuality: "medium" }).then(
    (bitmap) => {
      const { width, height } = bitmap;
      const canvas = h("canvas", { width, height, role: "presentation" });
      canvas.getContext("bitmaprenderer").transferFromImageBitmap(bitmap);
      frame.replaceChildren(canvas);
    },
    () => {}, // it keeps its icon
  );
  return frame;
}
