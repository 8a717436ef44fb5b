// How much is in what was chosen, and what takes the space.
import assert from "node:assert/strict";
import { chmodSync, rmSync } from "node:fs";
import { beforeEach, test } from "node:test";
import { findings, row, screenshot, withPage } from "./browser.mjs";
import { Gate } from "./gate.mjs";
import { ownFolder, write } from "./support.mjs";

const phone = { viewport: { width: 390, height: 780 }, isMobile: true, hasTouch: true };

const FILES = { "films/long.mkv": 9000, "films/old/first.avi": 5000, "b\uFFFDd.jpg": 4000, "gone.iso": 2000 };
let folder;

beforeEach(() => {
  folder = ownFolder("sizes", { "shut/": "", ...Object.fromEntries(Object.entries(FILES).map(([name, size]) => [name, "x".repeat(size)])) });
  chmodSync(`${folder}/shut`, 0o700);
});

const counted = (page) => page.waitForSelector("dialog .sizes:not([aria-busy]) dt >> text=Contains");
const lineOf = (page, name) => page.textContent(`dialog .sizes dt:has-text("${name}") + dd`);
const pictured = (page, name) => page.waitForSelector(`.space .crumb[aria-current]:has-text("${name}") >> xpath=ancestor::dialog//ul[contains(@class, "treemap")]`);

test("properties count one and many, by keys", () =>
  withPage("alice", { path: "/projects/sizes" }, async (page) => {
    await page.press("#view", "Alt+Enter"); // of the folder itself
    await counted(page);
    assert.equal(await lineOf(page, "Size"), "19.5 KB (20,000 bytes)");
    assert.equal(await lineOf(page, "Contains"), "4 files, 3 folders");
    await page.waitForSelector(".sizes >> text=1 folder or file could not be read");
    await page.keyboard.press("Escape");
    await page.waitForSelector("dialog", { state: "detached" });
    await page.keyboard.press("Control+a");
    await page.keyboard.press("Alt+Enter");
    await counted(page);
    await page.waitForSelector(".hero >> text=4 items");
    assert.equal(await lineOf(page, "Size"), "19.5 KB (20,000 bytes)");
    assert.equal(await lineOf(page, "Contains"), "4 files, 2 folders"); // one was not counted at all
    await page.waitForSelector(".sizes >> text=1 item could not be counted");
  }));

test("what takes the space: in and out by keys, to a file, past what is gone", () =>
  withPage("alice", { path: "/projects/sizes" }, async (page) => {
    const held = (name) => page.waitForFunction((begin) => document.activeElement.textContent.startsWith(begin), name);
    await page.press("#view", "Alt+s");
    await pictured(page, "sizes");
    const tiles = await page.locator(".treemap .tile").allTextContents();
    assert.deepEqual(tiles, ["films13.7 KB · 70%", "b?d.jpg3.91 KB · 20%", "gone.iso1.95 KB · 10%"]);
    await page.press(".treemap button", "End");
    await held("gone");
    await page.keyboard.press("Home");
    await page.keyboard.press("Enter");
    await pictured(page, "films");
    await held("long"); // the keyboard goes along
    await page.keyboard.press("Backspace");
    await pictured(page, "sizes");
    rmSync(`${folder}/gone.iso`);
    await page.click(".treemap button:has-text('gone')");
    await page.waitForSelector(".toast >> text=“gone.iso” is not there any more");
    await page.click("[data-list=largest_files]");
    assert.deepEqual(await page.locator(".space-row .name").allTextContents(), ["long.mkv", "first.avi", "b?d.jpg", "gone.iso"]);
    await page.click(".space-row:has-text('first')");
    await page.waitForSelector("dialog", { state: "detached" });
    await row(page, "first.avi").and(page.locator(".selected")).waitFor();
    assert.equal(await page.evaluate(() => location.hash), "#/projects/sizes/films/old");
  }));

test("a folder that is gone says so, and the way back stays", () =>
  withPage("alice", { path: "/projects/sizes", ...phone }, async (page) => {
    write(folder, { "brief/file": "x".repeat(3000) });
    await page.evaluate(() => document.getElementById("view").focus());
    await page.keyboard.press("Alt+s");
    await pictured(page, "sizes");
    assert.deepEqual(await findings(page, ".space"), []);
    await screenshot(page, "space");
    rmSync(`${folder}/brief`, { recursive: true });
    await page.tap(".treemap button:has-text('brief')");
    await page.waitForSelector(".space-failure >> text=brief");
    await page.tap(".space .crumb:has-text('sizes')");
    await pictured(page, "sizes");
    await page.tap(".space header button");
    await page.waitForSelector("dialog", { state: "detached" });
  }));

test("counting ends when it is told to, or with its dialog", () =>
  withPage("alice", { path: "/projects/sizes" }, async (page) => {
    const gate = new Gate("KTR::Task::beginUpdate");
    const open = async () => {
      await page.focus("#view");
      await page.keyboard.press("Alt+Enter");
      await gate.holds(); // before it begins
      gate.next();
      await gate.holds(); // in the first folder
    };
    try {
      await open();
      const told = page.waitForResponse((response) => response.request().postData()?.includes("action=cancel"));
      await page.click(".size-running button");
      await told;
      gate.open();
      await page.waitForSelector(".sizes >> text=Cancelled: not everything was counted");
      assert.equal(await page.locator(".activity-card", { hasText: "measure" }).count(), 0);
      await page.click(".sizes >> text=Count again");
      await page.waitForSelector(".sizes dd >> text=/ files, /");
      await page.keyboard.press("Escape");
      gate.next();
      await open();
      const cleared = page.waitForResponse((response) => response.request().postData()?.includes("action=clear"));
      await page.keyboard.press("Escape");
      gate.open();
      assert.equal((await (await cleared).json()).success, true);
    } finally {
      gate.open();
    }
  }));
