// What goes on at the moment: a panel with a card for each upload or task.

import { $, announce, h, icon, iconButton, keepFocus, plainName } from "./dom.js";
import { t } from "./strings.js";

const MOST_ERRORS = 50;
const cards = new Set();
let open = true;

export function setupActivity() {
  $("activity-toggle").addEventListener("click", () => {
    open = !open;
    paint();
  });
  $("activity-clear").addEventListener("click", () => {
    for (const card of [...cards].filter((one) => one.finished)) card.remove();
  });
}

function paint() {
  const running = [...cards].filter((card) => !card.finished);
  $("activity").hidden = cards.size === 0;
  $("activity").classList.toggle("folded", !open);
  $("activity-toggle").setAttribute("aria-expanded", String(open));
  $("activity-title").textContent =
    running.length > 0 ? t("activity.running", { count: running.length }) : t("activity.done");
  $("activity-clear").hidden = running.length === cards.size;
}

export class Card {
  // onCancel: what the button does while the card is not finished; onRemove: when somebody has seen the outcome.
  constructor({ iconName, title, onCancel, onRemove = () => {} }) {
    this.finished = false;
    this.onRemove = onRemove;
    this.title = h("b", {}, title);
    this.detail = h("span.detail");
    this.note = h("span.note");
    this.bar = h(
      "div.progress",
      { role: "progressbar", "aria-label": title, "aria-valuemin": 0, "aria-valuemax": 100 },
      h("i"),
    );
    this.errors = h("ul.errors", { hidden: true });
    this.picture = h("span.card-icon", {}, icon(iconName));
    this.button = iconButton("close", t("activity.cancel"), () => (this.finished ? this.remove() : onCancel()));
    this.node = h(
      "li.activity-card",
      {},
      this.picture,
      h("div.grow", {}, this.title, this.bar, this.detail, this.note, this.errors),
      this.button,
    );
    cards.add(this);
    open = true;
    $("activity-list").prepend(this.node);
    paint();
  }

  // fraction 0..1, or null while nobody knows.
  progress(fraction, detail, note = "") {
    this.bar.classList.toggle("unknown", fraction === null);
    this.bar.firstChild.style.width = fraction === null ? "" : `${Math.round(fraction * 1000) / 10}%`;
    if (fraction === null) this.bar.removeAttribute("aria-valuenow");
    else this.bar.setAttribute("aria-valuenow", Math.round(fraction * 100));
    this.detail.textContent = detail;
    this.note.textContent = note;
  }

  // list: {path, text}
  showErrors(list, leftOut = 0) {
    this.errors.hidden = list.length === 0;
    const shown = list.slice(0, MOST_ERRORS).map(({ path, text }) => h("li", { title: plainName(path) }, text));
    const more = leftOut + Math.max(0, list.length - MOST_ERRORS);
    if (more > 0) shown.push(h("li", {}, t("activity.more_errors", { count: more })));
    this.errors.replaceChildren(...shown);
  }

  // kind: "good", "failed" or "stopped"
  finish(kind, detail) {
    this.finished = true;
    this.node.classList.add("finished", kind);
    this.bar.hidden = true;
    this.note.textContent = "";
    this.picture.replaceChildren(icon({ good: "check", failed: "warning", stopped: "stop" }[kind]));
    this.detail.textContent = detail;
    this.button.setAttribute("aria-label", t("activity.remove"));
    this.button.title = t("activity.remove");
    announce([this.title.textContent, detail].join(": "));
    paint();
  }

  remove() {
    cards.delete(this);
    keepFocus($("activity-list"), () => this.node.remove());
    this.onRemove();
    paint();
  }
}
