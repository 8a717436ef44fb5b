// What goes on behind the page: searches and background operations.
import assert from "node:assert/strict";
import { existsSync, readdirSync, readFileSync, rmSync, writeFileSync } from "node:fs";
import { test } from "node:test";
import { cardOf, choose, go, press, row, wentWell, withPage } from "./browser.mjs";
import { Gate } from "./gate.mjs";
import { AGAIN, ownFolder, write } from "./support.mjs";

const MANY = 50;

// A zip with "locked.txt", encrypted with the password "open me".
const LOCKED =
  "UEsDBBQACQAIANQNKSsAAAAAAAAAAAYAAAAKABgAbG9ja2VkLnR4dFVUBQABAMqaO3V4CwABBAAAAAAEAAAAAFnL2rTVBShtKxVK0KvrQHWEU1aBUEsHCL3pXYgUAAAABgAAAFBLAQIUAxQACQAIANQNKSu96V2IFAAAAAYAAAAKABgAAAAAAAAAAACkgQAAAABsb2NrZWQudHh0VVQFAAEAypo7dXgLAAEEAAAAAAQAAAAAUEsFBgAAAAABAAEAUAAAAGQAAAAAAA==";

const parts = Object.fromEntries(Array.from({ length: MANY }, (_, i) => [`part ${i}.dat`, "x"]));

const found = (page, count) => page.waitForSelector(`#status >> text=${count} found`);

test("a search: live, sorted, filtered, true after operations", () => {
  ownFolder("search/<i>odd", { "needle 'one'.txt": "", "needle & two.txt": "needle", "Needle \u202Ethree.txt": "" });
  return withPage("admin", { path: "/projects/search" }, async (page) => {
    await page.fill("#find", "needle*");
    await page.press("#find", "Enter");
    await found(page, 3);
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
    await choose(page, "needle & two.txt");
    await page.keyboard.press("F2");
    await page.fill(".in-place", "needle & four.txt");
    await page.keyboard.press("Enter");
    await page.waitForSelector("#view >> text=needle & four.txt");
    await choose(page, "needle 'one'");
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
    await choose(page, "four.txt", { button: "right" });
    await page.click(".menu >> text=Show in its folder");
    await page.waitForSelector("#view .row.selected >> text=needle & four.txt");
    assert.equal(await page.evaluate(() => location.hash), "#/projects/search/%3Ci%3Eodd");
  });
});

test("how old the index is that a search was answered from", () => {
  ownFolder("aged", { "needle.txt": "" });
  return withPage("alice", { path: "/projects/aged" }, async (page) => {
    const asOf = { updated: Math.floor(Date.now() / 1000), live: false };
    let state = { finished: false };
    await page.route("**/cgi-bin/search*", async (route) => {
      const response = await route.fetch(AGAIN);
      const reply = await response.json();
      const fake = { shares: { projects: "index" }, indexes: { projects: asOf }, ...state };
      for (const part of [reply.data, reply.data?.first]) if (part?.items) Object.assign(part, fake);
      await route.fulfill({ response, json: reply });
    });
    await page.fill("#find", "needle*");
    await page.press("#find", "Enter");
    await page.waitForSelector("#status >> text=still preliminary");
    state = {}; // but as it is
    await page.waitForSelector("#status >> text=/from the index as of .*:/");
    asOf.live = true;
    await page.keyboard.press("Alt+r");
    await page.waitForSelector("#status >> text=kept up to date");
  });
});

test("a search with every kind of criterion, stopped, closed", () => {
  ownFolder("many", parts);
  return withPage("alice", { path: "/" }, async (page) => {
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
    await page.waitForSelector("#status .running", { state: "detached" });
    await page.press("#view", "End");
    await page.waitForSelector("#view .row.cursor >> text=part");
    await page.keyboard.press("Escape");
    await page.click("#toolbar >> text=Close results");
    await page.waitForSelector(".home");
  });
});

