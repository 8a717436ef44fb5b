// Whether the server can be reached, for what waits until it can.

import { sendOnce, session, urlOf } from "./api.js";

const PAUSES = [1000, 2000, 4000, 8000, 15000];
const AWAY = new Set(["page:unreachable", "page:upload_broken"]);
const LOGGED_OUT = "page:logged_out";
const GATEWAY = new Set([502, 503, 504]); // the web server is there, what answers behind it is not
let waiting = null;

// A failure that passes: nothing is wrong with what was asked.
export function isUnreachable(failure) {
  return AWAY.has(failure.key) || (failure.key === "page:bad_reply" && GATEWAY.has(failure.code));
}

// Also where only the log-in is missing. untilServed() resolves with whether it can be asked again.
export function isPassing(failure) {
  return failure.key === LOGGED_OUT || isUnreachable(failure);
}

export async function untilServed({ key }) {
  if (key !== LOGGED_OUT) await untilReachable();
  else return session.renew().catch(() => untilReachable().then(() => true));
  return true;
}

// Asks from time to time, and at once when the browser has a network again. Everybody waits for the same answer.
export function untilReachable() {
  waiting ??= ask().finally(() => {
    waiting = null;
  });
  return waiting;
}

async function ask() {
  for (let i = 0; ; ++i) {
    await pause(PAUSES[Math.min(i, PAUSES.length - 1)]);
    if (await answers()) return;
  }
}

function pause(length) {
  return new Promise((resolve) => {
    const timer = setTimeout(end, length);
    addEventListener("online", end);
    function end() {
      clearTimeout(timer);
      removeEventListener("online", end);
      resolve();
    }
  });
}

async function answers() {
  try {
    const { status } = await sendOnce(urlOf("list", { action: "shares", limit: 1 }));
    // A large body is cut off where nobody is logged in, and looks like a connection that broke.
    if (status === 401) return await session.renew();
    return !GATEWAY.has(status);
  } catch {
    return false;
  }
}
