// Public links: made, opened by a visitor who has no account, revoked.
import assert from "node:assert/strict";
import { test } from "node:test";
import { choose, findings, finish, newPage, press, row, screenshot, withPage } from "./browser.mjs";
import { ownFolder } from "./support.mjs";

async function makeLink(page, name, password) {
  await choose(page, name);
  await page.click("#toolbar >> text=Share a link");
  assert.match(await page.inputValue("[name=password]"), /^([a-km-np-z2-9]{4}-){3}[a-km-np-z2-9]{4}$/, "80 bits");
  await page.fill("[name=password]", password);
  await page.click(".dialog >> text=Create link");
  const address = await page.inputValue(".address");
  if (password) assert.equal(await page.inputValue(".dialog .password"), password);
  await page.click(".dialog >> text=Copy link");
  await press(page, ".toast", "Link copied", "Close");
  await page.keyboard.press("Escape");
  return address;
}

async function visit(address, run, options = {}) {
  const page = await newPage(options);
  await finish(page, async () => {
    const response = await page.goto(address);
    await run(page, response.status(), page.complaints);
  });
}

test("a folder with a password, opened elsewhere, then revoked", () => {
  ownFolder("linked", { "cabin/": "", "cabin/plan.pdf": "a plan" });
  return withPage("alice", { path: "/projects/linked" }, async (page) => {
    const address = await makeLink(page, "cabin", "let me in");
    await visit(address, async (visitor, status, wrong) => {
      assert.equal(status, 200);
      await screenshot(visitor, "visitor-door");
      await visitor.fill("input[type=password]", "let me out");
      await visitor.keyboard.press("Enter");
      await visitor.waitForFunction(() => document.querySelector(".wrong")?.textContent.includes("not right"));
      await visitor.fill("input[type=password]", "let me in");
      await visitor.keyboard.press("Enter");
      await visitor.waitForSelector("text=plan.pdf"); // the page comes back by itself
      await screenshot(visitor, "visitor");
      const download = visitor.waitForEvent("download");
      await visitor.click("[aria-label='Download: plan.pdf']");
      assert.equal((await download).suggestedFilename(), "plan.pdf");
      assert.deepEqual(
        wrong.filter((text) => !text.includes("403") && !text.includes("429")),
        [],
      );
    });
    await page.click("#account-button");
    await page.click(".menu >> text=My public links");
    const link = page.locator(".link-list li:has(b[title$='/linked/cabin'])"); // others may have left theirs
    await link.locator("text=with password").waitFor();
    await link.locator("[aria-label=Revoke]").click();
    await page.click(".dialog .button.danger");
    await link.waitFor({ state: "detached" });
    await visit(address, async (visitor, status) => {
      assert.equal(status, 404);
      assert.equal(await visitor.locator("text=plan.pdf").count(), 0);
      await visitor.waitForSelector("h1:has-text('This link is not available.')");
      assert.deepEqual(await findings(visitor), []);
      assert.notEqual(await visitor.evaluate(() => getComputedStyle(document.querySelector("main")).borderRadius), "0px");
    });
  });
});

test("changed in place: downloads that end, a badge, a code", () => {
  ownFolder("limited", { "notes.md": "# Notes" });
  return withPage("alice", { path: "/projects/limited" }, async (page) => {
    await choose(page, "notes.md");
    await page.click("#toolbar >> text=Share a link");
    await page.fill("[name=password]", "");
    await page.click(".dialog >> text=Create link");
    const address = await page.inputValue(".address");
    await page.click(".dialog >> text=QR code");
    const code = page.locator(".link-code");
    await code.locator(`svg[aria-label$="${address}"]`).waitFor();
    await screenshot(page, "link-code");
    assert.deepEqual(await findings(page), []);
    const picture = page.waitForEvent("download");
    await code.locator("text=Download picture").click();
    assert.equal((await picture).suggestedFilename(), "link.png");
    await page.keyboard.press("Escape");
    await page.keyboard.press("Escape");
    const marked = row(page, "notes.md").locator(".badge[title*='public link']");
    await marked.waitFor();

    await choose(page, "notes.md", { button: "right" });
    await page.click(".menu >> text=Links of this item");
    const link = page.locator(".link-list li", { has: page.locator(`a[href="${address}"]`) });
    await link.locator("text=no downloads yet").waitFor();
    await link.locator("[aria-label='Change this link']").click();
    const form = page.locator(".dialog:has([name=note])");
    await form.locator("[name=downloads]").fill("1");
    await form.locator("[name=note]").fill("for Ann");
    await form.locator("text=Save changes").click();
    await link.locator("text=no downloads yet, 1 possible").waitFor();
    await link.locator("text=for Ann").waitFor();
    await screenshot(page, "links-of-item");
    assert.deepEqual(await findings(page), []);

    await visit(address, async (visitor, status, wrong) => {
      await visitor.waitForSelector("#left:has-text('1 download left')");
      assert.equal(await visitor.locator("text=Preview").count(), 0);
      assert.deepEqual(await findings(visitor), []);
      await screenshot(visitor, "visitor-limited");
      const download = visitor.waitForEvent("download");
      await visitor.click("text=Download");
      await (await download).path();
      await visitor.click("text=Download");
      await visitor.waitForSelector("h1:has-text('used up')");
      assert.equal((await visitor.reload()).status(), 410);
      await visitor.waitForSelector("h1:has-text('This link has been used up.')");
      assert.deepEqual(wrong.filter((text) => !text.includes("410")), []);
    });
    await page.keyboard.press("Escape");
    await choose(page, "notes.md", { button: "right" });
    await page.click(".menu >> text=Links of this item");
    await link.locator("text=used up: 1 of 1 download").waitFor();
    await link.locator("[aria-label=Revoke]").click();
    await page.click(".dialog .button.danger");
    await link.waitFor({ state: "detached" });
    await page.keyboard.press("Escape");
    await marked.waitFor({ state: "detached" });
  });
});

