// Looking around: shares, folders, long lists, the keyboard, hostile names, refusals.
import assert from "node:assert/strict";
import { readdirSync, readFileSync, readlinkSync } from "node:fs";
import { test } from "node:test";
import { KINDS, PICTURES } from "../../apps/web/js/icons.js";
import { boxOf, choose, drawn, go, row, rowsReady, typeName, URL_OF_PAGE, withPage } from "./browser.mjs";
import { AGAIN, ownFolder } from "./support.mjs";

const LARGE = 20_000; // files of the share "warehouse"

const place = (page) => page.evaluate(() => location.hash.slice(1));

test("shares, by user", () =>
  withPage("alice", {}, async (page) => {
    assert.equal(await page.locator(".card").count(), 10);
    await withPage("bob", {}, async (other) => {
      assert.equal(await other.locator(".card", { hasText: "projects" }).count(), 0);
      assert.match(await other.locator(".card", { hasText: "photo" }).textContent(), /Read only/);
    });
    await page.fill("#find", "MUS");
    await page.waitForFunction(() => document.querySelectorAll(".cards li:not([hidden])").length === 1);
    await page.click(".card >> text=music");
    await page.waitForFunction(() => document.querySelectorAll("#view .row:not(.header)").length === 3);
    await page.dblclick("#view >> text=Night Trains");
    await page.waitForFunction(() => document.querySelectorAll("#view .row:not(.header)").length === 9);
    await page.waitForSelector("[role=treeitem].current[aria-label='Night Trains']");
    await page.click("#pathbar >> text=music");
    await page.waitForSelector("#view .row.selected >> text=Night Trains"); // where one came from
    await page.goBack();
    await page.waitForSelector("#view >> text=01 Track.flac");
  }));

test("sorting keeps folders first, both ways", () =>
  withPage("alice", { path: "/photo" }, async (page) => {
    for (const order of ["ascending", "descending"]) {
      await page.click("[data-sort=size]");
      await page.waitForSelector(`[aria-sort=${order}] [data-sort=size]`);
    }
    await page.waitForSelector("#row-0 >> text=Landscapes");
    await page.click(".columns-button");
    await page.click(".menu >> text=Group");
    await page.click(".columns-button");
    await page.click(".menu >> text=Dense");
    await page.waitForSelector("#view .row .group >> text=users");
    await page.waitForFunction(() => document.getElementById("row-0").offsetHeight === 28);
    await page.setViewportSize({ width: 800, height: 800 });
    await page.waitForSelector("#view .group", { state: "detached" }); // there is no room for it
    assert.ok((await boxOf(page.locator("#view .row .cell.name").first())).width >= 200);
    await page.setViewportSize({ width: 1280, height: 800 });
    await page.waitForSelector("#view .row .group");
    await page.press("#view", "End");
    await page.waitForSelector("#view .row.cursor .size >> text=/^0 B$/");
    await page.click("[data-sort=name]");
    await page.waitForSelector("[aria-sort=ascending] [data-sort=name]");
    await page.click(".view-switch button >> nth=1");
    await page.dblclick("#view.grid >> text=Landscapes");
    await page.waitForFunction(() => document.querySelectorAll(".thumbnail.loaded img").length === 12);
  }));

test("a large folder: first view, its end, everything chosen", () =>
  withPage("alice", { path: "/home" }, async (page) => {
    const requests = [];
    page.on("request", (request) => {
      if (request.url().includes("/cgi-bin/list")) requests.push(new URL(request.url()).searchParams);
    });
    await go(page, "/warehouse");
    await page.waitForSelector("#view >> text=item-00000.dat");
    assert.equal(await page.getAttribute("#view", "aria-rowcount"), String(LARGE + 1));
    assert.ok(requests.length <= 2, `${requests.length} requests for the first view`);
    await page.evaluate(async () => {
      const view = document.getElementById("view");
      for (let i = 1; i <= 20; ++i) {
        view.scrollTop = (view.scrollHeight * 0.99 * i) / 20;
        await new Promise(requestAnimationFrame);
      }
    });
    await page.waitForSelector("#view >> text=/item-198\\d\\d.dat/");
    assert.ok(
      requests.length < 60, // of 100 pages: two for each place, however slow the browser draws
      `${requests.length} requests after flying by ${LARGE} entries`,
    );
    assert.ok((await page.locator("#view .row").count()) < 80);
    await page.focus("#view");
    await typeName(page, "item-1734");
    await page.waitForSelector("#view .row.selected >> text=item-17340.dat");
    await page.keyboard.press("Shift+End");
    const many = `#status >> text=${(LARGE - 17340).toLocaleString("en-GB")} selected`;
    await page.waitForSelector(many);
    const refreshed = page.waitForResponse("**/cgi-bin/list?*");
    await page.keyboard.press("Alt+r");
    await (await refreshed).finished();
    await rowsReady(page);
    await drawn(page);
    await page.waitForSelector(many); // though most of them were never on screen
    await page.keyboard.press("Control+a");
    await page.waitForSelector("#status >> text=20,000 selected");
  }));

