// Where the rows of a list come from: a folder, or a search.

import { ApiError, get, MISSING } from "./api.js";
import { breathe } from "./dom.js";
import { entryOf } from "./entries.js";
import { Listing, PAGE } from "./listing.js";
import { inBothForms, lastOf, parentOf, patternOf } from "./path.js";

const ADDITIONAL = "size,time,owner,perm,mount_point_type,icon";
const BRIEF = { additional: undefined };
const LONGEST_PAGE = 10_000; // of search results
const SLICE = 2000; // entries that are made at once: the page stays free in between

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
  return new Listing(parts, fetchPart, onChange);
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

// One entry of a folder; nothing when there is none.
export async function entryAt(id) {
  const asked = { action: "folder", path_raw: parentOf(id), pattern: patternOf(lastOf(id)), additional: ADDITIONAL };
  return (await get("list", asked)).items.map(entryOf).find((entry) => entry.id === id);
}
