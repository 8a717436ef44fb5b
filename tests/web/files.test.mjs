// Files that come and go: uploads, conflicts, downloads, new folders, names, previews.
import assert from "node:assert/strict";
import { execFileSync } from "node:child_process";
import { existsSync, readdirSync, readFileSync, writeFileSync } from "node:fs";
import { join } from "node:path";
import { test } from "node:test";
import { cardOf, choose, drawn, go, press, row, unfinished, upload, wentWell, withPage } from "./browser.mjs";
import { localFiles, ownFolder, until, write } from "./support.mjs";

const NAMES = ["one.txt", "two, three*.txt", "four.txt"];
const pictures = `${process.env.ORVEL_TEST_PHOTO}/Landscapes`;
const trip = { "list & more.md": "# List\n\n- <b>bread</b>\n- Käse\n", "day 1/": "" };
for (const [i, name] of readdirSync(pictures).slice(0, 8).entries()) trip[`day 1/view ${i + 1}.png`] = readFileSync(join(pictures, name));
const files = localFiles("files", { "large.bin": Buffer.alloc(8 << 20, 7), "trip/day 1/empty/": "" });
write(files, Object.fromEntries(NAMES.map((name) => [name, `${name}, new`])));
write(join(files, "trip"), trip);

test("uploads: files, a folder, a conflict asked about once, cancel", () => {
  const own = ownFolder("uploads", { "house/": "" });
  return withPage("alice", { path: "/projects/uploads" }, async (page) => {
    await page.click("#toolbar >> text=New folder");
    await page.waitForSelector(".dialog .input:focus");
    await page.keyboard.type("in/out");
    await page.keyboard.press("Enter");
    await page.waitForSelector(".dialog .complaint >> text=cannot hold");
    await page.fill(".dialog .input", "house");
    await page.keyboard.press("Enter");
    await page.waitForSelector(".dialog .complaint >> text=exists already");
    await page.fill(".dialog .input", "incoming “1”");
    await page.keyboard.press("Enter");
    await page.waitForSelector("#view .row.selected >> text=incoming");
    await page.keyboard.press("Enter");
    await page.waitForSelector(".state >> text=This folder is empty");

    const there = join(own, "incoming “1”");
    const some = NAMES.map((name) => join(files, name));
    await upload(page, "Upload files", some);
    await wentWell(page, "3 files uploaded");
    assert.equal(readFileSync(join(there, "two, three*.txt"), "utf8"), "two, three*.txt, new");
    await upload(page, "Upload files", some);
    await page.waitForSelector(".dialog >> text=The file exists already");
    await page.check(".dialog >> text=Do the same for the 2 others");
    await page.click(".dialog >> text=Keep both");
    await page.waitForSelector("#view >> text=four (2).txt");
    await wentWell(page, "3 files uploaded");
    assert.equal(await page.locator(".dialog").count(), 0);
    await upload(page, "Upload files", some);
    await page.locator(".dialog >> text=The file exists already").waitFor();
    await page.keyboard.press("Escape");
    await press(page, ".activity-card", "Cancelled", "Remove from the list");
    await drawn(page);
    assert.equal(await page.locator(".dialog").count(), 0); // though three stood in line
    for (const name of some) writeFileSync(name, "newer");
    await upload(page, "Upload files", some);
    await page.locator(".dialog .compared figure:has-text('To come'):has-text('newer')").waitFor();
    await page.check(".dialog >> text=Do the same");
    await page.click(".dialog >> text=Replace");
    await wentWell(page, "3 files uploaded");
    assert.equal(readFileSync(join(there, "one.txt"), "utf8"), "newer");

    await upload(page, "Upload a folder", join(files, "trip"));
    await wentWell(page, "9 files uploaded");
    await upload(page, "Upload a folder", join(files, "trip"));
    await page.click(".dialog:has-text('list & more') >> text=Skip"); // this one alone
    await page.waitForSelector(".compared figure:nth-child(2) canvas"); // the picture of what comes
    await page.waitForSelector(".compared figure:nth-child(1) .loaded img");
    await page.keyboard.press("Escape");
    await press(page, ".activity-card", "Cancelled", "Remove from the list");
    assert.ok(readFileSync(join(there, "trip/day 1/view 8.png")).equals(trip["day 1/view 8.png"]));
    await page.waitForSelector("#view >> text=trip");

    // Dropped on a folder of the list, from outside.
    await row(page, "trip").evaluate((target) => {
      const data = new DataTransfer();
      data.items.add(new File(["dropped"], "from outside.txt"));
      for (const type of ["dragenter", "dragover", "drop"])
        target.dispatchEvent(new DragEvent(type, { bubbles: true, cancelable: true, dataTransfer: data }));
    });
    await wentWell(page, "“from outside.txt” to trip");
    assert.equal(readFileSync(join(there, "trip/from outside.txt"), "utf8"), "dropped");

    await page.evaluate(async (id) => {
      const { startUpload } = await import(new URL("uploads.js", document.querySelector("script[type=module]").src));
      startUpload([{ parts: ["nothing in it"] }], id);
    }, await page.evaluate(() => location.hash.slice(1)));
    await wentWell(page, "1 folder to");
    assert.ok(existsSync(join(there, "nothing in it")));

    // So slow a network that it takes a minute: there is something to cancel.
    const session = await page.context().newCDPSession(page);
    await session.send("Network.emulateNetworkConditions", { offline: false, latency: 0, downloadThroughput: -1, uploadThroughput: 128 << 10 });
    await upload(page, "Upload files", join(files, "large.bin"));
    await page.waitForFunction(() => document.querySelector(".activity-card [role=progressbar]").ariaValueNow > 2);
    await cardOf(page, "large.bin").locator("> .icon-button").click();
    await cardOf(page, "Cancelled").waitFor();
    const { request } = page.context();
    await until("the upload's end on the server", async () => !(await unfinished(request)).some(({ path }) => path.endsWith("large.bin")));
    assert.ok(!existsSync(join(there, "large.bin")));
  });
});

