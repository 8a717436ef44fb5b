// Strangers who try passwords of a link, and visitors who know theirs. See guesses_test.sh.
import http from "node:http";

const [program, guarded, other, free] = process.argv.slice(2);
const [addresses, least] = process.argv.slice(6).map(Number);
const begin = performance.now();
const seconds = () => (performance.now() - begin) / 1000;
const sleep = (milliseconds) => new Promise((done) => setTimeout(done, milliseconds));
const addressOf = (number) => `10.${number >> 16}.${(number >> 8) & 255}.${number & 255}`;
const limit = setTimeout(() => fail("the visitors are not answered after 1,200 s"), 1200000);
let failed = false;

function fail(what) {
  console.log(`FAILED: ${what}`);
  process.exit(1);
}

function expect(what, holds) {
  if (holds) return;
  console.log(`FAILED: ${what}`);
  failed = true;
}

// One request of a visitor; the strangers share few connections, each visitor has one of his own.
const crowd = new http.Agent({ keepAlive: true, maxSockets: 48 });
function ask(link, address, form, agent) {
  const body = form && new URLSearchParams(form).toString();
  const options = {
    agent,
    method: form ? "POST" : "GET",
    headers: {
      "X-Forwarded-For": `203.0.113.9, ${address}`,
      ...(form && { "Content-Type": "application/x-www-form-urlencoded", "Content-Length": Buffer.byteLength(body) }),
    },
  };
  return new Promise((done, broken) => {
    const request = http.request(`${program}?FOLDER_SHARING=${link}${form ? "" : "&action=list"}`, options, (reply) => {
      let text = "";
      reply.on("data", (part) => (text += part));
      reply.on("end", () => done({ status: reply.statusCode, json: JSON.parse(text) }));
    });
    request.on("error", broken);
    request.end(body);
  });
}

// Comes again until it is judged, as often as `patience` milliseconds allow; what the last answer was, and how long it took.
async function enter(link, address, password, agent, patience = Infinity) {
  const from = performance.now();
  for (let turn = "", tries = 1; ; tries += 1) {
    const { status, json } = await ask(link, address, { action: "login", password, turn }, agent);
    if (status !== 429 || done) return { status, tries, took: (performance.now() - from) / 1000 };
    turn = json.data.turn;
    await sleep(Math.min(json.data.wait, patience));
  }
}

let done = false, requests = 0, judged = 0;
async function stranger(number) {
  while (!done) {
    const { status, tries } = await enter(guarded, addressOf(number), `guess ${number}`, crowd, 20000);
    requests += tries;
    if (status === 403) judged += 1;
    else if (status !== 429) fail(`a stranger got ${status}`);
  }
}

const strangers = Array.from({ length: addresses }, (_, number) => stranger(number));
await sleep(3000); // so that the strangers are there first
const own = () => new http.Agent();
const visitor = enter(guarded, "192.0.2.1", "pass word", own());
const elsewhere = await enter(other, "192.0.2.2", "other word", own());
const reader = performance.now();
const shown = await ask(free, "192.0.2.3", undefined, own());
const readerTook = (performance.now() - reader) / 1000;
const answer = await visitor;
const after = seconds();
const judgedThen = judged;
while (requests < least && seconds() < 1000) await sleep(100);
const end = seconds(), total = judged;
done = true;
await Promise.all(strangers);
clearTimeout(limit);

console.log(`${requests} requests from ${addresses} addresses in ${end.toFixed(0)} s: ${total} judged; the visitor's right password was`
  + ` answered after ${answer.took.toFixed(1)} s (${answer.tries} requests, ${judgedThen} guesses judged by then); one of another link after`
  + ` ${elsewhere.took.toFixed(1)} s, a link without a password after ${readerTook.toFixed(2)} s`);
expect("the visitor is let in", answer.status === 200);
expect("one of another link is let in", elsewhere.status === 200);
expect("a link without a password is shown", shown.status === 200 && shown.json.success);
// Slowness only makes these fewer.
expect("at most five a second", total <= 5 * (end + 1) && judgedThen <= 5 * (after + 1));
process.exit(failed ? 1 : 0);
