// Where the rows of a list come from: a folder, or a search.

import { ApiError, get, MISSING, post } from "./api.js";
import { breathe } from "./dom.js";
import { entryOf } from "./entries.js";
import { emit } from "./events.js";
import { Listing, PAGE } from "./listing.js";
import { encodeName, inBothForms, inForms, lastOf, parentOf, patternOf, splitExtension } from "./path.js";
import { language } from "./strings.js";

export const ADDITIONAL = "size,time,owner,perm,mount_point_type,icon";
const BESIDE = "access,links"; // what else comes with a folder's list
const BRIEF = { additional: undefined };
const LONGEST_PAGE = 10_000; // of search results
const SLICE = 2000; // entries that are made at once: the page stays free in between

let beside = `${BESIDE},above`; // with the first one also what the tree shows

async function entriesOf(items) {
  const entries = [];
  for (let i = 0; i < items.length; i += SLICE) {
    if (i > 0) await breathe();
    for (const item of items.slice(i, i + SLICE)) entries.push(entryOf(item));
  }
  return entries;
}

function orderOf({ by, ascending }) {
  return { sort_by: by, sort_direction: ascending ? "asc" : "desc" };
}

// Folders come first whichever way the rest is sorted: descending, they are a list of their own.
export function folderListing(id, { sort, filter }, onChange) {
  const parts = sort.ascending ? ["all"] : ["dir", "file"];
  const pattern = filter === "" ? undefined : inBothForms(`*${filter.replace(/[,\\]/g, "?")}*`);
  const asked = { action: "folder", path_raw: id, pattern, additional: ADDITIONAL, ...orderOf(sort) };
  const fetchPart = async (filetype, { offset, limit, brief, signal }) => {
    const reply = await get("list", { ...asked, filetype, offset, limit, ...(brief && BRIEF) }, signal);
    return { total: reply.total, items: await entriesOf(reply.items) };
  };
  const listing = new Listing(["all"], null, onChange);
  listing.fetchPart = keptPages(listing, asked, () => listing.become(parts, fetchPart));
  listing.folder = id;
  return listing;
}

// Pages of a list that the server keeps from the first one on. `unkept`: it cannot.
function keptPages(listing, asked, unkept) {
  let keeping = null;
  const keep = async (page, signal) => {
    const order = { keep: 1, natural: language, folders_first: 1, with: beside };
    const reply = await get("list", { ...asked, ...order, ...page }, signal);
    beside = BESIDE;
    for (const [word, answer] of Object.entries(reply.with ?? {})) emit(`came-${word}`, { id: asked.path_raw, answer });
    if (!reply.listing) {
      await unkept();
      return listing.fetchPart(listing.parts[0].part, page);
    }
    listing.kept = reply.listing;
    return { ...reply, items: await entriesOf(reply.items) };
  };
  return async (_part, { offset, limit, brief, signal }) => {
    while (listing.kept === null) {
      if (keeping !== null) {
        await keeping.catch(() => {});
        continue;
      }
      keeping = keep({ offset, limit, ...(brief && BRIEF) }, signal);
      try {
        return await keeping;
      } finally {
        keeping = null;
      }
    }
    const page = { action: "page", listing: listing.kept, offset, limit, additional: brief ? undefined : ADDITIONAL };
    const reply = await get("list", page, signal);
    return { ...reply, items: await entriesOf(reply.items) };
  };
}

// The row of a name (encoded) in a list that is kept; -1 when it has none.
export async function rowsOfNames(listing, names) {
  const rows = [];
  for (const lines of inForms(names)) {
    const asked = { action: "rows", listing: listing.kept, names_raw: lines.join("\n") };
    rows.push(...(await post("list", asked)).rows);
  }
  return rows;
}

// The first row from `from` on, and round, whose name begins so; -1.
export async function rowBeginning(listing, text, from) {
  const asked = { action: "find", listing: listing.kept, prefix_raw: encodeName(text), from };
  return (await get("list", asked)).row;
}

// What somebody may come back to is not let go.
export async function renewKept(known) {
  const ids = [...new Set(known.filter(Boolean))];
  if (ids.length > 0) await get("list", { action: "renew", listing: ids.join(",") }).catch(() => {});
}

// The page that a search's list asks for first, before anything is filtered.
export function firstPage(sort) {
  return { filter: undefined, additional: ADDITIONAL, ...orderOf(sort), filetype: "all", offset: 0, limit: PAGE };
}

// The reply that starts a search may carry that page. It is used once, for what it was asked for.
let kept = null;

export function keepFirstPage(taskid, asked, reply) {
  kept = { key: JSON.stringify([taskid, asked]), reply };
}

function takeFirstPage(taskid, asked) {
  if (kept?.key !== JSON.stringify([taskid, asked])) return null;
  const { reply } = kept;
  kept = null;
  return reply;
}

// What a search has found so far; `extra` of the listing tells whether it goes on.
export function searchResults(taskid, { sort, filter, kind }, onChange) {
  const asked = { filter: filter || undefined, additional: ADDITIONAL, ...orderOf(sort) };
  const fetchPart = async (filetype, { offset, limit, brief, signal }) => {
    const page = { ...asked, filetype, offset, limit: limit || LONGEST_PAGE, ...(brief && BRIEF) };
    const fetchPage = () =>
      get("search", { action: "list", taskid, ...page }, signal).catch((failure) => {
        throw failure.code === MISSING ? new ApiError({ key: "page:search_gone" }) : failure;
      });
    const reply = takeFirstPage(taskid, page) ?? (await fetchPage());
    return { ...reply, items: await entriesOf(reply.items) };
  };
  return new Listing([kind], fetchPart, onChange, LONGEST_PAGE);
}

// What lies in the recycle bins of all shares.
export function deletedListing({ sort, filter }, onChange) {
  const pattern = filter === "" ? undefined : inBothForms(`*${filter.replace(/[,\\]/g, "?")}*`);
  const asked = { action: "deleted", pattern, ...orderOf(sort) };
  const fetchPart = async (filetype, { offset, limit, signal }) => {
    const reply = await get("list", { ...asked, filetype, offset, limit: limit || LONGEST_PAGE }, signal);
    const iconOf = ({ name }) => `${splitExtension(name)[1].slice(1).toLowerCase()}.png`;
    const items = reply.items.map((item) => (item.isdir ? item : { ...item, icon: iconOf(item) }));
    return { ...reply, items: await entriesOf(items), finished: true };
  };
  return new Listing(["all"], fetchPart, onChange, LONGEST_PAGE);
}

// One entry of a folder; nothing when there is none.
export async function entryAt(id) {
  const asked = { action: "folder", path_raw: parentOf(id), pattern: patternOf(lastOf(id)), additional: ADDITIONAL };
  return (await get("list", asked)).items.map(entryOf).find((entry) => entry.id === id);
}
