// Requests to the programs. A failure is an ApiError, whatever went wrong.

export class ApiError extends Error {
  constructor({ code = 0, key, path = "", data = null }) {
    super(`${key} (${code}) ${path}`);
    this.code = code;
    this.key = key;
    this.path = path;
    this.data = data;
  }
}

// The code of what is not there.
export const MISSING = 408;

export const PROGRAMS = "/cgi-bin/";

// Who this page belongs to, "" before that is known, and what asks for the password again when nobody is logged in any
// more: whether the request is worth sending again.
export const session = { user: "", renew: async () => false };
const MOST_RENEWED = 2;

export function encodeParams(params) {
  const text = new URLSearchParams();
  for (const [name, value] of Object.entries(params)) {
    if (value === undefined || value === null) continue;
    for (const one of Array.isArray(value) ? value : [value]) text.append(name, String(one));
  }
  return text;
}

export function urlOf(program, params) {
  return `${PROGRAMS}${program}?${encodeParams(params)}`;
}

// What reads: GET. An aborted request throws the browser's AbortError.
export async function get(program, params, signal) {
  return unwrap(await send(urlOf(program, params), { signal }));
}

// What changes something: POST.
export async function post(program, params, signal) {
  return unwrap(await send(PROGRAMS + program, { method: "POST", body: encodeParams(params), signal }));
}

// The response, whatever its status. When the session has ended it waits for the password.
export async function send(url, options) {
  for (let renewed = 0; ; ++renewed) {
    const response = await sendOnce(url, options);
    if (response.status !== 401 || renewed === MOST_RENEWED || !(await session.renew())) return response;
  }
}

// The server refuses what is meant for somebody else than who is logged in: another window may have changed that.
export function headersOf() {
  return session.user === "" ? {} : { "Orvel-User": encodeURIComponent(session.user) };
}

export async function sendOnce(url, options) {
  const headers = { ...options?.headers, ...headersOf() };
  try {
    return await fetch(url, { ...options, headers, cache: "no-store", credentials: "same-origin" });
  } catch (failure) {
    if (failure.name === "AbortError") throw failure;
    throw new ApiError({ key: "page:unreachable" });
  }
}

async function unwrap(response) {
  let text;
  try {
    text = await response.text();
  } catch (failure) {
    if (failure.name === "AbortError") throw failure;
    throw new ApiError({ key: "page:unreachable" });
  }
  return readReply(response.status, text);
}

// Also for replies that did not come through fetch().
export function readReply(status, text) {
  if (status === 401) throw new ApiError({ key: "page:logged_out" });
  let reply;
  try {
    reply = JSON.parse(text);
  } catch {
    throw new ApiError({ key: status === 413 ? "page:too_many" : "page:bad_reply", code: status });
  }
  if (!reply.success) throw new ApiError({ ...reply.error, data: reply.data });
  return reply.user === undefined ? reply.data : { ...reply.data, user: reply.user };
}

export function isAbort(failure) {
  return failure.name === "AbortError";
}
