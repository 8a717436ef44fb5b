// What goes wrong is said with its name, waited for or tried again; what went well leaves.
import assert from "node:assert/strict";
import { chmodSync, existsSync, mkdirSync, mkdtempSync, readFileSync, readdirSync, rmSync, statSync, utimesSync, writeFileSync } from "node:fs";
import { tmpdir } from "node:os";
import { join } from "node:path";
import { after, before, test } from "node:test";
import { go, row, upload, URL_OF_PAGE, wentWell, withPage } from "./browser.mjs";

const projects = process.env.ORVEL_TEST_PROJECTS;
const files = mkdtempSync(join(tmpdir(), "orvel-trouble-"));
const FILES = 30;

before(() => {
  mkdirSync(join(files, "trip/a/b"), { recursive: true });
  for (let i = 0; i < FILES; ++i) writeFileSync(join(files, "trip", i % 2 ? "a/b" : "a", `photo ${i}.jpg`), `photo ${i}`);
  writeFileSync(join(files, "thing"), "a file");
  for (const folder of ["trouble/in", "trouble/taken/thing", "trouble/source", "trouble/to"])
    mkdirSync(`${projects}/${folder}`, { recursive: true });
  for (const folder of ["", "/in", "/taken", "/taken/thing", "/source", "/to"]) chmodSync(`${projects}/trouble${folder}`, 0o777);
  for (const name of ["one.txt", "two.txt"]) {
    writeFileSync(`${projects}/trouble/in/${name}`, "");
    writeFileSync(`${projects}/trouble/source/${name}`, `${name} of the source`, { mode: 0o666 });
    writeFileSync(`${projects}/trouble/to/${name}`, `${name}, there before`, { mode: 0o666 });
  }
});
after(() => rmSync(files, { recursive: true }));

test("a connection that breaks: the queue waits and goes on, the list stays", () =>
  withPage(
    "alice",
    { path: "/projects/trouble/in" },
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
              method: "PUT",
              params: { path: `/projects/trouble/in/trip/a/${name}` },
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
      const there = ["a", "a/b"].flatMap((folder) => readdirSync(`${projects}/trouble/in/trip/${folder}`));
      assert.equal(there.filter((name) => name !== "b").length, FILES); // nothing twice
      assert.equal(questions, 1); // what goes into a new folder meets nothing
      await page.clock.fastForward("00:07");
      await well.waitFor({ state: "detached" }); // by itself
    },
    [/ERR_CONNECTION_RESET/],
  ));

test("a file that is refused: its name, the advice, once more", () =>
  withPage("alice", { path: "/projects/trouble/in" }, async (page) => {
    await page.route("**/cgi-bin/upload?*", (route) =>
      route.fulfill({ json: { success: false, error: { code: 416, key: "error:error_space_not_enough", path: "" } } }),
    );
    await upload(page, "Upload files", join(files, "thing"));
    const failed = page.locator(".activity-card.failed");
    await failed.locator("text=no room left for “thing”").waitFor();
    await failed.locator("text=Free some space on the volume").waitFor();
    assert.match(await page.textContent("#activity-title"), /activit.* failed/);
    await page.unroute("**/cgi-bin/upload?*");
    await failed.locator("text=Try again").click();
    await wentWell(page, "1 file uploaded");
    assert.ok(existsSync(`${projects}/trouble/in/thing`));

    // One of several that go together: the others arrive, with their times.
    let requests = 0;
    page.on("request", (request) => {
      requests += request.url().includes("/upload");
    });
    const names = ["a.txt", "b:b.txt", "c.txt", "d.txt"];
    for (const name of names) writeFileSync(join(files, name), name);
    utimesSync(join(files, "c.txt"), 1e9, 1e9);
    await upload(page, "Upload files", names.map((name) => join(files, name)));
    await failed.locator("text=3 files uploaded").waitFor();
    assert.equal(requests, 3); // all, the refused one alone, those behind it
    assert.equal(statSync(`${projects}/trouble/in/c.txt`).mtimeMs, 1e12);
    await failed.locator("li:has-text('b:b.txt') >> text=Try again").click();
    await failed.locator("text=3 files uploaded").waitFor();
    assert.equal(requests, 4);
  }));

