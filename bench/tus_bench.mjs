// The client of tus_bench.sh, in one process with the network that is cut off. Both uploads are sent from the same file.
import { createHash, randomBytes } from "node:crypto";
import { closeSync, createReadStream, existsSync, openSync, readdirSync, statSync, writeSync } from "node:fs";
import { Socket } from "node:net";
import { join } from "node:path";
import { createInterface } from "node:readline";
import { Upload } from "../tests/web/node_modules/tus-js-client/lib.es5/node/index.js";
import { CuttingNetwork } from "../tests/web/cutting.mjs";

const [url, password, folder, mib, work] = process.argv.slice(2);
const MIB = 1024 * 1024;
const size = Number(mib) * MIB;
const CUTS = 20;
const words = new Socket({ fd: 3, readable: false, writable: true });
const answers = createInterface({ input: new Socket({ fd: 4, readable: true, writable: false }) })[Symbol.asyncIterator]();

async function tell(word) {
  words.write(`${word}\n`);
  const { value } = await answers.next();
  if (value !== word) throw new Error(`the servers: ${value}`);
}

// What tells one piece from every other.
function makeSource(path) {
  const file = openSync(path, "w");
  const piece = randomBytes(16 * MIB);
  for (let at = 0; at < size; at += piece.length) {
    piece.writeBigUInt64LE(BigInt(at));
    writeSync(file, piece, 0, Math.min(piece.length, size - at));
  }
  closeSync(file);
}

async function sumOf(path) {
  const sum = createHash("sha256");
  for await (const piece of createReadStream(path)) sum.update(piece);
  return sum.digest("hex");
}

// Seconds that it took; `disturb(sent)` is asked at each step.
async function send(source, name, network, disturb) {
  const begin = performance.now();
  let resumed = 0;
  await new Promise((resolve, reject) => {
    const client = new Upload(createReadStream(source), {
      endpoint: `${network.url}cgi-bin/tus?path=/projects`,
      uploadSize: size,
      metadata: { filename: name },
      headers: { Authorization: `Basic ${Buffer.from(`alice:${password}`).toString("base64")}` },
      retryDelays: Array(60).fill(250),
      onAfterResponse: (request) => {
        if (request.getMethod() === "HEAD") ++resumed;
      },
      onProgress: disturb,
      onError: reject,
      onSuccess: resolve,
    });
    client.start();
  });
  return { seconds: (performance.now() - begin) / 1000, resumed };
}

const source = join(work, "source.bin");
makeSource(source);
const wanted = await sumOf(source);
const network = await new CuttingNetwork(url).listen();
const print = (name, { seconds, resumed }) => console.log(`${name}: ${seconds.toFixed(1)} s, ${(size / MIB / seconds).toFixed(0)} MiB/s, asked ${resumed} times where to go on`);
let failed = false;
const check = async (name) => {
  const path = join(folder, name);
  const right = existsSync(path) && statSync(path).size === size && (await sumOf(path)) === wanted;
  console.log(`${name}: ${right ? "the same bytes (sha256)" : "NOT WHAT WAS SENT"}`);
  failed ||= !right;
};

const plain = await send(source, "undisturbed", network, () => {});
print("undisturbed", plain);
await check("undisturbed");

// Evenly over the file: 20 cuts; behind every fifth something happens to the servers as well.
const done = { restart: 0, kill: 0 };
let steps = 0, busy = null;
const cut = await send(source, "disturbed", network, (sent) => {
  if (busy || steps >= CUTS || sent < ((steps + 1) * size) / (CUTS + 2)) return;
  ++steps;
  const word = { 5: "restart", 10: "restart", 13: "kill", 16: "restart" }[steps];
  if (word) ++done[word];
  busy = (word ? tell(word) : Promise.resolve()).then(() => {
    network.cut();
    busy = null;
  });
});
await busy;
print("disturbed", cut);
await check("disturbed");
console.log(`${network.cuts} cuts, ${done.restart} restarts, ${done.kill} kill -9; ${(cut.seconds / plain.seconds).toFixed(2)} times as long`);
const hidden = readdirSync(folder).filter((name) => name.startsWith(".vexo-part"));
console.log(`left half-made: ${hidden.length}`);
network.close();
words.end();
process.exit(failed || hidden.length > 0 || network.cuts < CUTS || done.restart !== 3 || done.kill !== 1 ? 1 : 0);
