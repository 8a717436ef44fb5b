// What is chosen is what is done, whatever others do meanwhile and however many it is.
import assert from "node:assert/strict";
import { existsSync, mkdirSync, readdirSync, renameSync, rmSync, writeFileSync } from "node:fs";
import { beforeEach, test } from "node:test";
import { boxOf, drawn, row, rowsReady, wentWell, withPage } from "./browser.mjs";

const folder = `${process.env.ORVEL_TEST_PROJECTS}/chosen`;
const MANY = 1500; // of which the middle is never on screen

beforeEach(() => {
  rmSync(folder, { recursive: true, force: true });
  mkdirSync(folder, { mode: 0o777 });
  mkdirSync(`${process.env.ORVEL_TEST_PROJECTS}/moved`, { recursive: true });
  for (let i = 0; i < MANY; ++i) writeFileSync(`${folder}/${nameOf(i)}`, "x".repeat(i % 7), { mode: 0o666 });
});

const nameOf = (i) => `item-${String(i).padStart(5, "0")}.dat`;
const chosenCount = (page, count) => page.waitForSelector(`#status >> text=${count.toLocaleString("en-GB")} selected`);

// From one row to another, with only their surroundings ever fetched.
async function chooseRange(page, from, to) {
  await row(page, nameOf(from)).click();
  await page.evaluate(
    ([index, total]) => {
      const view = document.getElementById("view");
      view.scrollTop = (view.scrollHeight * index) / total - 200;
    },
    [to, MANY],
  );
  await row(page, nameOf(to)).click({ modifiers: ["Shift"] });
  await chosenCount(page, to - from + 1);
}

async function deleteForGood(page) {
  await page.keyboard.press("Shift+Delete");
  await page.click(".dialog .button.danger");
  await page.waitForSelector(".activity-card.good >> text=Delete");
}

test("deletes what was chosen, though others renamed and added", () =>
  withPage("admin", { path: "/projects/chosen" }, async (page) => {
    await chooseRange(page, 2, 1299);
    renameSync(`${folder}/${nameOf(5)}`, `${folder}/a first one.dat`); // as many as before, each row one further down
    renameSync(`${folder}/${nameOf(900)}`, `${folder}/zz last.dat`);
    writeFileSync(`${folder}/item-00700 new.dat`, "");
    await page.keyboard.press("Alt+r");
    await page.waitForSelector(".toast >> text=2 selected items are no longer here");
    await chosenCount(page, 1296);
    await deleteForGood(page);
    const left = [0, 1, ...Array.from({ length: 200 }, (_, i) => 1300 + i)].map(nameOf);
    assert.deepEqual(readdirSync(folder).sort(), [...left, "a first one.dat", "item-00700 new.dat", "zz last.dat"].sort());
  }));

test("a range and everything are what was shown, and what came since is said and left alone", () =>
  withPage("admin", { path: "/projects/chosen" }, async (page) => {
    await row(page, nameOf(3)).click();
    renameSync(`${folder}/${nameOf(600)}`, `${folder}/before all.dat`); // the list on screen is older
    await page.keyboard.press("Shift+End");
    await chosenCount(page, MANY - 3);
    await page.keyboard.press("Escape");
    await page.keyboard.press("Control+a");
    await chosenCount(page, MANY);
    await row(page, nameOf(MANY - 1)).click({ modifiers: ["Control"] });
    await chosenCount(page, MANY - 1);
    await page.keyboard.press("Shift+Delete");
    await page.click(".dialog .button.danger");
    await page.waitForSelector(".activity-card.failed >> text=before all.dat” came in the meantime");
    await page.waitForSelector(`.activity-card.failed >> text=${nameOf(600)}`);
    await page.click(".activity-card.failed >> [aria-label='Remove from the list']");
    assert.deepEqual(readdirSync(folder).sort(), ["before all.dat", nameOf(MANY - 1)]);
  }));

test("a list that is gone: what was chosen by name stays, all must be chosen again, nothing is sent", () =>
  withPage("admin", { path: "/projects/chosen" }, async (page) => {
    const forget = () => {
      for (const user of readdirSync(process.env.ORVEL_TEST_KEPT))
        for (const one of readdirSync(`${process.env.ORVEL_TEST_KEPT}/${user}`))
          rmSync(`${process.env.ORVEL_TEST_KEPT}/${user}/${one}`);
    };
    await row(page, nameOf(4)).click();
    forget();
    const refreshed = page.waitForResponse("**/cgi-bin/list?action=folder*");
    await page.keyboard.press("Alt+r");
    await (await refreshed).finished(); // until then everything would be chosen by its names
    await rowsReady(page);
    await drawn(page);
    await page.waitForSelector("#view .row.selected >> text=item-00004.dat");
    await page.press("#view", "Control+a");
    await chosenCount(page, MANY);
    forget();
    await page.keyboard.press("Alt+r");
    await page.waitForSelector(".toast.failed >> text=is gone: please select again");
    await page.waitForFunction(() => !document.querySelector("#status").textContent.includes("selected"));
    await rowsReady(page);
    await page.press("#view", "Control+a");
    await chosenCount(page, MANY);
    forget();
    await page.keyboard.press("Shift+Delete");
    await page.click(".dialog .button.danger");
    await page.waitForSelector(".toast.failed >> text=is gone: please select again");
    assert.equal(readdirSync(folder).length, MANY);
  }));

