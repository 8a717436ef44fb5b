// Documents, pictures, films and sound in place; what is hostile in them stays what it is.
import assert from "node:assert/strict";
import { readdirSync, readFileSync } from "node:fs";
import { join } from "node:path";
import { before, test } from "node:test";
import { boxOf, findings, row, screenshot, withPage } from "./browser.mjs";
import { ownFolder, write as writeIn } from "./support.mjs";

const here = { path: "/projects/papers" };
const write = (name, content) => writeIn(folder, { [name]: content });
let folder, picture;

before(() => {
  const pictures = join(process.env.ORVEL_TEST_PHOTO, "Landscapes");
  picture = readFileSync(join(pictures, readdirSync(pictures)[0]));
  folder = ownFolder("papers", { "picture.png": picture });
});

async function look(page, name) {
  await row(page, name).dblclick();
  await page.locator(".preview-title b", { hasText: name }).waitFor();
}

async function leave(page) {
  await page.keyboard.press("Escape");
  await page.locator(".preview").waitFor({ state: "detached" });
}

// Every way out of a document that was tried: requests to elsewhere, scripts that ran.
function watch(page) {
  const elsewhere = [];
  page.on("request", (request) => {
    const { hostname, protocol } = new URL(request.url());
    if (hostname !== "127.0.0.1" && protocol.startsWith("http")) elsewhere.push(request.url());
  });
  page.on("dialog", (dialog) => elsewhere.push(`dialog ${dialog.message()}`) && dialog.dismiss());
  return async () => assert.deepEqual([elsewhere, await page.evaluate(() => globalThis.hacked)], [[], undefined]);
}

