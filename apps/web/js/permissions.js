// Permissions of one item or many: what they are, who may what and why, and changing them.

import { post } from "./api.js";
import { browser } from "./browser.js";
import { confirm, dialog, toastFailure } from "./dialogs.js";
import { h, icon, iconButton, nameNode } from "./dom.js";
import { sentenceOf } from "./errors.js";
import { iconOf } from "./icons.js";
import "./later.js";
import { nameOf } from "./path.js";
import { t } from "./strings.js";
import { startTask } from "./tasks.js";

const READ = 4;
const WRITE = 2;
const RUN = 1;
const BITS = [READ, WRITE, RUN];
const WORDS = { [READ]: "read", [WRITE]: "write", [RUN]: "enter" };
const CLASSES = { user: "u", group: "g", other: "o" };
const LOSS = 2201;

// `mayChange`: whether the share lets the user.
export async function showPermissions(choice, mayChange) {
  const [{ params }] = choice.portions();
  let now;
  try {
    now = await post("operation", { action: "permissions", ...params });
  } catch (failure) {
    return toastFailure(failure, choice.single?.id ?? choice.folders[0]);
  }
  const change = await dialog({
    title: t("command.permissions"),
    className: "properties permissions",
    fill: (close) => new Form(choice, now, mayChange && now.owned > 0, close).nodes(),
  });
  return change && apply(choice, change);
}

async function apply(choice, change, confirmed = false) {
  const params = confirmed ? { ...change, confirm: "true" } : change;
  return startTask("permit", choice, {
    params,
    affected: [browser.id],
    refused: async (failure) => {
      if (failure.code !== LOSS || !(await accepts(failure.data.warnings))) return failure.code === LOSS;
      await apply(choice, change, true);
      return true;
    },
  });
}

// Whether the user goes on although he gives something up.
function accepts(warnings) {
  return confirm({
    title: t("permissions.loss.title"),
    text: warnings.map((word) => t(`permissions.loss.${word}`)).join(" "),
    action: t("permissions.loss.go"),
    kind: "danger",
  });
}

// The entries of one list as rows of boxes. An entry that is not the same everywhere is left alone until it is touched.
class Table {
  // `list`: as the program has it; `open`: whether it can be changed; `labels(entry)` names one.
  constructor(list, { caption, open, labels, many, hasFolders, onchange }) {
    Object.assign(this, { caption, open, labels, many, hasFolders, onchange });
    this.rows = list.filter(({ kind }) => kind !== "mask").map((entry) => ({ entry, touched: 0 }));
    this.removed = [];
    this.body = h("tbody");
    this.node = h(
      "table.rights",
      {},
      h("caption.visually-hidden", {}, caption),
      h(
        "thead",
        {},
        h(
          "tr",
          {},
          h("td"),
          BITS.map((bit) => h("th", { scope: "col" }, t(`permissions.${WORDS[bit]}`))),
          h("td"),
        ),
      ),
      this.body,
    );
    this.paint();
  }

  paint() {
    this.body.replaceChildren(...this.rows.map((row) => this.line(row)));
  }

  line(row) {
    const { entry } = row;
    const label = this.labels(entry);
    const boxes = BITS.map((bit) => {
      const box = h("input", { type: "checkbox", "aria-label": `${label}: ${t(`permissions.${WORDS[bit]}`)}` });
      box.checked = (entry.all & bit) !== 0;
      box.indeterminate = (entry.all & bit) !== (entry.any & bit);
      box.disabled = !this.open;
      box.addEventListener("change", () => this.touch(row, bit, box.checked));
      return h("td", {}, box);
    });
    const some = this.many > 0 && entry.id !== undefined && entry.items < this.many && h("span.soft", {}, t("permissions.some", { count: entry.items }));
    const gone = () => {
      this.rows = this.rows.filter((one) => one !== row);
      if (!row.added) this.removed.push(entry);
      this.paint();
      this.onchange();
    };
    return h(
      "tr",
      {},
      h("th", { scope: "row" }, label, some),
      boxes,
      h("td", {}, this.open && entry.id !== undefined && iconButton("close", t("permissions.remove", { who: label }), gone)),
    );
  }