test("pages come while the list moves", () =>
  withPage("alice", { path: "/warehouse" }, async (page) => {
    await page.waitForSelector("#view >> text=item-00000.dat");
    // A key held down, faster than any standstill, until rows beyond the first page are there.
    const held = await page.evaluate(async () => {
      const view = document.getElementById("view");
      view.focus();
      const isThere = () => [...view.querySelectorAll(".row:not(.waiting)")].some((row) => row.index > 700);
      for (let i = 0; i < 2000; ++i) {
        if (isThere()) return i;
        if (view.querySelector(".cursor")?.index < 800 || i < 2)
          view.dispatchEvent(new KeyboardEvent("keydown", { key: "PageDown", bubbles: true, cancelable: true }));
        view.dispatchEvent(new Event("scroll"));
        await new Promise(requestAnimationFrame);
      }
      return -1;
    });
    assert.ok(held >= 0, "nothing was asked for while it moved");
  }));

test("a list of a million rows reaches its end", () =>
  withPage("alice", { path: "/" }, async (page) => {
    const total = 1_000_000;
    await page.route("**/cgi-bin/list?*warehouse*", (route) => {
      const params = new URL(route.request().url()).searchParams;
      const offset = Number(params.get("offset"));
      const items = Array.from({ length: Math.min(Number(params.get("limit")), total - offset) }, (_, i) => ({
        name: `row ${offset + i}`,
        path: `/warehouse/row ${offset + i}`,
        isdir: false,
      }));
      return route.fulfill({ json: { success: true, data: { total, offset, items } } });
    });
    await page.click("#tree >> text=warehouse");
    await page.waitForSelector("#view >> text=/^row 0$/");
    await page.press("#view", "End");
    const last = page.locator("#view .row.cursor", { hasText: `row ${total - 1}` });
    await last.waitFor();
    const [row, view] = [await boxOf(last), await boxOf(page.locator("#view"))];
    assert.ok(row.y + row.height <= view.y + view.height + 1);
    for (let i = 0; i < 3; ++i) await page.press("#view", "PageUp");
    await page.waitForSelector("#view .row.cursor");
    assert.ok(await page.locator("#view .row.cursor").isVisible());
    await page.locator("#view").evaluate((node) => {
      node.scrollTop = node.scrollHeight / 2;
    });
    await page.waitForSelector("#view >> text=/^row (49|50)\\d{4}$/");
  }));

test("names that programs stumble over", () =>
  withPage("alice", { path: "/worldwide", viewport: { width: 1280, height: 2000 } }, async (page) => {
    const shown = await page.locator("#view .row:not(.header) .cell.name").evaluateAll((cells) => cells.map((cell) => cell.title));
    for (const name of [
      "<img src=x onerror=alert(1)>.txt",
      "&amp; &lt;tag&gt;.txt",
      "single ' double \" back `.txt",
      "line[LF]break.txt",
      "looks like [RLO]txt.exe",
      "percent%20sign%2F.txt",
      "שלום עולם.txt",
      "#hash.txt",
      "question?.txt",
      "caf\uFFFD in Latin-1.txt",
    ])
      assert.ok(shown.includes(name), `${name} in ${shown.join("\n")}`);
    assert.equal(await page.locator("#view img, #view b b").count(), 0);
    await choose(page, "looks like");
    await page.keyboard.press("Shift+Delete");
    await page.waitForSelector(".dialog h2 >> text=looks like [RLO]txt.exe");
    await page.keyboard.press("Escape");
    await choose(page, "wwww");
    await page.keyboard.press("Shift+Delete");
    assert.ok(await page.locator(".dialog", { hasText: "wwww" }).evaluate((node) => node.scrollWidth <= node.clientWidth));
    await page.keyboard.press("Escape");
    await choose(page, "break.txt");
    await page.keyboard.press("F2");
    await page.press(".in-place", "Enter"); // unchanged, though a field holds no line break
    await page.waitForSelector(".in-place", { state: "detached" });
    await page.waitForSelector("#view .cell.name[title='line[LF]break.txt']");
    for (const [folder, inside] of [
      [/dossier/, "dedans.txt"],
      [/папка/, "внутри.txt"],
    ]) {
      await page.dblclick(`#view .row:has-text("${folder.source}")`);
      await page.waitForSelector(`#view >> text=${inside}`);
      await page.reload(); // the address alone leads back
      await page.waitForSelector(`#view >> text=${inside}`);
      await page.keyboard.press("Backspace");
      await page.waitForSelector("#view >> text=#hash.txt");
    }
    for (const name of ["Latin-1.txt", "question?.txt", "percent%20sign"]) {
      const download = page.waitForEvent("download");
      await choose(page, name, { button: "right" });
      await page.click(".menu >> text=Download");
      assert.ok((await (await download).createReadStream()).readable);
    }
  }));