test("Markdown is shown as it is meant, and nothing in it runs or tells", async () => {
  write("attack.md", [
    "# Report", "", "Some *text* with `code` and [a link](https://example.org/x).", "",
    "<script>globalThis.hacked = 1</script>", "<img src=x onerror='globalThis.hacked = 2'>", "",
    "[one](javascript:globalThis.hacked=3) [two](data:text/html,<script>globalThis.hacked=4</script>)",
    "[three]( JaVaScRiPt&#58;globalThis.hacked=5) <javascript:globalThis.hacked=6> [up](../../../../etc/passwd)", "",
    "![far](http://elsewhere.example/pixel.png) ![near](picture.png)", "",
    "| a | b |", "|---|---|", "| 1 | <b onclick=hacked=7>2</b> |", ""].join("\n"));
  await withPage("alice", here, async (page) => {
    const harmless = watch(page);
    await look(page, "attack.md");
    const shown = page.locator(".preview .markdown");
    await shown.locator("h1", { hasText: "Report" }).waitFor();
    await shown.locator("em", { hasText: "text" }).waitFor();
    await shown.locator("text=<script>globalThis.hacked = 1</script>").waitFor();
    assert.equal(await shown.locator("script, [onerror], [onclick], iframe").count(), 0);
    for (const link of await shown.locator("a").all()) {
      assert.match(await link.getAttribute("href"), /^(https:|#\/)/);
      assert.match(await link.getAttribute("rel"), /noopener/);
    }
    await shown.locator("img").waitFor(); // the one beside it, and no other
    await harmless();
    assert.deepEqual(await findings(page, ".preview"), []);
    await screenshot(page, "documents markdown");
    await page.click(".preview >> text=Source");
    await page.locator(".preview pre .tok-heading").first().waitFor();
    await leave(page);
  });
});

test("texts in any encoding, code in colours, long ones in pieces", async () => {
  write("code.js", "// a comment\nexport const answer = 42;\n");
  write("russian.txt", Buffer.from([0xcf, 0xf0, 0xe8, 0xe2, 0xe5, 0xf2])); // in Windows-1251
  write("long.log", `${"ä".repeat(131071)}|${"ü".repeat(131072)}\nthe end`); // a character across the border
  await withPage("alice", here, async (page) => {
    await look(page, "code.js");
    await page.locator(".preview pre .tok-comment", { hasText: "// a comment" }).waitFor();
    await screenshot(page, "documents code");
    await leave(page);
    await look(page, "russian.txt");
    await page.selectOption(".preview select", "windows-1251");
    await page.locator(".preview pre", { hasText: "Привет" }).waitFor();
    await leave(page);
    await look(page, "long.log");
    await page.locator(".preview [role=status]", { hasText: "Part 1 of 3" }).waitFor();
    await page.locator(".preview pre", { hasText: /^ä+\|ü$/ }).waitFor();
    await page.click(".preview >> text=Next part");
    await page.locator(".preview [role=status]", { hasText: "Part 2 of 3" }).waitFor();
    await page.locator(".preview pre", { hasText: /^ü+\s?$/ }).waitFor();
    await leave(page);
  });
});

// A document of two pages; `more` stands in its catalog.
function pdf(more = "") {
  const text = "BT /F1 40 Tf 60 700 Td (Hello from a document) Tj ET";
  const objects = [
    `<< /Type /Catalog /Pages 2 0 R ${more} >>`,
    "<< /Type /Pages /Kids [3 0 R 6 0 R] /Count 2 >>",
    "<< /Type /Page /Parent 2 0 R /MediaBox [0 0 612 792] /Contents 4 0 R /Resources << /Font << /F1 5 0 R >> >> >>",
    `<< /Length ${text.length} >>\nstream\n${text}\nendstream`,
    "<< /Type /Font /Subtype /Type1 /BaseFont /Helvetica >>",
    "<< /Type /Page /Parent 2 0 R /MediaBox [0 0 792 612] >>",
  ];
  let out = "%PDF-1.7\n";
  const at = objects.map((object, i) => {
    const begin = out.length;
    out += `${i + 1} 0 obj\n${object}\nendobj\n`;
    return begin;
  });
  const table = out.length;
  out += `xref\n0 ${at.length + 1}\n0000000000 65535 f \n${at.map((begin) => `${String(begin).padStart(10, "0")} 00000 n \n`).join("")}`;
  return `${out}trailer << /Size ${at.length + 1} /Root 1 0 R >>\nstartxref\n${table}\n%%EOF\n`;
}

test("PDF in place: its text can be read, its scripts cannot run", async () => {
  write("script.pdf", pdf("/OpenAction << /S /JavaScript /JS (globalThis.hacked = 1; app.alert\\(1\\); this.submitForm\\('http://elsewhere.example/'\\)) >> /AA << /WC << /S /URI /URI (http://elsewhere.example/) >> >>"));
  write("broken.pdf", "%PDF-1.7\nnothing of it");
  await withPage("alice", here, async (page) => {
    const harmless = watch(page);
    await look(page, "script.pdf");
    await page.locator(".pdf-text", { hasText: "Hello from a document" }).waitFor();
    await page.locator(".pdf [role=status]", { hasText: "Page 1 of 2" }).waitFor();
    const dark = await page.evaluate(() => {
      const canvas = document.querySelector(".pdf-page canvas");
      const { data } = canvas.getContext("2d").getImageData(0, 0, canvas.width, canvas.height);
      return data.filter((value, i) => i % 4 === 0 && value < 100).length;
    });
    assert.ok(dark > 100, `${dark} dark points`);
    const { width } = await boxOf(page.locator(".pdf-page").first());
    await page.locator(".pdf-pages").press("+");
    await page.waitForFunction((less) => document.querySelector(".pdf-page").offsetWidth > less, width);
    await harmless();
    await screenshot(page, "documents pdf");
    assert.deepEqual(await findings(page, ".preview"), []);
    await leave(page);
    await look(page, "broken.pdf");
    await page.locator(".preview", { hasText: "This file cannot be shown" }).waitFor();
    await leave(page);
  });
});

test("pictures closer and turned, by keys, wheel and touch", async () => {
  for (const name of ["picture 1.png", "picture 2.png"]) write(name, picture);
  await withPage("alice", { ...here, hasTouch: true }, async (page) => {
    await look(page, "picture 1.png");
    const image = page.locator(".preview .stage > img");
    await page.locator(".preview-tools").waitFor();
    await page.locator(".preview-title", { hasText: /\d+ of \d+/ }).waitFor();
    const lies = (part) => page.waitForSelector(`.stage > img[style*="${part}"]`);
    await page.keyboard.press("+");
    await lies("scale(1.5)");
    for (const key of ["0", "r"]) await page.keyboard.press(key);
    await lies("rotate(90deg)");
    await image.hover();
    await page.mouse.wheel(0, -300);
    await page.waitForSelector(".stage > img.zoomed");
    await screenshot(page, "documents picture");
    await page.keyboard.press("0");
    // A swipe leads on.
    await image.evaluate((node) => {
      const send = (type, clientX) =>
        node.parentElement.dispatchEvent(new PointerEvent(type, { pointerId: 7, pointerType: "touch", clientX, clientY: 300, bubbles: true }));
      send("pointerdown", 600);
      send("pointermove", 480);
      send("pointerup", 400);
    });
    await page.locator(".preview-title b", { hasText: "picture 2.png" }).waitFor();
    await leave(page);
  });
});

test("pictures one after the other, by themselves", async () => {
  ownFolder("slides", { "1.png": picture, "2.txt": "no picture", "3.png": picture });
  await withPage("alice", { path: "/projects/slides" }, async (page) => {
    const shows = (name) => page.locator(`.preview:has(.preview-tools) .preview-title b`, { hasText: name }).waitFor();
    await page.clock.install();
    await look(page, "1.png");
    await shows("1.png");
    await page.keyboard.press("s");
    await page.selectOption(".preview .slides", "10");
    await page.clock.fastForward(9000);
    await shows("1.png");
    for (const name of ["3.png", "1.png"]) {
      await page.clock.fastForward(10_000);
      await shows(name);
    }
    await screenshot(page, "documents slideshow");
    assert.deepEqual(await findings(page, ".preview"), []);
    await page.click(".preview [aria-label='Stop the slideshow']");
    await page.clock.fastForward(20_000);
    await page.locator(".preview [aria-label='Slideshow']").waitFor();
    await shows("1.png");
    await leave(page);
  });
});

test("in a tab of its own only what cannot harm is shown, and nothing in it runs", async () => {
  const attack = `<svg xmlns="http://www.w3.org/2000/svg"><script>globalThis.hacked = 1; fetch("/cgi-bin/list?action=shares")</script></svg>`;
  for (const name of ["tab.svg", "tab.html", "tab.xml", "tab.pdf", "tab.txt", "tab.png"]) write(name, attack);
  await withPage("alice", here, async (page) => {
    await look(page, "picture.png");
    const link = page.locator(".preview [aria-label='Show in a tab of its own']");
    const url = new URL(await link.getAttribute("href"), page.url());
    const [tab] = await Promise.all([page.context().waitForEvent("page"), link.click()]);
    await tab.waitForFunction(() => document.images[0]?.naturalWidth > 0);
    assert.equal(await tab.evaluate(() => globalThis.opener), null);
    await leave(page);
    const urlOf = (name) => url.href.replace("picture.png", name);
    const ran = () => tab.evaluate(() => globalThis.hacked);
    for (const name of ["tab.svg", "tab.html", "tab.xml", "tab.pdf"]) {
      const saved = tab.waitForEvent("download");
      await tab.goto(urlOf(name)).catch(() => {}); // it is no document
      await (await saved).cancel();
    }
    await tab.goto(urlOf("tab.txt"));
    await tab.locator("text=globalThis.hacked").waitFor();
    assert.equal(await ran(), undefined);
    await tab.goto(urlOf("tab.png"));
    assert.equal(await ran(), undefined);
    // Even if a browser took it for a document that can run something; without the policy this one would.
    for (const policy of [true, false]) {
      await tab.route("**/*inline=1*", async (route) => {
        const response = await route.fetch();
        const { "content-security-policy": given, ...headers } = response.headers();
        await route.fulfill({ response, headers: { ...headers, ...(policy && { "content-security-policy": given }), "content-type": "image/svg+xml" } });
      });
      await tab.goto(urlOf("tab.txt"));
      assert.equal(await ran(), policy ? undefined : 1);
      await tab.unrouteAll({ behavior: "wait" });
    }
    await tab.close();
  });
});

// Silence of so many seconds.
function wave(seconds) {
  const data = Buffer.alloc(seconds * 8000, 128);
  const head = Buffer.from("RIFF....WAVEfmt \x10\0\0\0\x01\0\x01\0\x40\x1f\0\0\x40\x1f\0\0\x01\0\x08\0data....", "latin1");
  head.writeUInt32LE(36 + data.length, 4);
  head.writeUInt32LE(data.length, 40);
  return Buffer.concat([head, data]);
}

test("films with the subtitles beside them and the place kept; sound goes on with the next", async () => {
  write("film.mkv", wave(60));
  write("film.de.srt", Buffer.from("\uFEFF1\r\n00:00:20,500 --> 00:00:24,000\r\nSchöne Grüße\r\n\r\n2\r\n00:00:30,000 --> 00:00:31,000\r\n<b>Ende</b>\r\n"));
  write("film.vtt", "WEBVTT\n\nNOTE nothing\n\n00:21.000 --> 00:22.000 line:0\nHello\n");
  write("tune 1.wav", wave(2));
  write("tune 2.wav", wave(600)); // it still plays when somebody looks
  await withPage("alice", here, async (page) => {
    await look(page, "film.mkv");
    await page.waitForFunction(() => document.querySelector(".preview video")?.textTracks[1]?.mode === "disabled");
    const said = await page.evaluate(() =>
      [...document.querySelector(".preview video").textTracks].map((track) => [track.language, track.mode, [...(track.cues ?? [])].map(({ startTime, text }) => [startTime, text])]),
    );
    assert.deepEqual(said[0].slice(0, 2), ["de", "showing"]);
    assert.deepEqual(said[0][2][0], [20.5, "Schöne Grüße"]);
    await page.evaluate(() => {
      document.querySelector(".preview video").currentTime = 33;
    });
    await page.waitForFunction(() => document.querySelector(".preview video").currentTime === 33 && !document.querySelector(".preview video").seeking);
    await leave(page);
    await look(page, "film.mkv");
    await page.waitForFunction(() => document.querySelector(".preview video")?.currentTime === 33);
    await leave(page);
    await look(page, "tune 1.wav");
    await page.locator(".preview audio").waitFor();
    await page.evaluate(async () => {
      const player = document.querySelector(".preview audio");
      player.muted = true;
      await player.play();
      player.currentTime = 1.9;
    });
    await page.locator(".preview-title b", { hasText: "tune 2.wav" }).waitFor();
    await page.waitForFunction(() => document.querySelector(".preview audio")?.paused === false);
    await leave(page);
  });
});