  touch(row, bit, on) {
    const { entry } = row;
    row.touched |= bit;
    // An entry of a name is set as a whole, so what differs of it is decided, too, and shows.
    if (entry.id !== undefined || this.whole) row.touched |= entry.all ^ entry.any;
    if (entry.id !== undefined || this.whole) entry.any = entry.all;
    entry.all = on ? entry.all | bit : entry.all & ~bit;
    entry.any = on ? entry.any | bit : entry.any & ~bit;
    const at = this.rows.indexOf(row);
    const place = BITS.indexOf(bit);
    this.paint();
    this.body.rows[at].querySelectorAll("input")[place].focus();
    this.onchange();
  }

  add(kind, name) {
    const known = this.rows.find(({ entry }) => entry.kind === kind && entry.name === name && entry.id !== undefined);
    const rights = READ | (this.hasFolders ? RUN : 0);
    if (!known) this.rows.push({ entry: { kind, id: null, name, all: rights, any: rights, items: this.many }, touched: 7, added: true });
    this.paint();
    this.onchange();
  }

  // Of folders, and of files that can be run already, unless it is one file that is meant.
  get run() {
    return this.hasFolders || this.many > 1 ? "X" : "x";
  }

  rightsOf({ all }) {
    return (all & READ ? "r" : "") + (all & WRITE ? "w" : "") + (all & RUN ? this.run : "");
  }

  // "u+r,g-w" of what was touched of owner, group and others.
  mode() {
    const letters = { [READ]: "r", [WRITE]: "w", [RUN]: this.run };
    const clauses = this.rows
      .filter(({ entry }) => entry.id === undefined)
      .flatMap(({ entry, touched }) =>
        BITS.filter((bit) => touched & bit).map(
          (bit) => CLASSES[entry.kind] + (entry.all & bit ? `+${letters[bit]}` : `-${letters[bit].toLowerCase()}`),
        ),
      );
    return clauses.join(",") || undefined;
  }

  // Lines of what is set and what goes; owner, group and others among them where `base` says so.
  lines(base = false) {
    const nameOfEntry = ({ id, name }) => name || (id === null ? "" : `#${id}`);
    const set = this.rows
      .filter(({ entry, touched }) => touched && (base || entry.id !== undefined))
      .map(({ entry }) => `${entry.kind}:${entry.id === undefined ? "" : nameOfEntry(entry)}:${this.rightsOf(entry)}`);
    const again = new Set(set.map((line) => line.slice(0, line.lastIndexOf(":"))));
    const gone = this.removed.map((entry) => `${entry.kind}:${nameOfEntry(entry)}`).filter((line) => !again.has(line));
    return [...gone, ...set].join("\n") || undefined;
  }
}

class Form {
  constructor(choice, now, open, close) {
    Object.assign(this, { choice, now, open, close });
    this.single = choice.single;
    const many = now.items;
    const hasFolders = now.folders > 0;
    const onchange = () => this.changed();
    const labels = (entry) => this.labelOf(entry);
    this.access = new Table(now.entries, { caption: t("permissions.access"), open, labels, many, hasFolders, onchange });
    this.defaults = new Table(now.defaults, {
      caption: t("permissions.defaults"),
      open,
      labels,
      many: now.default_folders,
      hasFolders: true,
      onchange,
    });
    this.defaults.whole = true;
  }

  labelOf({ kind, id, name }) {
    const { owner, group } = this.now;
    const who = (one) => one.name || `#${one.id}`;
    if (id !== undefined) return t(`permissions.entry.${kind}`, { name: name || `#${id}` });
    if (kind === "user") return owner ? t("permissions.owner.is", { name: who(owner) }) : t("permissions.owner.mixed");
    if (kind === "group") return group ? t("permissions.group.is", { name: who(group) }) : t("permissions.group.mixed");
    return t("permissions.others");
  }

