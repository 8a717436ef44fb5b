// What the server would refuse here, asked beforehand: what cannot work is not offered.

import { get } from "./api.js";
import { arrived, emit, on } from "./events.js";
import { isSearch, shareOf } from "./path.js";

const asked = new Map(); // id -> what the program "why" answered, or null while it has not

export function setupAccess() {
  // As it is now: somebody may have changed it since.
  on("place", (id) => {
    asked.clear();
    if (id !== "/" && !isSearch(id)) ask(id);
  });
}

async function ask(id) {
  asked.set(id, null);
  await arrived;
  const answer = await get("why", { path_raw: id }).catch(() => null);
  if (!asked.has(id)) return;
  asked.set(id, answer);
  if (answer) emit("access");
}

// As long as nobody knows, nothing is forbidden: the server decides in any case.
function isRestricted(id, word) {
  if (!asked.has(id)) ask(id);
  const answer = asked.get(id);
  return Boolean(answer && !answer.administrator && answer.restrictions.includes(word));
}

export function mayDownload(id) {
  return !isRestricted(shareOf(id), "no_download");
}

export function mayModify(id) {
  return !isRestricted(shareOf(id), "no_modifying");
}

// Whether the folder on screen takes something new, and lets go of what it holds.
export function mayWriteIn(folder) {
  const answer = asked.get(folder);
  if (!answer || answer.administrator || answer.remote || !answer.exists) return true;
  return !answer.read_only && ["write", "append"].some((bit) => answer.permissions.includes(bit));
}
