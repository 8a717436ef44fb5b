// Why somebody may or may not use a path: the rule that decided, in words.

import { get } from "./api.js";
import { dialog } from "./dialogs.js";
import { h, icon, plainName } from "./dom.js";
import { describe } from "./errors.js";
import "./later.js";
import { decode } from "./path.js";
import { t } from "./strings.js";

const MASKS = ["no_listing", "no_modifying", "no_download"];
const BITS = ["read", "write", "enter", "append", "delete"];

export function whyNode(id) {
  const node = h("section.why", { "aria-busy": "true" }, h("h3", {}, t("why.title")), h("p.soft", {}, t("why.asking")));
  get("why", { path_raw: id })
    .then(
      (reason) => node.replaceChildren(h("h3", {}, t("why.title")), reasonNode(reason)),
      (failure) => {
        node.lastChild.textContent = describe(failure).title;
      },
    )
    .finally(() => node.removeAttribute("aria-busy"));
  return node;
}

function reasonNode(reason) {
  const line = (good, text) =>
    h("li", {}, icon(good ? "check" : "close", good ? "icon small yes" : "icon small no"), h("span", {}, text));
  const lines = [
    line(
      reason.rule === "home" || reason.privilege > 0,
      t(`why.rule.${reason.rule}`, { share: reason.share }),
    ),
  ];
  if (reason.rule !== "home")
    lines.push(line(reason.privilege > 0, t(`why.privilege.${Math.max(0, reason.privilege)}`)));
  for (const mask of reason.restrictions.filter((one) => MASKS.includes(one))) {
    lines.push(line(reason.administrator, t(reason.administrator ? "why.mask.lifted" : `why.mask.${mask}`)));
  }
  if (reason.read_only) lines.push(line(false, t("why.mounted_read_only")));
  if (reason.remote) lines.push(line(true, t("why.remote")));
  else if (!reason.exists) lines.push(line(false, t("why.missing")));
  else {
    const may = BITS.filter((bit) => reason.permissions.includes(bit)).map((bit) => t(`why.bit.${bit}`));
    lines.push(
      line(
        reason.permissions.includes("read"),
        may.length > 0 ? t("why.permissions", { may: may.join(", ") }) : t("why.permissions.none"),
      ),
    );
  }
  return h("ul", {}, lines);
}

export function showWhy(id) {
  dialog({
    title: t("why.ask"),
    className: "properties",
    fill: () => [h("p", {}, h("code", {}, plainName(decode(id)))), whyNode(id)],
  });
}
