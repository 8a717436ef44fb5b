// The pieces of a text with the class that colours each: [[text, "tok-keyword"], ...].
import { classHighlighter, highlightCode } from "@lezer/highlight";
import { languageOf } from "./languages.js";

export async function colour(name, text) {
  const support = await languageOf(name);
  if (!support) return null;
  const pieces = [];
  highlightCode(
    text,
    support.language.parser.parse(text),
    classHighlighter,
    (piece, classes) => pieces.push([piece, classes]),
    () => pieces.push(["\n", ""]),
  );
  return pieces;
}
