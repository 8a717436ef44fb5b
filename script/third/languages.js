// Languages by the extensions, or names, of their files. Each is loaded when a file asks for it.
import { LanguageSupport, StreamLanguage } from "@codemirror/language";

const old = (mode) => new LanguageSupport(StreamLanguage.define(mode));

const LANGUAGES = [
  ["js mjs cjs jsx ts tsx mts", (name) => import("@codemirror/lang-javascript").then((m) => m.javascript({ jsx: /x$/.test(name), typescript: /\.m?tsx?$/.test(name) }))],
  ["css", () => import("@codemirror/lang-css").then((m) => m.css())],
  ["html htm xhtml vue", () => import("@codemirror/lang-html").then((m) => m.html())],
  ["json jsonc webmanifest", () => import("@codemirror/lang-json").then((m) => m.json())],
  ["xml svg xsl xsd rss plist", () => import("@codemirror/lang-xml").then((m) => m.xml())],
  ["py pyw", () => import("@codemirror/lang-python").then((m) => m.python())],
  ["md markdown readme", () => import("@codemirror/lang-markdown").then((m) => m.markdown())],
  ["c h cc cpp cxx hpp hh", () => import("@codemirror/lang-cpp").then((m) => m.cpp())],
  ["java", () => import("@codemirror/lang-java").then((m) => m.java())],
  ["php", () => import("@codemirror/lang-php").then((m) => m.php())],
  ["rs", () => import("@codemirror/lang-rust").then((m) => m.rust())],
  ["go", () => import("@codemirror/lang-go").then((m) => m.go())],
  ["sql", () => import("@codemirror/lang-sql").then((m) => m.sql())],
  ["yaml yml", () => import("@codemirror/lang-yaml").then((m) => m.yaml())],
  ["sh bash zsh bashrc profile", () => import("@codemirror/legacy-modes/mode/shell").then((m) => old(m.shell))],
  ["toml", () => import("@codemirror/legacy-modes/mode/toml").then((m) => old(m.toml))],
  ["ini conf cfg properties desktop service", () => import("@codemirror/legacy-modes/mode/properties").then((m) => old(m.properties))],
  ["dockerfile", () => import("@codemirror/legacy-modes/mode/dockerfile").then((m) => old(m.dockerFile))],
  ["rb", () => import("@codemirror/legacy-modes/mode/ruby").then((m) => old(m.ruby))],
  ["pl pm", () => import("@codemirror/legacy-modes/mode/perl").then((m) => old(m.perl))],
  ["lua", () => import("@codemirror/legacy-modes/mode/lua").then((m) => old(m.lua))],
  ["diff patch", () => import("@codemirror/legacy-modes/mode/diff").then((m) => old(m.diff))],
  ["ps1 psm1", () => import("@codemirror/legacy-modes/mode/powershell").then((m) => old(m.powerShell))],
  ["cs", () => import("@codemirror/legacy-modes/mode/clike").then((m) => old(m.csharp))],
  ["kt kts", () => import("@codemirror/legacy-modes/mode/clike").then((m) => old(m.kotlin))],
  ["swift", () => import("@codemirror/legacy-modes/mode/swift").then((m) => old(m.swift))],
  ["cmake cmakelists.txt", () => import("@codemirror/legacy-modes/mode/cmake").then((m) => old(m.cmake))],
  ["tex", () => import("@codemirror/legacy-modes/mode/stex").then((m) => old(m.stex))],
];

const BY_NAME = new Map(LANGUAGES.flatMap(([names, load]) => names.split(" ").map((name) => [name, load])));

// The language of a file called `name`, null for none that is known.
export async function languageOf(name) {
  const plain = name.toLowerCase();
  const load = BY_NAME.get(plain.replace(/^\./, "")) ?? BY_NAME.get(plain.slice(plain.lastIndexOf(".") + 1));
  return load ? load(plain) : null;
}
