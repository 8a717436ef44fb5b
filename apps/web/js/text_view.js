// CodeMirror in this page: loaded when it is asked for, in a shadow tree, where its rules need no style element.

import { h, loadStyle } from "./dom.js";
import "./later.js";
import { t } from "./strings.js";

let loading = null;

export function loadEditor() {
  loading ??= import("../third/editor.js");
  loading.catch(() => (loading = null));
  loadStyle("documents");
  return loading;
}

const NAMES = ["Find", "Replace", "next", "previous", "all", "match case", "regexp", "by word", "replace", "replace all", "close", "Control character"];

export function themeOf({ EditorView }) {
  const colours = {
    "keyword, .tok-operatorKeyword": "--code-keyword",
    "string, .tok-string2, .tok-inserted": "--code-string",
    "comment": "--code-comment",
    "number, .tok-bool, .tok-atom, .tok-literal": "--code-number",
    "typeName, .tok-className, .tok-namespace": "--code-type",
    "propertyName, .tok-attributeName, .tok-labelName": "--code-property",
    "deleted, .tok-invalid": "--danger",
    "link, .tok-url": "--accent-text",
  };
  return EditorView.theme({
    "&": { height: "100%", color: "var(--text)", backgroundColor: "var(--ground)", fontSize: "13.5px" },
    "&.cm-focused": { outline: "none" },
    ".cm-scroller": { fontFamily: "var(--mono)", lineHeight: "1.5" },
    ".cm-content": { caretColor: "var(--text)", padding: "8px 0" },
    ".cm-gutters": { backgroundColor: "var(--ground-side)", color: "var(--text-faint)", border: "0" },
    ".cm-activeLine, .cm-activeLineGutter": { backgroundColor: "var(--ground-hover)" },
    "&.cm-focused > .cm-scroller > .cm-selectionLayer .cm-selectionBackground, .cm-selectionBackground": {
      background: "var(--chosen)",
    },
    ".cm-cursor": { borderLeftColor: "var(--text)" },
    ".cm-panels": { backgroundColor: "var(--ground-side)", color: "var(--text)" },
    ".cm-panels input, .cm-panels button": { font: "inherit", color: "inherit" },
    ".cm-button": { background: "var(--ground-raised)", border: "1px solid var(--line-strong)" },
    ".cm-textfield": { background: "var(--ground)", border: "1px solid var(--line-strong)" },
    ".cm-specialChar": { color: "var(--warn)" },
    ".cm-changedLine, .cm-inlineChangedLine": { backgroundColor: "var(--good-ground) !important" },
    ".cm-deletedChunk, &.cm-merge-a .cm-changedLine": { backgroundColor: "var(--danger-ground) !important" },
    ...Object.fromEntries(Object.entries(colours).map(([names, colour]) => [`.tok-${names}`, { color: `var(${colour})` }])),
    ".tok-heading, .tok-strong": { fontWeight: "600" },
    ".tok-emphasis": { fontStyle: "italic" },
  });
}

// What every text shows, read or written.
export function lookOf(library) {
  const { classHighlighter, drawSelection, EditorState, EditorView, highlightSpecialChars, lineNumbers, syntaxHighlighting } = library;
  return [
    lineNumbers(),
    highlightSpecialChars(),
    drawSelection(),
    syntaxHighlighting(classHighlighter),
    EditorView.lineWrapping,
    EditorState.phrases.of(Object.fromEntries(NAMES.map((name) => [name, t(`editor.cm.${name}`)]))),
    themeOf(library),
  ];
}

// The tree of a new box.
export function shadowBox(parent) {
  const host = h("div.text-box");
  parent.replaceChildren(host);
  return host.attachShadow({ mode: "open" });
}

export function textView(library, { parent, text, name, separator, readOnly, onChange }) {
  const { EditorView, EditorState, Compartment, keymap, defaultKeymap, history, historyKeymap, indentWithTab } = library;
  const { bracketMatching, highlightActiveLine, indentOnInput, languageOf, openSearchPanel, search, searchKeymap } = library;
  const root = shadowBox(parent);
  const language = new Compartment();
  const view = new EditorView({
    root,
    parent: root,
    state: EditorState.create({
      doc: text,
      extensions: [
        lookOf(library),
        EditorState.lineSeparator.of(separator),
        EditorState.readOnly.of(readOnly),
        EditorView.contentAttributes.of({ "aria-label": t("editor.text", { name }) }),
        EditorView.updateListener.of((update) => update.docChanged && onChange()),
        history(),
        highlightActiveLine(),
        bracketMatching(),
        indentOnInput(),
        search({ top: true }),
        language.of([]),
        keymap.of([...defaultKeymap, ...historyKeymap, ...searchKeymap, indentWithTab]),
      ],
    }),
  });
  languageOf(name).then((found) => found && view.dispatch({ effects: language.reconfigure(found) }), () => {});
  return {
    text: () => view.state.sliceDoc(),
    focus: () => view.focus(),
    find: () => openSearchPanel(view),
    goTo: (at) => {
      view.dispatch({ selection: { anchor: positionOf(view, at, separator) }, scrollIntoView: true });
      view.focus();
    },
    destroy: () => view.destroy(),
  };
}

// Where a place of the text lies for the view, which counts every line's end as one.
function positionOf(view, at, separator) {
  const lines = view.state.sliceDoc().slice(0, at).split(separator);
  return view.state.doc.line(lines.length).from + lines.at(-1).length;
}
