// Guesses at a log-in. See login_bench.sh. By the name localhost the demo's web server asks for no password itself.
import assert from "node:assert/strict";
import http from "node:http";

const [program, guesses] = [process.argv[2], Number(process.argv[3])];
const NAMES = ["alice", "alina"]; // known and unknown
const ADDRESSES = 12, AT_ONCE = 2; // the server judges two of an address at a time, and 32 of all

// The status, and the milliseconds that the answer took.
function guess(user, number, address, agent) {
  const body = new URLSearchParams({ action: "begin", user, password: `guess ${number}` }).toString();
  const headers = { Host: "localhost", "X-Forwarded-For": address, "Content-Type": "application/x-www-form-urlencoded" };
  const from = performance.now();
  return new Promise((done, broken) => {
    const request = http.request(program, { agent, method: "POST", headers }, (reply) => {
      reply.resume().on("end", () => done({ status: reply.statusCode, took: performance.now() - from }));
    });
    request.on("error", broken);
    request.end(body);
  });
}

let begun = 0;
const times = { alice: [], alina: [] }, others = {};
async function guesser(address) {
  const agent = new http.Agent({ keepAlive: true, maxSockets: 1 });
  // A pair in an order that is drawn, so that what else the machine does meanwhile meets both alike.
  while (begun < guesses) {
    const pair = Math.random() < 0.5 ? NAMES : [...NAMES].reverse();
    for (const user of pair) {
      begun += 1;
      const { status, took } = await guess(user, begun, address, agent);
      if (status === 403) times[user].push(took);
      else others[status] = (others[status] ?? 0) + 1;
    }
  }
  agent.destroy();
}

const quantile = (sorted, part) => sorted[Math.floor(part * (sorted.length - 1))];

// Mann and Whitney: in which part of all pairs of a known and an unknown name the known one took longer, and how many
// standard deviations that lies from one half.
function compare(known, unknown) {
  const all = [...known.map((took) => ({ took, isKnown: true })), ...unknown.map((took) => ({ took, isKnown: false }))];
  all.sort((a, b) => a.took - b.took);
  const ranks = all.reduce((sum, { isKnown }, index) => sum + (isKnown ? index + 1 : 0), 0);
  const [m, n] = [known.length, unknown.length];
  const wins = ranks - (m * (m + 1)) / 2;
  return { part: wins / (m * n), deviations: (wins - (m * n) / 2) / Math.sqrt((m * n * (m + n + 1)) / 12) };
}

const from = performance.now();
await Promise.all(Array.from({ length: ADDRESSES * AT_ONCE }, (_, i) => guesser(`192.0.2.${1 + (i % ADDRESSES)}`)));
for (const user of NAMES) {
  times[user].sort((a, b) => a - b);
  const [low, median, high] = [0.25, 0.5, 0.75].map((part) => quantile(times[user], part).toFixed(2));
  console.log(`${user}: ${times[user].length} guesses refused, median ${median} ms, quartiles ${low} and ${high}`);
}
const { part, deviations } = compare(times.alice, times.alina);
console.log(`the known name took longer in ${(100 * part).toFixed(2)} % of pairs, ${deviations.toFixed(2)} standard deviations from half`);
console.log(`${begun} guesses in ${((performance.now() - from) / 1000).toFixed(0)} s; other answers: ${JSON.stringify(others)}`);
// A machine that has other work may turn some away (503).
assert.ok(times.alice.length + times.alina.length >= guesses * 0.9, "most are judged");
// By chance once in 15,000 runs.
assert.ok(Math.abs(deviations) < 4, "the times of the two differ");
