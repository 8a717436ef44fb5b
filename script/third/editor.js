export { Compartment, EditorSelection, EditorState } from "@codemirror/state";
export { drawSelection, EditorView, highlightActiveLine, highlightSpecialChars, keymap, lineNumbers } from "@codemirror/view";
export { defaultKeymap, history, historyKeymap, indentWithTab } from "@codemirror/commands";
export { bracketMatching, indentOnInput, syntaxHighlighting } from "@codemirror/language";
export { openSearchPanel, search, searchKeymap } from "@codemirror/search";
export { MergeView, unifiedMergeView } from "@codemirror/merge";
export { classHighlighter } from "@lezer/highlight";
export { languageOf } from "./languages.js";
