// What goes on behind the page: searches and background operations.
import assert from "node:assert/strict";
import { chmodSync, existsSync, mkdirSync, readdirSync, readFileSync, rmSync, writeFileSync } from "node:fs";
import { before, test } from "node:test";
import { go, row, rowsReady, wentWell, withPage } from "./browser.mjs";
import { Gate } from "./gate.mjs";

const projects = process.env.ORVEL_TEST_PROJECTS;
const MANY = 50;

// A zip with "locked.txt", encrypted with the password "open me".
const LOCKED =
  "UEsDBBQACQAIANQNKSsAAAAAAAAAAAYAAAAKABgAbG9ja2VkLnR4dFVUBQABAMqaO3V4CwABBAAAAAAEAAAAAFnL2rTVBShtKxVK0KvrQHWEU1aBUEsHCL3pXYgUAAAABgAAAFBLAQIUAxQACQAIANQNKSu96V2IFAAAAAYAAAAKABgAAAAAAAAAAACkgQAAAABsb2NrZWQudHh0VVQFAAEAypo7dXgLAAEEAAAAAAQAAAAAUEsFBgAAAAABAAEAUAAAAGQAAAAAAA==";

before(() => {
  mkdirSync(`${projects}/many/target`, { recursive: true });
  mkdirSync(`${projects}/locked`);
  mkdirSync(`${projects}/undone`);
  chmodSync(`${projects}/undone`, 0o777);
  writeFileSync(`${projects}/undone/one.txt`, "first");
  writeFileSync(`${projects}/locked/locked.zip`, LOCKED, "base64");
  for (let i = 0; i < MANY; ++i) writeFileSync(`${projects}/many/part ${i}.dat`, "x");
  mkdirSync(`${projects}/<i>odd`, { mode: 0o777 });
  for (const name of ["needle 'one'.txt", "needle & two.txt", "Needle \u202Ethree.txt"])
    writeFileSync(`${projects}/<i>odd/${name}`, "needle");
});

const card = (page, text) => page.locator(".activity-card", { hasText: text }).first();
const found = (page, count) => page.waitForSelector(`#status >> text=${count} found`);

test("a search: live, sorted, filtered, true after operations", () =>
  withPage("admin", { path: "/projects" }, async (page) => {
    await page.fill("#find", "needle*");
    await page.press("#find", "Enter");
    await found(page, 3);
    await rowsReady(page);
    await page.click("[data-sort=name]");
    await page.waitForSelector("[aria-sort=descending]");
    await page.fill("#find", "two");
    await found(page, 1);
    await page.fill("#find", "");
    await found(page, 3);
    await page.click("#toolbar >> text=Files and folders");
    await page.click(".menu >> text=/^Folders$/");
    await page.waitForSelector(".state >> text=Nothing here passes the filter");
    await page.click(".state >> text=Clear filter");
    await found(page, 3);
    await row(page, "needle & two.txt").click();
    await page.keyboard.press("F2");
    await page.fill(".in-place", "needle & four.txt");
    await page.keyboard.press("Enter");
    await page.waitForSelector("#view >> text=needle & four.txt");
    await row(page, "needle 'one'").click();
    await page.keyboard.press("Delete");
    await found(page, 2);
    await page.reload(); // the address keeps the search
    await found(page, 2);
    // Also what was asked for: where the results are gone it is asked once more.
    await page.evaluate(() => {
      location.hash = location.hash.replace(/\?\w+/, "?0123456789ABCDEF");
    });
    await page.click(".state >> text=Try again");
    await found(page, 2);
    await row(page, "four.txt").click({ button: "right" });
    await page.click(".menu >> text=Show in its folder");
    await page.waitForSelector("#view .row.selected >> text=needle & four.txt");
    assert.equal(await page.evaluate(() => location.hash), "#/projects/%3Ci%3Eodd");
  }));

test("how old the index is that a search was answered from", () =>
  withPage("alice", { path: "/projects" }, async (page) => {
    const asOf = { updated: Math.floor(Date.now() / 1000), live: false };
    let state = { finished: false };
    await page.route("**/cgi-bin/search*", async (route) => {
      const response = await route.fetch();
      const reply = await response.json();
      const fake = { shares: { projects: "index" }, indexes: { projects: asOf }, ...state };
      for (const part of [reply.data, reply.data?.first]) if (part?.items) Object.assign(part, fake);
      await route.fulfill({ response, json: reply });
    });
    await page.fill("#find", "needle*");
    await page.press("#find", "Enter");
    await page.waitForSelector("#status >> text=still preliminary");
    state = { finished: true };
    await page.waitForSelector("#status >> text=/from the index as of .*:/");
    asOf.live = true;
    await page.keyboard.press("Alt+r");
    await page.waitForSelector("#status >> text=kept up to date");
  }));

