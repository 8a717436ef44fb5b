// What an archive holds, folder by folder, and what is taken out of it.

import { get } from "./api.js";
import { browser, shareEntry } from "./browser.js";
import { mayWriteIn } from "./access.js";
import { askText, loaded } from "./dialogs.js";
import { h, icon, loadStyle, nameNode, plainName, set } from "./dom.js";
import { submit } from "./download.js";
import { isInBin, isReadOnlyShare } from "./entries.js";
import { describe } from "./errors.js";
import { formatSize, formatTime } from "./format.js";
import { kindOfName } from "./icons.js";
import "./later.js";
import { decode, encodeName } from "./path.js";
import { language, t } from "./strings.js";
import { startTask } from "./tasks.js";

const PAGE = 500;

// The node of an archive. Throws what is wrong with it.
export async function archiveNode(entry, signal) {
  loadStyle("archive");
  const view = new ArchiveView(entry, signal);
  await view.open([]);
  return view.node;
}

class ArchiveView {
  constructor(entry, signal) {
    Object.assign(this, { entry, signal, inside: [], items: [], index: undefined, chosen: new Set(), last: -1 });
    this.crumbs = h("ol");
    this.notes = h("ul.archive-notes");
    this.all = h("input", { type: "checkbox", "aria-label": t("archive.all"), onchange: () => this.chooseAll(this.all.checked) });
    this.body = h("tbody", {});
    this.more = h("button.button", { type: "button", onclick: () => this.fetchMore() }, t("archive.more"));
    this.status = h("span.soft.grow", { role: "status" });
    const button = (kind, label, run) => h(`button.button${kind}`, { type: "button", onclick: run }, t(label));
    const here = shareEntry(entry.id);
    this.here = [button(".outlined", "archive.here", () => this.extract(entry.parent, false)), button(".outlined", "archive.own", () => this.extract(entry.parent, true))];
    for (const one of this.here) one.hidden = !here || isReadOnlyShare(here) || isInBin(entry.id) || (entry.parent === browser.id && !mayWriteIn(entry.parent));
    this.node = h(
      "section.archive.scrolls",
      { "aria-label": entry.name },
      h("nav.archive-path", { "aria-label": t("archive.path") }, this.crumbs),
      this.notes,
      h(
        "div.archive-list",
        {},
        h(
          "table",
          { onkeydown: (event) => this.key(event) },
          h(
            "thead",
            {},
            h("tr", {}, h("th", { scope: "col" }, this.all), ...["name", "size", "mtime"].map((one) => h("th", { scope: "col", class: one === "name" ? undefined : `archive-${one}` }, t(`column.${one}`)))),
          ),
          this.body,
        ),
        this.more,
      ),
      h("div.archive-tools", {}, this.status, ...this.here, button(".primary", "command.extract", () => this.extractTo())),
    );
  }

  // `from`: what gets the focus once it is there, a name of the folder.
  async open(inside, from = null) {
    const held = this.node.contains(document.activeElement);
    const reply = await this.ask(inside, 0);
    if (this.signal.aborted) return;
    Object.assign(this, { inside, items: [], total: reply.total, last: -1 });
    this.chosen.clear();
    this.body.replaceChildren();
    this.drawPath();
    this.drawNotes(reply);
    this.add(reply);
    const names = [...this.body.querySelectorAll(".archive-name")];
    if (held) (names.find((node) => node.dataset.name === from) ?? names[0] ?? this.crumbs.querySelector("button"))?.focus();
  }

  async ask(inside, offset) {
    const asked = { action: "archive", path_raw: this.entry.id, inside_raw: inside.join("/"), index: this.index, natural: language, offset, limit: PAGE };
    const reply = await get("list", asked, this.signal);
    this.index = reply.index;
    return reply;
  }

  // A look that fails says so, and what is there stays.
  async go(inside, from) {
    await this.open(inside, from).catch((failure) => {
      if (!this.signal.aborted) this.notes.replaceChildren(note("warning", describe(failure).title));
    });
  }

  async fetchMore() {
    const { inside } = this;
    const reply = await this.ask(inside, this.items.length).catch(() => null);
    if (reply && inside === this.inside) this.add(reply);
  }

  add({ items }) {
    const first = this.items.length;
    this.items.push(...items.map((item) => ({ ...item, encoded: item.name_raw ?? encodeName(item.name) })));
    this.body.append(...this.items.slice(first).map((item, i) => this.row(item, first + i)));
    if (this.items.length === 0) this.body.append(h("tr", {}, h("td.soft", { colspan: 4 }, t("archive.empty"))));
    this.more.hidden = this.items.length >= this.total;
    this.say();
  }

  row(item, number) {
    const kind = item.isdir ? "folder" : kindOfName(item.name);
    const name = h(
      "button.archive-name",
      { type: "button", "data-name": item.encoded, onclick: () => this.enter(item) },
      icon(`kind-${kind}`, "file-icon"),
      nameNode(item.name),
      item.encrypted && h("span.archive-lock", { title: t("archive.locked") }, icon("lock", "icon small"), h("span.visually-hidden", {}, t("archive.locked"))),
      item.link && h("span.soft", {}, t("archive.link")),
    );
    const box = h("input", { type: "checkbox", "aria-label": plainName(item.name), onclick: (event) => this.choose(number, event.target.checked, event.shiftKey) });
    return h(
      "tr",
      {},
      h("td", {}, box),
      h("td.archive-cell", {}, name),
      h("td.archive-size", {}, item.size === undefined ? "" : formatSize(item.size)),
      h("td.archive-mtime", {}, item.mtime ? formatTime(item.mtime) : ""),
    );
  }

