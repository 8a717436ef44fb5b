// Choosing a folder.

import { get } from "./api.js";
import { browser } from "./browser.js";
import { dialog } from "./dialogs.js";
import { h, icon, iconButton, nameNode } from "./dom.js";
import { describe } from "./errors.js";
import { isReadOnlyShare } from "./entries.js";
import { folderKindOf } from "./icons.js";
import { makeFolder } from "./operations.js";
import { idIn, parentOf, shareOf } from "./path.js";
import { labelOf } from "./pathbar.js";
import { t } from "./strings.js";

// The id of the folder, or null.
export function pickFolder({ title, action, start }) {
  let here = start;
  return dialog({
    title,
    className: "picker",
    fill: (close) => {
      const list = h("ul.picker-list", { role: "listbox", tabindex: 0, "aria-label": title });
      const place = h("b.grow");
      const up = iconButton("up", t("command.up"), () => enter(parentOf(here)));
      const make = iconButton("new-folder", t("command.newFolder"), async () => {
        const made = await makeFolder(here);
        if (made) enter(made);
      });
      const button = h("button.button.primary", { type: "button", onclick: () => close(here) }, action);

      async function enter(id) {
        here = id;
        place.replaceChildren(nameNode(labelOf(id)));
        up.disabled = id === "/";
        const share = browser.shares.find((one) => one.id === shareOf(id));
        const usable = id !== "/" && share !== undefined && !isReadOnlyShare(share);
        button.disabled = make.disabled = !usable;
        try {
          const folders = await foldersOf(id);
          if (here !== id) return;
          list.replaceChildren(
            ...folders.map(({ id: child, kind }) =>
              h(
                "li",
                {},
                h(
                  "button.picker-item",
                  { type: "button", onclick: () => enter(child) },
                  icon(`kind-${kind}`, "file-icon"),
                  nameNode(labelOf(child)),
                  h("span.grow"),
                  icon("chevron-right", "icon small"),
                ),
              ),
            ),
          );
          if (folders.length === 0) list.replaceChildren(h("li.soft", {}, t("picker.empty")));
        } catch (failure) {
          if (here === id) list.replaceChildren(h("li.soft", {}, describe(failure).title));
        }
      }
      enter(start);
      return [
        h("div.picker-place", {}, up, place, make),
        list,
        h("footer", {}, h("button.button", { type: "button", onclick: () => close(null) }, t("dialog.cancel")), button),
      ];
    },
  });
}

async function foldersOf(id) {
  if (id === "/") return browser.shares;
  const { items } = await get("operation", { action: "subfolders", path_raw: id });
  return items
    .map((folder) => ({ id: idIn(folder), kind: folderKindOf(idIn(folder), folder.mount_type ?? "") }))
    .filter(({ kind }) => kind !== "recycle");
}
