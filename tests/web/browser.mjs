// A browser for the tests: Debian's Chromium through playwright-core, with every complaint of the page collected.
import { existsSync, readFileSync } from "node:fs";
import assert from "node:assert/strict";
import { basename, join } from "node:path";
import { after } from "node:test";
import { chromium } from "playwright-core";
import { AGAIN, LONGEST, until } from "./support.mjs";

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
  return chromium.launch({ executablePath: PROGRAM, args: [...ARGUMENTS, ...args], timeout: LONGEST });
}

after(() => browser.close());

// Most of the demo's photos hold no picture (415), and on a busy machine it says so later (503).
const isNoPicture = (url) => new URL(url, URL_OF_PAGE).pathname === "/cgi-bin/thumbnail";

// Counts what is being changed on the server: a test is over when this is. What users choose in a page is not `kept`, and
// reaches no other one: even a page that is being closed would send it. What others do in a folder shows at once where the
// page `follows`, else when it lists the folder again for another reason.
function standBetween({ kept, follows }) {
  const { fetch } = globalThis, { open, send } = XMLHttpRequest.prototype;
  globalThis.changing = 0;
  const done = () => --globalThis.changing;
  globalThis.fetch = (url, options, ...more) => {
    const ofChoices = !kept && typeof url === "string" && url.startsWith("/cgi-bin/");
    if (ofChoices && url.startsWith("/cgi-bin/preferences")) return Promise.resolve(Response.json({ success: true, data: { values: {} } }));
    if (!follows && typeof url === "string" && url.includes("action=changes")) return new Promise(() => {});
    const reply = fetch(ofChoices ? url.replace("with=preferences%2C", "with=") : url, options, ...more);
    if ((options?.method ?? "GET") === "GET") return reply;
    ++globalThis.changing;
    reply.then(done, done);
    return reply;
  };
  XMLHttpRequest.prototype.open = function (method, ...more) {
    if (method !== "GET") this.addEventListener("loadend", done, { once: true });
    this.changes = method !== "GET";
    return open.call(this, method, ...more);
  };
  XMLHttpRequest.prototype.send = function (...body) {
    globalThis.changing += this.changes;
    return send.apply(this, body);
  };
}

// A page of a browser of its own. `complaints` is what must be empty at the end: errors on the console or of scripts,
// failed requests.
export async function newPage({ kept = false, follows = false, ...options } = {}) {
  const context = await browser.newContext({
    viewport: { width: 1280, height: 800 },
    locale: "en-GB",
    colorScheme: "light",
    reducedMotion: "reduce",
    ...options,
  });
  context.setDefaultTimeout(LONGEST);
  await context.addInitScript(standBetween, { kept, follows });
  const page = await context.newPage();
  if (SCREENSHOTS && process.argv[1].endsWith(".test.mjs")) photograph(page);
  page.complaints = [];
  page.refusals = []; // in the programs' own words
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
    if (response.status() >= 400 && response.url().includes("/cgi-bin/")) response.text().then((text) => page.refusals.push(text.slice(0, 200)), () => {});
  });
  return page;
}

// A page of `user`.
export async function openPage(user, { path = "/", ...options } = {}) {
  const page = await newPage({ httpCredentials: { username: user, password: PASSWORDS[user] }, ...options });
  // What tests before this one left would be shown.
  const headers = { Origin: new URL(URL_OF_PAGE).origin };
  assert.ok((await page.context().request.post(`${URL_OF_PAGE}cgi-bin/operation`, { form: { action: "clear" }, headers, ...AGAIN })).ok());
  await page.goto(`${URL_OF_PAGE}#${path}`);
  await page.waitForSelector("body.started");
  return page;
}

// Does `run` in a page and closes it when the server is done with what was asked of it.
export async function finish(page, run) {
  try {
    await run();
    await page.waitForFunction(() => !globalThis.changing);
  } catch (failure) {
    await screenshot(page, `failed-${Date.now()}`);
    const shown = await page.evaluate(() => `${location.hash}\n${document.body.innerText}`).catch((reason) => reason.message);
    failure.stack += `\nComplaints: ${page.complaints.join("\n")}\nRefusals: ${page.refusals.join("\n")}\nShown: ${shown.slice(0, 2000)}`;
    throw failure;
  } finally {
    await page.unrouteAll({ behavior: "ignoreErrors" });
    await page.context().close();
  }
}

// What `run` does as `user`; `expected` are complaints that must come.
export async function withPage(user, options, run, expected = []) {
  const page = await openPage(user, options);
  await finish(page, async () => {
    await rowsReady(page);
    await run(page);
    for (const one of expected) await until(`${one} among the complaints`, () => page.complaints.some((text) => one.test(text)));
    assert.deepEqual(
      page.complaints.filter((text) => !expected.some((one) => one.test(text))),
      [],
    );
  });
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

// Looks for a name in the list by its letters, which come at one moment: those of a slow hand begin another word.
export function typeName(page, name) {
  return page.evaluate((letters) => {
    const now = { value: performance.now() };
    for (const key of letters)
      document.getElementById("view").dispatchEvent(Object.defineProperty(new KeyboardEvent("keydown", { key, bubbles: true, cancelable: true }), "timeStamp", now));
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

// Clicks on the name, which is another node as soon as the row is another file's.
export async function choose(page, name, options) {
  await row(page, name).locator(".name").first().click(options);
}

// Where something is. A row that is drawn anew is nowhere in between.
export function boxOf(locator) {
  return until(`${locator} in sight`, () => locator.boundingBox());
}

// Waits for what goes by itself (a card, a toast), and clicks that button of it in the same look.
export function press(page, what, text, button) {
  return page.waitForFunction(
    ([selector, wanted, label]) => {
      const isIt = (one) => one.getAttribute("aria-label") === label || one.textContent.trim() === label;
      const ones = [...document.querySelectorAll(selector)].filter((one) => one.textContent.includes(wanted));
      const found = ones.flatMap((one) => [...one.querySelectorAll("button")]).find(isIt);
      found?.click();
      return found !== undefined;
    },
    [what, text, button],
  );
}

export const cardOf = (page, text) => page.locator(".activity-card", { hasText: text }).first();

// Waits for the card of what went well, and takes it away.
export const wentWell = (page, text) => press(page, ".activity-card.good", text, "Remove from the list");

// A user's uploads that are not over.
export async function unfinished(request) {
  const { data } = await (await request.get(`${URL_OF_PAGE}cgi-bin/tus`, AGAIN)).json();
  return data.items;
}