test("many at once: dragged as one task after one question, renamed far away", () =>
  withPage("admin", { path: "/projects/chosen" }, async (page) => {
    await row(page, nameOf(0)).click();
    await page.keyboard.press("F2");
    await page.fill(".in-place", "zz far away.dat");
    await page.keyboard.press("Enter");
    await page.waitForSelector("#view .row.selected.cursor >> text=zz far away.dat");
    const asked = [];
    page.on("request", (request) => {
      if (request.method() === "POST") asked.push(new URLSearchParams(request.postData()).get("action"));
    });
    await page.press("#view", "Control+a");
    await page.waitForFunction(() => !document.querySelector("#view .row:not(.header, .selected)"));
    await row(page, "zz far away.dat").dragTo(page.locator("#tree >> text=/^moved$/"));
    await wentWell(page, `Move ${MANY.toLocaleString("en-GB")} items to moved`);
    assert.deepEqual(
      asked.filter((action) => ["present", "move"].includes(action)),
      ["present", "move"],
    );
    assert.deepEqual(readdirSync(folder), []);
    assert.ok(existsSync(`${process.env.ORVEL_TEST_PROJECTS}/moved/zz far away.dat`));
  }));

test("sorting keeps a choice, a filter says what it takes away, a failure chooses nothing", () =>
  withPage(
    "admin",
    { path: "/projects/chosen" },
    async (page) => {
      for (const i of [1, 2, 11]) await row(page, nameOf(i)).click({ modifiers: ["Control"] });
      await page.click("[data-sort=size]");
      await page.click("[data-sort=size]");
      await page.waitForSelector("[aria-sort=descending] [data-sort=size]");
      await rowsReady(page);
      await chosenCount(page, 3);
      await page.fill("#find", "item-0001");
      await page.waitForSelector(".toast >> text=2 selected items are hidden by the filter");
      await page.waitForSelector("#view .row.selected >> text=item-00011.dat");
      await chosenCount(page, 1);
      await page.fill("#find", "");
      await page.waitForSelector("#status >> text=1,500 items");
      await chosenCount(page, 1);
      await page.focus("#view");
      await page.keyboard.press("Control+a");
      await chosenCount(page, MANY);
      await page.route(
        (url) => url.pathname === "/cgi-bin/list",
        (route) => (route.request().method() === "POST" ? route.abort("connectionrefused") : route.continue()),
      );
      await page.click("[data-sort=name]");
      await page.waitForSelector(".toast.failed >> text=The server does not answer");
      await page.waitForFunction(() => !document.querySelector("#status").textContent.includes("selected"));
      assert.equal(await page.locator("#toolbar [data-command=delete]").count(), 0);
    },
    [/ERR_CONNECTION_REFUSED/],
  ));

test("many are downloaded as one field, and what the web server refuses says so", () =>
  withPage(
    "alice",
    { path: "/warehouse" },
    async (page) => {
      await page.evaluate(() => {
        HTMLFormElement.prototype.submit = function () {
          globalThis.sent = [...new FormData(this)];
        };
      });
      await page.press("#view", "Control+a");
      await chosenCount(page, 20_000);
      await page.click("#toolbar >> text=Download");
      const sent = await (await page.waitForFunction(() => globalThis.sent)).jsonValue();
      assert.deepEqual(
        sent.map(([name]) => name),
        ["listing", "ranges", "name"],
      );
      assert.equal(sent[1][1], "0-19999");
      await page.reload();
      for (const [status, words] of [
        [413, "more than the server takes at once"],
        [502, "status 502"],
      ]) {
        await page.route("**/cgi-bin/download", (route) => route.fulfill({ status, body: `${status}, of the web server` }));
        await row(page, nameOf(1)).click();
        await page.click("#toolbar >> text=Download");
        await page.waitForSelector(`.toast >> text=${words}`);
        await page.unroute("**/cgi-bin/download");
      }
    },
    [/status of (413|502)/, /^status (413|502)/],
  ));

test("a frame drawn beside the names chooses what it touches, in tiles, too", () =>
  withPage("admin", { path: "/photo" }, async (page) => {
    const drag = async (from, to) => {
      await page.mouse.move(...from);
      await page.mouse.down();
      await page.mouse.move(...to, { steps: 5 });
      await page.mouse.up();
    };
    const box = (index) => boxOf(page.locator(`#row-${index}`));
    const cell = await boxOf(page.locator("#row-2 .mtime"));
    await drag([cell.x + 60, cell.y + 8], [cell.x + 90, (await box(5)).y + 10]);
    await chosenCount(page, 4);
    await page.click(".view-switch button >> nth=1");
    await rowsReady(page);
    const [first, other] = [await box(0), await box(1)];
    const below = await page.locator("#view .row").evaluateAll((rows) => {
      const { left, top } = rows[0].getBoundingClientRect();
      return rows.map((one) => one.getBoundingClientRect()).find((one) => one.left === left && one.top > top).bottom;
    });
    await page.keyboard.press("Escape");
    await drag([first.x - 6, first.y + 4], [other.x + 20, below - 10]);
    await chosenCount(page, 4); // two of two lines, not all between
  }));
