// What the owner says of a public link: asked when one is made, and again when it is changed.

import { dialog } from "./dialogs.js";
import { dayRange, h, icon, nameNode } from "./dom.js";
import { sentenceOf } from "./errors.js";
import "./later.js";
import { t } from "./strings.js";

const MOST_DOWNLOADS = 1_000_000;
const MOST_FILES = 10_000;
const MEGABYTE = 1024 * 1024;
const MOST_MEGABYTES = 1024 * 1024 * 1024;

const secondsOf = (day) => (day ? Math.floor(new Date(`${day}T00:00:00`).getTime() / 1000) : 0);
const dayOf = (seconds) => (seconds ? new Date(seconds * 1000).toLocaleDateString("sv") : ""); // year-month-day

// 80 random bits in characters that are not mistaken for one another.
function proposedPassword() {
  const symbols = "abcdefghijkmnpqrstuvwxyz23456789";
  const drawn = crypto.getRandomValues(new Uint8Array(16));
  return [...drawn].map((byte, at) => (at > 0 && at % 4 === 0 ? "-" : "") + symbols[byte % symbols.length]).join("");
}

export function field(label, node, hint) {
  return h("label.field", {}, h("span", {}, label), node, hint && h("span.soft", {}, hint));
}

// The fields of a link, one of which there may be already. read() gives what differs from it, as the program takes it.
export function termFields(link = null, { receives = link?.received !== undefined } = {}) {
  const [available, expires] = dayRange(
    { name: "available", value: dayOf(link?.available) },
    { name: "expires", value: dayOf(link?.expires), min: link ? undefined : dayOf(Date.now() / 1000) },
  );
  const password = passwordFields(link);
  const most = h("input.input", {
    name: "downloads",
    type: "number",
    min: 1,
    max: MOST_DOWNLOADS,
    step: 1,
    inputmode: "numeric",
    value: link?.downloads || "",
    placeholder: t("link.downloads.any"),
  });
  const room = receives ? roomFields(link) : null;
  const note = h("input.input", { name: "note", type: "text", maxlength: 100, autocomplete: "off", value: link?.note ?? "" });
  const read = () => {
    const wanted = {
      available: secondsOf(available.value),
      expires: secondsOf(expires.value),
      downloads: receives ? undefined : Number(most.value),
      ...room?.read(),
      note: note.value.trim(),
      password: password.read(),
    };
    // A day that was not touched stays as it was stored.
    if (link && available.value === dayOf(link.available)) wanted.available = undefined;
    if (link && expires.value === dayOf(link.expires)) wanted.expires = undefined;
    return wanted;
  };
  const nodes = [
    ...password.nodes,
    h("div.pair", {}, field(t("link.available"), available), field(t("link.expires"), expires)),
    room?.nodes,
    receives
      ? field(t("link.note"), note)
      : h("div.pair", {}, field(t("link.downloads"), most), field(t("link.note"), note)),
  ];
  return { nodes, read, isOneSided: () => Boolean(available.value && !expires.value) };
}

// How much visitors may send.
function roomFields(link) {
  const number = (name, max, value) =>
    h("input.input", { name, type: "number", min: 1, max, step: 1, required: true, inputmode: "numeric", value });
  const files = number("most_files", MOST_FILES, link?.received.most_files ?? 100);
  const bytes = number("most_bytes", MOST_MEGABYTES, link ? Math.ceil(link.received.most_bytes / MEGABYTE) : 1024);
  return {
    nodes: [h("div.pair", {}, field(t("link.most_files"), files), field(t("link.most_bytes"), bytes))],
    read: () => ({ most_files: Number(files.value), most_bytes: Number(bytes.value) * MEGABYTE }),
  };
}

function passwordInput(attributes) {
  return h("input.input", { name: "password", type: "text", autocomplete: "off", spellcheck: "false", ...attributes });
}

function passwordFields(link) {
  if (!link) {
    const input = passwordInput({ autofocus: true, value: proposedPassword(), placeholder: t("link.password.none") });
    return {
      nodes: [field(t("link.password"), input, t("link.password.proposed"))],
      read: () => input.value,
    };
  }
  const choices = link.has_password ? ["keep", "set", "remove"] : ["remove", "set"];
  const choice = h(
    "select.input",
    { autofocus: true, name: "password-choice" },
    choices.map((one) => h("option", { value: one }, t(`link.password.${one}`))),
  );
  const input = passwordInput({ value: proposedPassword(), "aria-label": t("link.password.new"), hidden: true });
  choice.addEventListener("change", () => {
    input.hidden = choice.value !== "set";
    if (!input.hidden) input.select();
  });
  return {
    nodes: [
      field(t("link.password"), choice, link.has_password ? t("link.password.logs_out") : ""),
      input,
    ],
    read: () => ({ keep: undefined, set: input.value, remove: link.has_password ? "" : undefined })[choice.value],
  };
}

// A dialog around such fields; resolves with what `submit(terms)` gave, null when it was dismissed.
export function linkForm({ title, picture, name, fields, about, action, submit }) {
  return dialog({
    title,
    fill: (close) => {
      const complaint = h("span.complaint", { role: "alert" });
      const button = h("button.button.primary", { type: "submit" }, icon("link"), action);
      const form = h(
        "form",
        {
          onsubmit: async (event) => {
            event.preventDefault();
            button.disabled = true;
            try {
              close(await submit(fields.read()));
            } catch (failure) {
              complaint.textContent = fields.isOneSided() ? t("link.window") : sentenceOf(failure);
              button.disabled = false;
            }
          },
        },
        h("div.hero", {}, icon(picture, "file-icon"), h("b.grow", {}, nameNode(name))),
        h("div.fields.link-fields", {}, fields.nodes, about && h("p.soft", {}, about), complaint),
        h(
          "footer",
          {},
          h("button.button", { type: "button", onclick: () => close(null) }, t("dialog.cancel")),
          button,
        ),
      );
      return [form];
    },
  });
}
