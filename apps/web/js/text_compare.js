// Two states of one text beside each other, and which of them it shall be.

import { dialog } from "./dialogs.js";
import { h } from "./dom.js";
import "./later.js";
import { t } from "./strings.js";
import { lookOf, shadowBox } from "./text_view.js";

const NARROW = 700; // CSS pixels: one column below that

// "mine", "theirs", "both", or null for going on with the text as it is.
export function compareTexts(library, { name, theirs, mine }) {
  const box = h("div.compare-box");
  const answer = dialog({
    title: t("compare.title", { name }),
    className: "compare",
    wide: true,
    fill: (close) => [
      h("p.body", {}, t("compare.text")),
      h("div.compare-heads", {}, h("b", {}, t("compare.theirs")), h("b", {}, t("compare.mine"))),
      box,
      h(
        "footer",
        {},
        h("button.button", { type: "button", onclick: () => close(null) }, t("compare.on")),
        ["theirs", "mine"].map((which) =>
          h("button.button.outlined", { type: "button", onclick: () => close(which) }, t(`compare.take_${which}`)),
        ),
        h("button.button.primary", { type: "button", onclick: () => close("both") }, t("editor.keep_both")),
      ),
    ],
  });
  const view = show(library, box, theirs, mine);
  return answer.finally(() => view.destroy());
}

function show(library, box, theirs, mine) {
  const { EditorState, EditorView, MergeView, unifiedMergeView } = library;
  const root = shadowBox(box);
  const extensions = (label) => [
    lookOf(library),
    EditorState.readOnly.of(true),
    EditorView.contentAttributes.of({ "aria-label": t(label) }),
  ];
  const collapseUnchanged = { margin: 3, minSize: 6 };
  if (innerWidth < NARROW) {
    box.classList.add("unified");
    const merged = unifiedMergeView({ original: theirs, mergeControls: false, collapseUnchanged });
    return new EditorView({ root, parent: root, state: EditorState.create({ doc: mine, extensions: [extensions("compare.mine"), merged] }) });
  }
  return new MergeView({
    root,
    parent: root,
    a: { doc: theirs, extensions: extensions("compare.theirs") },
    b: { doc: mine, extensions: extensions("compare.mine") },
    collapseUnchanged,
  });
}
