// The first thing one sees: the shares.

import { browser } from "./browser.js";
import { h, icon, nameNode } from "./dom.js";
import { isOffline, isReadOnlyShare } from "./entries.js";
import { formatSize } from "./format.js";
import { iconOf } from "./icons.js";
import { labelOf } from "./pathbar.js";
import { t } from "./strings.js";

export function homeNode() {
  return h(
    "section.home",
    { tabindex: -1, "aria-label": t("place.shares") },
    h("h1", {}, browser.user ? t("home.hello", { user: browser.user }) : t("place.shares")),
    h("p.lead", {}, t("home.lead", { count: browser.shares.length })),
    h(
      "ul.cards",
      {},
      browser.shares.map((share) => h("li", {}, cardOf(share))),
    ),
  );
}

function cardOf(share) {
  return h(
    "a.card",
    { href: `#${share.id}`, "data-id": share.id },
    icon(iconOf(share), "file-icon"),
    h("b", {}, nameNode(labelOf(share.id))),
    h("span.about", {}, aboutOf(share)),
  );
}

function aboutOf(share) {
  if (isOffline(share)) return h("span.tag.warn", {}, icon("offline"), t("mark.offline"));
  const right = share.id === "/home" ? t("share.mine") : isReadOnlyShare(share) ? t("share.read") : t("share.write");
  return [
    h("span.tag", {}, isReadOnlyShare(share) && icon("read-only"), right),
    share.synced && h("span.tag", { title: t("mark.synced") }, icon("sync"), t("mark.synced.short")),
  ];
}

// The room left where the folder on screen lies.
export function paintVolume(node, share) {
  const { volume } = share ?? browser.shares.find((one) => one.volume) ?? {};
  node.hidden = !volume || !volume.totalspace;
  if (node.hidden) return;
  const used = volume.totalspace - volume.freespace;
  const bar = h("div.progress", { role: "presentation" }, h("i"));
  bar.firstChild.style.width = `${Math.min(100, (100 * used) / volume.totalspace)}%`;
  node.replaceChildren(
    bar,
    h("span", {}, t("volume.free", { free: formatSize(volume.freespace), total: formatSize(volume.totalspace) })),
  );
}
