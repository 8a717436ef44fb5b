// The questions of a search, and what they come to as parameters of the program.

import { browser } from "./browser.js";
import { dayRange, h, icon } from "./dom.js";
import { inBothForms } from "./path.js";
import { labelOf } from "./pathbar.js";
import { t } from "./strings.js";

const UNITS = { KB: 1024, MB: 1024 ** 2, GB: 1024 ** 3 };
const TIMES = ["mtime", "crtime", "atime"];
const DAY = 86400;

// where: "below", "here" or "all"; `folders` what "below" and "here" mean.
export function searchForm(values, submit) {
  const folder = browser.lastFolder;
  const field = (key, node) => h("label.field", {}, h("span", {}, t(`search.${key}`)), node);
  const text = (name, placeholder = "") =>
    field(
      name,
      h("input.input", {
        name,
        type: "text",
        value: values[name] ?? "",
        placeholder,
        autocomplete: "off",
        spellcheck: "false",
      }),
    );
  const choice = (name, options) =>
    field(
      name,
      h(
        "select.input",
        { name },
        options.map(([value, label]) =>
          h("option", { value, selected: (values[name] ?? options[0][0]) === value }, label),
        ),
      ),
    );
  const range = (name) =>
    h(
      "fieldset.range",
      {},
      h("legend", {}, t(`search.${name}`)),
      dayRange(
        ...["from", "to"].map((end) => ({
          name: `${name}_${end}`,
          value: values[`${name}_${end}`] ?? "",
          "aria-label": t(`search.${end}`),
        })),
      ),
    );
  const places =
    folder === "/"
      ? [["all", t("search.where.all")]]
      : [
          ["below", t("search.where.below", { folder: labelOf(folder) })],
          ["here", t("search.where.here", { folder: labelOf(folder) })],
          ["all", t("search.where.all")],
        ];
  const unit = h(
    "select.input",
    { name: "unit", "aria-label": t("search.unit") },
    Object.keys(UNITS).map((name) => h("option", { selected: (values.unit ?? "MB") === name }, name)),
  );
  const more = h(
    "details",
    { open: ["owner", "group", "crtime_from", "crtime_to", "atime_from", "atime_to"].some((name) => values[name]) },
    h("summary", {}, icon("chevron-right", "icon small"), t("search.more")),
    h("div.fields", {}, range("crtime"), range("atime"), text("owner"), text("group")),
  );
  return h(
    "form.search-form",
    {
      onsubmit: (event) => {
        event.preventDefault();
        submit(Object.fromEntries(new FormData(event.target)));
      },
    },
    text("name", t("search.name.hint")),
    choice("where", places),
    choice("type", [
      ["all", t("search.type.all")],
      ["file", t("search.type.file")],
      ["dir", t("search.type.dir")],
    ]),
    text("extension", "jpg, png"),
    range("mtime"),
    h(
      "fieldset.range.size-range",
      {},
      h("legend", {}, t("search.size")),
      h(
        "select.input",
        { name: "size_op", "aria-label": t("search.size.op") },
        ["greater", "less", "equal"].map((op) =>
          h("option", { value: op, selected: values.size_op === op }, t(`search.size.${op}`)),
        ),
      ),
      h("input.input", {
        name: "size",
        type: "number",
        min: 0,
        step: "any",
        value: values.size ?? "",
        "aria-label": t("search.size"),
      }),
      unit,
    ),
    more,
    h("span.complaint", { role: "alert" }),
    h(
      "footer",
      {},
      h("button.button", { type: "reset" }, t("search.reset")),
      h("button.button.primary", { type: "submit" }, icon("search"), t("search.start")),
    ),
  );
}

// Local days as seconds; "to" counts its own day in.
function secondsOf(day, extra) {
  return Math.floor(new Date(`${day}T00:00:00`).getTime() / 1000) + extra;
}

export function paramsOf(values) {
  const folder = browser.lastFolder;
  const params = {
    path_raw: values.where === "all" ? browser.shares.map((share) => share.id) : [folder],
    recursive: String(values.where !== "here"),
    name: inBothForms(values.name.trim()),
    type: values.type,
    extension: values.extension.replace(/[.*\s]/g, ""),
    owner: values.owner.trim(),
    group: values.group.trim(),
  };
  for (const time of TIMES) {
    if (values[`${time}_from`]) params[`${time}_from`] = secondsOf(values[`${time}_from`], 0);
    if (values[`${time}_to`]) params[`${time}_to`] = secondsOf(values[`${time}_to`], DAY);
  }
  if (values.size !== "") params[`size_${values.size_op}`] = Math.round(Number(values.size) * UNITS[values.unit]);
  return Object.fromEntries(Object.entries(params).filter(([, value]) => value !== ""));
}

export function isEmptySearch(params) {
  return Object.keys(params).every((name) => ["path_raw", "recursive"].includes(name) || params[name] === "all");
}