test("a file and a folder of one name: neither replaces the other", () =>
  withPage("alice", { path: "/projects/trouble/taken" }, async (page) => {
    await upload(page, "Upload files", join(files, "thing"));
    await page.waitForSelector(".dialog >> text=Neither can replace the other");
    assert.equal(await page.locator(".dialog button >> text=Replace").count(), 0);
    await page.click(".dialog >> text=Keep both");
    await page.waitForSelector("#view >> text=thing (2)");
    await row(page, "thing").click();
    await page.keyboard.press("Control+c");
    await go(page, "/projects/trouble/in");
    await page.waitForSelector("#view >> text=trip");
    await page.keyboard.press("Control+v");
    await page.waitForSelector(".dialog >> text=Neither can replace the other"); // "thing" is a file here
    await page.keyboard.press("Escape");
    await go(page, "/projects/trouble");
    await page.waitForSelector("#view >> text=taken");
    mkdirSync(`${projects}/trouble/to/taken`);
    await row(page, "taken").click();
    await page.keyboard.press("Control+c");
    await go(page, "/projects/trouble/to");
    await page.waitForSelector("#view >> text=one.txt");
    await page.keyboard.press("Control+v");
    await page.waitForSelector(".dialog >> text=files of the same name are replaced");
    await page.keyboard.press("Escape");
  }));

test("cut, a question dismissed, pasted after all; every tab follows, and what failed says why", () =>
  withPage("alice", { path: "/projects/trouble/source" }, async (page) => {
    const other = await page.context().newPage();
    await other.goto(`${URL_OF_PAGE}#/projects/trouble/to`);
    await other.waitForSelector("#view >> text=two.txt");
    // As if it took long.
    const running = { taskid: "OrvelFilemove_1", action: "move", state: "running", items_total: 7, items_done: 1, progress: 0.1 };
    await other.route("**/cgi-bin/operation?action=status", (route) =>
      route.fulfill({ json: { success: true, data: { tasks: [running] } } }),
    );
    await page.bringToFront();
    await page.focus("#view");
    await page.keyboard.press("Control+a");
    await page.keyboard.press("Control+x");
    await page.waitForFunction(() => document.querySelectorAll("#view .row.cut").length === 2);
    await go(page, "/projects/trouble/to");
    await page.waitForSelector("#view >> text=/there|two.txt/");
    await page.waitForFunction(() => !document.querySelector("#view .row.cut"));
    await page.keyboard.press("Control+v");
    await page.waitForSelector(".dialog >> text=2 names are taken");
    await page.keyboard.press("Escape");
    await page.click("#toolbar >> text=Paste");
    await page.waitForSelector(".dialog >> text=2 names are taken");
    await page.click(".dialog >> text=Keep both");
    await other.waitForSelector(".activity-card >> text=Move 7 items");
    await wentWell(page, "Move 2 items to to");
    assert.equal(await page.locator("#toolbar >> text=Paste").count(), 0);
    assert.equal(readdirSync(`${projects}/trouble/source`).length, 0);
    await go(page, "/projects");
    await row(page, "board").click();
    await page.keyboard.press("Control+c");
    await go(page, "/projects/trouble/in");
    await page.waitForSelector("#view >> text=trip");
    await page.keyboard.press("Control+v");
    const failed = page.locator(".activity-card.failed", { hasText: "Copy “board” to in" });
    await failed.locator("text=Ask the owner or an administrator").waitFor();
    await failed.locator("text=Why?").first().click();
    await page.waitForSelector(".dialog .why li");
    await page.keyboard.press("Escape");
    await failed.locator("text=Try again").click();
    await failed.waitFor();
    await page.reload();
    await page.waitForSelector("#view >> text=trip");
    assert.equal(await page.locator(".activity-card").count(), 0); // it has been seen
  }));
