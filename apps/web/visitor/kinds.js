// What a browser shows of a file by itself.

import { limits, lookAddress } from "./requests.js";
import { make } from "./parts.js";

const KINDS = {
  image: "jpg jpeg png gif bmp webp ico avif svg",
  audio: "mp3 flac wav ogg oga opus m4a aac",
  video: "mp4 webm m4v mov",
  text: "txt md log nfo readme srt csv tsv json xml yml yaml ini conf c h cpp hpp js mjs ts py rb go rs java sh css html sql",
};
const KIND_OF = new Map(Object.entries(KINDS).flatMap(([kind, list]) => list.split(" ").map((one) => [one, kind])));
// The whole file is fetched for a small picture: larger ones keep their icon.
const LARGEST_THUMBNAIL = 4 * 1024 * 1024;

export function kindOf({ isdir, name }) {
  return isdir ? "folder" : (KIND_OF.get(name.slice(name.lastIndexOf(".") + 1).toLowerCase()) ?? "other");
}

// The picture itself in place of `drawn`, once it is there.
export function thumbnail(item, drawn) {
  const size = item.additional?.size ?? 0;
  if (limits.left !== null || kindOf(item) !== "image" || size === 0 || size > LARGEST_THUMBNAIL) return drawn;
  const frame = make("span.thumbnail", {}, drawn);
  const image = make("img", { alt: "", loading: "lazy", decoding: "async" });
  image.addEventListener("load", () => drawn.remove());
  image.addEventListener("error", () => image.remove());
  image.src = lookAddress(item);
  frame.append(image);
  return frame;
}