  nodes() {
    const { now, choice, single, open } = this;
    this.complaint = h("p.complaint", { role: "alert" });
    this.button = h("button.button.primary", { type: "submit", disabled: true }, t("permissions.apply"));
    this.summary = h("p.soft.summary", { role: "status" });
    const name = single ? nameNode(single.name ?? nameOf(single.id)) : t("task.items.some", { count: choice.count });
    const about = [
      now.left_out > 0 && t("permissions.left_out", { count: now.items + now.links + now.failed }),
      now.failed > 0 && t("permissions.failed", { count: now.failed }),
      now.links > 0 && t("permissions.links", { count: now.links }),
      !open && now.items > 0 && t("permissions.closed"),
      open && now.owned < now.items && t("permissions.partly", { count: now.items - now.owned }),
    ].filter(Boolean);
    const hero = h(
      "div.hero",
      {},
      icon(single?.kind ? iconOf(single) : now.folders > 0 ? "kind-folder" : "kind-misc", "file-icon"),
      h("div.grow", {}, h("b", {}, name), about.length > 0 && h("span.soft", {}, about.join(" "))),
    );
    const fields = h(
      "div.fields",
      {},
      this.names(),
      h("section", { "aria-label": t("permissions.access") }, this.access.node, open && this.adder(this.access, "access")),
      now.folders > 0 && this.below(),
      now.folders > 0 && this.handedDown(),
      single && now.items > 0 && this.asking(),
      this.summary,
      this.complaint,
    );
    const footer = h(
      "footer",
      {},
      h("button.button", { type: "button", autofocus: true, onclick: () => this.close(null) }, t(open ? "dialog.cancel" : "dialog.close")),
      open && this.button,
    );
    const submit = (event) => {
      event.preventDefault();
      if (!this.button.disabled) this.close(this.change());
    };
    return [hero, h("form", { onsubmit: submit }, fields, footer)];
  }

  names() {
    const { now, open } = this;
    const field = (key, value, closed, more = {}) => {
      const input = h("input.input", {
        type: "text",
        value: value ? value.name || `#${value.id}` : "",
        placeholder: value ? "" : t("permissions.different"),
        disabled: closed,
        autocomplete: "off",
        spellcheck: "false",
        maxlength: 255,
        oninput: () => this.changed(),
        ...more,
      });
      this[key] = { input, before: input.value };
      return h("label.field", {}, h("span", {}, t(`permissions.${key}`)), input);
    };
    const groups = h("datalist#permission-groups", {}, now.groups.map(({ name }) => h("option", { value: name })));
    return h(
      "div.pair",
      {},
      field("owner", now.owner, !open || !now.administrator),
      field("group", now.group, !open, { list: "permission-groups" }),
      groups,
    );
  }

  adder(table, key) {
    const kind = h("select.input", { "aria-label": t("permissions.add.kind") }, ["user", "group"].map((one) => h("option", { value: one }, t(`permissions.add.${one}`))));
    const name = h("input.input", {
      type: "text",
      "aria-label": t("permissions.add.name"),
      placeholder: t("permissions.add.name"),
      autocomplete: "off",
      spellcheck: "false",
      maxlength: 255,
    });
    const add = () => {
      const text = name.value.trim();
      if (text === "") return name.focus();
      table.add(kind.value, text);
      name.value = "";
      return name.focus();
    };
    name.addEventListener("keydown", (event) => {
      if (event.key !== "Enter") return;
      event.preventDefault();
      add();
    });
    return h("div.adder", { "data-adds": key }, kind, name, h("button.button.outlined", { type: "button", onclick: add }, t("permissions.add")));
  }

  below() {
    this.belowBox = h("input", { type: "checkbox", disabled: !this.open, onchange: () => this.changed() });
    return this.open && h("label.check-line", {}, this.belowBox, t("permissions.below"));
  }

  handedDown() {
    const { open, defaults, now } = this;
    if (!open && now.default_folders === 0) return null;
    this.dropBox = h("input", { type: "checkbox", onchange: () => this.changed() });
    return h(
      "details",
      {},
      h("summary", {}, t("permissions.defaults")),
      h("p.soft", {}, t(now.default_folders > 0 ? "permissions.defaults.some" : "permissions.defaults.none")),
      defaults.node,
      open && this.adder(defaults, "defaults"),
      open && now.default_folders > 0 && h("label.check-line", {}, this.dropBox, t("permissions.defaults.drop")),
    );
  }

