// What is known of an entry, in a dialog: its facts, what it holds, and why somebody may use it.

import { mayModify } from "./access.js";
import { shareEntry } from "./browser.js";
import { dialog, loaded, toastFailure } from "./dialogs.js";
import { h, icon, nameNode, plainName } from "./dom.js";
import { isInBin, isOffline, isReadOnlyShare, typeOf } from "./entries.js";
import { formatFullTime, formatMode, formatSize } from "./format.js";
import { iconOf } from "./icons.js";
import "./later.js";
import { copyPath, showSpaceOf } from "./operations.js";
import { decode, parentOf } from "./path.js";
import { sizesNode } from "./sizes.js";
import { entryAt } from "./sources.js";
import { t } from "./strings.js";
import { whyNode } from "./why.js";

// What a folder holds, counted while its properties are shown.
function contentNode({ id }) {
  const more = h("button.button.outlined", { type: "button", onclick: () => showSpaceOf(id) }, icon("space"), t("command.space"));
  return sizesNode([{ id }], { without: 1, more: [h("p.size-actions", {}, more)] });
}

async function openVersions(entry) {
  const module = await loaded(import("./versions.js"));
  const share = shareEntry(entry.id);
  await module?.showVersions(entry, share !== undefined && !isReadOnlyShare(share) && mayModify(entry.id));
}

// Of an entry, or of the folder with an id.
export async function showProperties(what) {
  let entry = what;
  try {
    if (typeof what === "string") entry = parentOf(what) === "/" ? shareEntry(what) : await entryAt(what);
  } catch (failure) {
    return toastFailure(failure, what);
  }
  if (!entry) return undefined;
  const line = (key, value) => value && [h("dt", {}, t(`properties.${key}`)), h("dd", {}, value)];
  return dialog({
    title: t("command.properties"),
    className: "properties",
    fill: () => [
      h(
        "div.hero",
        {},
        icon(iconOf(entry), "file-icon"),
        h(
          "div.grow",
          {},
          h("b", {}, nameNode(entry.name)),
          h("span.soft", {}, typeOf(entry)),
        ),
      ),
      h(
        "dl",
        {},
        line("path", h("code", {}, plainName(decode(entry.id)))),
        line("size", entry.size !== null && `${formatSize(entry.size)} (${t("size.bytes", { count: entry.size })})`),
        line("modified", formatFullTime(entry.mtime)),
        line("created", formatFullTime(entry.time?.crtime)),
        line("owner", entry.owner && `${entry.owner} · ${entry.group}`),
        line("mode", entry.perm?.posix !== undefined && h("code", {}, `${formatMode(entry.perm.posix)}`)),
        line(
          "volume",
          entry.volume &&
            t("volume.free", { free: formatSize(entry.volume.freespace), total: formatSize(entry.volume.totalspace) }),
        ),
      ),
      entry.isFolder && !isOffline(entry) ? contentNode(entry) : "",
      whyNode(entry.id),
      h(
        "footer",
        {},
        !isOffline(entry) &&
          !isInBin(entry.id) &&
          h("button.button.outlined", { type: "button", onclick: () => openVersions(entry) }, icon("restore"), t("command.versions")),
        h(
          "button.button.outlined",
          { type: "button", onclick: () => copyPath(entry.id) },
          icon("copy"),
          t("command.copyPath"),
        ),
      ),
    ],
  });
}