test("files received by a link, on a phone, seen by the owner alone", () => {
  ownFolder("receiving", { "house/": "" });
  return withPage("alice", { path: "/projects/receiving" }, async (page) => {
    await choose(page, "house", { button: "right" });
    await page.click(".menu >> text=Receive files by a link");
    await page.fill("[name=inbox]", "from the party");
    await page.fill("[name=password]", "");
    await page.fill("[name=most_files]", "2");
    await screenshot(page, "link-receive");
    assert.deepEqual(await findings(page), []);
    await page.click(".dialog >> text=Create link");
    const address = await page.inputValue(".address");
    await page.keyboard.press("Escape");
    const phone = { viewport: { width: 390, height: 780 }, isMobile: true, hasTouch: true };
    const bytes = (text) => ({ mimeType: "image/jpeg", buffer: Buffer.from(text) });
    await visit(
      address,
      async (visitor, status, wrong) => {
        assert.equal(status, 200);
        await visitor.waitForSelector("h1:has-text('from the party')");
        await visitor.waitForSelector("text=2 more files can be sent");
        await visitor.setInputFiles("#files", [
          { name: "cake.jpg", ...bytes("cake") },
          { name: "cake.jpg", ...bytes("more cake") },
          { name: "too many.jpg", ...bytes("third") },
        ]);
        await visitor.locator(".sending .sent").nth(1).waitFor();
        await visitor.waitForSelector(".sending .failed >> text=The link does not take this much.");
        await visitor.waitForSelector("text=This link takes no more files.");
        await screenshot(visitor, "visitor-sends");
        assert.equal(await visitor.evaluate(() => document.documentElement.scrollWidth), 390);
        assert.deepEqual(await findings(visitor), []);
        assert.deepEqual(wrong.filter((text) => !text.includes("413")), []);
      },
      phone,
    );
    await visit(address, async (visitor, status) => {
      await visitor.waitForSelector("text=This link takes no more files.");
      assert.equal(await visitor.locator("text=cake").count(), 0, "nothing of what was sent");
      await screenshot(visitor, "visitor-full");
    }, { colorScheme: "dark" });
    await page.click("#account-button");
    await page.click(".menu >> text=My public links");
    const link = page.locator(".link-list li:has(b[title$='/house/from the party'])");
    await link.locator("text=2 of 2 files").waitFor();
    await screenshot(page, "links-received");
    await link.locator("[aria-label='What was sent']").click();
    const sent = page.locator(".dialog:has(h2:has-text('What was sent'))");
    await sent.locator("li:has-text('cake (2).jpg'):has-text('from 127.0.0.1')").waitFor();
    await screenshot(page, "links-sent");
    assert.deepEqual(await findings(page), []);
    await page.keyboard.press("Escape");
    await sent.waitFor({ state: "detached" });
    await link.locator("[aria-label=Revoke]").click();
    await page.click(".dialog .button.danger");
    await link.waitFor({ state: "detached" });
  });
});

test("names of markup reach a visitor as text", () =>
  withPage("alice", { path: "/worldwide" }, async (page) => {
    const address = await makeLink(page, "<img src=x onerror", "");
    await visit(address, async (visitor, status, wrong) => {
      assert.equal(status, 200);
      await visitor.waitForSelector("text=<img src=x onerror=alert(1)>.txt");
      assert.equal(await visitor.locator("img:not(.picture, .brand img)").count(), 0);
      assert.deepEqual(wrong, []);
    });
  }));

test("pictures on a phone: tiles, the file itself, sorted, back", () =>
  withPage("alice", { path: "/photo" }, async (page) => {
    const address = await makeLink(page, "Landscapes", "");
    const phone = { viewport: { width: 390, height: 780 }, isMobile: true, hasTouch: true };
    await visit(
      address,
      async (visitor, status, wrong) => {
        await visitor.waitForSelector(".tiles img:not(.picture)");
        assert.equal(await visitor.evaluate(() => document.documentElement.scrollWidth), 390); // not a shrunk page of a desktop
        assert.deepEqual(await findings(visitor), []);
        await visitor.tap(".tiles a >> nth=0");
        const shown = (name) => visitor.waitForSelector(`.preview b:has-text("${name}")`);
        await shown("After the rain.png");
        await visitor.waitForFunction(() => document.querySelector(".stage img").naturalWidth > 0);
        assert.deepEqual(await findings(visitor), []);
        await visitor.tap(".next");
        await shown("Blue hour.png");
        await visitor.reload(); // the address keeps it
        await shown("Blue hour.png");
        await visitor.goBack({ waitUntil: "commit" });
        await visitor.waitForSelector(".preview", { state: "detached" });
        await visitor.selectOption("select", "name desc");
        await visitor.waitForSelector(".tiles li:first-child:has-text('North slope.png')");
        await visitor.tap("[aria-label=List]");
        await visitor.waitForSelector("tbody tr:first-child:has-text('North slope.png')");
        assert.deepEqual(await findings(visitor), []);
        await screenshot(visitor, "visitor-phone");
        assert.deepEqual(wrong, []);
      },
      phone,
    );
  }));
