// Choosing a folder.

import { get } from "./api.js";
import { browser } from "./browser.js";
import { dialog } from "./dialogs.js";
import { h, icon, iconButton, nameNode, set } from "./dom.js";
import { describe } from "./errors.js";
import { isReadOnlyShare } from "./entries.js";
import { folderKindOf } from "./icons.js";
import "./later.js";
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
      const list = h("ul.picker-list", { role: "listbox", tabindex: 0, "aria-label": title, autofocus: true });
      const place = h("b.grow");
      const up = iconButton("up", t("command.up"), () => enter(parentOf(here)));
      const make = iconButton("new-folder", t("command.newFolder"), async () => {
        const made = await makeFolder(here);
        if (made) enter(made);
      });
      const button = h("button.button.primary", { type: "button", onclick: () => close(here) }, action);

      async function enter(id) {
        const from = here;
        here = id;
        place.replaceChildren(nameNode(labelOf(id)));
        up.disabled = id === "/";
        const share = browser.shares.find((one) => one.id === shareOf(id));
        const usable = id !== "/" && share !== undefined && !isReadOnlyShare(share);
        button.disabled = make.disabled = !usable;
        try {
          const folders = await foldersOf(id);
          if (here !== id) return;
          list.replaceChildren(...folders.map(({ id: child, kind }, i) => option(child, kind, i)));
          if (folders.length === 0) list.replaceChildren(note(t("picker.empty")));
          activate(list.querySelector(`[data-id="${CSS.escape(from)}"]`) ?? list.querySelector(".picker-item"));
        } catch (failure) {
          if (here === id) list.replaceChildren(note(describe(failure).title));
        }
      }

      // The list keeps the focus; its arrows move among the folders.
      function activate(node) {
        list.querySelector(".active")?.classList.remove("active");
        list.querySelector("[aria-selected=true]")?.setAttribute("aria-selected", "false");
        set(list, { "aria-activedescendant": node?.id });
        node?.classList.add("active");
        node?.setAttribute("aria-selected", "true");
        node?.scrollIntoView({ block: "nearest" });
      }

      list.addEventListener("click", (event) => {
        const node = event.target.closest(".picker-item");
        if (node) enter(node.dataset.id);
      });
      list.addEventListener("keydown", (event) => {
        const nodes = [...list.querySelectorAll(".picker-item")];
        const active = list.querySelector(".active");
        const at = nodes.indexOf(active);
        const open = () => active && enter(active.dataset.id);
        const back = () => here !== "/" && enter(parentOf(here));
        const run = {
          ArrowDown: () => activate(nodes[Math.min(at + 1, nodes.length - 1)]),
          ArrowUp: () => activate(nodes[Math.max(at - 1, 0)]),
          Home: () => activate(nodes[0]),
          End: () => activate(nodes.at(-1)),
          Enter: open,
          ArrowRight: open,
          ArrowLeft: back,
          Backspace: back,
        }[event.key];
        if (!run) return;
        event.preventDefault();
        run();
      });
      enter(start);
      return [
        h("div.picker-place", {}, up, place, make),
        list,
        h("footer", {}, h("button.button", { type: "button", onclick: () => close(null) }, t("dialog.cancel")), button),
      ];
    },
  });
}

function option(id, kind, i) {
  return h(
    "li.picker-item",
    { id: `picker-${i}`, role: "option", "aria-selected": "false", "data-id": id },
    icon(`kind-${kind}`, "file-icon"),
    nameNode(labelOf(id)),
    h("span.grow"),
    icon("chevron-right", "icon small"),
  );
}

function note(text) {
  return h("li.soft", { role: "option", "aria-disabled": "true" }, text);
}

async function foldersOf(id) {
  if (id === "/") return browser.shares;
  const { items } = await get("operation", { action: "subfolders", path_raw: id });
  return items
    .map((folder) => ({ id: idIn(folder), kind: folderKindOf(idIn(folder), folder.mount_type ?? "") }))
    .filter(({ kind }) => kind !== "recycle");
}
