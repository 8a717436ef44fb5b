// The main states of the page for everybody: assistive technology, forced colours, narrow windows, hands on keys.
import assert from "node:assert/strict";
import { chmodSync, mkdirSync, writeFileSync } from "node:fs";
import { before, test } from "node:test";
import { boxOf, findings, go, row, rowsReady, screenshot, typeName, withPage } from "./browser.mjs";
import { visitStates } from "./main_states.mjs";

const projects = process.env.ORVEL_TEST_PROJECTS;
const DEEP = "a drawer/with a rather long name/and another rather long name/in which there lies/one more/and the last one";
const phone = { viewport: { width: 390, height: 780 }, isMobile: true, hasTouch: true };

before(() => {
  mkdirSync(`${projects}/${DEEP}`, { recursive: true });
  mkdirSync(`${projects}/${DEEP}/four with a rather long name`);
  mkdirSync(`${projects}/accents`, { mode: 0o777 });
  for (const form of ["NFC", "NFD"]) writeFileSync(`${projects}/accents/café ${form}.txt`.normalize(form), "");
  mkdirSync(`${projects}/shut to writers/inside`, { recursive: true });
  writeFileSync(`${projects}/shut to writers/file.txt`, "x");
  chmodSync(`${projects}/shut to writers`, 0o555);
});

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
    await row(page, "notes.md").click();
    await page.click("#toolbar [data-command=copyTo]");
    await page.waitForSelector(".picker-item.active");
    for (const key of ["End", "Home", "ArrowDown"]) await page.keyboard.press(key);
    const second = await page.textContent(".picker-item.active .name");
    await page.keyboard.press("Enter");
    await page.waitForSelector(`.picker b:has-text("${second}")`);
    assert.equal(await page.evaluate(() => document.activeElement.getAttribute("role")), "listbox");
    await page.keyboard.press("ArrowLeft");
    await page.waitForSelector(`.picker-item.active:has-text("${second}")`); // where one came from
  }));

test("colours that the system forces show what is chosen", () =>
  withPage("alice", { path: "/photo", forcedColors: "active" }, async (page) => {
    await row(page, "2013").click();
    const look = (selector, part, property) =>
      page.evaluate(([one, two, three]) => getComputedStyle(document.querySelector(one), two)[three], [
        selector,
        part,
        property,
      ]);
    const ground = (selector) => look(selector, null, "backgroundColor");
    assert.notEqual(await ground("#view .row.selected"), await ground("#view .row:not(.selected, .header)"));
    assert.equal(await look("#view .row.selected .check", "::before", "content"), '"✓"');
    assert.notEqual(await ground("[aria-pressed=true]"), await ground("[aria-pressed=false]"));
    assert.notEqual(await ground("#volume .progress > i"), await ground("#volume .progress"));
  }));

test("a deep path in a narrow window, names in the tree, results on a phone", async () => {
  await withPage(
    "alice",
    { path: `/projects/${encodeURI(DEEP)}`, viewport: { width: 1024, height: 700 } },
    async (page) => {
      const crumbs = await page
        .locator("#pathbar .crumb:visible")
        .evaluateAll((nodes) => nodes.slice(1).map((node) => [node.textContent, node.clientWidth]));
      assert.ok(
        crumbs.every(([, width]) => width >= 40),
        `${crumbs}`,
      );
      await page.click("#pathbar .more-crumbs button");
      await page.click(".menu >> text=with a rather long name");
      await page.waitForSelector("#view >> text=and another rather long name");
      await page.goBack();
      const stem = page.locator(".tree-line", { hasText: "four with a rather" }).locator(".stem");
      await page.click(".tree-line.current .twist").catch(() => {});
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

test("what cannot work is not offered", () =>
  withPage("alice", { path: "/projects/shut%20to%20writers" }, async (page) => {
    const offered = (id) => page.locator(`#toolbar [data-command=${id}]`);
    await offered("newFolder").waitFor({ state: "detached" });
    await row(page, "file.txt").click();
    await offered("download").waitFor();
    assert.equal(await offered("delete").count(), 0);
    await go(page, "/preview");
    await row(page, "readme.txt").click();
    await offered("download").waitFor({ state: "detached" });
    assert.equal(await offered("share").count(), 0);
  }));

test("accents in either form; a filter on a phone says so and goes; letters find far names", async () => {
  await withPage("alice", { path: "/projects/accents", ...phone }, async (page) => {
    await page.tap("#find-button");
    await page.fill("#find", "café");
    await page.waitForSelector("#status >> text=filtered by “café”");
    assert.equal(await page.locator("#view .row:not(.header)").count(), 2);
    await page.evaluate(() => document.activeElement.blur());
    assert.ok(await page.locator("#find").isVisible());
    await page.tap("#status [aria-label='Clear filter']");
    await page.waitForFunction(() => !document.querySelector("#status .filter-chip"));
    assert.ok(!(await page.locator("#find").isVisible()));
    await page.tap("#search-button");
    await page.fill("[name=name]", "café*");
    await page.keyboard.press("Enter");
    await page.waitForSelector("#status >> text=2 found");
  });
  await withPage("alice", { path: "/warehouse" }, async (page) => {
    await page.click("[data-sort=size]");
    await page.waitForSelector("[aria-sort=ascending] [data-sort=size]");
    await rowsReady(page);
    await page.focus("#view");
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
