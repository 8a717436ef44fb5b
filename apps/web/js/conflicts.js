// Names that are taken where something is about to go: found beforehand, asked about once.

import { MISSING, post } from "./api.js";
import { dialog } from "./dialogs.js";
import { h, nameNode } from "./dom.js";
import { decode, encodeName, patternOf } from "./path.js";
import { labelOf } from "./pathbar.js";
import { t } from "./strings.js";

const NAMES_PER_QUESTION = 100;

// Which of the names (encoded) the folder has already.
export async function takenNames(folder, names) {
  const taken = new Set();
  for (let i = 0; i < names.length; i += NAMES_PER_QUESTION) {
    const pattern = names
      .slice(i, i + NAMES_PER_QUESTION)
      .map(patternOf)
      .join(",");
    const reply = await post("list", { action: "folder", path_raw: folder, pattern }).catch((failure) => {
      if (failure.code === MISSING) return { items: [] }; // is yet to be made
      throw failure;
    });
    for (const item of reply.items) taken.add(item.name_raw ?? encodeName(item.name));
  }
  return new Set(names.filter((name) => taken.has(name)));
}

// {answer: "skip", "overwrite" or "both", all}; null when it shall not go on. `more`: there are others to decide about.
export function askConflict({ name, folder, more, count = 1 }) {
  return dialog({
    title: count > 1 ? t("conflict.title.many", { count }) : t("conflict.title"),
    fill: (close) => {
      const all = h("input", { type: "checkbox", checked: more });
      const answer = (value) => () => close({ answer: value, all: more && all.checked });
      return [
        h(
          "div.body",
          {},
          count > 1 ? null : h("p", {}, h("b", {}, nameNode(decode(name)))),
          h("p.soft", {}, t(count > 1 ? "conflict.text.many" : "conflict.text", { folder: labelOf(folder) })),
          more && h("label.check-line", {}, all, t("conflict.all")),
        ),
        h(
          "footer",
          {},
          h("button.button", { type: "button", onclick: answer("skip") }, t("conflict.skip")),
          h("button.button.outlined", { type: "button", onclick: answer("overwrite") }, t("conflict.overwrite")),
          h("button.button.primary", { type: "button", onclick: answer("both") }, t("conflict.both")),
        ),
      ];
    },
  });
}
