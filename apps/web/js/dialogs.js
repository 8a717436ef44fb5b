// Questions and messages above the page.

import { h, icon, iconButton } from "./dom.js";
import { describe, sentenceOf } from "./errors.js";
import { t } from "./strings.js";

// Shows a dialog; resolves with what `close(value)` was given, null when it was dismissed. `fill(close)` gives its
// content, an array of nodes.
export function dialog({ title, className = "", fill, wide = false }) {
  return new Promise((resolve) => {
    const node = h("dialog.dialog", { "aria-labelledby": "dialog-title" });
    node.className = `dialog ${className} ${wide ? "wide" : ""}`;
    // At once: the browser announces a close later, and what comes in between finds the question answered.
    const close = (value) => {
      node.close();
      node.remove();
      raise();
      resolve(value);
    };
    node.append(
      h(
        "header",
        { role: "presentation" }, // the page has one banner
        h("h2#dialog-title", {}, title),
        iconButton("close", t("dialog.close"), () => close(null)),
      ),
      ...fill(close),
    );
    node.addEventListener("close", () => close(null)); // dismissed by a key
    node.addEventListener("mousedown", (event) => {
      if (event.target === node && isOutside(event, node.getBoundingClientRect())) close(null);
    });
    document.body.append(node);
    node.showModal();
    (node.querySelector("[autofocus]") ?? node.querySelector("footer .button:last-child"))?.focus();
  });
}

// The ground around a dialog, unlike the room between its parts.
function isOutside({ clientX, clientY }, { left, right, top, bottom }) {
  return clientX < left || clientX > right || clientY < top || clientY > bottom;
}

// One line of text. `check(text)` gives a complaint or "", `submit(text)` does it and throws what fails.
export function askText({ title, label, value = "", type = "text", selectTo = null, action, check = () => "", submit }) {
  return dialog({
    title,
    fill: (close) => {
      const input = h("input.input", {
        type,
        value,
        autofocus: true,
        spellcheck: "false",
        autocomplete: type === "password" ? "new-password" : "off", // none that the browser keeps for this page
        maxlength: 255,
      });
      const complaint = h("span.complaint", { role: "alert" });
      const button = h("button.button.primary", { type: "submit" }, action);
      const complain = (text) => {
        complaint.textContent = text;
        input.setAttribute("aria-invalid", String(text !== ""));
      };
      const form = h(
        "form",
        {
          onsubmit: async (event) => {
            event.preventDefault();
            const text = input.value;
            const wrong = check(text);
            if (wrong) return complain(wrong);
            button.disabled = true;
            try {
              close((await submit(text)) ?? text);
            } catch (failure) {
              complain(sentenceOf(failure));
              button.disabled = false;
              input.focus();
            }
          },
        },
        h("label.field", {}, h("span", {}, label), input, complaint),
        h("footer", {}, h("button.button", { type: "button", onclick: () => close(null) }, t("dialog.cancel")), button),
      );
      input.addEventListener("input", () => complain(""));
      // Before the first key, however soon it comes.
      input.addEventListener("focus", () => input.setSelectionRange(0, selectTo ?? input.value.length), { once: true });
      return [form];
    },
  });
}

// Buttons: [{label, value, kind}]; the last one is the default.
export function choose({ title, body, buttons, className }) {
  // What cannot be undone is not what Enter does by itself.
  const careful = buttons.some((button) => button.kind === "danger");
  return dialog({
    title,
    className,
    fill: (close) => [
      h("div.body", {}, body),
      h(
        "footer",
        {},
        buttons.map((button, i) =>
          h(
            `button.button${button.kind ? `.${button.kind}` : ""}`,
            { type: "button", autofocus: careful && i === 0, onclick: () => close(button.value) },
            button.label,
          ),
        ),
      ),
    ],
  });
}

export function confirm({ title, text, action, kind = "primary" }) {
  return choose({
    title,
    body: h("p", {}, text),
    buttons: [
      { label: t("dialog.cancel"), value: false },
      { label: action, value: true, kind },
    ],
  });
}

export async function showWhyOf(id) {
  (await loaded(import("./why.js")))?.showWhy(id);
}

const rack = document.getElementById("toasts");

// Below an open dialog nobody would see a message, or could reach it.
function raise() {
  const top = [...document.querySelectorAll("dialog[open]")].at(-1) ?? document.body;
  if (rack.parentElement !== top) top.append(rack);
}

document.addEventListener("close", (event) => event.target.contains(rack) && raise(), true);

// A short message at the foot of the page. {text, hint, kind, actions: [{label, run}]}
export function toast({ text, hint = "", kind = "", actions = [], life = kind === "failed" ? 12000 : 5000 }) {
  let timer;
  raise();
  const node = h("div.toast", { role: kind === "failed" ? "alert" : "status" });
  if (kind) node.classList.add(kind);
  const remove = () => node.remove();
  node.append(
    icon(kind === "failed" ? "warning" : "check"),
    h("div.grow", {}, h("b", {}, text), hint && h("p", {}, hint)),
    ...actions.map(({ label, run }) =>
      h(
        "button.button",
        {
          type: "button",
          onclick: () => {
            remove();
            run();
          },
        },
        label,
      ),
    ),
    iconButton("close", t("dialog.close"), remove),
  );
  rack.append(node);
  while (rack.children.length > 3) rack.firstChild.remove();
  // It stays as long as somebody is at it.
  const leave = () => {
    clearTimeout(timer);
    timer = setTimeout(() => (node.matches(":hover, :focus-within") ? leave() : remove()), life);
  };
  leave();
}

export function dismissToasts() {
  rack.replaceChildren();
}

// A module that nobody needs before somebody asks for it; nothing, and said so, when it does not come.
export function loaded(module) {
  return module.catch(() => toastFailure({ key: "page:unreachable" }));
}

// `id` is what the failure was about, for asking why.
export function toastFailure(failure, id = null) {
  const { title, hint, why } = describe(failure);
  const actions = why && id ? [{ label: t("why.ask"), run: () => showWhyOf(id) }] : [];
  toast({ text: title, hint, kind: "failed", actions });
}
