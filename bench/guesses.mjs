// Strangers who try passwords of a link, and visitors who know theirs. See guesses.sh.
import assert from "node:assert/strict";
import http from "node:http";
import { setTimeout as sleep } from "node:timers/promises";

const [program, guarded, other, free] = process.argv.slice(2);
const [addresses, least] = process.argv.slice(6).map(Number);
const begin = performance.now();
const secondsSince = (time) => (performance.now() - time) / 1000;
const addressOf = (number) => `10.${number >> 16}.${(number >> 8) & 255}.${number & 255}`;
setTimeout(() => assert.fail("the visitors are not answered after 1,200 s"), 1200000).unref();

// One request of a visitor; the strangers share few connections, each visitor has one of his own.
const crowd = new http.Agent({ keepAlive: true, maxSockets: 48 });
function ask(link, address, form, agent = new http.Agent()) {
  const headers = { "X-Forwarded-For": `203.0.113.9, ${address}`, "Content-Type": "application/x-www-form-urlencoded" };
  const url = `${program}?FOLDER_SHARING=${link}${form ? "" : "&action=list"}`;
  return new Promise((done, broken) => {
    const request = http.request(url, { agent, method: form ? "POST" : "GET", headers }, async (reply) => {
      const text = (await reply.toArray()).join("");
      done({ status: reply.statusCode, json: JSON.parse(text) });
    });
    request.on("error", broken);
    request.end(form && new URLSearchParams(form).toString());
  });
}

// Comes again until it is judged, as often as `patience` milliseconds allow; what the last answer was, and how long it took.
let done = false, requests = 0, judged = 0;
async function enter(link, address, password, agent, patience = Infinity) {
  const from = performance.now();
  for (let turn = "", tries = 1; ; tries += 1) {
    const { status, json } = await ask(link, address, { action: "login", password, turn }, agent);
    if (agent === crowd) requests += 1;
    if (status !== 429 || done) return { status, tries, took: secondsSince(from) };
    turn = json.data.turn;
    await sleep(Math.min(json.data.wait, patience));
  }
}
async function stranger(number) {
  while (!done) {
    const { status } = await enter(guarded, addressOf(number), `guess ${number}`, crowd, 20000);
    assert.ok([403, 429].includes(status), `a stranger got ${status}`);
    if (status === 403) judged += 1;
  }
}

// The limit is for one that stands still: each stranger asks at least once a minute.
async function requestsReach(count) {
  let [before, since] = [requests, performance.now()];
  while (requests < count) {
    if (requests > before) [before, since] = [requests, performance.now()];
    assert.ok(performance.now() - since < 120_000, `waited in vain for ${count} requests: ${requests} came`);
    await sleep(20);
  }
}

const strangers = Array.from({ length: addresses }, (_, number) => stranger(number));
await requestsReach(addresses); // the strangers are there first
const visitor = enter(guarded, "192.0.2.1", "pass word");
const elsewhere = await enter(other, "192.0.2.2", "other word");
const shown = await ask(free, "192.0.2.3");
const answer = await visitor;
const [judgedThen, after] = [judged, secondsSince(begin)];
await requestsReach(least);
const [total, end] = [judged, secondsSince(begin)];
done = true;
await Promise.all(strangers);

console.log(
  `${requests} requests from ${addresses} addresses in ${end.toFixed(0)} s: ${total} judged; the right password after` +
    ` ${answer.took.toFixed(1)} s (${answer.tries} requests, ${judgedThen} guesses judged by then), that of another link after` +
    ` ${elsewhere.took.toFixed(1)} s`,
);
assert.deepEqual([answer.status, elsewhere.status, shown.status, shown.json.success], [200, 200, 200, true]);
// Slowness only makes these fewer.
assert.ok(total <= 5 * (end + 1) && judgedThen <= 5 * (after + 1), "at most five a second");
process.exit(0);
