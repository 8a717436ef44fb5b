// The box that filters the folder on screen, and from which a search below it starts.

import { browser, setFilter, setKind } from "./browser.js";
import { $ } from "./dom.js";
import { on } from "./events.js";
import { searchFor } from "./search.js";

export function clearFilter() {
  $("find").value = "";
  if (document.activeElement !== $("find")) document.querySelector(".top").classList.remove("finding");
  if (browser.kind !== "all") setKind("all");
  setFilter("");
}

export function setupFind() {
  const input = $("find");
  let timer = null;
  input.addEventListener("input", () => {
    clearTimeout(timer);
    if (browser.id !== "/") timer = setTimeout(() => setFilter(input.value.trim()), 180);
  });
  input.addEventListener("keydown", (event) => {
    if (event.key === "Escape") {
      clearFilter();
      $("view").focus();
    }
    if (event.key === "ArrowDown") $("view").focus();
    // Here is only what lies in this folder: Enter looks below it, and from the start in all shares.
    if (event.key === "Enter" && input.value.trim() !== "") {
      clearTimeout(timer);
      searchFor(input.value.trim());
    }
  });
  $("find-clear").addEventListener("click", () => {
    clearTimeout(timer);
    clearFilter();
    input.focus();
  });
  on("clear-filter", clearFilter);
  on("place", () => {
    clearTimeout(timer);
    input.value = "";
    document.querySelector(".top").classList.remove("finding");
  });
}