test("what one may not open says so, and why", () =>
  withPage("bob", { path: "/projects" }, async (page) => {
    await page.waitForSelector(".state >> text=no permission for “projects”");
    await page.click(".state >> text=Why?");
    await page.waitForSelector(".dialog >> text=You are on the no-access list of “projects”");
    await page.keyboard.press("Escape");
    await go(page, "/photo/no such folder");
    await page.waitForSelector(".state >> text=“no such folder” is not there");
    await page.click(".state >> text=Go up");
    await page.waitForSelector("#view >> text=2012");
    assert.equal(await page.locator("#toolbar [data-command=newFolder]").count(), 0); // his right is to read
    const taken = await row(page, "2012").evaluate((target) => {
      const dataTransfer = new DataTransfer();
      dataTransfer.items.add(new File(["x"], "dropped.txt"));
      target.dispatchEvent(new DragEvent("dragover", { bubbles: true, cancelable: true, dataTransfer }));
      return target.classList.contains("drop");
    });
    assert.ok(!taken);
    assert.match(await row(page, "2012").getAttribute("aria-label"), /^2012, Folder, /); // no word of its buttons
  }));

test("dark, German, on a phone", async () => {
  await withPage("alice", { path: "/photo", colorScheme: "dark", locale: "de-DE" }, async (page) => {
    assert.equal(await page.getAttribute("html", "lang"), "de");
    await page.waitForSelector("#status >> text=195 Elemente");
    await page.keyboard.press("?");
    await page.waitForSelector(".dialog >> text=Tastenkürzel");
    await page.keyboard.press("Escape");
    await page.setViewportSize({ width: 820, height: 700 });
    await page.click("#search-button");
    await page.waitForFunction(() => document.querySelector("#view .row .cell.name").offsetWidth > 120);
  });
  await withPage(
    "alice",
    { path: "/photo", viewport: { width: 390, height: 780 }, isMobile: true, hasTouch: true },
    async (page) => {
      await row(page, "2016").tap();
      await page.waitForFunction(() => location.hash === "#/photo/2016");
      assert.ok(await page.evaluate(() => document.documentElement.scrollWidth <= innerWidth));
      await page.tap("#menu-button");
      await page.waitForSelector("[role=treeitem]:focus");
      await page.keyboard.press("Escape");
      await page.waitForSelector("#menu-button:focus");
      await page.tap("#menu-button");
      await page.tap("#tree >> text=music");
      await page.waitForSelector("#view >> text=Night Trains");
    },
  );
});