test("a search with every kind of criterion, stopped, closed", () =>
  withPage("alice", { path: "/" }, async (page) => {
    await page.click("#search-button");
    await page.click(".search-form >> text=More criteria");
    await page.fill("[name=name]", "part *");
    await page.fill("[name=extension]", "dat");
    await page.selectOption("[name=type]", "file");
    await page.selectOption("[name=size_op]", "less");
    await page.fill("[name=size]", "4");
    await page.fill("[name=mtime_from]", "2020-01-01");
    await page.fill("[name=mtime_to]", "2019-01-01");
    assert.equal(await page.locator(".search-form input:invalid").count(), 1); // it would end before it begins
    await page.fill("[name=mtime_to]", "");
    await page.fill("[name=owner]", "nobody of that name");
    await page.click(".search-form >> text=/^Search$/");
    await page.waitForSelector(".search-form .complaint >> text=Owner");
    await page.fill("[name=owner]", "");
    const gate = new Gate("FILEIDXOutputDBInsert");
    await page.click(".search-form >> text=/^Search$/");
    await gate.holds();
    gate.next();
    await gate.holds(); // before the second match
    await page.waitForSelector("#view .row >> text=part");
    await page.click("#toolbar >> text=Stop");
    gate.open();
    await page.waitForFunction(() => !document.querySelector("#status .running"));
    await page.press("#view", "End");
    await page.waitForSelector("#view .row.cursor >> text=part");
    await page.keyboard.press("Escape");
    await page.click("#toolbar >> text=Close results");
    await page.waitForSelector(".home");
  }));

test("copy, reload, cancel; a conflict; delete and restore", () =>
  withPage("admin", { path: "/projects" }, async (page) => {
    await row(page, "many").click();
    await page.keyboard.press("Control+c");
    await go(page, "/projects/house");
    await page.waitForSelector("#view >> text=plan.pdf");
    await page.focus("#view");
    const gate = new Gate("VEXOFileCopy");
    await page.keyboard.press("Control+v");
    await card(page, "Copy").waitFor();
    await gate.holds();
    await page.reload();
    await page.waitForFunction(() => document.querySelector(".activity-card .detail")?.textContent.includes(" of "));
    await card(page, "Copy “many” to house").locator("> .icon-button").click();
    await card(page, "Cancelled").waitFor();
    gate.open();
    assert.ok(readdirSync(`${projects}/house/many`).length < MANY);

    await go(page, "/projects/<i>odd");
    await page.waitForSelector("#view >> text=four.txt");
    await row(page, "four.txt").click();
    for (let i = 0; i < 2; ++i) {
      await page.click("#toolbar >> text=Copy to");
      await page.click(".picker >> [aria-label='Up one folder']");
      await page.click(".picker >> text=house");
      await page.click(".picker >> text=Copy here");
      if (i === 1) await page.click(".dialog >> text=Keep both");
      await wentWell(page, "Copy “needle & four.txt” to house");
    }
    assert.ok(existsSync(`${projects}/house/needle & four (2).txt`));

    await page.keyboard.press("Delete");
    await page.waitForSelector(".activity-card.good >> text=Delete “needle & four.txt”");
    await page.click("#tree >> text=projects");
    await page.dblclick("#view >> text=Recycle bin");
    await page.waitForSelector("#toolbar >> text=Empty recycle bin");
    assert.equal(await page.locator("#toolbar >> text=Upload").count(), 0);
    await row(page, "<i>odd").dblclick();
    await row(page, "four.txt").click();
    await page.click("#toolbar >> text=Restore");
    await page.waitForSelector(".activity-card.good >> text=Restore “needle & four.txt”");
    assert.ok(existsSync(`${projects}/<i>odd/needle & four.txt`));
  }));

test("an archive with a password: asked for, refused, opened", () =>
  withPage("admin", { path: "/projects/locked" }, async (page) => {
    await row(page, "locked.zip").click();
    await page.click("[aria-label='More actions']");
    await page.click(".menu >> text=Extract to");
    await page.click(".picker >> text=Extract here");
    for (const password of ["wrong", "open me"]) {
      await page.waitForSelector(".activity-card.failed >> text=The archive “locked.zip” needs a password");
      await page.click(".activity-card.failed >> text=Enter password…");
      await page.fill(".dialog input[type=password]", password);
      await page.keyboard.press("Enter");
    }
    await page.waitForSelector(".activity-card.good >> text=Extract");
    assert.equal(readFileSync(`${projects}/locked/locked.txt`, "latin1"), "hidden");
  }));

