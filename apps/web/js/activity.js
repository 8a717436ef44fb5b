// What goes on at the moment: a panel with a card for each upload or task. What went well leaves by itself.

import { showWhyOf } from "./dialogs.js";
import { $, announce, h, icon, iconButton, keepFocus, plainName } from "./dom.js";
import { t } from "./strings.js";

const MOST_ERRORS = 10;
const STAY = 6000; // of what went well
const LOOK_AGAIN = 2000; // while somebody is looking at the panel
const ICONS = { good: "check", failed: "warning", stopped: "stop" };
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
  const running = [...cards].filter((card) => !card.finished).length;
  $("activity").hidden = cards.size === 0;
  $("activity").classList.toggle("folded", !open);
  $("activity-toggle").setAttribute("aria-expanded", String(open));
  $("activity-title").textContent = running > 0 ? t("activity.running", { count: running }) : outcome();
  $("activity-clear").hidden = running === cards.size;
}

// The worst that happened.
function outcome() {
  const count = (kind) => [...cards].filter((card) => card.kind === kind).length;
  if (count("failed") > 0) return t("activity.failed", { count: count("failed") });
  return t(count("stopped") > 0 ? "activity.stopped" : "activity.done");
}

export class Card {
  // onCancel: what the button does while the card is not finished; onRemove: when somebody has seen the outcome.
  constructor({ iconName, title, onCancel, onRemove = () => {} }) {
    this.onCancel = onCancel;
    this.onRemove = onRemove;
    this.iconName = iconName;
    this.title = h("b");
    this.detail = h("span.detail");
    this.note = h("span.note");
    this.bar = h("div.progress", { role: "progressbar", "aria-valuemin": 0, "aria-valuemax": 100 }, h("i"));
    this.errors = h("ul.errors", { hidden: true });
    this.actions = h("div.card-actions", { hidden: true });
    this.picture = h("span.card-icon");
    this.button = iconButton("close", "", () => (this.finished ? this.remove() : this.onCancel()));
    this.node = h(
      "li.activity-card",
      {},
      this.picture,
      h("div.grow", {}, this.title, this.bar, this.detail, this.note, this.errors, this.actions),
      this.button,
    );
    this.retitle(title);
    cards.add(this);
    $("activity-list").prepend(this.node);
    open = true;
    this.begin();
  }

  // Also of what was finished, and is tried again.
  begin() {
    clearTimeout(this.timer);
    this.finished = false;
    this.kind = null;
    this.node.classList.remove("finished", ...Object.keys(ICONS));
    this.bar.hidden = false;
    this.picture.replaceChildren(icon(this.iconName));
    this.actions.hidden = true;
    this.name(t("activity.cancel"));
    paint();
  }

  retitle(text) {
    this.title.textContent = text;
    this.bar.setAttribute("aria-label", text);
  }

  name(label) {
    this.button.setAttribute("aria-label", label);
    this.button.title = label;
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

  // list: {id, path, title, hint, why, again} of each failure; advice that is the same is given once.
  showErrors(list, leftOut = 0) {
    this.errors.hidden = list.length === 0;
    const shown = list.slice(0, MOST_ERRORS);
    const link = (text, run) => h("button.link", { type: "button", onclick: run }, text);
    const lines = shown.map(({ id, path, title, why, again }) =>
      h(
        "li",
        { title: plainName(path) },
        title,
        why && link(t("why.ask"), () => showWhyOf(id)),
        again && link(t("state.retry"), again),
      ),
    );
    const more = leftOut + list.length - shown.length;
    if (more > 0) lines.push(h("li", {}, t("activity.more_errors", { count: more })));
    for (const hint of new Set(shown.map((one) => one.hint).filter(Boolean))) lines.push(h("li.hint", {}, hint));
    keepFocus(this.node, () => this.errors.replaceChildren(...lines));
  }

  // kind: "good", "failed" or "stopped"; actions: {label, run}
  finish(kind, detail, actions = []) {
    this.finished = true;
    this.kind = kind;
    this.node.classList.add("finished", kind);
    this.bar.hidden = true;
    this.note.textContent = "";
    this.picture.replaceChildren(icon(ICONS[kind]));
    this.detail.textContent = detail;
    this.actions.hidden = actions.length === 0;
    this.actions.replaceChildren(
      ...actions.map(({ label, run }) => h("button.link", { type: "button", onclick: run }, label)),
    );
    this.name(t("activity.remove"));
    announce([this.title.textContent, detail].join(": "));
    paint();
    if (kind === "good") this.leaveIn(STAY);
  }

  // Nothing goes away under the eyes or the hand of somebody.
  leaveIn(wait) {
    clearTimeout(this.timer);
    this.timer = setTimeout(() => {
      if (document.hidden || $("activity").matches(":hover, :focus-within")) this.leaveIn(LOOK_AGAIN);
      else this.remove();
    }, wait);
  }

  remove() {
    clearTimeout(this.timer);
    cards.delete(this);
    keepFocus($("activity-list"), () => this.node.remove());
    this.onRemove();
    paint();
  }
}