test("previews, thumbnails, rename, downloads", () => {
  const texts = { "latin.txt": Buffer.from("Café", "latin1"), "wide.txt": Buffer.from("\uFEFFCafé", "utf16le") };
  const there = ownFolder("looked “at”", { ...trip, ...texts });
  execFileSync("vips", ["black", join(there, "scanned.tif"), "300", "200"]); // no browser shows it
  return withPage("alice", { path: "/projects/looked%20%E2%80%9Cat%E2%80%9D" }, async (page) => {
    await row(page, "list & more").dblclick();
    await page.waitForSelector(".preview.paper .markdown li >> text=<b>bread</b>");
    for (const name of Object.keys(texts)) {
      await go(page, `/projects/looked%20%E2%80%9Cat%E2%80%9D!${name}`);
      await page.waitForSelector(`.preview-title >> text=${name}`);
      await page.waitForSelector(".preview pre >> text=/^.?Café$/");
    }
    await go(page, "/projects/looked%20%E2%80%9Cat%E2%80%9D!scanned.tif");
    await page.waitForFunction(() => document.querySelector(".preview img")?.naturalWidth === 300);
    await page.keyboard.press("Escape");
    await row(page, "day 1").dblclick();
    await page.click(".view-switch button >> nth=1");
    await page.waitForFunction(() => document.querySelectorAll(".thumbnail.loaded img").length === 8);
    await choose(page, "view 3");
    await page.press("#view", " ");
    await page.waitForSelector(".preview img");
    await page.keyboard.press("ArrowRight");
    await page.waitForSelector(".preview-title >> text=view 4.png");
    await page.reload(); // the address keeps it, and the way back leads out of it
    await page.waitForSelector(".preview-title >> text=view 4.png");
    await page.keyboard.press(" ");
    await page.waitForFunction(() => !location.hash.includes("!"));
    const tab = page.context().waitForEvent("page");
    await row(page, "view 3").locator("a").click({ button: "middle" });
    const other = await tab;
    await other.waitForSelector(".preview-title >> text=view 3.png");
    await other.close();
    await page.bringToFront();
    await choose(page, "view 4"); // nothing lies over it
    await page.keyboard.press(" ");
    await page.waitForSelector(".preview img");
    await page.goBack();
    await page.waitForSelector(".preview", { state: "detached" });
    await page.waitForSelector("#view .row.selected >> text=view 4.png"); // still here
    await page.keyboard.press("F2");
    await page.fill(".in-place", "view 5.png");
    await page.keyboard.press("Enter");
    await page.waitForSelector(".bubble >> text=“view 5.png” exists already");
    await page.fill(".in-place", "seen <b>here.png");
    await page.keyboard.press("Enter");
    await page.waitForSelector("#view .row.selected >> text=seen <b>here.png");
    await page.keyboard.press("Control+a");
    const download = page.waitForEvent("download");
    await page.click("#toolbar >> text=Download");
    assert.equal((await download).suggestedFilename(), "day 1.zip");
    assert.equal(readFileSync(await (await download).path()).toString("latin1", 0, 2), "PK");
  });
});

test("a refused download says so in words", () =>
  withPage(
    "alice",
    { path: "/preview" },
    async (page) => {
      // As if the share had been closed to downloads a moment ago.
      await page.route(/&with=access/, (route) => route.continue({ url: route.request().url().replace("&with=access", "") }));
      await page.route("**/cgi-bin/why?path_raw=%2Fpreview", (route) =>
        route.fulfill({ json: { success: false, error: { code: 401, key: "error:error_error_system", path: "" } } }),
      );
      await page.reload();
      await choose(page, "readme.txt");
      await page.click("#toolbar >> text=Download");
      await press(page, ".toast.failed", "no permission for “readme.txt”", "Why?");
      await page.waitForSelector(".why >> text=The share lets nobody download");
    },
    [/403.*download/, /status of 403/],
  ));
