// The first thing one sees: the shares.

import { browser } from "./browser.js";
import { h, icon, iconButton, nameNode, plainName } from "./dom.js";
import { isOffline, isReadOnlyShare } from "./entries.js";
import { formatSize } from "./format.js";
import { folderKindOf, iconOf } from "./icons.js";
import { showSpaceOf } from "./operations.js";
import { decode, parentOf } from "./path.js";
import { labelOf } from "./pathbar.js";
import { dropFavourite, favourites, recentPlaces } from "./places.js";
import { t } from "./strings.js";

export function homeNode() {
  return h(
    "section.home",
    { tabindex: -1, "aria-label": t("place.shares") },
    h("h1", {}, browser.user ? t("home.hello", { user: browser.user }) : t("place.shares")),
    h(
      "ul.cards",
      {},
      browser.shares.map((share) => h("li", {}, cardOf(share))),
    ),
    h("p.lead.nothing", { role: "status", hidden: true }, t("home.none")),
    placesNode("home.favourites", favourites(), true),
    placesNode("home.recent", recentPlaces(), false),
  );
}

// Leaves those whose name holds the text.
export function filterHome(node, text) {
  const wanted = text.toLowerCase();
  for (const line of node.querySelectorAll("li"))
    line.hidden = !line.querySelector("b").textContent.toLowerCase().includes(wanted);
  node.querySelector(".nothing").hidden = node.querySelector("li:not([hidden])") !== null;
}

function placesNode(title, ids, removable) {
  if (ids.length === 0) return null;
  const list = h("ul.places", {});
  const section = h("section", { "aria-label": t(title) }, h("h2", {}, t(title)), list);
  for (const id of ids) {
    const link = h(
      "a.place-link",
      { href: `#${id}`, title: plainName(decode(id)) },
      icon(`kind-${folderKindOf(id)}`, "file-icon"),
      h("b", {}, nameNode(labelOf(id))),
      h("span.about", {}, parentOf(id) === "/" ? "" : plainName(decode(parentOf(id)))),
    );
    const remove = () => {
      dropFavourite(id);
      const next = line.nextElementSibling ?? line.previousElementSibling;
      line.remove();
      if (next) next.querySelector("button").focus();
      else section.remove();
    };
    const line = h("li", {}, link, removable && iconButton("close", t("home.drop", { name: plainName(labelOf(id)) }), remove));
    list.append(line);
  }
  return section;
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
  const { freespace, totalspace } = share.volume ?? {};
  return [
    h("span.tag", {}, isReadOnlyShare(share) && icon("read-only"), right),
    totalspace > 0 && h("span.tag", {}, t("home.free", { free: formatSize(freespace) })),
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
    share && !isOffline(share) ? iconButton("space", t("space.of", { name: labelOf(share.id) }), () => showSpaceOf(share.id)) : "",
  );
}
