// How long a page takes to show what somebody else did in its folder of 1,000 files: names that come, sizes that change.
//   tests/web/run.sh $PWD/script/server $PWD/build/release $PWD/bench/live_bench.mjs
import { mkdirSync, writeFileSync } from "node:fs";
import { test } from "node:test";
import { setTimeout } from "node:timers/promises";
import { row, withPage } from "../tests/web/browser.mjs";

const ROUNDS = 20;
const folder = `${process.env.ORVEL_TEST_PROJECTS}/live bench`;
mkdirSync(folder);
for (let i = 0; i < 1000; ++i) writeFileSync(`${folder}/file ${i}.txt`, "x");

const CHANGES = {
  "a name that comes": async (page, i) => {
    writeFileSync(`${folder}/a ${i}.txt`, "");
    await row(page, `a ${i}.txt`).waitFor();
  },
  "a size that changes": async (page, i) => {
    writeFileSync(`${folder}/a 0.txt`, "x".repeat(100 + i));
    await row(page, "a 0.txt").locator(".size", { hasText: `${100 + i} B` }).waitFor();
  },
};

test("how soon a change shows", () =>
  withPage("admin", { path: "/projects/live%20bench", follows: true }, async (page) => {
    for (const [what, change] of Object.entries(CHANGES)) {
      const took = [];
      for (let i = 0; i < ROUNDS; ++i) {
        await page.mouse.move(20 + i, 20); // somebody is there
        await setTimeout((i * 137) % 1200); // at any moment between two questions
        const begun = performance.now();
        await change(page, i);
        took.push(performance.now() - begun);
      }
      took.sort((one, other) => one - other);
      console.log(`${what}: median ${(took[ROUNDS / 2] / 1000).toFixed(2)} s, longest ${(took.at(-1) / 1000).toFixed(2)} s`);
    }
  }));