test("copy, reload, cancel; a conflict; delete and restore", () => {
  const own = ownFolder("copies", { "<i>odd/": "", "<i>odd/needle & four.txt": "four", "house/": "" });
  write(`${own}/many`, parts);
  return withPage("admin", { path: "/projects/copies" }, async (page) => {
    await choose(page, "many");
    await page.keyboard.press("Control+c");
    await go(page, "/projects/copies/house");
    await page.waitForSelector(".state >> text=This folder is empty");
    const gate = new Gate("VEXOFileCopy");
    await page.keyboard.press("Control+v");
    const copying = cardOf(page, "Copy “many” to house");
    await copying.waitFor();
    await gate.holds();
    await page.reload();
    await copying.filter({ hasText: ` of ${MANY}` }).waitFor();
    await copying.locator("> .icon-button").click();
    await copying.filter({ hasText: "Cancelled" }).waitFor();
    gate.open();
    assert.ok(readdirSync(`${own}/house/many`).length < MANY);

    await go(page, "/projects/copies/<i>odd");
    await choose(page, "four.txt");
    for (let i = 0; i < 2; ++i) {
      await page.click("#toolbar >> text=Copy to");
      await page.click(".picker >> [aria-label='Up one folder']");
      await page.click(".picker >> text=house");
      await page.click(".picker >> text=Copy here");
      if (i === 1) await page.click(".dialog >> text=Keep both");
      await wentWell(page, "Copy “needle & four.txt” to house");
    }
    assert.ok(existsSync(`${own}/house/needle & four (2).txt`));

    await page.keyboard.press("Delete");
    await wentWell(page, "Delete “needle & four.txt”");
    await go(page, "/projects");
    await page.dblclick("#view >> text=Recycle bin");
    await page.waitForSelector("#toolbar >> text=Empty recycle bin");
    await page.waitForSelector("#toolbar >> text=Upload", { state: "detached" });
    await page.dblclick("#view >> text=copies");
    await page.dblclick("#view >> text=<i>odd");
    await choose(page, "four.txt");
    await page.click("#toolbar >> text=Restore");
    await wentWell(page, "Restore “needle & four.txt”");
    assert.ok(existsSync(`${own}/<i>odd/needle & four.txt`));
  });
});

test("an archive with a password: asked for, refused, opened", () => {
  const own = ownFolder("locked", { "locked.zip": Buffer.from(LOCKED, "base64") });
  return withPage("admin", { path: "/projects/locked" }, async (page) => {
    await choose(page, "locked.zip");
    await page.click("[aria-label='More actions']");
    await page.click(".menu >> text=Extract to");
    await page.click(".picker >> text=Extract here");
    for (const password of ["wrong", "open me"]) {
      await press(page, ".activity-card.failed", "The archive “locked.zip” needs a password", "Enter password…");
      await page.fill(".dialog input[type=password]", password);
      await page.keyboard.press("Enter");
    }
    await wentWell(page, "Extract");
    assert.equal(readFileSync(`${own}/locked.txt`, "latin1"), "hidden");
  });
});

test("packed, extracted", () => {
  const own = ownFolder("packed", { "house/": "", "notes.md": "# Notes" });
  return withPage("alice", { path: "/projects/packed" }, async (page) => {
    await choose(page, "notes.md");
    await page.click("[aria-label='More actions']");
    await page.click(".menu >> text=Pack");
    await page.waitForSelector(".dialog input:focus"); // it opens once the chosen entries are known
    await page.keyboard.press("Enter");
    await wentWell(page, "notes.md");
    await choose(page, "notes.zip");
    await page.click("[aria-label='More actions']");
    await page.click(".menu >> text=Extract to");
    await page.click(".picker >> text=house");
    await page.click(".picker [aria-label='New folder']");
    await page.fill(".dialog:last-of-type input", "unpacked");
    await page.keyboard.press("Enter");
    await page.waitForSelector(".picker b >> text=unpacked");
    await page.click(".picker >> text=Extract here");
    await wentWell(page, "Extract");
    assert.ok(existsSync(`${own}/house/unpacked/notes.md`));

    await choose(page, "notes.zip");
    await page.click("#toolbar [data-command=moveTo]");
    await page.click(".picker >> text=house");
    await page.click(".picker >> text=Move here");
    await cardOf(page, "Move “notes.zip” to house").locator("text=Undo").waitFor();
    assert.ok(!existsSync(`${own}/notes.zip`));
    await press(page, ".activity-card", "Move “notes.zip” to house", "Undo");
    await wentWell(page, "Undo: Move “notes.zip” to house");
    assert.ok(existsSync(`${own}/notes.zip`));
  });
});

