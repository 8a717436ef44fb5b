// What goes wrong is said with its name, waited for or tried again; what went well leaves.
import assert from "node:assert/strict";
import { existsSync, readdirSync, readFileSync, statSync, utimesSync } from "node:fs";
import { join } from "node:path";
import { test } from "node:test";
import { choose, drawn, go, row, upload, URL_OF_PAGE, wentWell, withPage } from "./browser.mjs";
import { AGAIN, localFiles, ownFolder, write } from "./support.mjs";

const FILES = 30;
const files = localFiles("trouble", { thing: "a file" });
for (let i = 0; i < FILES; ++i) write(join(files, "trip", i % 2 ? "a/b" : "a"), { [`photo ${i}.jpg`]: `photo ${i}` });

test("a connection that breaks: the queue waits and goes on, the list stays", () => {
  const own = ownFolder("broken off", { "two.txt": "" });
  return withPage(
    "alice",
    { path: "/projects/broken%20off" },
    async (page) => {
      let sent = 0;
      let away = false;
      let questions = 0;
      page.on("request", (request) => {
        if (request.postData()?.includes("action=present")) ++questions;
      });
      await page.route("**/cgi-bin/**", async (route) => {
        // What comes together in one form arrives, and only its answer is lost. The page's body cannot be seen here.
        if (route.request().url().includes("/upload") && ++sent === 1) {
          for (const name of readdirSync(join(files, "trip/a")).filter((one) => one !== "b"))
            await page.context().request.fetch(`${URL_OF_PAGE}cgi-bin/upload`, {
              ...AGAIN,
              method: "PUT",
              params: { path: `/projects/broken off/trip/a/${name}` },
              data: readFileSync(join(files, "trip/a", name)),
              headers: { Origin: new URL(URL_OF_PAGE).origin },
            });
          away = true;
        }
        return away ? route.abort("connectionreset") : route.continue();
      });
      await page.clock.install();
      await upload(page, "Upload a folder", join(files, "trip"));
      await page.waitForSelector(".activity-card >> text=Waiting for the connection");
      await page.keyboard.press("Alt+r");
      await page.waitForSelector("#notice >> text=may be out of date");
      await page.waitForSelector("#view >> text=two.txt");
      away = false;
      await page.clock.fastForward("00:20"); // to its next try
      const well = page.locator(".activity-card.good", { hasText: `${FILES} files uploaded` });
      await well.waitFor();
      await page.waitForSelector("#notice", { state: "hidden" });
      const there = ["a", "a/b"].flatMap((folder) => readdirSync(join(own, "trip", folder)));
      assert.equal(there.filter((name) => name !== "b").length, FILES); // nothing twice
      assert.equal(questions, 1); // what goes into a new folder meets nothing
      await page.clock.fastForward("00:07");
      await well.waitFor({ state: "detached" }); // by itself
    },
    [/ERR_CONNECTION_RESET/],
  );
});

test("a file that is refused: its name, the advice, once more", () => {
  const own = ownFolder("refused");
  return withPage("alice", { path: "/projects/refused" }, async (page) => {
    await page.route("**/cgi-bin/upload?*", (route) =>
      route.fulfill({ json: { success: false, error: { code: 416, key: "error:error_space_not_enough", path: "" } } }),
    );
    await upload(page, "Upload files", join(files, "thing"));
    const failed = page.locator(".activity-card.failed");
    await failed.locator("text=no room left for “thing”").waitFor();
    await failed.locator("text=Free some space on the volume").waitFor();
    await page.waitForSelector("#activity-title >> text=/activit.* failed/");
    await page.unroute("**/cgi-bin/upload?*");
    await failed.locator("text=Try again").click();
    await wentWell(page, "1 file uploaded");
    assert.ok(existsSync(join(own, "thing")));

    // One of several that go together: the others arrive, with their times.
    let requests = 0;
    page.on("request", (request) => {
      requests += request.url().includes("/upload");
    });
    const names = ["a.txt", "b:b.txt", "c.txt", "d.txt"];
    write(files, Object.fromEntries(names.map((name) => [name, name])));
    utimesSync(join(files, "c.txt"), 1e9, 1e9);
    await upload(page, "Upload files", names.map((name) => join(files, name)));
    await failed.locator("text=3 files uploaded").waitFor();
    assert.equal(requests, 3); // all, the refused one alone, those behind it
    assert.equal(statSync(join(own, "c.txt")).mtimeMs, 1e12);
    await failed.locator("li:has-text('b:b.txt') >> text=Try again").click();
    await failed.locator("text=3 files uploaded").waitFor();
    assert.equal(requests, 4);
  });
});

