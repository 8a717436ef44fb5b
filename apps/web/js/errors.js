// Failures in words: what happened, to which file, what to do.

import { has, t } from "./strings.js";

const DENIED = new Set([407, 409]);

// {title, hint, why}: "why" when the reason of the refusal can be asked for.
export function describe(failure, path = failure.path) {
  const name = nameIn(path ?? "") || "/";
  const key = [`code:${failure.code}`, failure.key].find((one) => one && has(one)) ?? "page:unknown";
  const hint = `${key}.hint`;
  return {
    title: t(key, { name, code: failure.code ?? 0 }),
    hint: has(hint) ? t(hint, { name, code: failure.code ?? 0 }) : "",
    why: DENIED.has(failure.code),
  };
}

// What happened and what to do, where there is one line for both.
export function sentenceOf(failure) {
  const { title, hint } = describe(failure);
  return hint ? `${title}. ${hint}` : title;
}

function nameIn(path) {
  return path.slice(path.lastIndexOf("/") + 1) || path;
}
