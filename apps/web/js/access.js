// What the server would refuse here, asked beforehand: what cannot work is not offered.

import { get } from "./api.js";
import { emit, on } from "./events.js";
import { isSearch, shareOf } from "./path.js";

const asked = new Map(); // id -> what the program "why" answered, or null while it has not

export function setupAccess() {
  // As it is now: somebody may have changed it since.
  on("place", (id) => {
    asked.clear();
    if (id !== "/" && !isSearch(id)) asked.set(id, null);
  });
  // It comes with the list of a folder.
  on("came-access", ({ id, answer }) => take(id, answer));
  on("opened", (id) => asked.get(id) === null && ask(id));
}

async function ask(id) {
  asked.set(id, null);
  take(id, await get("why", { path_raw: id }).catch(() => null));
}

function take(id, answer) {
  if (!asked.has(id)) return;
  asked.set(id, answer);
  if (answer) emit("access");
}

// The restrictions are the share's: what is known of anything in it says them.
function answerAbout(share) {
  const known = [...asked].find(([id]) => shareOf(id) === share);
  if (!known) ask(share);
  return known?.[1];
}

// As long as nobody knows, nothing is forbidden: the server decides in any case.
function isRestricted(id, word) {
  const answer = answerAbout(shareOf(id));
  return Boolean(answer && !answer.administrator && answer.restrictions.includes(word));
}

export function mayDownload(id) {
  return !isRestricted(id, "no_download");
}

export function mayModify(id) {
  return !isRestricted(id, "no_modifying");
}

// Whether the folder on screen takes something new, and lets go of what it holds.
export function mayWriteIn(folder) {
  const answer = asked.get(folder);
  if (!answer || answer.administrator || answer.remote || !answer.exists) return true;
  return !answer.read_only && ["write", "append"].some((bit) => answer.permissions.includes(bit));
}
