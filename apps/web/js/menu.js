// Menus: at the pointer, or below a button.

import { h, icon } from "./dom.js";
import { t } from "./strings.js";

let current = null;

function closeMenu() {
  current?.close();
}

// items: {label, icon, shortcut, run, disabled, danger, checked}, {heading} or "-"; `several` of a row of ticks.
export function openMenu(items, { x, y, anchor = null }) {
  closeMenu();
  const before = document.activeElement;
  const label = anchor?.getAttribute("aria-label") ?? anchor?.textContent ?? t("menu.more");
  const menu = h("div.menu", { role: "menu", tabindex: -1, "aria-label": label });
  const close = (focusBack = true) => {
    host.remove();
    document.removeEventListener("pointerdown", outside, true);
    window.removeEventListener("blur", close);
    anchor?.setAttribute("aria-expanded", "false");
    current = null;
    if (focusBack) before?.focus?.({ preventScroll: true });
  };
  const outside = (event) => {
    if (!menu.contains(event.target)) close(false);
  };
  for (const item of items.filter((one, i) => one !== "-" || (i > 0 && items[i - 1] !== "-" && i < items.length - 1))) {
    if (item.heading) menu.append(h("div.menu-heading", { role: "presentation" }, item.heading));
    else menu.append(item === "-" ? h("hr") : itemNode(item, close));
  }
  menu.addEventListener("keydown", (event) => keydown(event, menu, close));
  menu.addEventListener("contextmenu", (event) => event.preventDefault());
  // Outside of everything that could cut it off, and still a part of the page with a name.
  const host = h("aside", { "aria-label": label }, menu);
  document.body.append(host);
  place(menu, x, y, anchor);
  anchor?.setAttribute("aria-expanded", "true");
  document.addEventListener("pointerdown", outside, true);
  window.addEventListener("blur", close);
  current = { close };
  menu.focus({ preventScroll: true });
}

function itemNode(item, close) {
  const radio = item.checked !== undefined;
  return h(
    "button.menu-item",
    {
      type: "button",
      role: item.several ? "menuitemcheckbox" : radio ? "menuitemradio" : "menuitem",
      tabindex: -1,
      disabled: item.disabled,
      "aria-checked": radio ? String(item.checked) : null,
      "data-danger": item.danger ? "" : null,
      onclick: () => {
        close();
        item.run();
      },
      onpointermove: (event) => event.currentTarget.focus({ preventScroll: true }),
    },
    icon(radio ? (item.checked ? "check" : "blank") : (item.icon ?? "blank")),
    h("span.grow", {}, item.label),
    item.shortcut && h("kbd", { "aria-hidden": "true" }, item.shortcut),
  );
}

const SHEET = matchMedia("(max-width: 600px) and (pointer: coarse)");

function place(menu, x, y, anchor) {
  // Under a thumb it lies at the foot of the screen.
  if (SHEET.matches) return menu.classList.add("sheet");
  const box = anchor?.getBoundingClientRect();
  const width = menu.offsetWidth;
  const height = menu.offsetHeight;
  let left = box ? (box.right - width > 8 && box.left + width > innerWidth - 8 ? box.right - width : box.left) : x;
  let top = box ? box.bottom + 4 : y;
  if (left + width > innerWidth - 8) left = Math.max(8, (box ? innerWidth - 8 : x) - width);
  if (top + height > innerHeight - 8)
    top = Math.max(8, box ? box.top - height - 4 : Math.min(y, innerHeight - 8) - height);
  menu.style.left = `${left}px`;
  menu.style.top = `${Math.max(8, top)}px`;
  return undefined;
}

function keydown(event, menu, close) {
  const nodes = [...menu.querySelectorAll(".menu-item:not(:disabled)")];
  const at = nodes.indexOf(document.activeElement);
  const step = { ArrowDown: at + 1, ArrowUp: at < 0 ? -1 : at - 1, Home: 0, End: nodes.length - 1 }[event.key];
  event.stopPropagation();
  if (step !== undefined) {
    event.preventDefault();
    nodes[(step + nodes.length) % nodes.length]?.focus();
  } else if (event.key === "Escape" || event.key === "Tab") {
    event.preventDefault();
    close();
  } else if (event.key.length === 1) {
    const begins = (node) => node.textContent.toLowerCase().startsWith(event.key.toLowerCase());
    const next = [...nodes.slice(at + 1), ...nodes.slice(0, at + 1)].find(begins);
    if (next && event.key !== " ") next.focus();
  }
}
