// How long the page is busy when very many files are chosen and something is done to them: the main thread's time from
// the key to the moment at which it answers again. Run by tests/web/run.sh; ORVEL_BENCH_FILES says how many.
import { mkdirSync, rmSync, writeFileSync } from "node:fs";
import { test } from "node:test";
import { withPage } from "../tests/web/browser.mjs";

const COUNT = Number(process.env.ORVEL_BENCH_FILES ?? 100_000);
const folder = `${process.env.ORVEL_TEST_PROJECTS}/many`;

// Milliseconds until a timer of the page fires after `act`, at most one of its own turns later than it could.
async function busyAfter(page, act) {
  await page.evaluate(() => {
    globalThis.longest = 0;
    let before = performance.now();
    globalThis.beat = setInterval(() => {
      const now = performance.now();
      globalThis.longest = Math.max(globalThis.longest, now - before);
      before = now;
    }, 5);
  });
  await act();
  return page.evaluate(() => {
    clearInterval(globalThis.beat);
    return Math.round(globalThis.longest);
  });
}

test(`${COUNT} chosen`, () =>
  withPage("admin", { path: "/projects" }, async (page) => {
    rmSync(folder, { recursive: true, force: true });
    mkdirSync(folder, { mode: 0o777 });
    for (let i = 0; i < COUNT; ++i) writeFileSync(`${folder}/item ${i}.dat`, "", { mode: 0o666 });
    await page.goto(`${page.url().split("#")[0]}#/projects/many`);
    await page.waitForSelector(`#status >> text=${COUNT.toLocaleString("en-GB")} items`, { timeout: 60_000 });
    const report = (what, busy) => console.log(`${what}: longest time without an answer ${busy} ms`);
    report(
      "choose all",
      await busyAfter(page, async () => {
        await page.press("#view", "Control+a");
        await page.waitForSelector(`#status >> text=${COUNT.toLocaleString("en-GB")} selected`);
      }),
    );
    report(
      "download",
      await busyAfter(page, async () => {
        const begun = page.waitForEvent("download", { timeout: 60_000 });
        await page.click("#toolbar >> text=Download");
        const download = await begun;
        await download.cancel();
      }),
    );
    const start = performance.now();
    report(
      "delete",
      await busyAfter(page, async () => {
        await page.keyboard.press("Shift+Delete");
        await page.click(".dialog .button.danger");
        await page.waitForSelector(".activity-card >> text=Delete");
      }),
    );
    console.log(`delete: task shown after ${Math.round(performance.now() - start)} ms`);
    await page.waitForSelector(".activity-card.good >> text=Delete", { timeout: 300_000 });
    console.log(`delete: ended after ${Math.round(performance.now() - start)} ms`);
  }));
