// What a file or folder was like before: its versions by date, what an earlier folder held, and bringing them back.

import { get, urlOf } from "./api.js";
import { confirm, dialog } from "./dialogs.js";
import { h, icon, iconButton, loadStyle, nameNode } from "./dom.js";
import { entryOf } from "./entries.js";
import { describe } from "./errors.js";
import { formatFullTime, formatSize } from "./format.js";
import { canShowImage, iconOf } from "./icons.js";
import "./later.js";
import { isWithin, nameOf, parentOf } from "./path.js";
import { t } from "./strings.js";
import { startTask } from "./tasks.js";
import { textNode } from "./view_text.js";

const PAGE = 200;
const EDGE = 1024;

await loadStyle("versions");

const snapshotOf = (version) => version.snapshot_raw ?? encodeURIComponent(version.snapshot);
const dateOf = (version) => (version.time === undefined ? version.snapshot : formatFullTime(version.time));

// `mayChange`: whether the share lets the user put something there.
export function showVersions(entry, mayChange) {
  const end = new AbortController();
  return dialog({
    title: t("versions.title", { name: nameOf(entry.id) }),
    className: "versions",
    wide: true,
    fill: (close) => [new Versions(entry, mayChange, end.signal, close).node],
  }).finally(() => end.abort());
}

class Versions {
  constructor(entry, mayChange, signal, close) {
    Object.assign(this, { entry, mayChange, signal, close, turn: 0 });
    this.node = h("div.versions-body", {});
    this.list();
  }

  // Shows what `make(turn)` gives, once it is there and nothing else was asked for since.
  async show(make, focus) {
    const turn = ++this.turn;
    const isShown = () => turn === this.turn && !this.signal.aborted;
    this.node.setAttribute("aria-busy", "true");
    let nodes;
    try {
      nodes = await make();
    } catch (failure) {
      const { title, hint } = describe(failure);
      nodes = [this.wayBack(), h("div.versions-failure", { role: "alert" }, icon("warning"), h("b", {}, title), h("span.soft", {}, hint))];
    }
    if (!isShown()) return;
    this.node.removeAttribute("aria-busy");
    this.node.replaceChildren(...nodes.filter(Boolean));
    this.node.scrollTop = 0;
    this.node.querySelector(focus)?.focus();
  }

  // The versions of what was asked about.
  list(before = null) {
    this.back = null;
    return this.show(async () => {
      const found = await get("list", { action: "versions", path_raw: this.entry.id }, this.signal);
      return [this.presentNode(found.present), ...this.rowsOf(found)];
    }, before === null ? ".versions-list button" : `[data-snapshot="${CSS.escape(before)}"] button`);
  }

  presentNode({ exists, size, mtime }) {
    if (!exists) return h("p.versions-now", {}, t("versions.gone"));
    return h("p.versions-now", {}, h("b", {}, t("versions.now")), h("span", {}, formatFullTime(mtime)), size !== undefined && h("span", {}, formatSize(size)));
  }

  rowsOf({ items, present, snapshots, cut, closed }) {
    if (items.length === 0) {
      const text = closed ? "versions.closed" : snapshots === 0 ? "versions.no_snapshots" : "versions.none";
      return [h("p.versions-empty", {}, t(text, { count: snapshots }))];
    }
    const rows = items.map((version) => this.row(version, present));
    return [h("ul.versions-list", { "aria-label": t("command.versions") }, rows), cut && h("p.soft", {}, t("versions.cut", { count: snapshots }))];
  }

  row(version, present) {
    const date = dateOf(version);
    const notes = [
      version.current && t("versions.current"),
      version.same > 1 && t("versions.same", { count: version.same, date: formatFullTime(version.oldest) }),
      version.dated === "none" && t("versions.undated"),
      version.isdir ? "" : t("versions.changed", { date: formatFullTime(version.mtime) }),
    ];
    const look = () => (version.isdir ? this.browse(version, this.entry.id) : this.look(version, this.entry, () => this.list(snapshotOf(version))));
    return h(
      "li",
      { "data-snapshot": snapshotOf(version) },
      h("div.grow", {}, h("b", {}, date), h("span.soft", {}, notes.filter(Boolean).join(" · "))),
      h("span.versions-size", {}, version.isdir ? "" : formatSize(version.size), h("span.soft", {}, version.isdir ? "" : differenceOf(version, present))),
      this.actions(version, { ...this.entry, isFolder: version.isdir }, { label: date, look, isSame: version.current }),
    );
  }

  // What can be done with a version of `entry`.
  actions(version, entry, { label, look, isSame = false }) {
    const button = (name, key, run) => iconButton(name, `${t(key)}: ${label}`, run, { title: t(key) });
    return h(
      "div.versions-actions",
      {},
      entry.isFolder ? button("folder-open", "versions.open", look) : button("eye", "versions.look", look),
      !entry.isFolder && button("download", "command.download", () => this.download(version, entry)),
      this.mayChange && parentOf(entry.id) !== "/" && button("copy", "versions.beside", () => this.restore(version, entry, { beside: "true" })),
      this.mayChange && parentOf(entry.id) !== "/" && !isSame && button("restore", "versions.over", () => this.replace(version, entry)),
    );
  }

