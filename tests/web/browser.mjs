// A browser for the tests: Debian's Chromium through playwright-core, with every complaint of the page collected.
import { existsSync, mkdirSync, mkdtempSync, rmSync } from "node:fs";
import assert from "node:assert/strict";
import { tmpdir } from "node:os";
import { join } from "node:path";
import { crc32, deflateSync } from "node:zlib";
import { chromium } from "playwright-core";

const PROGRAM = process.env.ORVEL_TEST_CHROMIUM ?? "/usr/bin/chromium";
export const URL_OF_PAGE = process.env.ORVEL_TEST_URL;
export const PASSWORDS = {
  alice: process.env.ORVEL_TEST_ALICE,
  bob: process.env.ORVEL_TEST_BOB,
  admin: process.env.ORVEL_TEST_ADMIN,
};
const SCREENSHOTS = process.env.ORVEL_TEST_SCREENSHOTS;

if (!existsSync(PROGRAM)) throw new Error(`${PROGRAM} is not installed: script/bootstrap does that`);
if (!URL_OF_PAGE) throw new Error("ORVEL_TEST_URL is not set: run tests/web/run.sh");

export async function launch() {
  const data = mkdtempSync(join(tmpdir(), "orvel-chromium-"));
  const browser = await chromium.launch({
    executablePath: PROGRAM,
    args: [
      "--headless",
      "--no-sandbox",
      "--disable-gpu",
      "--disable-quic",
      "--no-first-run",
      "--disable-background-networking",
      "--disable-component-update",
      "--disable-sync",
      `--disk-cache-dir=${data}`,
    ],
  });
  return {
    browser,
    close: async () => {
      await browser.close();
      rmSync(data, { recursive: true, force: true });
    },
  };
}

// A page of `user`. `complaints` is what must be empty at the end: errors on the console or of scripts, failed requests.
export async function openPage(browser, user, { path = "/", ...options } = {}) {
  const context = await browser.newContext({
    viewport: { width: 1280, height: 800 },
    locale: "en-GB",
    colorScheme: "light",
    reducedMotion: "reduce",
    httpCredentials: user && { username: user, password: PASSWORDS[user] },
    ...options,
  });
  const page = await context.newPage();
  page.complaints = [];
  page.on("console", (message) => {
    if (["error", "warning"].includes(message.type())) page.complaints.push(`console: ${message.text()}`);
  });
  page.on("pageerror", (error) => page.complaints.push(`page: ${error.stack}`));
  page.on("requestfailed", (request) => {
    // What the page itself lets go of, and a download, which leaves its frame, end so.
    if (request.failure().errorText !== "net::ERR_ABORTED")
      page.complaints.push(`request: ${request.url()} ${request.failure().errorText}`);
  });
  page.on("response", (response) => {
    if (response.status() >= 400) page.complaints.push(`status ${response.status()}: ${response.url()}`);
  });
  await page.goto(`${URL_OF_PAGE}#${path}`);
  await page.waitForSelector("body.started");
  return page;
}

// What `run` does as `user`; `expected` are complaints that must come.
export async function withPage({ browser }, user, options, run, expected = []) {
  const page = await openPage(browser, user, options);
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
    failure.message += `\nComplaints: ${page.complaints.join("\n")}`;
    throw failure;
  } finally {
    await page.context().close();
  }
}

export async function screenshot(page, name) {
  mkdirSync(SCREENSHOTS, { recursive: true });
  await page.screenshot({ path: join(SCREENSHOTS, `${name}.png`) });
}

export async function rowsReady(page) {
  await page.waitForSelector("#view[aria-busy=false], .home, .state");
  await page.waitForFunction(() => !document.querySelector("#view .row.waiting"));
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

// Waits for the card of what went well, and takes it away.
export async function wentWell(page, text) {
  await page.waitForFunction((wanted) => {
    const card = [...document.querySelectorAll(".activity-card.good")].find((one) => one.textContent.includes(wanted));
    card?.querySelector(":scope > .icon-button").click();
    return card !== undefined;
  }, text);
}

// A PNG of hills under a sky, different for each number.
export function picture(width, height, number) {
  const rows = Buffer.alloc(height * (width * 3 + 1));
  for (let y = 0; y < height; ++y) {
    for (let x = 0; x < width; ++x) {
      let layer = 0;
      for (let i = 1; i <= 4; ++i) {
        const ridge =
          height * (0.3 + i * 0.15) +
          Math.sin(x / (34 + 9 * i) + number * i * 1.7) * 18 +
          Math.sin(x / 13 + number + i) * 4;
        if (y > ridge) layer = i;
      }
      const hue = ((number * 47) % 360) + layer * 14;
      const light = layer === 0 ? 0.92 - (0.35 * (height - y)) / height : 0.66 - layer * 0.13;
      const channel = (shift) => Math.round(255 * light * (0.72 + 0.28 * Math.cos(((hue + shift) * Math.PI) / 180)));
      rows.set([channel(0), channel(120), channel(240)], y * (width * 3 + 1) + 1 + x * 3);
    }
  }
  const chunk = (name, data) => {
    const body = Buffer.concat([Buffer.from(name), data]);
    const out = Buffer.alloc(body.length + 8);
    out.writeUInt32BE(data.length, 0);
    body.copy(out, 4);
    out.writeUInt32BE(crc32(body) >>> 0, body.length + 4);
    return out;
  };
  const head = Buffer.alloc(13);
  head.writeUInt32BE(width, 0);
  head.writeUInt32BE(height, 4);
  head.set([8, 2], 8);
  return Buffer.concat([
    Buffer.from("\x89PNG\r\n\x1a\n", "latin1"),
    chunk("IHDR", head),
    chunk("IDAT", deflateSync(rows)),
    chunk("IEND", Buffer.alloc(0)),
  ]);
}