test("mounts, shares that do not answer, slow and broken servers", () =>
  withPage(
    "alice",
    { path: "/" },
    async (page) => {
      const change = (match, edit) =>
        page.route(
          (url) => url.pathname === "/cgi-bin/list" && match(url.searchParams),
          async (route) => {
            const response = await route.fetch(AGAIN);
            const reply = await response.json();
            edit(reply.data.items);
            await route.fulfill({ response, json: reply });
          },
        );
      await change(
        (params) => params.get("action") === "shares",
        (items) => {
          items.find((item) => item.name === "music").additional.mount_point_type = "remotefail";
          items.find((item) => item.name === "photo").additional.volume_status.readonly = true;
        },
      );
      await change(
        (params) => params.get("path_raw") === "/projects",
        (items) => {
          items.filter((item) => item.isdir && item.additional).slice(2, 5).forEach((item, i) => {
            item.additional.mount_point_type = ["iso", "remote", "remotefail"][i];
          });
        },
      );
      await page.reload();
      await page.waitForSelector(".card:has-text('music') >> text=Server does not answer");
      await page.waitForSelector(".card:has-text('photo') >> text=Read only");
      await page.waitForSelector("#tree [aria-label='music, Server does not answer'] .tag.warn");
      await page.click(".card >> text=projects"); // whose first folders are mounted, as it says
      for (const kind of ["iso", "remote", "offline"])
        await page.waitForSelector(`#view use[href$="kind-folder-${kind}"]`, { state: "attached" });

      let answer;
      const held = new Promise((resolve) => {
        answer = resolve;
      });
      await page.route("**/cgi-bin/list?*warehouse*", async (route) => {
        await held;
        await route.continue();
      });
      await page.click("#tree >> text=warehouse");
      await page.waitForFunction(() => {
        const bone = document.querySelector("#view .row.waiting .bone");
        return bone && Number(getComputedStyle(bone).opacity) > 0.7;
      });
      answer();
      await page.waitForSelector("#view >> text=item-00000.dat");
      await page.waitForSelector("#live >> text=Folder opened");
      await page.route("**/cgi-bin/list?*preview*", (route) => route.abort("connectionrefused"));
      await page.click("#tree >> text=preview");
      await page.waitForSelector(".state >> text=The server does not answer");
      await page.unroute("**/cgi-bin/list?*preview*");
      await page.click(".state button >> text=Try again");
      await page.waitForSelector("#view >> text=readme.txt");
      await go(page, "/projects");
      await choose(page, "notes.md");
      const refuse = (pattern) => page.route(pattern, (route) => route.abort("connectionrefused"));
      await refuse("**/cgi-bin/download*");
      await page.focus("#view");
      await page.keyboard.press(" ");
      await page.waitForSelector(".preview >> text=The server does not answer");
      await page.keyboard.press("Escape");
      await page.keyboard.press("Control+s");
      await page.waitForSelector(".toast.failed >> text=The server does not answer");
      await refuse("**/strings/*");
      await page.reload();
      await page.waitForSelector("text=Reload the page");
    },
    [/ERR_CONNECTION_REFUSED/, /Failed to fetch/],
  ));

test("a typed path, a filter, a place that is not there any more", () =>
  withPage("alice", { path: "/warehouse" }, async (page) => {
    let requests = 0;
    page.on("request", (request) => {
      requests += request.url().includes("/cgi-bin/list");
    });
    await page.press("#view", "Control+a");
    await page.click("[data-command=copyTo]");
    await page.waitForSelector(".picker-list li");
    assert.ok(requests < 5, `${requests} requests for 20,000 entries`);
    await page.keyboard.press("Escape");
    await go(page, "/warehouse/item-03210.dat");
    await page.waitForSelector("#view .row.selected >> text=item-03210.dat"); // far down in its folder
    assert.equal(await place(page), "/warehouse");
    await page.keyboard.press("Control+l");
    await page.keyboard.type("/projects/house");
    await page.keyboard.press("Enter");
    await page.waitForSelector("#view >> text=plan.pdf");
    assert.equal(await place(page), "/projects/house");
    await page.keyboard.press("/");
    await page.keyboard.type("nothing like it");
    await page.waitForSelector(".state >> text=Nothing here matches");
    await page.keyboard.press("Escape");
    await page.waitForSelector("#view >> text=plan.pdf");
  }));

test("the keyboard alone is never lost", () => {
  ownFolder("by keys");
  return withPage("alice", { path: "/projects/by%20keys" }, async (page) => {
    const held = (selector) => page.waitForFunction((one) => document.activeElement.matches(one), selector);
    await page.focus("[data-command=newFolder]");
    await page.keyboard.press("Enter");
    const box = await boxOf(page.locator(".dialog .field"));
    await page.mouse.click(box.x - 8, box.y + 8); // beside the field, and still in the dialog
    await page.fill(".dialog .input", "by keyboard");
    await page.keyboard.press("Enter");
    await page.waitForSelector("#view .row.selected >> text=by keyboard");
    await held("#view");
    await page.press("[data-sort=size]", "Enter");
    await held("[aria-sort=ascending] [data-sort=size]");
    await page.focus("#view");
    await page.keyboard.press("Home");
    await page.keyboard.press("Shift+F10");
    await page.waitForSelector(".menu >> text=Rename");
    await page.keyboard.press("Escape");
    await page.keyboard.press("Delete");
    await page.press(".activity-card.good > .icon-button", "Enter");
    await page.waitForSelector(".activity-card", { state: "detached" });
    await held("#view");
    await page.keyboard.press("Alt+2");
    await page.click("#sort-button");
    await page.click(".menu >> text=Name");
    await page.keyboard.press("Control+l");
    await page.click("#find");
    await held("#find");
    await page.click("#search-button");
    await held("[name=name]");
    await page.keyboard.press("Escape");
    await held("#search-button");
  });
});

