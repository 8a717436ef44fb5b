// An entry of a listing as the page uses it: flat, with its id.

import { encodeName, idIn, parentOf, splitExtension } from "./path.js";
import { kindOf } from "./icons.js";
import { t } from "./strings.js";

export function entryOf(item) {
  const more = item.additional ?? {};
  const id = idIn(item);
  return {
    id,
    name: item.name,
    encodedName: item.name_raw ?? encodeName(item.name),
    parent: parentOf(id),
    isFolder: item.isdir,
    gone: item.gone === true, // since it was listed
    kind: kindOf(item, id, more.mount_point_type ?? ""),
    size: item.isdir ? null : (more.size ?? null),
    mtime: more.time?.mtime ?? 0,
    time: more.time,
    owner: more.owner?.user || (more.owner ? String(more.owner.uid) : ""),
    group: more.owner?.group || (more.owner ? String(more.owner.gid) : ""),
    mount: more.mount_point_type ?? "",
    perm: more.perm,
    right: more.perm?.share_right,
    volume: more.volume_status,
    deleted: item.deleted && { ...item.deleted, from: idIn(item.deleted, "from") },
    synced: more.sync_share ?? false,
  };
}

// What somebody without the right to read an entry sees is its name alone.
export function isLocked(entry) {
  return entry.perm?.acl !== undefined && !entry.perm.acl.read && entry.right === undefined;
}

export function isOffline(entry) {
  return entry.mount === "remotefail";
}

export function isReadOnlyShare(entry) {
  return entry.right === 1 || entry.volume?.readonly === true;
}

export function extensionOf(entry) {
  return entry.isFolder ? "" : splitExtension(entry.name)[1].slice(1).toUpperCase();
}

const TEXT_KINDS = new Set(["text", "code", "misc", "sheet"]);

// What is worth reading as a text, as far as the name says.
export function mayBeText(entry) {
  return !entry.isFolder && TEXT_KINDS.has(entry.kind);
}

const ARCHIVE = /\.(zip|7z|rar|iso|tar|tar\.(gz|bz2|xz|zst|lz|lz4|lzma|z)|tgz|tbz2?|txz|tzst)$/i;

// What the server can look into, as far as the name says.
export function isArchive(entry) {
  return !entry.isFolder && ARCHIVE.test(entry.name);
}

// The recycle bin of a share has a name that says so.
export function shownName(entry) {
  return entry.kind === "recycle" ? t("place.recycle") : entry.name;
}

// The recycle bin itself, or below it.
export function isInBin(id) {
  return id.split("/")[2] === "%23recycle";
}

export function isRecycleBin(id) {
  return isInBin(id) && id.split("/").length === 3;
}

export function typeOf(entry) {
  if (entry.isFolder) return t("type.folder");
  const extension = extensionOf(entry);
  return extension ? t(`kind.${entry.kind}`, { extension }) : t("type.file");
}
