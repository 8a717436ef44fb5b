// Who is logged in, where else, and logging out.

import { session } from "./api.js";
import { addCommand, runCommand } from "./commands.js";
import { dialog, toastFailure } from "./dialogs.js";
import { $, h, icon, keepFocus } from "./dom.js";
import { formatTime } from "./format.js";
import { openMenu } from "./menu.js";
import { logOut, sessions } from "./session.js";
import { t } from "./strings.js";

addCommand({ id: "sessions", icon: "activity", group: "info", run: showSessions });
addCommand({ id: "logOut", icon: "logout", group: "info", run: () => logOut().catch(toastFailure) });

export function setupAccount() {
  const button = $("account-button");
  button.addEventListener("click", async () => {
    // Where the web server logs people in there is no session to end.
    const own = await sessions().catch(() => []);
    const ends = own.some((one) => one.current);
    openMenu(
      [
        { heading: session.user },
        { label: t("command.links"), icon: "link", run: () => runCommand("links") },
        ...(ends
          ? [
              { label: t("command.sessions"), icon: "activity", run: () => runCommand("sessions") },
              "-",
              { label: t("command.logOut"), icon: "logout", run: () => runCommand("logOut") },
            ]
          : []),
      ],
      { anchor: button },
    );
  });
}

// The name of a browser and of its system, out of what it calls itself.
function browserName(text) {
  const found = [
    [/Edg\//, "Edge"],
    [/OPR\//, "Opera"],
    [/Firefox\//, "Firefox"],
    [/Chrome\//, "Chrome"],
    [/Safari\//, "Safari"],
  ].find(([mark]) => mark.test(text));
  const system = /(Android|iPhone|iPad|Windows|Mac OS X|Linux)/.exec(text)?.[1].replace("Mac OS X", "macOS");
  if (!found) return text.split(" ")[0] || t("sessions.unknown");
  return system ? t("sessions.browser", { browser: found[1], system }) : found[1];
}

async function showSessions() {
  let items;
  try {
    items = await sessions();
  } catch (failure) {
    return toastFailure(failure);
  }
  const list = h("ul.session-list");
  const others = h("button.button", { type: "button", onclick: () => end("others") }, t("sessions.others"));
  const end = async (scope) => {
    try {
      await logOut(scope);
      items = await sessions();
    } catch (failure) {
      toastFailure(failure);
    }
    paint();
  };
  const paint = () => {
    others.hidden = items.length < 2;
    keepFocus(list, () => list.replaceChildren(...items.map((one) => lineOf(one, end))));
  };
  paint();
  return dialog({
    title: t("sessions.title"),
    fill: (close) => [
      h("div.body", {}, list),
      h("footer", {}, others, h("button.button.primary", { type: "button", onclick: () => close(null) }, t("dialog.close"))),
    ],
  });
}

function lineOf({ id, address, browser, since, used, current }, end) {
  const about = [address, t("sessions.since", { time: formatTime(since) }), t("sessions.used", { time: formatTime(used) })];
  const name = browserName(browser ?? "");
  const label = `${t("command.logOut")}: ${name}, ${address}`;
  return h(
    "li",
    {},
    icon("user"),
    h("div.grow", {}, h("b", {}, name), current && h("span.tag", {}, t("sessions.this")), h("span.soft", {}, about.join(" · "))),
    h("button.button.outlined", { type: "button", "aria-label": label, onclick: () => end(current ? "this" : id) }, t("command.logOut")),
  );
}
