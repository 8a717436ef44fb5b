// How an archive is to be made: its name, format and password.

import { dialog } from "./dialogs.js";
import { h } from "./dom.js";
import "./later.js";
import { t } from "./strings.js";

const FORMATS = ["zip", "7z", "tar.gz", "tar.xz", "tar.zst"];
const ENDING = /\.(zip|7z|tar\.gz|tar\.xz|tar\.zst)$/i;

// {name, format, password}, null when nothing is to be made. `check(name)` gives a complaint or "".
export function askPack({ count, stem, check }) {
  return dialog({
    title: t("compress.title", { count }),
    fill: (close) => {
      const name = h("input.input", { type: "text", name: "name", value: `${stem}.zip`, autofocus: true, spellcheck: "false", autocomplete: "off", maxlength: 255 });
      const format = h(
        "select.input",
        { name: "format" },
        FORMATS.map((one) => h("option", { value: one }, t(`compress.format.${one}`))),
      );
      // Shown while it is typed: nobody else can say later what it was.
      const password = h("input.input", { type: "text", name: "password", autocomplete: "off", spellcheck: "false", maxlength: 255 });
      const complaint = h("span.complaint", { role: "alert" });
      const locks = h("label.field", {}, h("span", {}, t("compress.password")), password, h("span.soft", {}, t("compress.password.hint")));
      const bare = () => name.value.replace(ENDING, "");
      format.addEventListener("change", () => {
        name.value = `${bare()}.${format.value}`;
        locks.hidden = format.value !== "zip";
      });
      name.addEventListener("input", () => complaint.replaceChildren());
      name.addEventListener("focus", () => name.setSelectionRange(0, bare().length), { once: true });
      const submit = (event) => {
        event.preventDefault();
        const full = name.value.toLowerCase().endsWith(`.${format.value}`) ? name.value : `${name.value}.${format.value}`;
        const wrong = check(name.value) || check(full);
        if (wrong) complaint.textContent = wrong;
        else close({ name: full, format: format.value, password: (format.value === "zip" && password.value) || undefined });
      };
      return [
        h(
          "form",
          { onsubmit: submit },
          h("label.field", {}, h("span", {}, t("name.label")), name, complaint),
          h("label.field", {}, h("span", {}, t("compress.format")), format),
          locks,
          h(
            "footer",
            {},
            h("button.button", { type: "button", onclick: () => close(null) }, t("dialog.cancel")),
            h("button.button.primary", { type: "submit" }, t("compress.action")),
          ),
        ),
      ];
    },
  });
}
