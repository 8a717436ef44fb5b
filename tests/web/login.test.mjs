// Logging in by the page: who gets in, what is asked, where one is logged in, a session that ends in the middle of work.
import assert from "node:assert/strict";
import { readFileSync, rmSync, writeFileSync } from "node:fs";
import { join } from "node:path";
import { test } from "node:test";
import { findings, finish, go, newPage, PASSWORDS, rowsReady, screenshot, upload, URL_OF_PAGE, wentWell } from "./browser.mjs";
import { AGAIN, localFiles } from "./support.mjs";

// By this name the demo's web server asks nobody for a password.
const SITE = URL_OF_PAGE.replace("127.0.0.1", "localhost");
const NAMES = ["large.bin", "one.txt", "two.txt", "three.txt"];
const files = localFiles("login", Object.fromEntries(NAMES.map((name, i) => [name, Buffer.alloc(i === 0 ? 2 << 20 : 10, 7)])));
const FILES = NAMES.map((name) => join(files, name));

// A browser of its own, with the page's scripts under watch.
async function withBrowser(run, options = {}) {
  const page = await newPage(options);
  await finish(page, async () => {
    await run(page, page.context());
    assert.deepEqual(page.complaints.filter((text) => text.startsWith("page:")), []);
  });
}

async function logIn(page, user, password = PASSWORDS[user], path = "/") {
  await page.goto(`${SITE}#${path}`);
  await page.fill("[name=user]", user);
  await page.fill("[name=password]", password);
  await page.keyboard.press("Enter");
  await page.waitForSelector("body.started");
  await rowsReady(page);
}

async function logOut(page) {
  await page.click("#account-button");
  await page.click(".menu >> text=Log out");
  await page.waitForSelector(".login [name=user]");
}

// As another window of the same browser would.
const post = (context, program, form) =>
  context.request.post(`${SITE}cgi-bin/${program}`, { form, headers: { Origin: new URL(SITE).origin }, ...AGAIN });

async function inHome(context) {
  const reply = await context.request.get(`${SITE}cgi-bin/list?action=folder&path=/home`, AGAIN);
  return (await reply.json()).data.items.map((item) => item.name).filter((name) => NAMES.includes(name));
}

test("right, wrong, unknown, asked once more, out again", () =>
  withBrowser(async (page, context) => {
    await page.goto(`${SITE}#/photo`);
    await page.waitForSelector(".login [name=user]:focus");
    assert.deepEqual(await findings(page), []);
    assert.deepEqual(await page.locator(".login input").evaluateAll((all) => all.map((one) => one.autocomplete)), [
      "username",
      "current-password",
    ]);
    const said = [];
    for (const user of ["alice", "nobody of that name"]) {
      await page.fill("[name=user]", user);
      await page.fill("[name=password]", "wrong");
      await page.keyboard.press("Enter");
      await page.waitForFunction(() => document.querySelector(".login [name=password]").value === "");
      await page.waitForSelector(".login [name=password]:focus");
      said.push(await page.textContent(".login .complaint"));
      await page.fill(".login [name=password]", "x"); // what is said next is new
    }
    assert.match(said[0], /do not fit together/);
    assert.equal(said[0], said[1]);
    await page.fill("[name=user]", "alice");
    await page.fill("[name=password]", "");
    await page.keyboard.press("Enter");
    await page.waitForSelector(".login [name=answer]:focus"); // by the machine itself
    assert.equal(await page.getAttribute("[name=answer]", "type"), "password");
    assert.deepEqual(await findings(page), []);
    await page.keyboard.type(PASSWORDS.alice);
    await page.keyboard.press("Enter");
    await page.waitForSelector("#view >> text=Landscapes"); // where the address led
    await post(context, "logout", { scope: "others" }); // where tests before this one logged in

    // Somewhere else, too: seen, and ended from here.
    await withBrowser(async (other) => {
      await logIn(other, "alice");
      await page.click("#account-button");
      await page.waitForSelector(".menu >> text=alice");
      await page.click(".menu >> text=Where am I logged in");
      await page.waitForFunction(() => document.querySelectorAll(".session-list li").length === 2);
      assert.deepEqual(await findings(page, ".dialog"), []);
      await screenshot(page, "sessions");
      await page.click(".session-list li:not(:has(.tag)) button");
      await page.waitForFunction(() => document.querySelectorAll(".session-list li").length === 1);
      await page.keyboard.press("Escape");
      await go(other, "/music");
      await other.waitForSelector(".login-again");
    });
    await logOut(page);
    await page.goto("about:blank");
    await page.goBack(); // the browser has kept nothing of what was on screen
    await page.waitForSelector(".login");
    assert.equal(await page.locator("#view >> text=Landscapes").count(), 0);
    assert.equal((await context.request.get(`${SITE}cgi-bin/list?action=shares`, AGAIN)).status(), 401);
  }));