  download(version, entry) {
    const link = h("a", { href: urlOf("download", this.params(version, entry)), download: "" });
    link.click();
  }

  params(version, entry) {
    return { path_raw: entry.id, snapshot_raw: snapshotOf(version) };
  }

  async replace(version, entry) {
    const sure = await confirm({
      title: t("versions.over.title", { name: nameOf(entry.id) }),
      text: t(entry.isFolder ? "versions.over.folder" : "versions.over.file", { date: dateOf(version) }),
      action: t("versions.over"),
    });
    if (sure) await this.restore(version, entry, { conflict: "overwrite" });
  }

  async restore(version, entry, how) {
    const params = { snapshot_raw: snapshotOf(version), ...how };
    const folder = parentOf(entry.id);
    if (await startTask("recover", [{ id: entry.id }], { params, affected: [folder], target: folder })) this.close(true);
  }

  // What shows the date, says that nothing can be changed, and leads back.
  banner(version, id = "") {
    const at = id && isWithin(id, this.entry.id) && id !== this.entry.id ? id : "";
    return h(
      "div.versions-banner",
      { role: "note" },
      this.wayBack(),
      h("div.grow", {}, h("b", {}, t("versions.as_of", { date: dateOf(version) })), h("span.soft", {}, at ? `${nameOf(at)} · ${t("versions.read_only")}` : t("versions.read_only"))),
    );
  }

  wayBack() {
    return h("button.button.outlined", { type: "button", onclick: () => (this.back ?? (() => this.list()))() }, icon("back"), t("versions.back"));
  }

  // A folder as it was.
  browse(version, id) {
    const isTop = id === this.entry.id;
    const back = isTop ? () => this.list(snapshotOf(version)) : () => this.browse(version, parentOf(id));
    return this.show(async () => {
      const list = h("ul.versions-list", { "aria-label": nameOf(id) });
      const more = h("button.button.outlined", { type: "button", hidden: true, onclick: () => fetchMore() }, t("versions.more"));
      const fetchMore = async () => {
        more.disabled = true;
        const offset = list.children.length;
        const page = await get("list", { action: "folder", ...this.params(version, { id }), offset, limit: PAGE, additional: "size,time,type" }, this.signal);
        list.append(...page.items.map((item) => this.itemRow(version, id, entryOf(item))));
        more.hidden = list.children.length >= page.total || page.items.length === 0;
        more.disabled = false;
        return page.total;
      };
      this.back = back;
      const total = await fetchMore();
      more.onclick = () => fetchMore().catch((failure) => list.append(h("li", { role: "alert" }, describe(failure).title)));
      return [this.banner(version, id), total === 0 ? h("p.versions-empty", {}, t("versions.empty_folder")) : list, more];
    }, ".versions-banner button");
  }

  itemRow(version, folder, entry) {
    const look = () => (entry.isFolder ? this.browse(version, entry.id) : this.look(version, entry, () => this.browse(version, folder)));
    return h(
      "li",
      {},
      icon(iconOf(entry), "file-icon"),
      h("div.grow", {}, h("button.link", { type: "button", onclick: look }, nameNode(entry.name)), h("span.soft", {}, formatFullTime(entry.mtime))),
      h("span.versions-size", {}, entry.isFolder ? "" : formatSize(entry.size)),
      this.actions(version, entry, { label: entry.name, look }),
    );
  }

  // One file as it was: a picture, a text, or the way to download it.
  look(version, entry, back) {
    return this.show(async () => {
      this.back = back;
      const source = this.params(version, entry);
      return [this.banner(version), h("div.versions-look", {}, await this.contentNode(entry, source, version))];
    }, ".versions-banner button");
  }

  async contentNode(entry, source, version) {
    const image = await pictureNode([urlOf("thumbnail", { ...source, size: EDGE }), ...(canShowImage(nameOf(entry.id)) ? [urlOf("download", source)] : [])], nameOf(entry.id));
    if (image) return image;
    const size = version.isdir ? entry.size : (version.size ?? entry.size);
    const text = await textNode({ id: entry.id, name: nameOf(entry.id), size, source }, this.signal);
    if (text) return text;
    return h("p.versions-empty", {}, t("versions.no_look"), h("button.button.outlined", { type: "button", onclick: () => this.download(version, entry) }, icon("download"), t("command.download")));
  }
}

// "300 kB less than now"
function differenceOf({ size }, present) {
  if (!present.exists || present.size === undefined) return "";
  if (size === present.size) return t("versions.size.same");
  return t(size < present.size ? "versions.size.less" : "versions.size.more", { size: formatSize(Math.abs(size - present.size)) });
}

// The first of the addresses at which there is a picture; null when there is none.
async function pictureNode(sources, alt) {
  for (const src of sources) {
    const image = h("img", { alt, src });
    const shown = await image.decode().then(
      () => true,
      () => false,
    );
    if (shown) return image;
  }
  return null;
}
