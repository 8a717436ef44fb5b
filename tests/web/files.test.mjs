// Files that come and go: uploads, conflicts, downloads, new folders, names, previews.
import assert from "node:assert/strict";
import { copyFileSync, existsSync, mkdirSync, mkdtempSync, readdirSync, readFileSync, rmSync, statSync, writeFileSync } from "node:fs";
import { tmpdir } from "node:os";
import { join } from "node:path";
import { after, before, test } from "node:test";
import { drawn, go, row, unfinished, upload, wentWell, withPage } from "./browser.mjs";
import { until } from "./support.mjs";

const projects = process.env.ORVEL_TEST_PROJECTS;
const files = mkdtempSync(join(tmpdir(), "orvel-upload-"));

before(() => {
  mkdirSync(join(files, "trip/day 1/empty"), { recursive: true });
  const pictures = `${process.env.ORVEL_TEST_PHOTO}/Landscapes`;
  for (const [i, name] of readdirSync(pictures).slice(0, 8).entries())
    copyFileSync(`${pictures}/${name}`, join(files, `trip/day 1/view ${i + 1}.png`));
  writeFileSync(join(files, "trip/list & more.md"), "# List\n\n- <b>bread</b>\n- Käse\n");
  for (const name of ["one.txt", "two, three*.txt", "four.txt"]) writeFileSync(join(files, name), `${name}, new`);
  writeFileSync(join(files, "large.bin"), Buffer.alloc(8 << 20, 7));
});
after(() => rmSync(files, { recursive: true }));

const card = (page, text) => page.locator(".activity-card", { hasText: text }).first();

test("uploads: files, a folder, a conflict asked about once, cancel", () =>
  withPage("alice", { path: "/projects" }, async (page) => {
    await page.click("#toolbar >> text=New folder");
    await page.waitForSelector(".dialog .input");
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

    const there = join(projects, "incoming “1”");
    const some = ["one.txt", "two, three*.txt", "four.txt"].map((name) => join(files, name));
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
    await card(page, "Cancelled").waitFor();
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
    await card(page, "9 files uploaded").waitFor();
    await upload(page, "Upload a folder", join(files, "trip"));
    await page.click(".dialog:has-text('list & more') >> text=Skip"); // this one alone
    await page.waitForSelector(".compared figure:nth-child(2) canvas"); // the picture of what comes
    await page.waitForSelector(".compared figure:nth-child(1) .loaded img");
    await page.keyboard.press("Escape");
    assert.equal(
      statSync(join(there, "trip/day 1/view 8.png")).size,
      statSync(join(files, "trip/day 1/view 8.png")).size,
    );
    await page.waitForSelector("#view >> text=trip");

    // Dropped on a folder of the list, from outside.
    await row(page, "trip").evaluate((target) => {
      const data = new DataTransfer();
      data.items.add(new File(["dropped"], "from outside.txt"));
      for (const type of ["dragenter", "dragover", "drop"])
        target.dispatchEvent(new DragEvent(type, { bubbles: true, cancelable: true, dataTransfer: data }));
    });
    await card(page, "“from outside.txt” to trip").filter({ hasText: "1 file uploaded" }).waitFor();
    assert.equal(readFileSync(join(there, "trip/from outside.txt"), "utf8"), "dropped");

    await page.evaluate(async (id) => {
      const { startUpload } = await import(new URL("uploads.js", document.querySelector("script[type=module]").src));
      startUpload([{ parts: ["nothing in it"] }], id);
    }, await page.evaluate(() => location.hash.slice(1)));
    await card(page, "1 folder to").filter({ hasText: "1 done" }).waitFor();

    // So slow a network that it takes a minute: there is something to cancel.
    const session = await page.context().newCDPSession(page);
    await session.send("Network.emulateNetworkConditions", {
      offline: false,
      latency: 0,
      downloadThroughput: -1,
      uploadThroughput: 128 << 10,
    });
    await upload(page, "Upload files", join(files, "large.bin"));
    await page.waitForFunction(
      () => Number(document.querySelector(".activity-card [role=progressbar]").getAttribute("aria-valuenow")) > 2,
    );
    await page.locator(".activity-card").first().locator("button").click();
    await card(page, "Cancelled").waitFor();
    const { request } = page.context();
    await until("the upload's end on the server", async () => !(await unfinished(request)).some(({ path }) => path.endsWith("large.bin")));
    assert.ok(!existsSync(join(there, "large.bin")));
  }));

test("previews, thumbnails, rename, downloads", () =>
  withPage("alice", { path: "/projects/incoming%20%E2%80%9C1%E2%80%9D/trip" }, async (page) => {
    await row(page, "list & more").dblclick();
    await page.waitForSelector(".preview.paper .markdown li >> text=<b>bread</b>");
    const texts = { "latin.txt": Buffer.from("Café", "latin1"), "wide.txt": Buffer.from("\uFEFFCafé", "utf16le") };
    for (const [name, bytes] of Object.entries(texts)) writeFileSync(join(projects, "incoming “1”/trip", name), bytes);
    for (const name of Object.keys(texts)) {
      await go(page, `/projects/incoming%20%E2%80%9C1%E2%80%9D/trip!${name}`);
      await page.waitForSelector(`.preview-title >> text=${name}`);
      await page.waitForSelector(".preview pre >> text=/^.?Café$/");
    }
    await page.keyboard.press("Escape");
    await row(page, "day 1").dblclick();
    await page.click(".view-switch button >> nth=1");
    await page.waitForFunction(() => document.querySelectorAll(".thumbnail.loaded img").length === 8);
    await row(page, "view 3").click();
    await page.focus("#view");
    await page.keyboard.press(" ");
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
    await row(page, "view 4").click();
    assert.equal(await page.locator(".preview").count(), 0); // and not open again
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
    assert.equal(
      readFileSync(await (await download).path())
        .subarray(0, 2)
        .toString(),
      "PK",
    );
  }));

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
      await row(page, "readme.txt").click();
      await page.click("#toolbar >> text=Download");
      await page.waitForSelector(".toast.failed >> text=no permission for “readme.txt”");
      await page.click(".toast >> text=Why?");
      await page.waitForSelector(".why >> text=The share lets nobody download");
    },
    [/403.*download/, /status of 403/],
  ));
