// The keyboard: moving in the list, shortcuts, finding by typing.

import { browser } from "./browser.js";
import { allCommands, context, keysOf, runCommand } from "./commands.js";
import { $ } from "./dom.js";
import { rowBeginning } from "./sources.js";
import { t } from "./strings.js";

const TYPING_PAUSE = 900; // after which a letter begins a new word
const TYPED_SHOWS = 4000;
const TYPING_GAP = 200; // in which the next letter mostly comes
let typed = "";
let typedAt = 0;

export function setupKeys() {
  $("view").addEventListener("keydown", (event) => {
    if (event.target !== $("view")) return;
    if (moved(event) || typeAhead(event)) event.preventDefault();
  });
  addEventListener("keydown", shortcut);
  // Where the keyboard stands shows to who uses it.
  addEventListener("keydown", () => document.body.classList.add("keyed"), true);
  addEventListener("pointerdown", () => document.body.classList.remove("keyed"), true);
}

function shortcut(event) {
  if (event.defaultPrevented || document.querySelector("dialog[open], .menu")) return;
  const writing = event.target.closest?.("input:not([type=checkbox]), textarea, select, [contenteditable]");
  const found = allCommands().find((command) => keysOf(command).some((keys) => matches(event, keys)));
  if (!found || (writing && !event.ctrlKey && !event.metaKey && !event.altKey)) return;
  if (writing && ["selectAll", "copy", "cut", "paste", "undo"].includes(found.id)) return;
  // A plain key on a button or a link is that button's.
  const onControl = event.target.closest?.("button, a, [role=treeitem]");
  if (onControl && ["Enter", " "].includes(event.key)) return;
  // What is chosen in the list is not what the keyboard stands on in the tree.
  if (found.group === "change" && found.id !== "undo" && event.target.closest?.("[role=tree]")) return;
  if (!found.when(context())) return;
  event.preventDefault();
  runCommand(found.id);
}

function matches(event, keys) {
  const wanted = new Set(keys.split("+"));
  const mod = event.ctrlKey || event.metaKey;
  const key = [...wanted].at(-1);
  // With Alt the key itself counts: some systems make another character of it.
  const pressed = event.altKey ? event.code.replace(/^(Key|Digit)/, "").toLowerCase() : event.key.toLowerCase();
  return (
    mod === wanted.has("Mod") &&
    event.altKey === wanted.has("Alt") &&
    event.shiftKey === (wanted.has("Shift") || (event.shiftKey && key === "?")) &&
    (event.key === key || pressed === key)
  );
}

function moved(event) {
  const { listing, selection, view } = browser;
  if (!listing?.ready || listing.total === 0 || event.altKey) return false;
  const across = view.shape.across;
  const page = view.linesPerPage() * across;
  const { cursor } = selection;
  const steps = {
    ArrowDown: cursor + across,
    ArrowUp: cursor - across,
    Home: 0,
    End: listing.total - 1,
    PageDown: cursor + page,
    PageUp: cursor - page,
  };
  if (across > 1) Object.assign(steps, { ArrowRight: cursor + 1, ArrowLeft: cursor - 1 });
  if (event.key === " " && (event.ctrlKey || event.metaKey)) {
    selection.pick(cursor, { ctrl: true });
    return true;
  }
  if (!(event.key in steps)) return false;
  // The first key after arriving chooses the first row instead of jumping over it.
  const fresh =
    selection.count === 0 && cursor === 0 && ["ArrowDown", "ArrowRight"].includes(event.key) && !event.shiftKey;
  const index = fresh ? 0 : Math.min(listing.total - 1, Math.max(0, steps[event.key]));
  if (event.ctrlKey && !event.shiftKey) selection.move(index);
  else selection.pick(index, { shift: event.shiftKey, ctrl: event.ctrlKey });
  view.reveal(index);
  return true;
}

// Letters jump to the next name that begins with them; what is looked for shows as long as it is being typed.
function typeAhead(event) {
  const { listing, selection } = browser;
  if (!listing?.ready || event.ctrlKey || event.metaKey || event.altKey) return false;
  const now = event.timeStamp; // however long the page was busy since
  const continued = now - typedAt < TYPING_PAUSE && typed !== "";
  // As long as one sees what was typed, the last letter can be taken back.
  const back = event.key === "Backspace" && typed !== "" && !$("typed").hidden;
  if (!back && (event.key.length !== 1 || "/?".includes(event.key) || (event.key === " " && !continued))) return false;
  typed = back ? typed.slice(0, -1) : continued ? typed + event.key : event.key;
  typedAt = now;
  showTyped(typed);
  const repeated = [...typed].every((letter) => letter === typed[0]);
  if (typed !== "") jump(repeated ? typed[0] : typed, selection.cursor + (repeated || typed.length === 1 ? 1 : 0));
  return true;
}

let shownTimer = null;

function showTyped(text, words = "jump.to") {
  clearTimeout(shownTimer);
  $("typed").hidden = text === "";
  $("typed").textContent = text === "" ? "" : t(words, { text });
  shownTimer = setTimeout(showTyped, TYPED_SHOWS, "");
}

let jumps = 0;

// The list that the server keeps is asked: no browser compares names as the server does.
async function jumpInKept(text, start, mine) {
  const { listing, selection, view } = browser;
  await new Promise((resolve) => setTimeout(resolve, TYPING_GAP / 2));
  if (mine !== jumps) return;
  showTyped(text, "jump.looking");
  clearTimeout(shownTimer);
  const row = await rowBeginning(listing, text, start % Math.max(1, listing.total)).catch(() => -1);
  const entry = row < 0 ? undefined : await listing.at(row);
  if (mine !== jumps || listing !== browser.listing) return;
  showTyped(text, entry ? "jump.to" : "jump.none");
  if (!entry) return;
  selection.only(entry, row);
  view.reveal(row, "center");
}

async function jump(text, start) {
  const mine = ++jumps;
  const { listing, selection, view } = browser;
  if (listing.kept) return jumpInKept(text, start, mine);
  const wanted = text.toLowerCase();
  const begins = (entry) => entry.name.toLowerCase().startsWith(wanted);
  let index = listing.find(begins, start % Math.max(1, listing.total));
  let entry = listing.item(index);
  if (index < 0 && !listing.loaded(0, listing.total - 1)) {
    // Most of a long list has never been fetched; while somebody types on, nobody asks.
    await new Promise((resolve) => setTimeout(resolve, TYPING_GAP));
    if (mine !== jumps) return;
    showTyped(text, "jump.looking");
    clearTimeout(shownTimer);
    const all = await listing.allNames().catch(() => []);
    index = all.findIndex(begins);
    entry = all[index];
  }
  if (mine !== jumps || listing !== browser.listing) return;
  showTyped(text, index < 0 ? "jump.none" : "jump.to");
  if (index < 0) return;
  selection.only(entry, index);
  view.reveal(index, "center");
}
