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

  async function logIn(password) {
    const body = new URLSearchParams({ action: "login", password });
    return ask({}, { method: "POST", body });
  }

  function askPassword(path) {
    const input = make("input", { type: "password", id: "password", autocomplete: "current-password", required: "" });
    const button = make("button", { type: "submit" }, texts.open);
    const wrong = make("p", { class: "wrong", role: "alert" });
    const form = make("form", {
      submit: async (event) => {
        event.preventDefault();
        button.disabled = true;
        const { status } = await logIn(input.value).catch(() => ({ status: 500 }));
        if (status === 200) return open(path);
        button.disabled = false;
        wrong.textContent = status === 403 ? texts.wrong : status === 404 ? texts.gone : texts.failed;
        input.select();
      }
    }, make("label", { for: "password" }, texts.password), input, button, wrong);
    show(make("h1", {}, texts.title), form);
    input.focus();
  }

  function sizeText(bytes) {
    const units = ["B", "KB", "MB", "GB", "TB"];
    let unit = 0;
    while (bytes >= 1000 && unit < units.length - 1) { bytes /= 1000; unit += 1; }
    const digits = unit === 0 ? 0 : 1;
    return new Intl.NumberFormat(g_Lang, { maximumFractionDigits: digits }).format(bytes) + " " + units[unit];
  }

  function row(item) {
    const more = item.additional || {};
    const name = item.isdir
      ? make("a", { href: "#" + encodeURIComponent(JSON.stringify(pathField(item))), class: "folder" }, make("bdi", {}, item.name))
      : make("a", { href: address({ action: "download", ...pathField(item) }), download: "" }, make("bdi", {}, item.name));
    const changed = more.time ? new Date(more.time.mtime * 1000).toLocaleString(g_Lang) : "";
    return make("tr", {}, make("td", {}, name), make("td", { class: "size" }, item.isdir ? "" : sizeText(more.size || 0)),
      make("td", { class: "time" }, changed));
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
    return ask({ action: "list", additional: "size,time", limit: definitions.pageSize, offset, ...path });
  }

  // The page logs in by itself where no password is asked, unless its session has ended since.
  async function open(path) {
    const state = await ask({ action: "state" }).catch(() => ({ status: 500 }));
    if (state.status !== 200) return noticeOf(state.status);
    if (!state.json.data.logged_in) {
      if (state.json.data.password) return askPassword(path);
      const again = await logIn("").catch(() => ({ status: 500 }));
      if (again.status !== 200) return noticeOf(again.status);
    }
    const { status, json } = await list(path, 0).catch(() => ({ status: 500 }));
    if (status !== 200) return noticeOf(status);
    if (!json.success) return noticeOf(404);
    const place = json.place;
    const parts = [make("h1", {}, place.name)];
    if (place.path) parts.push(make("p", {}, make("a", { href: "#" }, texts.top)));
    if (json.data.items.length > 0) {
      const text = place.file ? texts.download : texts.downloadAll;
      parts.push(make("p", {}, make("a", { class: "button", href: address({ action: "download", ...pathField(place) }) }, text)));
      parts.push(...table(json.data, path));
    } else {
      parts.push(make("p", { class: "notice" }, texts.empty));
    }
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
    view = make("main", {});
    document.body.append(view);
    window.addEventListener("hashchange", openCurrent);
    openCurrent();
  });
})();
