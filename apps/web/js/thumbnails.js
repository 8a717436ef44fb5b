// Small pictures of image files, in place of their icon once they are there.

import { urlOf } from "./api.js";
import { h } from "./dom.js";
import { canShowImage } from "./icons.js";

// The whole file is fetched: larger ones keep their icon.
const LARGEST = 4 * 1024 * 1024;

export function thumbnailOf(entry, drawn) {
  if (entry.isFolder || !entry.size || entry.size > LARGEST || !canShowImage(entry.name)) return drawn;
  const frame = h("span.thumbnail", {}, drawn);
  const image = h("img", { alt: "", loading: "lazy", decoding: "async", draggable: "false" });
  image.addEventListener("load", () => {
    frame.classList.add("loaded");
    drawn.remove();
  });
  image.addEventListener("error", () => image.remove());
  image.src = urlOf("download", { path_raw: entry.id });
  frame.append(image);
  return frame;
}
