// The first view of a folder of 100,000 files in a real browser: the page, which asks for what is in sight, beside one
// that fetches the whole list and shows as many rows.
//   tests/web/run.sh script/server build/release bench/page_bench.mjs
import { mkdirSync, writeFileSync } from "node:fs";
import { test } from "node:test";
import { openPage } from "../tests/web/browser.mjs";

const FILES = 100_000;
const ROUNDS = 5;
const folder = `${process.env.ORVEL_TEST_PROJECTS}/bench`;
mkdirSync(folder);
for (let i = 0; i < FILES; ++i) writeFileSync(`${folder}/IMG_2026_${String(i).padStart(6, "0")}.jpeg`, "");

const median = (values) => values.sort((a, b) => a - b)[values.length >> 1];

async function measure(open) {
  const page = await openPage("alice", { path: "/home" });
  const session = await page.context().newCDPSession(page);
  await session.send("Network.enable");
  let requests = 0;
  let bytes = 0;
  session.on("Network.requestWillBeSent", () => ++requests);
  session.on("Network.loadingFinished", (event) => {
    bytes += event.encodedDataLength;
  });
  const time = await page.evaluate(open);
  await page.waitForTimeout(300);
  await page.context().close();
  return { requests, bytes, time };
}

// Until the rows in sight are drawn.
const thePage = () =>
  new Promise((resolve) => {
    const begun = performance.now();
    location.hash = "/projects/bench";
    const look = () =>
      document.querySelector("#view .row:not(.header) .name")?.textContent.includes("IMG_2026")
        ? requestAnimationFrame(() => resolve(performance.now() - begun))
        : requestAnimationFrame(look);
    look();
  });
const wholeList = async () => {
  const begun = performance.now();
  const reply = await fetch(
    "/cgi-bin/list?action=folder&path=/projects/bench&additional=size,time,owner,perm,mount_point_type",
  );
  const { items } = (await reply.json()).data;
  const rows = items
    .slice(0, 30)
    .map((item) =>
      Object.assign(document.createElement("div"), { textContent: `${item.name} ${item.additional.size}` }),
    );
  document.querySelector("main").replaceChildren(...rows);
  await new Promise(requestAnimationFrame);
  return performance.now() - begun;
};

test("the first view", { timeout: 600_000 }, async () => {
  const runs = { page: [], whole: [] };
  for (let i = 0; i < ROUNDS; ++i) {
    runs.page.push(await measure(thePage));
    runs.whole.push(await measure(wholeList));
  }
  const of = (name, key) => median(runs[name].map((run) => run[key]));
  for (const name of ["page", "whole"]) {
    console.log(
      `${name}: ${of(name, "requests")} requests, ${Math.round(of(name, "bytes") / 1000)} kB, ${Math.round(of(name, "time"))} ms`,
    );
  }
  console.log(
    `whole/page: bytes ${(of("whole", "bytes") / of("page", "bytes")).toFixed(0)}, time ${(of("whole", "time") / of("page", "time")).toFixed(1)}`,
  );
});
