// The view of a public link: password form, listing, downloads. The page gives its language, the prefix of addresses and
// the shared path as g_Lang, g_Tunnel and g_FolderPath; everything else is asked from the program.
(function () {
  "use strict";

  const texts = window.visitorTexts;
  const definitions = window.visitorDefinitions;
  const link = new URLSearchParams(location.search).get("FOLDER_SHARING");
  let view;

  // Text from names goes into the page as text alone, never as markup.
  function make(tag, attributes, ...children) {
    const element = document.createElement(tag);
    for (const [name, value] of Object.entries(attributes || {})) {
      if (typeof value === "function") element.addEventListener(name, value);
      else element.setAttribute(name, value);
    }
    element.append(...children);
    return element;
  }

  function address(fields) {
    const query = new URLSearchParams(fields);
    if (link !== null) query.set("FOLDER_SHARING", link);
    return g_Tunnel + definitions.program + "?" + query;
  }

  // A path goes as its bytes, which need not be text.
  function pathField(item) {
    if (item.path_raw !== undefined) return { path_raw: item.path_raw };
    return item.path ? { path: item.path } : {};
  }

  async function ask(fields, options) {
    const answer = await fetch(address(fields), { credentials: "same-origin", ...options });
    return { status: answer.status, json: await answer.json() };
  }

  function show(...children) {
    view.replaceChildren(...children);
  }

  function notice(text) {
    show(make("p", { class: "notice", role: "alert" }, text));
  }

  function noticeOf(status) {
    notice(status === 403 ? texts.blocked : status === 404 ? texts.gone : texts.failed);
  }

  // Passwords are judged in turn: whoever is not next is told when to come again, and with which turn.
  async function logIn(password, tellWait) {
    let turn = "";
    for (;;) {
      const body = new URLSearchParams({ action: "login", password, turn });
      const answer = await ask({}, { method: "POST", body });
      if (answer.status !== 429) return answer;
      turn = answer.json.data.turn;
      await wait(answer.json.data.wait, tellWait);
    }
  }

  async function wait(milliseconds, tell) {
    const end = Date.now() + milliseconds;
    for (let left = milliseconds; left > 0; left = end - Date.now()) {
      if (milliseconds > 1500) tell(Math.ceil(left / 1000));
      await new Promise((done) => setTimeout(done, Math.min(left, 1000)));
    }
  }

  function askPassword(path) {
    const input = make("input", { type: "password", id: "password", autocomplete: "current-password", required: "" });
    const button = make("button", { type: "submit" }, texts.open);
    const wrong = make("p", { class: "wrong", role: "alert" });
    const form = make("form", {
      submit: async (event) => {
        event.preventDefault();
        button.disabled = true;
        const tellWait = (seconds) => { wrong.textContent = texts.wait.replace("{seconds}", seconds); };
        const { status } = await logIn(input.value, tellWait).catch(() => ({ status: 500 }));
        if (status === 200) return open(path);
        button.disabled = false;
        wrong.textContent = status === 403 ? texts.wrong : status === 404 ? texts.gone : texts.failed;
        input.select();
      }
    }, make("label", { for: "password" }, texts.password), input, button, wrong);
    show(make("div", { class: "door" }, make("h1", {}, texts.title), form));
    input.focus();
  }

  function sizeText(bytes) {
    const units = ["B", "KB", "MB", "GB", "TB"];
    let unit = 0;
    while (bytes >= 1000 && unit < units.length - 1) { bytes /= 1024; unit += 1; }
    const digits = unit === 0 || bytes >= 100 ? 0 : bytes >= 10 ? 1 : 2;
    return new Intl.NumberFormat(g_Lang, { maximumFractionDigits: digits }).format(bytes) + " " + units[unit];
  }

  function dayText(time) {
    if (!time) return "";
    return new Date(time.mtime * 1000).toLocaleDateString(g_Lang, { day: "numeric", month: "short", year: "numeric" });
  }

  // Pictures of extensions stand apart from those of what has none.
  const general = ["misc.png", "folder.png", "recycle_bin.png", "isomountpoint.png", "remotemountpoint.png"];

  function picture(icon) {
    const file = general.includes(icon) ? icon : "files_ext/" + encodeURIComponent(icon);
    return make("img", { class: "picture", src: g_Tunnel + "/images/" + file, alt: "" });
  }

  function row(item) {
    const more = item.additional || {};
    const name = item.isdir
      ? make("a", { href: "#" + encodeURIComponent(JSON.stringify(pathField(item))), class: "folder" }, make("bdi", {}, item.name))
      : make("a", { href: address({ action: "download", ...pathField(item) }), download: "" }, make("bdi", {}, item.name));
    const size = item.isdir ? "" : sizeText(more.size || 0);
    return make("tr", {}, make("td", { class: "name" }, picture(item.icon), name),
      make("td", { class: "size" }, size), make("td", { class: "time" }, dayText(more.time)));
  }

  function table(data, path) {
    const body = make("tbody", {}, ...data.items.map(row));
    const head = make("thead", {}, make("tr", {}, make("th", { scope: "col" }, texts.name),
      make("th", { scope: "col", class: "size" }, texts.size), make("th", { scope: "col", class: "time" }, texts.changed)));
    const parts = [make("table", {}, head, body)];
    if (body.rows.length < data.total) {
      const button = make("button", {
        type: "button",
        click: async () => {
          const next = await list(path, body.rows.length).catch(() => ({ status: 500 }));
          if (next.status !== 200 || !next.json.success) return noticeOf(next.status);
          body.append(...next.json.data.items.map(row));
          if (next.json.data.items.length === 0 || body.rows.length >= next.json.data.total) button.remove();
        }
      }, texts.more);
      parts.push(button);
    }
    return parts;
  }

  function list(path, offset) {
    return ask({ action: "list", additional: "size,time,icon", limit: definitions.pageSize, offset, ...path });
  }

  function showFile(place, item, button) {
    const more = (item && item.additional) || {};
    const about = [sizeText(more.size || 0), dayText(more.time)].filter((text) => text !== "").join(" · ");
    show(make("div", { class: "single" }, picture(item ? item.icon : "misc.png"), make("h1", {}, make("bdi", {}, place.name)),
      make("p", { class: "about" }, about), button));
  }

  async function open(path) {
    const state = await ask({ action: "state" }).catch(() => ({ status: 500 }));
    if (state.status !== 200) return noticeOf(state.status);
    if (!state.json.data.logged_in) return askPassword(path);
    const { status, json } = await list(path, 0).catch(() => ({ status: 500 }));
    if (status !== 200) return noticeOf(status);
    if (!json.success) return noticeOf(404);
    const { place, data } = json;
    const button = make("a", { class: "button", href: address({ action: "download", ...pathField(place) }) },
      place.file ? texts.download : texts.downloadAll);
    if (place.file) return showFile(place, data.items[0], button);
    const head = make("header", {}, picture("folder.png"), make("h1", {}, make("bdi", {}, place.name)));
    if (data.items.length > 0) head.append(button);
    const parts = [head];
    if (place.path) parts.push(make("p", { class: "way" }, make("a", { href: "#" }, texts.top)));
    if (data.items.length > 0) parts.push(...table(data, path));
    else parts.push(make("p", { class: "notice" }, texts.empty));
    show(...parts);
  }

  // The place below the shared folder stands behind "#", so that the browser's own way back works.
  function openCurrent() {
    let path = {};
    try {
      path = JSON.parse(decodeURIComponent(location.hash.slice(1)) || "{}");
    } catch (error) {
      path = {};
    }
    open(path);
  }

  document.addEventListener("DOMContentLoaded", () => {
    document.documentElement.lang = g_Lang;
    // The page itself does not say that its layout follows the width of a phone.
    document.head.append(make("meta", { name: "viewport", content: "width=device-width, initial-scale=1" }));
    view = make("main", {});
    const mark = make("img", { src: g_Tunnel + "/favicon.svg", alt: "", width: "26", height: "26" });
    document.body.append(make("div", { class: "brand", role: "banner" }, mark, "Orvel"), view);
    window.addEventListener("hashchange", openCurrent);
    openCurrent();
  });
})();
