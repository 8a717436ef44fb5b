// A browser for the tests: Debian's Chromium through playwright-core, with every complaint of the page collected.
import { existsSync, readFileSync } from "node:fs";
import assert from "node:assert/strict";
import { basename, join } from "node:path";
import { after } from "node:test";
import { setTimeout } from "node:timers/promises";
import { chromium } from "playwright-core";

// The shell draws and computes the same with a third less work; it lacks what a user has around a page.
const PROGRAM =
  process.env.ORVEL_TEST_CHROMIUM ?? ["/usr/bin/chromium-headless-shell", "/usr/bin/chromium"].find((path) => existsSync(path));
export const URL_OF_PAGE = process.env.ORVEL_TEST_URL;
export const PASSWORDS = {
  alice: process.env.ORVEL_TEST_ALICE,
  bob: process.env.ORVEL_TEST_BOB,
  admin: process.env.ORVEL_TEST_ADMIN,
};
const SCREENSHOTS = process.env.ORVEL_TEST_SCREENSHOTS;

if (!PROGRAM || !existsSync(PROGRAM)) throw new Error("no Chromium is installed: script/bootstrap does that");
if (!URL_OF_PAGE) throw new Error("ORVEL_TEST_URL is not set: run tests/web/run.sh");

const ARGUMENTS = [
  "--headless",
  "--no-sandbox",
  "--disable-gpu",
  "--in-process-gpu",
  "--disable-quic",
  "--no-first-run",
  "--disable-background-networking",
  "--disable-component-update",
  "--disable-sync",
];
export const browser = await launch();

export function launch(...args) {
  return chromium.launch({ executablePath: PROGRAM, args: [...ARGUMENTS, ...args] });
}

after(() => browser.close());

// Most of the demo's photos hold no picture (415), and on a busy machine it says so later (503).
const isNoPicture = (url) => new URL(url, URL_OF_PAGE).pathname === "/cgi-bin/thumbnail";

// A page of `user`. `complaints` is what must be empty at the end: errors on the console or of scripts, failed requests.
// What users choose in it reaches no other page, unless `kept`.
export async function openPage(user, { path = "/", kept = false, ...options } = {}) {
  const context = await browser.newContext({
    viewport: { width: 1280, height: 800 },
    locale: "en-GB",
    colorScheme: "light",
    reducedMotion: "reduce",
    httpCredentials: user && { username: user, password: PASSWORDS[user] },
    ...options,
  });
  const page = await context.newPage();
  if (!kept) await page.route("**/cgi-bin/preferences*", (route) => route.fulfill({ json: { success: true, data: { values: {} } } }));
  if (SCREENSHOTS && process.argv[1].endsWith(".test.mjs")) photograph(page);
  page.complaints = [];
  page.on("console", (message) => {
    if (["error", "warning"].includes(message.type()) && !isNoPicture(message.location().url)) page.complaints.push(`console: ${message.text()}`);
  });
  page.on("pageerror", (error) => page.complaints.push(`page: ${error.stack}`));
  page.on("requestfailed", (request) => {
    // What the page itself lets go of, and a download, which leaves its frame, end so.
    if (request.failure().errorText !== "net::ERR_ABORTED")
      page.complaints.push(`request: ${request.url()} ${request.failure().errorText}`);
  });
  page.on("response", (response) => {
    if (response.status() >= 400 && !([415, 503].includes(response.status()) && isNoPicture(response.url()))) page.complaints.push(`status ${response.status()}: ${response.url()}`);
  });
  await page.goto(`${URL_OF_PAGE}#${path}`);
  await page.waitForSelector("body.started");
  return page;
}

// What `run` does as `user`; `expected` are complaints that must come.
export async function withPage(user, options, run, expected = []) {
  const page = await openPage(user, options);
  try {
    await rowsReady(page);
    await run(page);
    for (const one of expected)
      assert.ok(
        page.complaints.some((text) => one.test(text)),
        `${one} in ${page.complaints}`,
      );
    assert.deepEqual(
      page.complaints.filter((text) => !expected.some((one) => one.test(text))),
      [],
    );
  } catch (failure) {
    await screenshot(page, `failed-${user}-${Date.now()}`);
    const shown = await page.evaluate(() => `${location.hash}\n${document.body.innerText}`).catch((reason) => reason.message);
    failure.message += `\nComplaints: ${page.complaints.join("\n")}\nShown: ${shown.slice(0, 2000)}`;
    throw failure;
  } finally {
    await page.context().close();
  }
}

