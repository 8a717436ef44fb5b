// The path as a row of folders, and as text to type over.

import { $, h, icon, iconButton, nameNode, plainName, set } from "./dom.js";
import { browser, go } from "./browser.js";
import { ancestry, decode, encodePath, isDeleted, isSearch, nameOf, normaliseId } from "./path.js";
import { isRecycleBin } from "./entries.js";
import { on } from "./events.js";
import { openMenu } from "./menu.js";
import { t } from "./strings.js";

const bar = document.getElementById("pathbar");

export function labelOf(id) {
  if (id === "/") return t("place.shares");
  if (isDeleted(id)) return t("place.deleted");
  if (isSearch(id)) return t("place.search");
  if (id === "/home") return t("place.home");
  return isRecycleBin(id) ? t("place.recycle") : nameOf(id);
}

export function setupPathbar() {
  on("place", paint);
  new ResizeObserver(fold).observe(bar);
  bar.addEventListener("click", (event) => {
    if (!event.target.closest("a, button")) editPath();
  });
}

function paint(id) {
  const ids = isSearch(id) ? ["/", id] : ["/", ...ancestry(id)];
  bar.replaceChildren(
    h(
      "ol",
      {},
      ids.map((one, i) => {
        const last = i === ids.length - 1;
        const crumb = h("a.crumb", {
          href: `#${one}`,
          "data-id": one,
          "aria-current": last ? "page" : null,
          title: last ? null : plainName(decode(one)),
        });
        if (i === 0 && !last) set(crumb, { "aria-label": labelOf(one) }).append(icon("kind-share"));
        else crumb.append(nameNode(labelOf(one)));
        return h("li", {}, crumb);
      }),
    ),
  );
  fold();
  // The first screen has a heading of its own.
  $("place").hidden = id === "/";
  $("place").textContent = plainName(labelOf(id));
  document.title = `${plainName(labelOf(id))} – Orvel`;
}

// What the bar has no room for goes into a menu, from the top on; the shares and the folder on screen stay.
function fold() {
  const list = bar.querySelector("ol");
  if (!list) return;
  list.querySelector(".more-crumbs")?.remove();
  const middle = [...list.children].slice(1, -1);
  for (const item of middle) item.hidden = false;
  const hidden = [];
  if (list.scrollWidth <= list.clientWidth) return;
  const items = () =>
    hidden.map((item) => {
      const { id } = item.firstChild.dataset;
      return { label: plainName(labelOf(id)), icon: "folder-open", run: () => go(id) };
    });
  const button = iconButton("dots", t("path.more"), () => openMenu(items(), { anchor: button }), {
    "aria-haspopup": "menu",
  });
  list.firstChild.after(h("li.more-crumbs", {}, button));
  while (middle.length > 0 && list.scrollWidth > list.clientWidth) {
    const item = middle.shift();
    item.hidden = true;
    hidden.push(item);
  }
}

export function editPath() {
  if (bar.querySelector("input")) return;
  const before = browser.id;
  const text = isSearch(before) ? "/" : decode(before);
  const input = h("input.input", {
    type: "text",
    value: text,
    "aria-label": t("path.edit"),
    spellcheck: "false",
    autocomplete: "off",
  });
  let done = false;
  const finish = (accept) => {
    if (done) return;
    done = true;
    const typed = input.value.trim();
    paint(browser.id);
    // Bytes that cannot be typed stay when nothing was typed over them.
    if (accept) go(typed === text ? before : normaliseId(encodePath(typed)));
  };
  input.addEventListener("keydown", (event) => {
    event.stopPropagation();
    if (event.key !== "Enter" && event.key !== "Escape") return;
    finish(event.key === "Enter");
    document.getElementById("view").focus({ preventScroll: true });
  });
  input.addEventListener("blur", () => finish(false));
  bar.append(input);
  input.focus();
  input.select();
}

export function crumbId(node) {
  return node.closest?.(".crumb")?.dataset.id ?? null;
}
