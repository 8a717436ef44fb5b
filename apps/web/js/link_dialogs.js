// Public links: making one for a file or folder, and those that one has.

import { get, post } from "./api.js";
import { confirm, dialog, toast, toastFailure } from "./dialogs.js";
import { h, icon, iconButton, keepFocus, nameNode, plainName } from "./dom.js";
import { emit } from "./events.js";
import { formatDay, formatSize, formatTime } from "./format.js";
import { iconOf } from "./icons.js";
import "./later.js";
import { showCode } from "./link_code.js";
import { field, linkForm, termFields } from "./link_form.js";
import { showSent } from "./link_sent.js";
import { copyText } from "./operations.js";
import { decode, idIn, nameOf } from "./path.js";
import { t } from "./strings.js";

export async function makeLink(entry) {
  let password = "";
  const link = await linkForm({
    title: t("link.title"),
    picture: iconOf(entry),
    name: entry.name,
    fields: termFields(),
    about: t(entry.isFolder ? "link.about.folder" : "link.about.file"),
    action: t("link.create"),
    submit: (terms) => {
      ({ password } = terms);
      return post("link", { action: "create", path_raw: entry.id, ...terms });
    },
  });
  if (!link) return;
  emit("links");
  showLink(link, password);
}

// Visitors send files into a new folder of this one, and see nothing.
export async function receiveFiles(entry) {
  let password = "";
  const name = h("input.input", { name: "inbox", type: "text", required: true, maxlength: 100, autofocus: true, value: t("link.inbox.name") });
  const fields = termFields(null, { receives: true });
  fields.nodes.unshift(field(t("link.inbox"), name, t("link.inbox.hint", { folder: entry.name })));
  const link = await linkForm({
    title: t("command.receive"),
    picture: iconOf(entry),
    name: entry.name,
    fields,
    about: t("link.about.receives"),
    action: t("link.create"),
    submit: (terms) => {
      ({ password } = terms);
      return post("link", { action: "create", path_raw: entry.id, inbox: name.value.trim(), ...terms });
    },
  });
  if (!link) return;
  emit("links");
  emit("folders-changed", { ids: [entry.id] });
  showLink(link, password);
}

async function editLink(link) {
  let password;
  const changed = await linkForm({
    title: t("link.edit.title"),
    picture: link.received ? "upload" : link.has_password ? "lock" : "link",
    name: nameOf(idIn(link)),
    fields: termFields(link),
    action: t("link.save"),
    submit: (terms) => {
      ({ password } = terms);
      return post("link", { action: "change", id: link.id, ...terms });
    },
  });
  if (!changed) return null;
  if (password) await showLink(changed, password);
  else toast({ text: t("link.saved") });
  return changed;
}

// The password is shown this once: the appliance keeps no more than its hash.
function showLink(link, password) {
  const input = h("input.input.address", {
    type: "text",
    readonly: true,
    value: addressOf(link),
    "aria-label": t("link.address"),
  });
  const done = dialog({
    title: t("link.made"),
    fill: () => [
      h(
        "div.body",
        {},
        h(
          "div.address-line",
          {},
          input,
          h(
            "button.button.primary",
            { type: "button", autofocus: true, onclick: () => copyLink(link) },
            icon("copy"),
            t("link.copy"),
          ),
        ),
        link.has_password &&
          h(
            "div.address-line",
            {},
            h("input.input.password", { type: "text", readonly: true, value: password, "aria-label": t("link.password") }),
            h(
              "button.button.outlined",
              { type: "button", onclick: () => copyText(password, t("link.password.copied")) },
              icon("copy"),
              t("link.password.copy"),
            ),
          ),
        h(
          "p.soft",
          {},
          [link.has_password ? t("link.tell_password") : t("link.open_to_all"), windowOf(link), limitOf(link)]
            .filter(Boolean)
            .join(" "),
        ),
      ),
      h(
        "footer",
        {},
        h("button.button.outlined", { type: "button", onclick: () => codeOf(link) }, icon("code"), t("link.code")),
        h(
          "a.button.outlined",
          { href: addressOf(link), target: "_blank", rel: "noopener" },
          icon("eye"),
          t("link.visit"),
        ),
      ),
    ],
  });
  input.select();
  return done;
}

// The appliance may not know the name that it is reached by.
function addressOf(link) {
  return new URL(link.address, location.href).href;
}