// What a machine may ask and refuse, by a PAM service of the test's own.
const { ORVEL_TEST_DEMO: demo, ORVEL_TEST_PAM_TOLD: told, VEXO_GATE_PAM: service } = process.env;
const auth = (more = "") => `auth required ${told} ask=Password: want=word ${more}\n`;
const account = (more = "") => `account required ${told} ${more}\n`;
const code = auth("say=Sent. [show=One-time code: ] want=123456") + account();
const toChange = auth() + account("must_change");
const toBlock = 'autoblock_attempts="1"\n';

// stack; what is asked and answered; the complaint at the end, "" for who is let in; settings meanwhile
const WAYS = [
  { stack: auth() + account("locked"), answers: [["Password", "word"]], said: "Your account is locked" },
  { stack: toChange + `password required ${told} locked\n`, answers: [["Password", "word"]], said: "your password has and was not changed" },
  { stack: code, answers: [["Password", "word"], ["One-time code", "000000"]], said: "do not fit together" },
  { stack: code, answers: [["Password", "word"], ["One-time code", "123456"]], said: "" },
  {
    stack: `${toChange}password required ${told} [ask=Current password: ] want=word [ask=New password: ] want=fresh [ask=Retype new password: ] want=fresh\n`,
    answers: [["Password", "word"], ["Present password", "word"], ["New password", "fresh"], ["New password once more", "fresh"]],
    said: "",
  },
  { stack: auth() + account(), answers: [["Password", "wrong"]], said: "do not fit together", settings: toBlock },
  { stack: auth() + account(), answers: [["Password", "word"]], said: "Too many attempts failed from this address. Try again in", settings: toBlock },
];

test("locked, expired, a one-time code, too many failures", () =>
  withBrowser(async (page) => {
    const file = join(demo, "etc/vexoinfo.conf"), settings = readFileSync(file, "utf8");
    try {
      for (const way of WAYS) {
        writeFileSync(join(service, "orvel"), way.stack);
        writeFileSync(file, settings + (way.settings ?? ""));
        await page.goto(SITE);
        await page.fill(".login [name=user]", "alice");
        for (const [asked, answer] of way.answers) {
          await page.waitForSelector(`.login .field >> text=${asked}`);
          await page.fill(asked === "Password" ? ".login [name=password]" : ".login [name=answer]", answer);
          await page.keyboard.press("Enter");
        }
        if (way.said) await page.waitForSelector(`.login .complaint >> text=${way.said}`);
        else await logOut(page);
      }
    } finally {
      rmSync(join(service, "orvel"), { force: true });
      writeFileSync(file, settings);
      rmSync(join(demo, "var/lib/vexo/autoblock.db"), { force: true });
    }
  }));

test("a session that ends during an upload: asked for in place, everything arrives once", () =>
  withBrowser(async (page, context) => {
    await logIn(page, "alice", PASSWORDS.alice, "/home");
    let uploads = 0;
    await page.route("**/cgi-bin/upload*", async (route) => {
      if (++uploads === 1) await post(context, "logout", {});
      await route.continue();
    });
    await upload(page, "Upload files", FILES);
    await page.waitForSelector(".login-again [name=password]:focus");
    for (let i = 0; i < 3; ++i) await page.keyboard.press("Escape"); // there is nothing to go back to
    assert.deepEqual(await findings(page, ".login-again"), []);
    assert.equal(await page.inputValue(".login-again [name=user]"), "alice");
    await screenshot(page, "log-in-again");
    await page.fill(".login-again [name=password]", "wrong");
    await page.keyboard.press("Enter");
    await page.waitForSelector(".login-again .complaint >> text=do not fit together");
    await page.fill(".login-again [name=password]", PASSWORDS.alice);
    await page.keyboard.press("Enter");
    await wentWell(page, `${NAMES.length} files uploaded`);
    assert.equal(await page.locator(".login-again").count(), 0);
    assert.deepEqual((await inHome(context)).sort(), [...NAMES].sort());
  }));

test("somebody else is logged in by then: the page starts anew, nothing that was queued is sent", () =>
  withBrowser(async (page, context) => {
    await logIn(page, "admin", PASSWORDS.admin, "/home");
    await page.route("**/cgi-bin/upload*", async (route) => {
      const reply = await post(context, "login", { action: "begin", user: "bob", password: PASSWORDS.bob });
      assert.equal((await reply.json()).data?.user, "bob");
      await route.continue();
    });
    await upload(page, "Upload files", FILES);
    await page.waitForSelector(".home >> text=Hello, bob");
    await page.waitForFunction(() => location.hash === "#/");
    await page.waitForSelector(".activity-card", { state: "detached" });
    assert.deepEqual(await inHome(context), []);
  }));

test("where the web server logs people in there is no logging out", () =>
  withBrowser(
    async (page) => {
      await page.goto(URL_OF_PAGE);
      await page.waitForSelector("body.started");
      await page.click("#account-button");
      await page.waitForSelector(".menu >> text=My public links");
      assert.equal(await page.locator(".menu >> text=Log out").count(), 0);
    },
    { httpCredentials: { username: "alice", password: PASSWORDS.alice } },
  ));
