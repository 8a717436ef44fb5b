// A name typed over in its row.

import { $, h } from "./dom.js";
import { sentenceOf } from "./errors.js";

// What askText() asks, without a dialog: Enter and leaving the field do it, Escape leaves all as it was. Resolves with
// what `submit` gave, null when nothing was done.
export function askInPlace(row, { label, value, selectTo, check, submit }) {
  return new Promise((resolve) => {
    const name = row.querySelector(".label");
    const input = h("input.input.in-place", { type: "text", value, "aria-label": label, spellcheck: "false", autocomplete: "off", maxlength: 255 });
    const complaint = h("span.complaint.bubble", { role: "alert", hidden: true });
    let over = false;
    let asking = false;
    const end = (answer) => {
      if (over) return;
      over = true;
      row.editing = false;
      row.draggable = true;
      const held = document.activeElement === input;
      input.remove();
      complaint.remove();
      name.hidden = false;
      if (held) $("view").focus({ preventScroll: true });
      resolve(answer);
    };
    const complain = (text) => {
      complaint.hidden = text === "";
      complaint.textContent = text;
      input.setAttribute("aria-invalid", String(text !== ""));
    };
    const finish = async (leaving) => {
      if (over || asking) return;
      const text = input.value;
      const wrong = check(text);
      if (wrong) return leaving ? end(null) : complain(wrong);
      asking = true;
      input.readOnly = true;
      try {
        end((await submit(text)) ?? text);
      } catch (failure) {
        asking = false;
        input.readOnly = false;
        complain(sentenceOf(failure));
        input.focus();
      }
      return undefined;
    };
    input.addEventListener("input", () => complain(""));
    input.addEventListener("blur", () => finish(true));
    input.addEventListener("keydown", (event) => {
      event.stopPropagation();
      if (event.key === "Escape") end(null);
      if (event.key !== "Enter") return;
      event.preventDefault();
      finish(false);
    });
    // Clicks in the field are not clicks on the row.
    for (const kind of ["click", "dblclick", "contextmenu"]) input.addEventListener(kind, (event) => event.stopPropagation());
    row.editing = true; // see the view: the row keeps what it holds
    row.draggable = false;
    name.hidden = true;
    name.after(input, complaint);
    input.focus({ preventScroll: true });
    input.setSelectionRange(0, selectTo);
  });
}
