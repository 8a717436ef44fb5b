// Names that are taken where something is about to go: found beforehand, asked about once.

import { MISSING, post } from "./api.js";
import { dialog } from "./dialogs.js";
import { h, icon, nameNode } from "./dom.js";
import { formatSize, formatTime } from "./format.js";
import { kindOfName } from "./icons.js";
import { childOf, decode, encodeName, inForms, lastOf } from "./path.js";
import { labelOf } from "./pathbar.js";
import { t } from "./strings.js";
import { thumbnailOf, thumbnailOfFile } from "./thumbnails.js";

// Which of the names (encoded) the folder has already: name -> {isFolder, size, mtime}.
export function takenNames(folder, names) {
  return taken(folder, inForms(names).map((lines) => ({ names_raw: lines.join("\n") })));
}

// The same for the names of what is chosen.
export function takenOf(folder, choice) {
  if (choice.rows) return taken(folder, [choice.portions()[0].params]);
  return takenNames(folder, choice.entries.map(({ id }) => lastOf(id)));
}

async function taken(folder, questions) {
  const found = new Map();
  for (const question of questions) {
    const asked = { action: "present", path_raw: folder, ...question };
    const { items } = await post("operation", asked).catch((failure) => {
      if (failure.code === MISSING && !failure.data?.listing) return { items: [] }; // is yet to be made
      throw failure;
    });
    for (const { name, name_raw, isdir, size, mtime } of items)
      found.set(name_raw ?? encodeName(name), { isFolder: isdir, size, mtime });
  }
  return found;
}

// Pairs of what comes and what is there, of which one is a folder and the other is not: nothing can replace those.
export function cannotReplace({ comes, there }) {
  return comes.isFolder !== there.isFolder;
}

// Asks about one pair of {name, comes, there}, or about many at once. {answer: "skip", "overwrite" or "both", all}; null
// when it shall not go on. `more`: there may be others to decide about, `known` of which are certain.
export function askConflict({ folder, pairs, more = false, known = 0 }) {
  const [first] = pairs;
  const stuck = pairs.filter(cannotReplace).length;
  const kind = pairs.length > 1 ? "many" : stuck > 0 ? "clash" : first.comes.isFolder ? "folder" : "file";
  const texts = [t(`conflict.text.${kind}`, { folder: labelOf(folder), count: pairs.length })];
  if (kind === "many" && stuck > 0) texts.push(t("conflict.stuck", { count: stuck }));
  return dialog({
    title: t(`conflict.title.${kind}`, { count: pairs.length }),
    fill: (close) => {
      const all = h("input", { type: "checkbox" });
      const button = (style, value, key) =>
        h(
          `button.button${style}`,
          { type: "button", onclick: () => close({ answer: value, all: more && all.checked }) },
          t(key),
        );
      const merges = kind === "folder";
      return [
        h(
          "div.body",
          {},
          pairs.length === 1 && h("p", {}, h("b", {}, nameNode(decode(first.name)))),
          texts.map((text) => h("p.soft", {}, text)),
          kind === "file" && comparison(first, folder),
          more && h("label.check-line", {}, all, known > 0 ? t("conflict.all.known", { count: known }) : t("conflict.all")),
        ),
        h(
          "footer",
          {},
          button("", "skip", "conflict.skip"),
          stuck < pairs.length && button(".outlined", "overwrite", merges ? "conflict.merge" : "conflict.overwrite"),
          button(".primary", "both", "conflict.both"),
        ),
      ];
    },
  });
}

// Both files side by side: picture, size, time.
function comparison({ name, comes, there }, folder) {
  if (comes.size === undefined || comes.size === null) return null; // chosen by name alone
  const shown = decode(name);
  const drawn = () => icon(`kind-${kindOfName(shown)}`, "file-icon large");
  const file = (key, { size, mtime }, picture, newer) =>
    h(
      "figure",
      {},
      h("span.tile-picture", {}, picture),
      h("figcaption", {}, h("b", {}, t(key)), size !== null && h("span", {}, formatSize(size)), h("span", {}, formatTime(mtime)), newer && h("span.newer", {}, t("conflict.newer"))),
    );
  const thumbnail = ({ id, size, mtime }) => thumbnailOf({ id, name: shown, size, mtime, isFolder: false }, drawn());
  const here = thumbnail({ ...there, id: childOf(folder, name) });
  const coming = comes.file ? thumbnailOfFile(comes.file, drawn()) : thumbnail(comes);
  return h(
    "div.compared",
    {},
    file("conflict.there", there, here, there.mtime > comes.mtime),
    file("conflict.comes", comes, coming, comes.mtime > there.mtime),
  );
}
