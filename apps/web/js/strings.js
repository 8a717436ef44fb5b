// Texts of the page, by language. A key that is nowhere shows as itself.

import { plainName } from "./dom.js";
import { pref, setPref } from "./prefs.js";

export const LANGUAGES = { en: "English", de: "Deutsch" };

const table = {};
export let language = "en";
export let locale = "en";

export async function loadStrings() {
  const wanted =
    pref("language", null) ?? navigator.languages.map((tag) => tag.slice(0, 2)).find((tag) => tag in LANGUAGES);
  language = wanted in LANGUAGES ? wanted : "en";
  await addTexts("");
  // Dates and numbers as the browser's own region writes them, where it speaks the language.
  locale = navigator.languages.find((tag) => tag.startsWith(language)) ?? language;
  document.documentElement.lang = language;
}

// Adds the texts that lie in a folder of their own: what the page starts with waits for no others.
export async function addTexts(folder) {
  const response = await fetch(new URL(`../strings/${folder}${language}.json`, import.meta.url));
  Object.assign(table, await response.json());
}

export function changeLanguage(name) {
  setPref("language", name);
  location.reload();
}

export function has(key) {
  return key in table;
}

// Fills {name} in the text; characters that would hide or turn it show as marks. A table entry {"one": ..., "other": ...} is chosen by the parameter `count`.
export function t(key, parameters = {}) {
  let text = table[key] ?? key;
  if (typeof text === "object") text = text[new Intl.PluralRules(language).select(parameters.count)] ?? text.other;
  return text.replace(/\{(\w+)\}/g, (whole, name) => {
    const value = parameters[name];
    if (value === undefined) return whole;
    return typeof value === "number" ? value.toLocaleString(locale) : plainName(value);
  });
}
