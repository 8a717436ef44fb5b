// The main states of the page for everybody: assistive technology, forced colours, narrow windows, hands on keys.
import assert from "node:assert/strict";
import { chmodSync } from "node:fs";
import { test } from "node:test";
import { boxOf, choose, findings, go, rowsReady, screenshot, typeName, withPage } from "./browser.mjs";
import { visitStates } from "./main_states.mjs";
import { ownFolder } from "./support.mjs";

const DEEP = "a drawer/with a rather long name/and another rather long name/in which there lies/one more/and the last one";
const phone = { viewport: { width: 390, height: 780 }, isMobile: true, hasTouch: true };

// No finding of axe-core on what is on screen, or in the part of it that is new.
async function accessible(page, state, part = "html") {
  await rowsReady(page);
  await page.waitForSelector(part);
  const found = await findings(page, part);
  await screenshot(page, `state-${state.replaceAll(" ", "-")}`);
  assert.deepEqual(found, [], state);
}

test("no finding in any main state, light and dark, wide and on a phone", async () => {
  await withPage("alice", { path: "/" }, (page) => visitStates(page, accessible));
  await withPage("alice", { path: "/photo", colorScheme: "dark", locale: "de-DE" }, async (page) => {
    await accessible(page, "dark");
    await page.keyboard.press("Control+a");
    await page.click("#toolbar [data-command=copyTo]");
    await page.waitForSelector(".picker-item");
    await accessible(page, "dark picker", ".dialog");
  });
  await withPage("alice", { path: "/photo", ...phone }, async (page) => {
    await accessible(page, "phone");
    await page.tap("#menu-button");
    await accessible(page, "phone drawer");
  });
});

test("a folder chosen by keys alone", () =>
  withPage("alice", { path: "/projects" }, async (page) => {
    await choose(page, "notes.md");
    await page.click("#toolbar [data-command=copyTo]");
    await page.waitForSelector(".picker-list:focus .picker-item.active");
    for (const key of ["End", "Home", "ArrowDown"]) await page.keyboard.press(key);
    const second = await page.textContent(".picker-item.active .name");
    await page.keyboard.press("Enter");
    await page.waitForSelector(`.picker b:has-text("${second}")`);
    await page.waitForSelector(".picker-list:focus");
    await page.keyboard.press("ArrowLeft");
    await page.waitForSelector(`.picker-item.active:has-text("${second}")`); // where one came from
  }));

test("colours that the system forces show what is chosen", () =>
  withPage("alice", { path: "/photo", forcedColors: "active" }, async (page) => {
    await choose(page, "2013");
    const look = (...what) => page.evaluate(([one, part, property]) => getComputedStyle(document.querySelector(one), part)[property], what);
    const ground = (selector) => look(selector, null, "backgroundColor");
    assert.notEqual(await ground("#view .row.selected"), await ground("#view .row:not(.selected, .header)"));
    assert.equal(await look("#view .row.selected .check", "::before", "content"), '"✓"');
    assert.notEqual(await ground("[aria-pressed=true]"), await ground("[aria-pressed=false]"));
    assert.notEqual(await ground("#volume .progress > i"), await ground("#volume .progress"));
  }));

test("a deep path in a narrow window, names in the tree, results on a phone", async () => {
  ownFolder(`${DEEP}/four with a rather long name`);
  await withPage(
    "alice",
    { path: `/projects/${encodeURI(DEEP)}`, viewport: { width: 1024, height: 700 } },
    async (page) => {
      const crumbs = await page
        .locator("#pathbar .crumb:visible")
        .evaluateAll((nodes) => nodes.slice(1).map((node) => [node.textContent, node.clientWidth]));
      assert.ok(crumbs.every(([, width]) => width >= 40), `${crumbs}`);
      await page.click("#pathbar .more-crumbs button");
      await page.click(".menu >> text=with a rather long name");
      await page.waitForSelector("#view >> text=and another rather long name");
      await page.goBack();
      const stem = page.locator(".tree-line", { hasText: "four with a rather" }).locator(".stem");
      await page.click(".tree-line.current:has-text('and the last one') .twist");
      await stem.waitFor();
      assert.ok((await boxOf(stem)).width >= 20);
    },
  );
  await withPage("alice", { path: "/", ...phone }, async (page) => {
    await page.tap("#search-button");
    await page.fill("[name=name]", "plan");
    await page.keyboard.press("Enter");
    await page.waitForSelector("#view .row >> text=/\\/projects\\/house/");
  });
});

test("what cannot work is not offered", () => {
  chmodSync(ownFolder("shut to writers", { "inside/": "", "file.txt": "x" }), 0o555);
  return withPage("alice", { path: "/projects/shut%20to%20writers" }, async (page) => {
    const offered = (id) => page.locator(`#toolbar [data-command=${id}]`);
    await offered("newFolder").waitFor({ state: "detached" });
    await choose(page, "file.txt");
    await offered("download").waitFor();
    await offered("delete").waitFor({ state: "detached" });
    await go(page, "/preview");
    await choose(page, "readme.txt");
    for (const id of ["download", "share"]) await offered(id).waitFor({ state: "detached" });
  });
});

test("accents in either form; a filter on a phone says so and goes; letters find far names", async () => {
  ownFolder("accents", Object.fromEntries(["NFC", "NFD"].map((form) => [`café ${form}.txt`.normalize(form), ""])));
  await withPage("alice", { path: "/projects/accents", ...phone }, async (page) => {
    await page.tap("#find-button");
    await page.fill("#find", "café");
    await page.waitForSelector("#status >> text=filtered by “café”");
    await page.waitForFunction(() => document.querySelectorAll("#view .row:not(.header)").length === 2);
    await page.evaluate(() => document.activeElement.blur());
    assert.ok(await page.locator("#find").isVisible());
    await page.tap("#status [aria-label='Clear filter']");
    await page.waitForSelector("#status .filter-chip", { state: "detached" });
    await page.waitForSelector("#find", { state: "hidden" });
    await page.tap("#search-button");
    await page.fill("[name=name]", "café*");
    await page.keyboard.press("Enter");
    await page.waitForSelector("#status >> text=2 found");
  });
  await withPage("alice", { path: "/warehouse" }, async (page) => {
    await page.click("[data-sort=size]");
    await page.waitForSelector("[aria-sort=ascending] [data-sort=size]");
    await rowsReady(page);
    await typeName(page, "item-19999x");
    // Taken back at once: what was typed shows for four seconds.
    await page.waitForFunction(() => {
      if (!document.getElementById("typed").textContent.includes("No name begins with")) return false;
      document.getElementById("view").dispatchEvent(new KeyboardEvent("keydown", { key: "Backspace", bubbles: true, cancelable: true }));
      return true;
    });
    await page.waitForSelector("#view .row.selected >> text=item-19999.dat");
    assert.equal(await page.evaluate(() => location.hash), "#/warehouse");
  });
});
