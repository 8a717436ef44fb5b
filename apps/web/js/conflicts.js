// Names that are taken where something is about to go: found beforehand, asked about once.

import { MISSING, post } from "./api.js";
import { dialog } from "./dialogs.js";
import { h, nameNode } from "./dom.js";
import { formatSize, formatTime } from "./format.js";
import { decode, encodeName, inForms } from "./path.js";
import { labelOf } from "./pathbar.js";
import { t } from "./strings.js";

// Which of the names (encoded) the folder has already: name -> {isFolder, size, mtime}.
export async function takenNames(folder, names) {
  const taken = new Map();
  for (const lines of inForms(names)) {
    const asked = { action: "present", path_raw: folder, names_raw: lines.join("\n") };
    const { items } = await post("operation", asked).catch((failure) => {
      if (failure.code === MISSING) return { items: [] }; // is yet to be made
      throw failure;
    });
    for (const { name, name_raw, isdir, size, mtime } of items)
      taken.set(name_raw ?? encodeName(name), { isFolder: isdir, size, mtime });
  }
  return taken;
}

// Pairs of what comes and what is there, of which one is a folder and the other is not: nothing can replace those.
export function cannotReplace({ comes, there }) {
  return comes.isFolder !== there.isFolder;
}

// Asks about one pair of {name, comes, there}, or about many at once. {answer: "skip", "overwrite" or "both", all}; null
// when it shall not go on. `more`: there are others to decide about.
export function askConflict({ folder, pairs, more = false }) {
  const [first] = pairs;
  const stuck = pairs.filter(cannotReplace).length;
  const kind = pairs.length > 1 ? "many" : stuck > 0 ? "clash" : first.comes.isFolder ? "folder" : "file";
  const texts = [t(`conflict.text.${kind}`, { folder: labelOf(folder), count: pairs.length })];
  if (kind === "many" && stuck > 0) texts.push(t("conflict.stuck", { count: stuck }));
  return dialog({
    title: t(`conflict.title.${kind}`, { count: pairs.length }),
    fill: (close) => {
      const all = h("input", { type: "checkbox", checked: more });
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
          kind === "file" && comparison(first),
          more && h("label.check-line", {}, all, t("conflict.all")),
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

function comparison({ comes, there }) {
  const line = (key, { size, mtime }) => [
    h("dt", {}, t(key)),
    h("dd", {}, [size !== null && formatSize(size), formatTime(mtime)].filter(Boolean).join(" · ")),
  ];
  if (comes.size === undefined || comes.size === null) return null; // chosen by name alone
  return h("dl.compared", {}, line("conflict.there", there), line("conflict.comes", comes));
}