test("packed, extracted", () =>
  withPage("alice", { path: "/projects" }, async (page) => {
    await row(page, "notes.md").click();
    await page.click("[aria-label='More actions']");
    await page.click(".menu >> text=Pack as zip");
    await page.waitForSelector(".dialog input:focus"); // it opens once the chosen entries are known
    await page.keyboard.press("Enter");
    await row(page, "notes.zip").click();
    await page.click("[aria-label='More actions']");
    await page.click(".menu >> text=Extract to");
    await page.click(".picker >> text=house");
    await page.click(".picker [aria-label='New folder']");
    await page.fill(".dialog:last-of-type input", "unpacked");
    await page.keyboard.press("Enter");
    await page.waitForSelector(".picker b >> text=unpacked");
    await page.click(".picker >> text=Extract here");
    await page.waitForSelector(".activity-card.good >> text=Extract");
    assert.ok(existsSync(`${projects}/house/unpacked/notes.md`));

    await row(page, "notes.zip").click();
    await page.click("#toolbar [data-command=moveTo]");
    await page.click(".picker >> text=house");
    await page.click(".picker >> text=Move here");
    const moved = card(page, "Move “notes.zip” to house");
    await moved.locator("text=Undo").waitFor();
    assert.ok(!existsSync(`${projects}/notes.zip`));
    await moved.locator("text=Undo").click();
    await wentWell(page, "Undo: Move “notes.zip” to house");
    assert.ok(existsSync(`${projects}/notes.zip`));
  }));

test("undone by a key: a rename, a deletion; what stands in the way is named", () =>
  withPage("alice", { path: "/projects/undone" }, async (page) => {
    const file = `${projects}/undone/one.txt`;
    await row(page, "one.txt").click();
    await page.keyboard.press("F2");
    await page.fill(".in-place", "two.txt");
    await page.keyboard.press("Enter");
    await page.waitForSelector(".toast >> text=“one.txt” is now “two.txt”");
    await page.keyboard.press("Control+z");
    await wentWell(page, "Undo: “one.txt” is now “two.txt”");
    await row(page, "one.txt").click();
    await page.keyboard.press("Delete");
    await card(page, "Delete “one.txt”").locator("text=Undo").waitFor();
    writeFileSync(file, "in its place");
    await page.fill("#find", "o");
    await page.press("#find", "Control+z"); // what is typed is the field's own
    await page.fill("#find", "");
    await page.press("#view", "Control+z");
    await page.waitForSelector(".activity-card.failed >> text=“one.txt” exists already");
    rmSync(file);
    await page.click(".activity-card.failed >> text=Try again");
    await wentWell(page, "Undo: Delete “one.txt”");
    assert.equal(readFileSync(file, "utf8"), "first");
  }));

test("deleted files: one list of all bins, sorted, searched, restored, emptied", () =>
  withPage("alice", { path: "/projects/undone" }, async (page) => {
    rmSync(`${projects}/#recycle`, { recursive: true, force: true }); // with what only an administrator may remove
    mkdirSync(`${projects}/#recycle/samba`, { recursive: true });
    for (const folder of ["#recycle", "#recycle/samba"]) chmodSync(`${projects}/${folder}`, 0o777);
    writeFileSync(`${projects}/#recycle/samba/unknown.txt`, "by Samba");
    writeFileSync(`${projects}/undone/gone.txt`, "gone");
    await page.keyboard.press("Alt+r");
    await row(page, "gone.txt").click();
    await page.keyboard.press("Delete");
    await wentWell(page, "Delete “gone.txt”");
    await page.click("#deleted-link");
    await page.waitForSelector("#deleted-link[aria-current]");
    await rowsReady(page);
    assert.match(await row(page, "gone.txt").innerText(), /\/projects\/undone.*alice/s);
    assert.match(await row(page, "unknown.txt").innerText(), /\/projects\/samba.*around.*not known/s);
    await page.click("[data-sort=name]");
    await page.waitForSelector("[aria-sort=ascending]");
    await page.fill("#find", "gone");
    await page.waitForSelector("#status >> text=1 item");
    assert.equal(await page.locator("#toolbar [data-command=emptyBin]").count(), 0); // it would empty more than is shown
    await row(page, "gone.txt").click();
    await page.click("#toolbar [data-command=restore]");
    await wentWell(page, "Restore “gone.txt”");
    assert.equal(readFileSync(`${projects}/undone/gone.txt`, "utf8"), "gone");
    await page.fill("#find", "");
    await row(page, "unknown.txt").waitFor();
    assert.equal(await row(page, "gone.txt").count(), 0);
    await page.click("#toolbar [data-command=emptyBin]");
    await page.click(".dialog >> text=Empty recycle bin");
    await wentWell(page, "Empty recycle bin");
    await page.waitForSelector(".state >> text=The recycle bin is empty");
    await go(page, "/projects");
    await page.waitForSelector("#deleted-link:not([aria-current])");
  }));
