// How the page starts on a line of 150 ms, by HTTPS as orvel-web serves it: with nothing kept, and once more.
//   tests/web/run.sh $PWD/script/server $PWD/build/release $PWD/bench/start_bench.mjs
import { execFileSync, spawn } from "node:child_process";
import { createHash, X509Certificate } from "node:crypto";
import { mkdirSync, readFileSync, writeFileSync } from "node:fs";
import { resolve } from "node:path";
import { test } from "node:test";
import { launch, PASSWORDS, URL_OF_PAGE } from "../tests/web/browser.mjs";

const DELAY = 150;
const ROUNDS = 5;
const folder = `${process.env.ORVEL_TEST_PROJECTS}/start`;
mkdirSync(folder);
for (let i = 0; i < 20; ++i) writeFileSync(`${folder}/report ${i}.txt`, "");

// The demo's web server once more, on the next port but one, with a certificate.
const port = Number(new URL(URL_OF_PAGE).port) + 2;
const state = resolve(process.env.ORVEL_TEST_KEPT, "../../../../run/lighttpd");
const pair = ["-keyout", `${state}/bench.key`, "-out", `${state}/bench.pem`];
execFileSync("openssl", ["req", "-x509", "-newkey", "ec", "-pkeyopt", "ec_paramgen_curve:prime256v1", "-nodes", "-subj", "/CN=x", ...pair], { stdio: "ignore" });
const configuration = readFileSync(`${state}/lighttpd.conf`, "utf8").replace(/^server\.port = .*/m, `server.port = ${port}\nserver.tag = ""`).replace('"mod_scgi" )', '"mod_scgi", "mod_openssl" )');
writeFileSync(`${state}/bench.conf`, `${configuration}\nssl.engine = "enable"\nssl.pemfile = "${pair[3]}"\nssl.privkey = "${pair[1]}"\n`);
const server = spawn("lighttpd", ["-D", "-f", `${state}/bench.conf`], { stdio: ["ignore", "ignore", "inherit"] });

// Nothing is kept of a server whose certificate is in doubt.
const key = new X509Certificate(readFileSync(pair[3])).publicKey.export({ type: "spki", format: "der" });
const browser = await launch(`--ignore-certificate-errors-spki-list=${createHash("sha256").update(key).digest("base64")}`);

const median = (values) => values.sort((a, b) => a - b)[values.length >> 1];

// Until the page shows `shown`; and all that was asked until a second later.
async function start(context, place, shown) {
  const page = await context.newPage();
  const session = await context.newCDPSession(page);
  await session.send("Network.enable");
  await session.send("Network.emulateNetworkConditions", { offline: false, latency: DELAY, downloadThroughput: -1, uploadThroughput: -1 });
  const kept = new Set();
  const sent = { requests: 0, all: 0, bytes: 0 };
  let done = false;
  session.on("Network.requestServedFromCache", ({ requestId }) => kept.add(requestId));
  session.on("Network.responseReceived", ({ requestId, response }) => response.fromDiskCache && kept.add(requestId));
  session.on("Network.loadingFinished", ({ requestId, encodedDataLength }) => {
    if (kept.has(requestId)) return;
    ++sent.all;
    if (!done) ++sent.requests;
    sent.bytes += encodedDataLength;
  });
  const begun = performance.now();
  await page.goto(`https://127.0.0.1:${port}/#${place}`);
  await page.waitForSelector(shown);
  done = true;
  sent.time = performance.now() - begun;
  await page.waitForTimeout(1000);
  await page.close();
  return sent;
}

test("starts", { timeout: 600_000 }, async () => {
  const extraHTTPHeaders = { Authorization: `Basic ${Buffer.from(`alice:${PASSWORDS.alice}`).toString("base64")}` };
  for (const [place, shown] of [
    ["/", ".home"],
    ["/projects/start", "#view .row:not(.header) .name"],
  ]) {
    const runs = { cold: [], warm: [] };
    for (let i = 0; i < ROUNDS; ++i) {
      const context = await browser.newContext({ extraHTTPHeaders });
      runs.cold.push(await start(context, place, shown));
      runs.warm.push(await start(context, place, shown));
      await context.close();
    }
    for (const [name, all] of Object.entries(runs)) {
      const of = (key) => median(all.map((run) => run[key]));
      console.log(`${name} at ${place}: ${of("requests")} requests and ${Math.round(of("time"))} ms until it shows, ${of("all")} in all, ${(of("bytes") / 1000).toFixed(1)} kB`);
    }
  }
  await browser.close();
  server.kill();
});
