// The ways that people go most, in Firefox.
import assert from "node:assert/strict";
import { existsSync, readFileSync } from "node:fs";
import { join } from "node:path";
import { after, before, test } from "node:test";
import { Firefox } from "./firefox.mjs";
import { localFiles, ownFolder } from "./support.mjs";

const SITE = process.env.ORVEL_TEST_URL.replace("127.0.0.1", "localhost"); // where the page asks for the password
const files = localFiles("firefox", Object.fromEntries(["letter.txt", "list.txt", "later.txt"].map((name) => [name, `This is ${name}.`])));
let firefox;

before(async () => {
  firefox = await Firefox.start();
});
after(() => firefox?.close());

async function logIn() {
  await firefox.fill(".login [name=user]", "alice");
  await firefox.fill(".login [name=password]", process.env.ORVEL_TEST_ALICE);
  await firefox.type("Enter");
}

async function leave() {
  await firefox.click("#account-button", "");
  await firefox.click(".menu button", "Log out");
  await firefox.find(".login [name=user]");
}

test("in, upload, preview, rename, delete, link, out", async () => {
  const row = ["#view .row:not(.header) .name"];
  const there = join(ownFolder("in firefox", { "inside/": "", "inside/plan.pdf": "a plan" }), "inside");
  await firefox.open(`${SITE}#/projects/in%20firefox`);
  await logIn();
  await firefox.click(...row, "inside", 2);
  await firefox.find(...row, "plan.pdf");
  firefox.complaints.length = 0; // that nobody was logged in

  await firefox.click("#toolbar button", "Upload");
  await firefox.choose([join(files, "letter.txt"), join(files, "list.txt")], () => firefox.click(".menu button", "Upload files"));
  await firefox.find(...row, "list.txt");
  assert.equal(readFileSync(join(there, "letter.txt"), "utf8"), "This is letter.txt.");

  await firefox.click(...row, "letter.txt", 2);
  await firefox.find(".preview pre", "This is letter.txt.");
  await firefox.type("Escape");
  await firefox.gone(".preview");

  await firefox.click(...row, "letter.txt");
  await firefox.type("F2");
  await firefox.fill(".in-place", "note");
  await firefox.type("Enter");
  await firefox.find("#view .row.selected", "note");
  await firefox.gone("#view .row", "letter.txt");

  await firefox.type("Delete");
  await firefox.gone("#view .row", "note");
  assert.ok(!existsSync(join(there, "note")));

  await firefox.click(...row, "plan.pdf");
  await firefox.click("#toolbar button", "Share a link");
  await firefox.fill(".dialog [name=password]", "let me in");
  await firefox.click(".dialog button", "Create link");
  await firefox.find(".dialog .address");
  const { value: link } = await firefox.call("() => document.querySelector('.dialog .address').value");
  await firefox.type("Escape");
  assert.deepEqual(firefox.complaints, []);
  await leave();
  firefox.complaints.length = 0;

  await firefox.goto(link.replace(/^https?:\/\/[^/]+\//, SITE));
  await firefox.fill("input[type=password]", "let me in");
  await firefox.type("Enter");
  await firefox.find(".single h1", "plan.pdf");
  assert.deepEqual(firefox.complaints, []);
});

test("a session that ends during an upload: asked for in place, and it arrives", async () => {
  const there = ownFolder("later in firefox", { "plan.pdf": "a plan" });
  await firefox.open(`${SITE}#/projects/later%20in%20firefox`);
  await logIn();
  await firefox.find("#view .row .name", "plan.pdf");
  const logOut = "() => fetch('cgi-bin/logout', { method: 'POST', body: new URLSearchParams() }).then((reply) => reply.status)";
  const sent = firefox.holdOnce("/cgi-bin/upload", async () => assert.equal((await firefox.call(logOut)).value, 200));
  await firefox.click("#toolbar button", "Upload");
  await firefox.choose([join(files, "later.txt")], () => firefox.click(".menu button", "Upload files"));
  await sent;
  await firefox.fill(".login-again [name=password]", process.env.ORVEL_TEST_ALICE);
  await firefox.type("Enter");
  await firefox.find("#view .row .name", "later.txt");
  assert.equal(readFileSync(join(there, "later.txt"), "utf8"), "This is later.txt.");
  await firefox.gone(".login-again");
  await leave();
});
