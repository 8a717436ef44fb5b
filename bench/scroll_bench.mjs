// What a list of 100,000 files shows while it moves: frames in which a row in sight has nothing in it yet, not counting the
// first 100 ms, and the pages that were asked for.
//   tests/web/run.sh $PWD/script/server $PWD/build/release $PWD/bench/scroll_bench.mjs
import { mkdirSync, writeFileSync } from "node:fs";
import { test } from "node:test";
import { withPage } from "../tests/web/browser.mjs";

const FILES = 100_000;
const LASTS = 8000; // milliseconds
const folder = `${process.env.ORVEL_TEST_PROJECTS}/scroll`;
mkdirSync(folder);
for (let i = 0; i < FILES; ++i) writeFileSync(`${folder}/IMG_2026_${String(i).padStart(6, "0")}.jpeg`, "");

// Moves with each frame, or as often as a key that is held down repeats.
async function move({ speed, key, lasts }) {
  const view = document.getElementById("view");
  view.focus();
  const begun = performance.now();
  const from = view.scrollTop;
  let pressed = 0;
  const seen = { frames: 0, empty: 0, longest: 0 };
  let empty = null;
  for (let now = begun; now - begun < lasts; now = performance.now()) {
    if (speed) view.scrollTop = from + (speed * (now - begun)) / 1000;
    for (; key && pressed < (now - begun) / 33; ++pressed)
      view.dispatchEvent(new KeyboardEvent("keydown", { key, bubbles: true, cancelable: true }));
    await new Promise(requestAnimationFrame);
    if (performance.now() - begun < 100) continue;
    const { top, bottom } = view.getBoundingClientRect();
    const isEmpty = [...view.querySelectorAll(".row.waiting")].some((row) => {
      const box = row.getBoundingClientRect();
      return box.bottom > top + 40 && box.top < bottom;
    });
    ++seen.frames;
    if (isEmpty) ++seen.empty;
    empty = isEmpty ? (empty ?? performance.now()) : null;
    if (empty) seen.longest = Math.max(seen.longest, Math.round(performance.now() - empty));
  }
  return seen;
}

test("moving", { timeout: 600_000 }, () =>
  withPage("alice", { path: "/projects/scroll" }, async (page) => {
    let requests = 0;
    page.on("request", (request) => request.url().includes("/cgi-bin/list?") && ++requests);
    for (const [name, how] of [
      ["7,200 px/s", { speed: 7200 }],
      ["PageDown held", { key: "PageDown" }],
      ["ArrowDown held", { key: "ArrowDown" }],
    ]) {
      await page.evaluate(() => {
        document.getElementById("view").scrollTop = 0;
      });
      await page.keyboard.press("Home");
      await page.waitForFunction(() => !document.querySelector("#view .row.waiting"));
      requests = 0;
      const { frames, empty, longest } = await page.evaluate(move, { ...how, lasts: LASTS });
      console.log(`${name}: ${empty} of ${frames} frames with an empty row, ${longest} ms at a stretch, ${requests} requests`);
    }
  }));