  // Who else may what, asked of the server.
  asking() {
    const kind = h("select.input", { "aria-label": t("permissions.add.kind") }, ["user", "group"].map((one) => h("option", { value: one }, t(`permissions.add.${one}`))));
    const name = h("input.input", { type: "text", "aria-label": t("permissions.add.name"), placeholder: t("permissions.add.name"), autocomplete: "off", spellcheck: "false", maxlength: 255 });
    const answer = h("div.answer", { role: "status" });
    const ask = async () => {
      const who = name.value.trim();
      if (who === "") return name.focus();
      try {
        const found = await post("operation", { action: "access", path_raw: this.single.id, [kind.value]: who });
        answer.replaceChildren(answerNode(kind.value, who, found));
        answer.scrollIntoView({ block: "nearest" });
      } catch (failure) {
        answer.replaceChildren(h("p.complaint", {}, sentenceOf({ code: failure.code, key: failure.key, path: `/${who}` })));
      }
      return undefined;
    };
    name.addEventListener("keydown", (event) => {
      if (event.key !== "Enter") return;
      event.preventDefault();
      ask();
    });
    return h(
      "details",
      {},
      h("summary", {}, t("permissions.who")),
      h("div.adder", { "data-adds": "who" }, kind, name, h("button.button.outlined", { type: "button", onclick: ask }, t("permissions.ask"))),
      answer,
    );
  }

  // What is asked for, as the program takes it.
  change() {
    const text = ({ input, before }) => (input.value.trim() !== before ? input.value.trim() || undefined : undefined);
    const dropped = this.dropBox?.checked;
    return {
      owner: text(this.owner),
      group: text(this.group),
      mode: this.access.mode(),
      entries: this.access.lines(),
      defaults: dropped ? "none" : this.defaults.lines(true),
      below: this.belowBox?.checked ? "true" : undefined,
    };
  }

  changed() {
    const { below, ...what } = this.change();
    const any = Object.values(what).some(Boolean);
    const { count } = this.choice;
    this.button.disabled = !any;
    const runs = this.access.run === "X" && /\+X|:[rw]*X/.test(`${what.mode} ${what.entries}`);
    this.summary.textContent = any
      ? [t(below ? "permissions.does.below" : "permissions.does", { count }), runs && t("permissions.does.run")].filter(Boolean).join(" ")
      : "";
  }
}

const RULES = ["home", "no_access", "read_write", "read_only", "no_list", "service"];

function listOf(words) {
  return words.map((word) => t(`permissions.may.${word}`)).join(", ");
}

// What a user or a group may do, line by line.
function answerNode(kind, name, { rights, masked, by, groups = [], closed, unknown, share }) {
  const line = (good, text) => h("li", {}, icon(good ? "check" : "close", good ? "icon small yes" : "icon small no"), h("span", {}, text));
  const whom = t(`permissions.entry.${kind}`, { name });
  const reason = t(`permissions.by.${by}`, { groups: groups.join(", ") });
  const lines = [
    rights.length > 0
      ? line(true, t("permissions.answer", { who: whom, may: listOf(rights), reason }))
      : line(false, t("permissions.answer.none", { who: whom, reason })),
    masked.length > 0 && line(false, t("permissions.answer.masked", { may: listOf(masked) })),
    closed.length > 0 && line(false, t("permissions.answer.closed", { path: closed[0] })),
    unknown.length > 0 && line(false, t("permissions.answer.unknown", { path: unknown[0] })),
    share && RULES.includes(share.rule) && line(share.privilege !== 0, t(`permissions.rule.${share.rule}`)),
    !share && by !== "administrator" && h("li", {}, icon("info", "icon small"), h("span", {}, t("permissions.rule.unknown"))),
  ];
  return h("section.why", {}, h("ul", {}, lines.filter(Boolean)));
}
