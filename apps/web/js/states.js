// What stands in place of a list: nothing there, nothing found, failed.

import { h, icon } from "./dom.js";
import { describe } from "./errors.js";
import { t } from "./strings.js";

function state(iconName, title, text, actions = [], failed = false) {
  const node = h(
    "section.state",
    { role: failed ? "alert" : "status" },
    h("div.picture", {}, icon(iconName)),
    h("h2", {}, title),
    text && h("p", {}, text),
    actions.length > 0 &&
      h(
        "div.actions",
        {},
        actions.map(({ label, run, kind = "outlined" }) =>
          h(`button.button.${kind}`, { type: "button", onclick: run }, label),
        ),
      ),
  );
  node.classList.toggle("failed", failed);
  return node;
}

export function emptyFolder({ canWrite, upload, newFolder }) {
  return state(
    "folder-open",
    t("empty.folder"),
    canWrite ? t("empty.folder.hint") : "",
    canWrite
      ? [
          { label: t("command.upload"), run: upload },
          { label: t("command.newFolder"), run: newFolder },
        ]
      : [],
  );
}

export function emptyBin() {
  return state("trash", t("empty.bin"), t("empty.bin.hint"));
}

export function nothingFound(text, clear, searchBelow) {
  const actions = [{ label: t("filter.clear"), run: clear }];
  if (searchBelow) actions.push({ label: t("filter.below"), run: searchBelow });
  return state("search", text === "" ? t("empty.kind") : t("empty.filter", { text }), t("empty.filter.hint"), actions);
}

export function nothingMatches(refine) {
  return state("search", t("empty.search"), t("empty.search.hint"), [{ label: t("search.refine"), run: refine }]);
}

export function stillSearching() {
  const node = state("search", t("search.running"), t("search.running.hint"));
  node.classList.add("patient");
  return node;
}

export function noShares() {
  return state("lock", t("empty.shares"), t("empty.shares.hint"));
}

export function failedState(failure, path, { retry, back, why }) {
  const said = describe(failure, path);
  const icons = { 407: "lock", 408: "search", 410: "offline" };
  const out = failure.key === "page:logged_out";
  const actions = [out ? { label: t("state.login"), run: () => location.reload() } : { label: t("state.retry"), run: retry }];
  if (back) actions.unshift({ label: t("state.back"), run: back });
  if (said.why && why) actions.push({ label: t("why.ask"), run: why });
  return state(icons[failure.code] ?? "warning", said.title, said.hint, actions, true);
}

// Above a list that could not be asked for again: what it shows is as it was.
export function staleNotice(failure, retry) {
  return [
    icon("offline", "icon small"),
    h("span.grow", {}, t("stale.text", { what: describe(failure).title })),
    failure.key === "page:logged_out"
      ? h("button.button", { type: "button", onclick: () => location.reload() }, t("state.login"))
      : h("button.button", { type: "button", onclick: retry }, t("state.retry")),
  ];
}
