// Large files on their way, by the protocol tus: what has arrived stays, whatever breaks in between.

import { ApiError, get, headersOf, readReply, send, urlOf } from "./api.js";
import { idIn, normaliseId } from "./path.js";
import { modifiedOf } from "./upload_request.js";

const LOCKED = 423;
const GONE = new Set([404, 410]);
const PASSING = new Set([409, LOCKED, ...GONE]); // asked anew, with the offset or as a new upload
const MOST_WAITS = 60; // for a request that the server still takes for alive
const WAIT = 2000;

// The user's uploads that are not over: [{id, path, size, offset, mtime, conflict, created, expires}], `path` an id.
export async function unfinishedUploads() {
  const { items } = await get("tus", {});
  return items.map((item) => ({ ...item, path: idIn(item) }));
}

export function isOf(item, path, file) {
  return item.path === path && item.size === file.size && item.mtime === modifiedOf(file);
}

// A request of the protocol. Resolves with {status, header(name), text}, undefined when it was aborted; a connection that
// breaks throws.
function ask(method, params, { headers = {}, body, onBegin = () => {}, onProgress } = {}) {
  return new Promise((resolve, reject) => {
    const request = new XMLHttpRequest();
    onBegin(request);
    request.open(method, urlOf("tus", params));
    const all = { "Tus-Resumable": "1.0.0", ...headers, ...headersOf() };
    for (const [name, value] of Object.entries(all)) request.setRequestHeader(name, value);
    if (onProgress) request.upload.addEventListener("progress", onProgress);
    request.addEventListener("load", () =>
      resolve({ status: request.status, text: request.responseText, header: (name) => request.getResponseHeader(name) }),
    );
    request.addEventListener("error", () => reject(new ApiError({ key: "page:upload_broken" })));
    request.addEventListener("abort", () => resolve());
    request.send(body ?? null);
  });
}

function refusal({ status, text }) {
  try {
    readReply(status, text);
  } catch (failure) {
    return failure;
  }
  return new ApiError({ key: "page:bad_reply", code: status });
}

const pause = () => new Promise((resolve) => setTimeout(resolve, WAIT));

// Sends the file to `path`, an id; what of it has arrived before is not sent again. `known`: the id of the upload, where
// the page knows it. onUpload(id) when that is known, false for one that is not wanted any more; wait(promise) while another request is at work on it. Resolves with
// {path, skipped} once the file has its name, undefined when it was aborted.
export async function sendResumable(path, file, { conflict, known, onUpload, onBegin, onOffset, wait }) {
  let id = known ?? (await unfinishedUploads()).find((item) => isOf(item, path, file))?.id;
  for (let waits = 0; ; ) {
    if (!id) {
      id = await begin(path, file, conflict);
    }
    if (!onUpload(id)) return undefined;
    let reply = await ask("HEAD", { id, conflict }, { onBegin });
    const offset = Number(reply?.header("Upload-Offset"));
    if (reply?.status === 200) {
      onOffset(offset, true);
      if (offset === file.size) return outcome(reply, path);
      reply = await sendRest(id, file, offset, { conflict, onBegin, onOffset });
    } else if (reply && !PASSING.has(reply.status)) {
      // A HEAD that is refused has no words: a piece of no bytes is refused for the same reason.
      reply = await sendRest(id, file, file.size, { conflict, onBegin, onOffset });
    }
    if (!reply) return undefined;
    if (reply.status === 204) return outcome(reply, path);
    if (!PASSING.has(reply.status) || ++waits > MOST_WAITS) throw refusal(reply);
    if (GONE.has(reply.status)) id = null;
    if (id && !(await wait(pause().then(() => true)))) return undefined;
  }
}

// Never aborted: what it began could not be ended by anybody who does not know its id.
async function begin(path, file, conflict) {
  const params = { path_raw: path, conflict, mtime: modifiedOf(file) };
  const reply = await ask("POST", params, { headers: { "Upload-Length": file.size } });
  if (reply.status !== 201) throw refusal(reply);
  return readReply(reply.status, reply.text).id;
}

function sendRest(id, file, offset, { conflict, onBegin, onOffset }) {
  const headers = { "Upload-Offset": offset, "Content-Type": "application/offset+octet-stream" };
  const onProgress = ({ loaded }) => onOffset(offset + loaded);
  return ask("PATCH", { id, conflict }, { headers, body: file.slice(offset), onBegin, onProgress });
}

function outcome(reply, path) {
  const given = reply.header("Orvel-Path");
  return { path: given ? normaliseId(given) : path, skipped: reply.header("Orvel-Skipped") !== null };
}

// Ends an upload and removes what has arrived. The server waits for the request that was cut off, and the browser sends
// this even if the page is closed meanwhile.
export async function discard(id) {
  const headers = { "Tus-Resumable": "1.0.0" };
  for (let tries = 0; tries < 6; ++tries) {
    const { status } = await send(urlOf("tus", { id, wait: 10 }), { method: "DELETE", headers, keepalive: true });
    if (status !== LOCKED) return status === 204 || GONE.has(status);
  }
  return false;
}
