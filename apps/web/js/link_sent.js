// What visitors sent by a link: when, from where, under which name.

import { get } from "./api.js";
import { dialog, toastFailure } from "./dialogs.js";
import { h, icon, keepFocus, nameNode } from "./dom.js";
import { formatFullTime, formatSize } from "./format.js";
import "./later.js";
import { decode, idIn } from "./path.js";
import { t } from "./strings.js";

const PAGE = 200;

export async function showSent(link) {
  const ask = (offset) => get("link", { action: "received", id: link.id, offset, limit: PAGE }).then(({ items }) => items);
  let items;
  try {
    items = await ask(0);
  } catch (failure) {
    return toastFailure(failure);
  }
  let more = items.length === PAGE;
  return dialog({
    title: t("link.sent"),
    wide: true,
    className: "links",
    fill: () => {
      const list = h("ul.link-list");
      const paint = () =>
        keepFocus(list, () =>
          list.replaceChildren(
            ...items.map(rowOf),
            ...(items.length === 0 ? [h("li.none", {}, icon("upload"), h("span", {}, t("link.sent.none")))] : []),
            ...(more ? [h("li", {}, h("button.button.outlined", { type: "button", onclick: next }, t("link.sent.more")))] : []),
          ),
        );
      const next = async () => {
        try {
          const page = await ask(items.length);
          more = page.length === PAGE;
          items = items.concat(page);
          paint();
        } catch (failure) {
          toastFailure(failure);
        }
      };
      paint();
      return [list];
    },
  });
}

function rowOf(file) {
  const about = [formatSize(file.size), formatFullTime(file.time), file.address && t("link.sent.from", { address: file.address })];
  return h(
    "li",
    {},
    h("span.card-icon", {}, icon("upload")),
    h("div.grow", {}, h("b", {}, nameNode(decode(idIn(file, "name")))), h("span.soft", {}, about.filter(Boolean).join(" · "))),
  );
}
