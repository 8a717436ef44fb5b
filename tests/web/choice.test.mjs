// What is chosen is what is done, whatever others do meanwhile and however many it is.
import assert from "node:assert/strict";
import { existsSync, readdirSync, renameSync, rmSync, writeFileSync } from "node:fs";
import { beforeEach, test } from "node:test";
import { boxOf, choose, press, row, rowsReady, wentWell, withPage } from "./browser.mjs";
import { ownFolder, until } from "./support.mjs";

const MANY = 1500; // of which the middle is never on screen
let folder;

beforeEach(() => {
  folder = ownFolder("chosen");
  for (let i = 0; i < MANY; ++i) writeFileSync(`${folder}/${nameOf(i)}`, "x".repeat(i % 7), { mode: 0o666 });
});

const nameOf = (i) => `item-${String(i).padStart(5, "0")}.dat`;
const chosenCount = (page, count) => page.waitForSelector(`#status >> text=${count.toLocaleString("en-GB")} selected`);

// From one row to another, with only their surroundings ever fetched.
async function chooseRange(page, from, to) {
  await choose(page, nameOf(from));
  await page.evaluate(
    ([index, total]) => {
      const view = document.getElementById("view");
      view.scrollTop = (view.scrollHeight * index) / total - 200;
    },
    [to, MANY],
  );
  await choose(page, nameOf(to), { modifiers: ["Shift"] });
  await chosenCount(page, to - from + 1);
}

async function deleteForGood(page) {
  await page.keyboard.press("Shift+Delete");
  await page.click(".dialog .button.danger");
}

// Until the list is one that the server keeps, rows are chosen by their names.
const isKept = (page) =>
  page.waitForFunction(async () => {
    const { browser } = await import(new URL("browser.js", document.querySelector("script[type=module]").src));
    return browser.listing.kept !== null;
  });

// A list that takes the place of another one is not kept for a moment.
const chooseAllRows = (page) =>
  until("all rows of a list that is kept to be chosen", async () => {
    await page.press("#view", "Control+a");
    return page.evaluate(async () => {
      const { browser } = await import(new URL("browser.js", document.querySelector("script[type=module]").src));
      return browser.selection.rows !== null;
    });
  });

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
    await wentWell(page, "Delete");
    const left = [0, 1, ...Array.from({ length: 200 }, (_, i) => 1300 + i)].map(nameOf);
    assert.deepEqual(readdirSync(folder).sort(), [...left, "a first one.dat", "item-00700 new.dat", "zz last.dat"].sort());
  }));

test("a range and everything are what was shown, and what came since is said and left alone", () =>
  withPage("admin", { path: "/projects/chosen" }, async (page) => {
    await choose(page, nameOf(3));
    renameSync(`${folder}/${nameOf(600)}`, `${folder}/before all.dat`); // the list on screen is older
    await page.keyboard.press("Shift+End");
    await chosenCount(page, MANY - 3);
    await page.keyboard.press("Escape");
    await page.keyboard.press("Control+a");
    await chosenCount(page, MANY);
    await choose(page, nameOf(MANY - 1), { modifiers: ["Control"] });
    await chosenCount(page, MANY - 1);
    await deleteForGood(page);
    await page.waitForSelector(".activity-card.failed >> text=before all.dat” came in the meantime");
    await press(page, ".activity-card.failed", nameOf(600), "Remove from the list");
    assert.deepEqual(readdirSync(folder).sort(), ["before all.dat", nameOf(MANY - 1)]);
  }));

test("a list that is gone: what was chosen by name stays, all must be chosen again, nothing is sent", () =>
  withPage("admin", { path: "/projects/chosen" }, async (page) => {
    const forget = () => {
      for (const user of readdirSync(process.env.ORVEL_TEST_KEPT))
        for (const one of readdirSync(`${process.env.ORVEL_TEST_KEPT}/${user}`))
          rmSync(`${process.env.ORVEL_TEST_KEPT}/${user}/${one}`, { force: true });
    };
    await choose(page, nameOf(4));
    forget();
    await Promise.all([page.waitForResponse("**/cgi-bin/list?action=folder*"), page.keyboard.press("Alt+r")]); // another list
    await isKept(page);
    await page.waitForSelector("#view .row.selected >> text=item-00004.dat");
    await chooseAllRows(page);
    await chosenCount(page, MANY);
    forget();
    await page.keyboard.press("Alt+r");
    await press(page, ".toast.failed", "is gone: please select again", "Close");
    await page.waitForFunction(() => !document.querySelector("#status").textContent.includes("selected"));
    await isKept(page);
    await chooseAllRows(page);
    await chosenCount(page, MANY);
    // Gone when the request comes: what is on screen may be listed anew until then.
    await page.route("**/cgi-bin/operation", (route) => {
      if (route.request().postData()?.includes("action=delete")) forget();
      return route.continue();
    });
    await deleteForGood(page);
    await page.waitForSelector(".toast.failed >> text=is gone: please select again");
    assert.equal(readdirSync(folder).length, MANY);
  }));

test("many at once: dragged as one task after one question, renamed far away", () => {
  const moved = ownFolder("moved");
  return withPage("admin", { path: "/projects/chosen" }, async (page) => {
    await choose(page, nameOf(0));
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
    assert.ok(existsSync(`${moved}/zz far away.dat`));
  });
});

test("sorting keeps a choice, a filter says what it takes away, a failure chooses nothing", () =>
  withPage(
    "admin",
    { path: "/projects/chosen" },
    async (page) => {
      for (const i of [1, 2, 11]) await choose(page, nameOf(i), { modifiers: ["Control"] });
      for (const order of ["ascending", "descending"]) {
        await page.click("[data-sort=size]");
        await page.waitForSelector(`[aria-sort=${order}] [data-sort=size]`);
      }
      await chosenCount(page, 3);
      await page.fill("#find", "item-0001");
      await page.waitForSelector(".toast >> text=2 selected items are hidden by the filter");
      await page.waitForSelector("#view .row.selected >> text=item-00011.dat");
      await chosenCount(page, 1);
      await page.fill("#find", "");
      await page.waitForSelector("#status >> text=1,500 items");
      await chosenCount(page, 1);
      await page.press("#view", "Control+a");
      await chosenCount(page, MANY);
      await page.route(
        (url) => url.pathname === "/cgi-bin/list",
        (route) => (route.request().method() === "POST" ? route.abort("connectionrefused") : route.continue()),
      );
      await page.click("[data-sort=name]");
      await page.waitForSelector(".toast.failed >> text=The server does not answer");
      await page.waitForFunction(() => !document.querySelector("#status").textContent.includes("selected"));
      await page.waitForSelector("#toolbar [data-command=delete]", { state: "detached" });
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
        await choose(page, nameOf(1));
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