// A picture of each dialog, message and state that a test waits for.
const file = basename(process.argv[1], ".test.mjs");
let pictures = 0;
function photograph(page) {
  const wait = page.waitForSelector.bind(page);
  page.waitForSelector = async (selector, ...options) => {
    const found = await wait(selector, ...options);
    if (found && /\.(activity-card|dialog|home|menu|picker|preview|state|toast)/.test(selector))
      await screenshot(page, `${file} ${String(++pictures).padStart(3, "0")} ${selector.replace(/[^\w .-]+/g, " ").slice(0, 80)}`);
    return found;
  };
}

export async function screenshot(page, name) {
  if (SCREENSHOTS) await page.screenshot({ path: join(SCREENSHOTS, `${name}.png`) });
}

export function go(page, place) {
  return page.evaluate((id) => {
    location.hash = id;
  }, place);
}

export async function upload(page, command, paths) {
  const chooser = page.waitForEvent("filechooser");
  await page.click("#toolbar >> text=Upload");
  await page.click(`.menu >> text=${command}`);
  await (await chooser).setFiles(paths);
}

export async function rowsReady(page) {
  await page.waitForSelector("#view[aria-busy=false], .home, .state");
  await page.waitForFunction(() => !document.querySelector("#view .row.waiting"));
}

const axe = readFileSync(new URL(import.meta.resolve("axe-core/axe.min.js")), "utf8");

// What axe-core finds on screen, or in the part of it that is new.
export async function findings(page, part = "html") {
  if (!(await page.evaluate(() => "axe" in globalThis))) await page.evaluate(axe);
  return page.evaluate(async (within) => {
    const { violations } = await globalThis.axe.run(within, { resultTypes: ["violations"] });
    return violations.flatMap(({ id, nodes }) => nodes.slice(0, 3).map((node) => `${id}: ${node.html.slice(0, 160)}`));
  }, part);
}

// Looks for a name in the list by its letters, which come as fast as the page takes for one word.
export function typeName(page, name) {
  return page.evaluate((letters) => {
    for (const key of letters) document.getElementById("view").dispatchEvent(new KeyboardEvent("keydown", { key, bubbles: true, cancelable: true }));
  }, [...name]);
}

// What the page was about to draw is drawn.
export function drawn(page) {
  return page.evaluate(() => new Promise((done) => requestAnimationFrame(() => requestAnimationFrame(done))));
}

export function row(page, name) {
  return page
    .locator("#view .row:not(.header)")
    .filter({ has: page.locator(".name", { hasText: name }) })
    .first();
}

// Where something is. A row that is drawn anew is nowhere in between.
export async function boxOf(locator) {
  for (const limit = Date.now() + 30_000; Date.now() < limit; ) {
    const box = await locator.boundingBox();
    if (box) return box;
  }
  throw new Error(`not to be seen within 30 s: ${locator}`);
}

// Waits for what neither the page nor its requests show.
export async function untilSo(what, isSo) {
  for (const end = Date.now() + 60_000; Date.now() < end; await setTimeout(20)) if (await isSo()) return;
  throw new Error(`waited a minute in vain for ${what}`);
}

// A user's uploads that are not over.
export async function unfinished(request) {
  const { data } = await (await request.get(`${URL_OF_PAGE}cgi-bin/tus`)).json();
  return data.items;
}

// Waits for the card of what went well, and takes it away.
export async function wentWell(page, text) {
  await page.waitForFunction((wanted) => {
    const card = [...document.querySelectorAll(".activity-card.good")].find((one) => one.textContent.includes(wanted));
    card?.querySelector(":scope > .icon-button").click();
    return card !== undefined;
  }, text);
}
