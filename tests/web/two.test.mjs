// Two people at work in one folder: one chooses, sorts and deletes in the page, the other renames, adds and removes beside
// it. What was chosen goes, and nothing else. ORVEL_TEST_LONG=1: 20,000 files for a minute.
import assert from "node:assert/strict";
import { existsSync, readdirSync, renameSync, rmSync, writeFileSync } from "node:fs";
import { test } from "node:test";
import { drawn, rowsReady, withPage } from "./browser.mjs";
import { ownFolder } from "./support.mjs";

const LONG = process.env.ORVEL_TEST_LONG !== undefined;
const FILES = LONG ? 20_000 : 1500;
const ROUNDS = 3;
const folder = ownFolder("two");
const nameOf = (i) => `item-${String(i).padStart(5, "0")}`;

// Everything that ever was: when it came, and whether the other one took it away.
const world = new Map();
const names = []; // of what may be there still
let moment = 0;
let seed = 7;
const below = (limit) => (seed = (seed * 48271) % 2147483647) % limit;

function add(name) {
  writeFileSync(`${folder}/${name}`, "x".repeat(below(9)), { mode: 0o666 });
  came(name);
}

function came(name) {
  world.set(name, { came: ++moment, taken: false });
  names.push(name);
}

// Any file that is there.
function anyName() {
  for (;;) {
    const at = below(names.length);
    if (existsSync(`${folder}/${names[at]}`)) return names[at];
    names[at] = names.at(-1);
    names.pop();
  }
}

// The other one's next step; names that are new lie among the others as well as before and behind them.
function otherStep() {
  const name = anyName();
  const fresh = `${["a came", nameOf(below(FILES)), "z came"][below(3)]} ${moment}`;
  const step = below(3);
  if (step === 0) return add(fresh);
  world.get(name).taken = true;
  if (step === 1) return rmSync(`${folder}/${name}`);
  renameSync(`${folder}/${name}`, `${folder}/${fresh}`);
  return came(fresh);
}

// Clicks on a row in the middle of the view, which is moved to that part of the list.
async function clickAt(page, part, modifiers) {
  await page.evaluate((where) => {
    const view = document.getElementById("view");
    view.scrollTop = (view.scrollHeight - view.clientHeight) * where;
  }, part);
  await drawn(page);
  await rowsReady(page);
  const { left, top, height } = await page.evaluate(() => document.getElementById("view").getBoundingClientRect());
  for (const key of modifiers) await page.keyboard.down(key);
  await page.mouse.click(left + 200, top + height / 2);
  for (const key of modifiers) await page.keyboard.up(key);
  await drawn(page);
  return page.getAttribute("#view .row.cursor .name", "title"); // rows may have moved below the pointer
}

const CHOICES = [
  async (page) => {
    const names = [];
    for (const part of [0.2, 0.5, 0.9]) names.push(await clickAt(page, part, names.length > 0 ? ["Control"] : []));
    return Object.assign((name) => names.includes(name), { what: names.join(", ") });
  },
  async (page) => {
    const start = below(60) / 100;
    const ends = [await clickAt(page, start, []), await clickAt(page, start + (LONG ? 0.02 : 0.3), ["Shift"])].sort();
    return Object.assign((name) => ends[0] <= name && name <= ends[1], { what: ends.join(" to ") });
  },
  async (page) => {
    await page.press("#view", "Control+a");
    const spared = await clickAt(page, 0.4, ["Control"]);
    return Object.assign((name) => name !== spared, { what: `all but ${spared}` });
  },
];

async function deleteChosen(page) {
  await page.press("#view", "Shift+Delete");
  await page.click(".dialog .button.danger");
  const card = page.locator(".activity-card:is(.good, .failed, .stopped)");
  await card.first().waitFor();
  await card.first().locator(":scope > .icon-button").click();
}

function check(isChosen, shown, chosen) {
  const left = new Set(readdirSync(folder));
  for (const [name, { came, taken }] of world) {
    if (taken) world.delete(name);
    else if (!isChosen(name) || came > chosen) assert.ok(left.has(name), `${name} was not chosen (${isChosen.what})`);
    else if (came <= shown) assert.ok(!left.has(name), `${name} was chosen (${isChosen.what})`);
    if (!left.has(name)) world.delete(name);
  }
}

test("two people in one folder", () => {
  for (let i = 0; i < FILES; ++i) add(nameOf(i));
  return withPage("admin", { follows: true, path: "/projects/two" }, async (page) => {
    const end = Date.now() + 60_000;
    let rounds = 0;
    const others = setInterval(otherStep, 30);
    try {
      for (; LONG ? Date.now() < end : rounds < ROUNDS; ++rounds) {
        const shown = moment;
        await page.press("#view", "Alt+r");
        await page.click("[data-sort=name]");
        await page.waitForSelector(`[aria-sort=${rounds % 2 === 0 ? "descending" : "ascending"}] [data-sort=name]`);
        await rowsReady(page);
        // Nearly everything only at last, so that there is something to choose from.
        const last = LONG ? Date.now() > end - 5000 : rounds === ROUNDS - 1;
        const isChosen = await CHOICES[last ? 2 : rounds % 2](page);
        const chosen = moment;
        await deleteChosen(page);
        check(isChosen, shown, chosen);
      }
    } finally {
      clearInterval(others);
    }
    console.log(`${rounds} times chosen and deleted, ${moment - FILES} things added and renamed meanwhile`);
  });
});
