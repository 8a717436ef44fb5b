// Public links: making one for a file or folder, and all of one's own.

import { get, post } from "./api.js";
import { confirm, dialog, toast, toastFailure } from "./dialogs.js";
import { dayRange, h, icon, iconButton, keepFocus, nameNode, plainName } from "./dom.js";
import { sentenceOf } from "./errors.js";
import { formatDay } from "./format.js";
import { iconOf } from "./icons.js";
import { copyText } from "./operations.js";
import { decode, idIn, nameOf } from "./path.js";
import { t } from "./strings.js";

const dayStart = (day) => (day ? Math.floor(new Date(`${day}T00:00:00`).getTime() / 1000) : undefined);

// 80 random bits in characters that are not mistaken for one another.
function proposedPassword() {
  const symbols = "abcdefghijkmnpqrstuvwxyz23456789";
  const drawn = crypto.getRandomValues(new Uint8Array(16));
  return [...drawn].map((byte, at) => (at > 0 && at % 4 === 0 ? "-" : "") + symbols[byte % symbols.length]).join("");
}

export async function makeLink(entry) {
  let password = "";
  const link = await dialog({
    title: t("link.title"),
    fill: (close) => {
      const complaint = h("span.complaint", { role: "alert" });
      const today = new Date().toLocaleDateString("sv"); // year-month-day
      const [available, expires] = dayRange({ name: "available" }, { name: "expires", min: today });
      const field = (key, node, hint) =>
        h("label.field", {}, h("span", {}, t(`link.${key}`)), node, hint && h("span.soft", {}, hint));
      const form = h(
        "form",
        {
          onsubmit: async (event) => {
            event.preventDefault();
            ({ password } = Object.fromEntries(new FormData(form)));
            try {
              close(
                await post("link", {
                  action: "create",
                  path_raw: entry.id,
                  password: password || undefined,
                  available: dayStart(available.value),
                  expires: dayStart(expires.value),
                }),
              );
            } catch (failure) {
              complaint.textContent = available.value && !expires.value ? t("link.window") : sentenceOf(failure);
            }
          },
        },
        h("div.hero", {}, icon(iconOf(entry), "file-icon"), h("b.grow", {}, nameNode(entry.name))),
        h(
          "div.fields.link-fields",
          {},
          field(
            "password",
            h("input.input", {
              name: "password",
              type: "text",
              autocomplete: "off",
              spellcheck: "false",
              autofocus: true,
              value: proposedPassword(),
              placeholder: t("link.password.none"),
            }),
            t("link.password.proposed"),
          ),
          h(
            "div.pair",
            {},
            field("available", available),
            field("expires", expires),
          ),
          h("p.soft", {}, t(entry.isFolder ? "link.about.folder" : "link.about.file")),
          complaint,
        ),
        h(
          "footer",
          {},
          h("button.button", { type: "button", onclick: () => close(null) }, t("dialog.cancel")),
          h("button.button.primary", { type: "submit" }, icon("link"), t("link.create")),
        ),
      );
      return [form];
    },
  });
  if (link) showLink(link, password);
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
          [link.has_password ? t("link.tell_password") : t("link.open_to_all"), windowOf(link)]
            .filter(Boolean)
            .join(" "),
        ),
      ),
      h(
        "footer",
        {},
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

export async function showLinks() {
  let items;
  try {
    ({ items } = await get("link", { action: "list" }));
  } catch (failure) {
    return toastFailure(failure);
  }
  return dialog({
    title: t("command.links"),
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
      const rowOf = (link) =>
        h(
          "li",
          {},
          h("span.card-icon", {}, icon(link.has_password ? "lock" : "link")),
          h(
            "div.grow",
            {},
            h("b", { title: plainName(decode(idIn(link))) }, nameNode(nameOf(idIn(link)))),
            h(
              "span.soft",
              {},
              [
                plainName(decode(idIn(link))),
                link.has_password && t("link.protected"),
                windowOf(link) || t("link.forever"),
              ]
                .filter(Boolean)
                .join(" · "),
            ),
          ),
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
          iconButton("copy", t("link.copy"), () => copyLink(link)),
          iconButton("trash", t("link.revoke"), async () => {
            if (
              !(await confirm({
                title: t("link.revoke.title"),
                text: t("link.revoke.text"),
                action: t("link.revoke"),
                kind: "danger",
              }))
            )
              return;
            try {
              await post("link", { action: "revoke", id: link.id });
              items = items.filter((one) => one !== link);
              paint();
              toast({ text: t("link.revoked") });
            } catch (failure) {
              toastFailure(failure);
            }
          }),
        );
      paint();
      return [list];
    },
  });
}