  enter(item) {
    if (item.isdir) return this.go([...this.inside, item.encoded]);
    return item.link ? undefined : this.fetch(item);
  }

  async fetch(item) {
    let password;
    if (item.encrypted) {
      password = await askText({
        title: t("extract.password.title", { name: this.entry.name }),
        label: t("extract.password"),
        type: "password",
        action: t("command.download"),
        check: (text) => (text === "" ? t("extract.password.empty") : ""),
        submit: (text) => text,
      });
      if (password === null) return;
    }
    submit({ path_raw: this.entry.id, inside_raw: [...this.inside, item.encoded].join("/"), ...(password && { password }) }, this.entry.id);
  }

  choose(number, chosen, asRange) {
    const [from, to] = asRange && this.last >= 0 ? [Math.min(this.last, number), Math.max(this.last, number)] : [number, number];
    this.last = number;
    const boxes = this.boxes();
    for (let i = from; i <= to; ++i) {
      boxes[i].checked = chosen;
      if (chosen) this.chosen.add(this.items[i].encoded);
      else this.chosen.delete(this.items[i].encoded);
    }
    this.say();
  }

  chooseAll(chosen) {
    for (const box of this.boxes()) box.checked = chosen;
    this.chosen = new Set(chosen ? this.items.map(({ encoded }) => encoded) : []);
    this.say();
  }

  boxes() {
    return [...this.body.querySelectorAll("input")];
  }

  say() {
    const count = this.chosen.size;
    this.all.checked = count > 0 && count === this.items.length;
    this.all.indeterminate = count > 0 && count < this.items.length;
    this.status.textContent = count > 0 ? t("archive.chosen", { count }) : t("status.items", { count: this.total });
  }

  key(event) {
    const names = [...this.body.querySelectorAll(".archive-name")];
    const at = names.indexOf(event.target.closest("tr")?.querySelector(".archive-name"));
    const move = (to) => names[Math.max(0, Math.min(names.length - 1, to))]?.focus();
    const run = {
      ArrowDown: () => move(at + 1),
      ArrowUp: () => move(at - 1),
      Home: () => move(0),
      End: () => move(names.length - 1),
      ArrowRight: () => at >= 0 && this.items[at].isdir && this.enter(this.items[at]),
      ArrowLeft: () => this.up(),
      Backspace: () => this.up(),
      " ": () => event.target.matches(".archive-name") && this.choose(at, !this.boxes()[at].checked, event.shiftKey),
      a: () => this.chooseAll(true),
    }[event.key];
    const plain = !event.altKey && (event.key === "a") === (event.ctrlKey || event.metaKey);
    if (!run || !plain || (event.key === " " && event.target.matches("input"))) return;
    event.preventDefault();
    event.stopPropagation();
    run();
  }

  up() {
    if (this.inside.length > 0) this.go(this.inside.slice(0, -1), this.inside.at(-1));
  }

  drawPath() {
    const crumb = (label, depth) => {
      const button = h("button.crumb", { type: "button", onclick: () => this.go(this.inside.slice(0, depth), this.inside[depth]) }, label);
      if (depth === this.inside.length) set(button, { "aria-current": "page" });
      return h("li", {}, button);
    };
    this.crumbs.replaceChildren(crumb(plainName(this.entry.name), 0), ...this.inside.map((one, i) => crumb(plainName(decode(one)), i + 1)));
  }

  drawNotes({ cut, encrypted, refused }) {
    const notes = [
      cut && note("warning", t(`archive.cut.${cut}`)),
      refused > 0 && note("warning", t("archive.refused", { count: refused })),
      encrypted && note("lock", t(/\.zip$/i.test(this.entry.name) ? "archive.encrypted" : "archive.encrypted.unknown")),
    ];
    this.notes.replaceChildren(...notes.filter(Boolean));
  }

  async extractTo() {
    const picker = await loaded(import("./picker.js"));
    const target = await picker?.pickFolder({ title: t("extract.title"), action: t("extract.action"), start: this.entry.parent });
    if (target) await this.extract(target, false);
  }

  // What is chosen, or all of the folder.
  async extract(target, own) {
    const params = {
      target_raw: target,
      conflict: "keep_both",
      own_folder: own ? "true" : undefined,
      inside_raw: this.inside.length > 0 ? this.inside.join("/") : undefined,
      members_raw: this.chosen.size > 0 ? [...this.chosen].join("\n") : undefined,
    };
    const begun = await startTask("extract", [this.entry], { params, affected: [target], target });
    if (begun) this.node.closest("dialog")?.close(); // how it goes on shows in the list
  }
}

function note(iconName, text) {
  return h("li", {}, icon(iconName, "icon small"), h("span", {}, text));
}
