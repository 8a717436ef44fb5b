// Who is logged in. Whatever finds out that nobody is any more waits here until the same person is again; when it is
// somebody else, the page starts anew and nothing that waited is sent.

import { get, post, readReply, sendOnce, session, urlOf } from "./api.js";
import { emit } from "./events.js";

const windows = new BroadcastChannel("orvel.session");
let renewing = null;

export function setupSession() {
  session.renew = () => {
    renewing ??= renew().finally(() => {
      renewing = null;
    });
    return renewing;
  };
  // Somebody logged in or out in another window of this browser.
  windows.addEventListener("message", () => {
    if (session.user !== "") session.renew().catch(() => {});
  });
}

// {user, machine}; null where the web server itself knows who asks.
async function whoAmI() {
  const response = await sendOnce(urlOf("login", {}));
  if (response.status !== 200) return null;
  return readReply(response.status, await response.text());
}

// Whether what was refused can be asked again.
async function renew() {
  const now = await whoAmI();
  if (!now) return false;
  if (session.user === "") {
    if (now.user !== "") return false; // logged in, and refused for another reason
    const { logInPage } = await import("./login.js");
    await logInPage(now.machine);
    windows.postMessage("in");
    return true;
  }
  if (now.user === session.user) return true;
  if (now.user !== "") return startAnew();
  const { logInHere } = await import("./login.js");
  const over = new AbortController();
  const user = await Promise.race([logInHere(session.user, startAnew), elsewhere(over.signal)]);
  over.abort();
  document.querySelector(".login-again").close();
  if (user !== session.user) return startAnew();
  windows.postMessage("in");
  return true;
}

// Resolves with who logged in in another window meanwhile.
function elsewhere(signal) {
  return new Promise((resolve) => {
    const look = async () => {
      const { user } = (await whoAmI().catch(() => null)) ?? { user: "" };
      if (user !== "") resolve(user);
    };
    windows.addEventListener("message", look, { signal });
  });
}

// Never comes back.
function startAnew() {
  emit("start-anew");
  location.replace("#/");
  location.reload();
  return new Promise(() => {});
}

export async function logOut(scope = "this") {
  const reply = await post("logout", { scope });
  windows.postMessage("out");
  if (scope === "this" || scope === "all") await startAnew();
  return reply;
}

// The sessions of this user; none of them is this one where the web server logs people in.
export async function sessions() {
  const { items } = await get("sessions", {});
  return items;
}
