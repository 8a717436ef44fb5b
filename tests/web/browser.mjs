// A browser for the tests: Debian's Chromium through playwright-core, with every complaint of the page collected.
import { existsSync, mkdirSync, mkdtempSync, rmSync } from "node:fs";
import { tmpdir } from "node:os";
import { join } from "node:path";
import { chromium } from "playwright-core";

const PROGRAM = process.env.ORVEL_TEST_CHROMIUM ?? "/usr/bin/chromium";
export const URL_OF_PAGE = process.env.ORVEL_TEST_URL;
export const PASSWORDS = { alice: process.env.ORVEL_TEST_ALICE, bob: process.env.ORVEL_TEST_BOB, admin: process.env.ORVEL_TEST_ADMIN };
const SCREENSHOTS = process.env.ORVEL_TEST_SCREENSHOTS ?? mkdtempSync(join(tmpdir(), "orvel-screenshots-"));

if (!existsSync(PROGRAM)) throw new Error(`${PROGRAM} is not installed: script/bootstrap does that`);
if (!URL_OF_PAGE) throw new Error("ORVEL_TEST_URL is not set: run tests/web/run.sh");

export async function launch() {
  const data = mkdtempSync(join(tmpdir(), "orvel-chromium-"));
  const browser = await chromium.launch({
    executablePath: PROGRAM,
    args: ["--headless", "--no-sandbox", "--disable-gpu", "--disable-quic", "--no-first-run", "--disable-background-networking",
      "--disable-component-update", "--disable-sync", `--disk-cache-dir=${data}`],
  });
  return { browser, close: async () => {
    await browser.close();
    rmSync(data, { recursive: true, force: true });
  } };
}

// A page of `user`. `complaints` is what must be empty at the end: errors on the console or of scripts, failed requests.
export async function openPage(browser, user, { path = "/", ...options } = {}) {
  const context = await browser.newContext({
    viewport: { width: 1280, height: 800 }, locale: "en-GB", colorScheme: "light", reducedMotion: "reduce",
    httpCredentials: user && { username: user, password: PASSWORDS[user] }, ...options,
  });
  const page = await context.newPage();
  page.complaints = [];
  page.on("console", (message) => {
    if (["error", "warning"].includes(message.type())) page.complaints.push(`console: ${message.text()}`);
  });
  page.on("pageerror", (error) => page.complaints.push(`page: ${error.stack}`));
  page.on("requestfailed", (request) => {
    // What the page itself lets go of, and a download, which leaves its frame, end so.
    if (request.failure().errorText !== "net::ERR_ABORTED") page.complaints.push(`request: ${request.url()} ${request.failure().errorText}`);
  });
  page.on("response", (response) => {
    if (response.status() >= 400) page.complaints.push(`status ${response.status()}: ${response.url()}`);
  });
  await page.goto(`${URL_OF_PAGE}#${path}`);
  await page.waitForSelector("body.started");
  return page;
}

export async function screenshot(page, name) {
  mkdirSync(SCREENSHOTS, { recursive: true });
  await page.screenshot({ path: join(SCREENSHOTS, `${name}.png`) });
}

export async function rowsReady(page) {
  await page.waitForSelector("#view[aria-busy=false], .home, .state");
  await page.waitForFunction(() => !document.querySelector("#view .row.waiting"));
}

export function row(page, name) {
  return page.locator("#view .row:not(.header)").filter({ has: page.locator(".name", { hasText: name }) }).first();
}