test("undone by a key: a rename, a deletion; what stands in the way is named", () => {
  const file = `${ownFolder("undone", { "one.txt": "first" })}/one.txt`;
  return withPage("alice", { path: "/projects/undone" }, async (page) => {
    await choose(page, "one.txt");
    await page.keyboard.press("F2");
    await page.fill(".in-place", "two.txt");
    await page.keyboard.press("Enter");
    await page.waitForSelector(".toast >> text=“one.txt” is now “two.txt”");
    await page.keyboard.press("Control+z");
    await wentWell(page, "Undo: “one.txt” is now “two.txt”");
    await choose(page, "one.txt");
    await page.keyboard.press("Delete");
    await cardOf(page, "Delete “one.txt”").locator("text=Undo").waitFor();
    writeFileSync(file, "in its place");
    await page.fill("#find", "o");
    await page.press("#find", "Control+z"); // what is typed is the field's own
    await page.fill("#find", "");
    await page.press("#view", "Control+z");
    await page.waitForSelector(".activity-card.failed >> text=“one.txt” exists already");
    rmSync(file);
    await press(page, ".activity-card.failed", "“one.txt” exists already", "Try again");
    await wentWell(page, "Undo: Delete “one.txt”");
    assert.equal(readFileSync(file, "utf8"), "first");
  });
});

test("deleted files: one list of all bins, sorted, searched, restored, emptied", () => {
  // Without what only an administrator may remove.
  const bin = `${process.env.ORVEL_TEST_PROJECTS}/#recycle`;
  rmSync(bin, { recursive: true, force: true });
  write(bin, { "/": "", "samba/": "", "samba/unknown.txt": "by Samba" });
  const own = ownFolder("deleted", { "gone.txt": "gone" });
  return withPage("alice", { path: "/projects/deleted" }, async (page) => {
    await choose(page, "gone.txt");
    await page.keyboard.press("Delete");
    await wentWell(page, "Delete “gone.txt”");
    await page.click("#deleted-link");
    await page.waitForSelector("#deleted-link[aria-current]");
    await row(page, "gone.txt").filter({ hasText: /\/projects\/deleted.*alice/s }).waitFor();
    await row(page, "unknown.txt").filter({ hasText: /\/projects\/samba.*around.*not known/s }).waitFor();
    await page.click("[data-sort=name]");
    await page.waitForSelector("[aria-sort=ascending]");
    await page.fill("#find", "gone");
    await page.waitForSelector("#status >> text=1 item");
    await page.waitForSelector("#toolbar [data-command=emptyBin]", { state: "detached" }); // it would empty more than is shown
    await choose(page, "gone.txt");
    await page.click("#toolbar [data-command=restore]");
    await wentWell(page, "Restore “gone.txt”");
    assert.equal(readFileSync(`${own}/gone.txt`, "utf8"), "gone");
    await page.fill("#find", "");
    await row(page, "unknown.txt").waitFor();
    assert.equal(await row(page, "gone.txt").count(), 0);
    await page.click("#toolbar [data-command=emptyBin]");
    await page.click(".dialog >> text=Empty recycle bin");
    await wentWell(page, "Empty recycle bin");
    await page.waitForSelector(".state >> text=The recycle bin is empty");
    await go(page, "/projects");
    await page.waitForSelector("#deleted-link:not([aria-current])");
  });
});