test("what was chosen is there in another browser, too", async () => {
  const favourites = "section[aria-label=Favourites]";
  await withPage("bob", { path: "/photo", kept: true }, async (page) => {
    const sent = page.waitForResponse((response) => (response.request().postData() ?? "").includes("favourites"));
    await page.click("[data-sort=mtime]");
    await choose(page, "Landscapes", { button: "right" });
    await page.click(".menu >> text=Add to favourites");
    assert.equal((await sent).status(), 200);
  });
  await withPage("bob", { kept: true }, async (page) => {
    await page.click(`${favourites} >> text=Landscapes`);
    await page.waitForSelector("#view >> text=Dusk.png");
    await page.waitForSelector("[aria-sort=ascending] [data-sort=name]");
    await page.goto(`${URL_OF_PAGE}#/photo`);
    await page.waitForSelector("[aria-sort=ascending] [data-sort=mtime]");
    await page.goto(`${URL_OF_PAGE}#/`);
    await page.click("[aria-label='Remove Landscapes from favourites']");
    await page.waitForSelector(favourites, { state: "detached" });
    await page.waitForSelector("section[aria-label='Recent folders'] >> text=photo");
  });
});

test("every module that a start needs is fetched at once", async () => {
  const web = new URL("../../apps/web/", import.meta.url);
  const listed = [...readFileSync(new URL("index.html", web), "utf8").matchAll(/(?:href|src)="js\/([\w.]+)"/g)].map(
    (match) => match[1],
  );
  const needed = new Set(["main.js", "theme.js"]);
  for (const name of needed)
    for (const [, other] of readFileSync(new URL(`js/${name}`, web), "utf8").matchAll(/(?:from|import) "\.\/([\w.]+)"/g)) needed.add(other);
  assert.deepEqual(listed.sort(), [...needed].sort());
});

test("a start asks for the shares and the folder, and for nothing else", () =>
  withPage("bob", { path: "/photo/Landscapes" }, async (page) => {
    const asked = [];
    page.on("request", (one) => one.url().includes("/cgi-bin/") && asked.push(new URL(one.url())));
    await page.reload({ waitUntil: "networkidle" });
    await rowsReady(page);
    await page.waitForSelector("[role=treeitem].current[aria-label='Landscapes']");
    assert.deepEqual(asked.map((url) => `${url.pathname.slice(9)} ${url.searchParams.get("action")}`), ["list shares", "list folder"]);
  }));

test("every message key has its words in both languages, where it is loaded", async () => {
  const web = new URL("../../apps/web/", import.meta.url);
  const source = readFileSync(new URL("../../src/core/error_state.cpp", import.meta.url), "utf8");
  const keys = [...source.matchAll(/"(error:\w+)"/g)].flatMap((match) => [match[1], `${match[1]}.hint`]);
  assert.ok(keys.length > 40);
  const tableOf = (file) => JSON.parse(readFileSync(new URL(`strings/${file}.json`, web), "utf8"));
  const [en, later] = [tableOf("en"), tableOf("later/en")];
  for (const key of keys) assert.ok(en[key], key);
  for (const [file, table] of [["de", en], ["later/de", later]])
    assert.deepEqual(Object.keys(tableOf(file)).sort(), Object.keys(table).sort());
  for (const file of readdirSync(new URL("js", web))) {
    const text = readFileSync(new URL(`js/${file}`, web), "utf8");
    const named = Object.keys(later).filter((key) => text.includes(`"${key}"`));
    assert.ok(named.length === 0 || text.includes('import "./later.js";'), `${file} names ${named}`);
  }
});

test("each kind of file has the icons that the programs look for", () => {
  const images = new URL("../../apps/web/images/", import.meta.url);
  const drawn = readdirSync(new URL("files_ext", images)).map((icon) => [icon, readlinkSync(new URL(`files_ext/${icon}`, images))]);
  const wanted = Object.entries(KINDS).flatMap(([kind, extensions]) =>
    extensions.split(" ").map((extension) => [`${extension}.png`, `../kinds/${kind}.png`]),
  );
  assert.deepEqual(drawn.sort(), wanted.sort());
  for (const [icon, kind] of Object.entries(PICTURES))
    assert.equal(readlinkSync(new URL(icon, images)), `kinds/${kind}.png`);
});