test("a file and a folder of one name: neither replaces the other", () => {
  ownFolder("clash", { "taken/": "", "taken/thing/": "", "in/": "", "in/thing": "a file", "to/": "", "to/taken/": "" });
  return withPage("alice", { path: "/projects/clash/taken" }, async (page) => {
    await upload(page, "Upload files", join(files, "thing"));
    await page.waitForSelector(".dialog >> text=Neither can replace the other");
    assert.equal(await page.locator(".dialog button >> text=Replace").count(), 0);
    await page.click(".dialog >> text=Keep both");
    await wentWell(page, "1 file uploaded");
    await page.waitForSelector("#view >> text=thing (2)");
    for (const [folder, name, target, question] of [
      ["taken", "thing", "in", "Neither can replace the other"],
      ["", "taken", "to", "files of the same name are replaced"],
    ]) {
      await go(page, `/projects/clash/${folder}`.replace(/\/$/, ""));
      await choose(page, name);
      await page.keyboard.press("Control+c");
      await go(page, `/projects/clash/${target}`);
      await row(page, name).waitFor();
      await page.waitForSelector(`#pathbar >> text=${target}`);
      await page.keyboard.press("Control+v");
      await page.waitForSelector(`.dialog >> text=${question}`);
      await page.keyboard.press("Escape");
    }
  });
});

test("cut, a question dismissed, pasted after all; every tab follows, and what failed says why", () => {
  const both = { "one.txt": "", "two.txt": "" };
  const own = ownFolder("cut", { "source/": "", "to/": "", "in/": "" });
  for (const folder of ["source", "to"]) write(join(own, folder), both);
  return withPage("alice", { path: "/projects/cut/source" }, async (page) => {
    const other = await page.context().newPage();
    await other.goto(`${URL_OF_PAGE}#/projects/cut/to`);
    await other.waitForSelector("#view >> text=two.txt");
    // As if it took long.
    const running = { taskid: "OrvelFilemove_1", action: "move", state: "running", items_total: 7, items_done: 1, progress: 0.1 };
    await other.route("**/cgi-bin/operation?action=status", (route) =>
      route.fulfill({ json: { success: true, data: { tasks: [running] } } }),
    );
    await page.bringToFront();
    await page.press("#view", "Control+a");
    await page.keyboard.press("Control+x");
    await page.waitForFunction(() => document.querySelectorAll("#view .row.cut").length === 2);
    await go(page, "/projects/cut/to");
    await page.waitForSelector("#view .row.cut", { state: "detached" });
    await row(page, "two.txt").waitFor();
    await page.keyboard.press("Control+v");
    await page.waitForSelector(".dialog >> text=2 names are taken");
    await page.keyboard.press("Escape");
    await page.click("#toolbar >> text=Paste");
    await page.waitForSelector(".dialog >> text=2 names are taken");
    await page.click(".dialog >> text=Keep both");
    await other.waitForSelector(".activity-card >> text=Move 7 items");
    await wentWell(page, "Move 2 items to to");
    await page.waitForSelector("#toolbar >> text=Paste", { state: "detached" });
    assert.deepEqual(readdirSync(join(own, "source")), []);
    await go(page, "/projects");
    await choose(page, "board");
    await page.keyboard.press("Control+c");
    await go(page, "/projects/cut/in");
    await page.waitForSelector(".state >> text=This folder is empty");
    await page.keyboard.press("Control+v");
    const failed = page.locator(".activity-card.failed", { hasText: "Copy “board” to in" });
    await failed.locator("text=Ask the owner or an administrator").waitFor();
    await failed.locator("text=Why?").first().click();
    await page.waitForSelector(".dialog .why li");
    await page.keyboard.press("Escape");
    await failed.locator("text=Try again").click();
    await failed.waitFor();
    await page.reload();
    await page.waitForSelector(".state >> text=This folder is empty");
    await page.waitForFunction(() => document.body.classList.contains("started"));
    await drawn(page);
    assert.equal(await failed.count(), 0); // it has been seen
  });
});
