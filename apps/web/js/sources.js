// Where the rows of a list come from: a folder, or a search.

import { ApiError, get, MISSING } from "./api.js";
import { entryOf } from "./entries.js";
import { Listing } from "./listing.js";
import { lastOf, parentOf, patternOf } from "./path.js";

const ADDITIONAL = "size,time,owner,perm,mount_point_type,icon";

function orderOf({ by, ascending }) {
  return { sort_by: by, sort_direction: ascending ? "asc" : "desc" };
}

// Folders come first whichever way the rest is sorted: descending, they are a list of their own.
export function folderListing(id, { sort, filter }, onChange) {
  const parts = sort.ascending ? ["all"] : ["dir", "file"];
  const pattern = filter === "" ? undefined : `*${filter.replace(/[,\\]/g, "?")}*`;
  const asked = { action: "folder", path_raw: id, pattern, additional: ADDITIONAL, ...orderOf(sort) };
  const fetchPart = async (filetype, offset, limit, signal) => {
    const reply = await get("list", { ...asked, filetype, offset, limit }, signal);
    return { total: reply.total, items: reply.items.map(entryOf) };
  };
  return new Listing(parts, fetchPart, onChange);
}

// What a search has found so far; `extra` of the listing tells whether it goes on.
export function searchResults(taskid, { sort, filter, kind }, onChange) {
  const asked = { action: "list", taskid, filter: filter || undefined, additional: ADDITIONAL, ...orderOf(sort) };
  const fetchPart = async (filetype, offset, limit, signal) => {
    const reply = await get("search", { ...asked, filetype, offset, limit }, signal).catch((failure) => {
      throw failure.code === MISSING ? new ApiError({ key: "page:search_gone" }) : failure;
    });
    return { ...reply, items: reply.items.map(entryOf) };
  };
  return new Listing([kind], fetchPart, onChange);
}

// One entry of a folder; nothing when there is none.
export async function entryAt(id) {
  const asked = { action: "folder", path_raw: parentOf(id), pattern: patternOf(lastOf(id)), additional: ADDITIONAL };
  return (await get("list", asked)).items.map(entryOf).find((entry) => entry.id === id);
}
