// Which picture an entry has: names of symbols in icons.svg.

import { splitExtension } from "./path.js";

// Which kind of file has which extensions; each of these has an icon in images/files_ext, too.
export const KINDS = {
  image: "jpg jpeg png gif bmp webp heic heif tif tiff svg ico avif psd ai eps",
  raw: "raw cr2 cr3 nef arw dng orf rw2 raf",
  video: "mp4 mkv avi mov wmv webm m4v mpg mpeg flv 3gp vob",
  audio: "mp3 flac wav ogg oga opus m4a aac wma aiff alac mid",
  pdf: "pdf",
  document: "doc docx odt rtf pages tex epub",
  sheet: "xls xlsx ods csv numbers tsv",
  slides: "ppt pptx odp key",
  text: "txt md log nfo readme srt",
  code: "c h cpp hpp cc js mjs ts tsx jsx py rb go rs java kt sh bash pl php html htm css json xml yml yaml toml ini conf sql",
  archive: "zip tar gz tgz bz2 xz zst 7z rar lz4 cab deb rpm",
  disc: "iso img bin dmg vmdk vdi qcow2",
  program: "exe msi apk app appimage bat com jar",
  font: "ttf otf woff woff2",
};

const BY_EXTENSION = new Map(
  Object.entries(KINDS).flatMap(([kind, list]) => list.split(" ").map((ext) => [ext, kind])),
);
const PREVIEW_IMAGES = new Set(["jpg", "jpeg", "png", "gif", "bmp", "webp", "ico", "avif", "svg"]);

// Icons of what has no extension.
export const PICTURES = {
  "misc.png": "misc",
  "folder.png": "folder",
  "isomountpoint.png": "folder-iso",
  "remotemountpoint.png": "folder-remote",
  "recycle_bin.png": "recycle",
};

// `icon`: the one that the server chose.
export function kindOf(item, id, mount) {
  if (mount === "remotefail") return "folder-offline";
  const picture = Object.hasOwn(PICTURES, item.icon ?? "") ? PICTURES[item.icon] : undefined;
  if (!item.isdir) return picture ?? BY_EXTENSION.get(item.icon?.replace(/\.png$/, "")) ?? "misc";
  return picture !== undefined && picture !== "folder" ? picture : folderKindOf(id, mount);
}

// The kind of a file of which only the name is known.
export function kindOfName(name) {
  return BY_EXTENSION.get(splitExtension(name)[1].slice(1).toLowerCase().replace(/^tar\./, "")) ?? "misc";
}

// The kind of a folder of which only the place is known.
export function folderKindOf(id, mount) {
  if (mount === "remotefail") return "folder-offline";
  if (mount === "remote") return "folder-remote";
  if (mount === "iso") return "folder-iso";
  const parts = id.split("/");
  if (parts.length === 2) return parts[1] === "home" ? "home" : "share";
  return parts.length === 3 && parts[2] === "%23recycle" ? "recycle" : "folder";
}

export function iconOf(entry) {
  return `kind-${entry.kind}`;
}

export function canShowImage(name) {
  return PREVIEW_IMAGES.has(splitExtension(name)[1].slice(1).toLowerCase());
}