function codeOf(link) {
  return showCode(addressOf(link), plainName(nameOf(idIn(link)))).catch(toastFailure);
}

function copyLink(link) {
  return copyText(addressOf(link), t("link.copied"));
}

function windowOf(link) {
  if (!link.expires) return "";
  return t(link.available ? "link.between" : "link.until", {
    from: formatDay(link.available),
    to: formatDay(link.expires),
  });
}

function limitOf({ downloads }) {
  return downloads ? t("link.limit", { count: downloads }) : "";
}

function roomOf({ received, last_use: last }) {
  const { files, bytes, most_files: mostFiles, most_bytes: mostBytes } = received;
  const count = t("link.received", { files, count: mostFiles, size: formatSize(bytes), most: formatSize(mostBytes) });
  return files ? `${count} · ${t("link.last", { time: formatTime(last) })}` : count;
}

function usesOf({ used, downloads, last_use: last }) {
  if (downloads && used >= downloads) return t("link.used_up", { count: downloads });
  if (!used) return downloads ? t("link.unused.of", { count: downloads }) : t("link.unused");
  const count = downloads ? t("link.used.of", { used, count: downloads }) : t("link.used", { count: used });
  return `${count} · ${t("link.last", { time: formatTime(last) })}`;
}

// Of one file or folder, or all.
export async function showLinks(entry = null) {
  let items;
  try {
    ({ items } = await get("link", { action: "list", path_raw: entry?.id }));
  } catch (failure) {
    return toastFailure(failure);
  }
  return dialog({
    title: t(entry ? "command.itemLinks" : "command.links"),
    wide: true,
    className: "links",
    fill: () => {
      const list = h("ul.link-list");
      const paint = () =>
        keepFocus(list, () =>
          list.replaceChildren(
            ...(items.length > 0 ? items.map(rowOf) : [h("li.none", {}, icon("link"), h("span", {}, t("link.none")))]),
          ),
        );
      const edit = async (link) => {
        const changed = await editLink(link);
        if (!changed) return;
        items = items.map((one) => (one === link ? changed : one));
        paint();
      };
      const revoke = async (link) => {
        if (!(await confirmRevoking())) return;
        try {
          await post("link", { action: "revoke", id: link.id });
          items = items.filter((one) => one !== link);
          paint();
          emit("links");
          toast({ text: t("link.revoked") });
        } catch (failure) {
          toastFailure(failure);
        }
      };
      const rowOf = (link) => linkRow(link, { edit, revoke });
      paint();
      return [list];
    },
  });
}

function confirmRevoking() {
  return confirm({
    title: t("link.revoke.title"),
    text: t("link.revoke.text"),
    action: t("link.revoke"),
    kind: "danger",
  });
}

function linkRow(link, { edit, revoke }) {
  const { received } = link;
  const full = received && (received.files >= received.most_files || received.bytes >= received.most_bytes);
  const spent = full || (Boolean(link.downloads) && link.used >= link.downloads);
  return h(
    "li",
    {},
    h("span.card-icon", {}, icon(received ? "upload" : link.has_password ? "lock" : "link")),
    h(
      "div.grow",
      {},
      h("b", { title: plainName(decode(idIn(link))) }, nameNode(nameOf(idIn(link)))),
      link.note && h("span.note", {}, h("bdi", {}, link.note)),
      h(
        "span.soft",
        {},
        [plainName(decode(idIn(link))), link.has_password && t("link.protected"), windowOf(link) || t("link.forever")]
          .filter(Boolean)
          .join(" · "),
      ),
      h(spent ? "span.soft.spent" : "span.soft", {}, full && `${t("link.full")}: `, received ? roomOf(link) : usesOf(link)),
    ),
    h(
      "div.link-actions",
      {},
      h(
        "a.icon-button",
        {
          href: addressOf(link),
          target: "_blank",
          rel: "noopener",
          "aria-label": t("link.visit"),
          title: t("link.visit"),
        },
        icon("eye"),
      ),
      received && iconButton("list", t("link.sent"), () => showSent(link)),
      iconButton("copy", t("link.copy"), () => copyLink(link)),
      iconButton("code", t("link.code"), () => codeOf(link)),
      iconButton("rename", t("link.edit"), () => edit(link)),
      iconButton("trash", t("link.revoke"), () => revoke(link)),
    ),
  );
}
