// An open folder follows what somebody else does in it; what one is at in it stays as it is.
import assert from "node:assert/strict";
import { existsSync, rmSync } from "node:fs";
import { test } from "node:test";
import { boxOf, choose, finish, openPage, row, rowsReady, screenshot, withPage } from "./browser.mjs";
import { ownFolder, until, write } from "./support.mjs";

const numbered = (count) => Object.fromEntries(Array.from({ length: count }, (_, i) => [`file ${String(i).padStart(3, "0")}.txt`, "x"]));

test("what one does the other sees, and keeps what was chosen", () => {
  const folder = ownFolder("together", { "a.txt": "x", "b.txt": "x", "c.txt": "x" });
  return withPage("alice", { follows: true, path: "/projects/together" }, async (page) => {
    await choose(page, "b.txt");
    const other = await openPage("admin", { path: "/projects/together" });
    await finish(other, async () => {
      await rowsReady(other);
      await other.click("#toolbar >> text=New folder");
      await other.fill(".dialog input", "a new one");
      await other.keyboard.press("Enter");
      await row(other, "a new one").waitFor();
    });
    await row(page, "a new one").waitFor();
    assert.equal(await row(page, "b.txt").getAttribute("aria-selected"), "true");
    write(folder, { "c.txt": "y".repeat(5000) });
    await row(page, "c.txt").locator(".size", { hasText: "4.88" }).waitFor();
    rmSync(`${folder}/b.txt`);
    await page.waitForSelector(".toast >> text=b.txt");
    await row(page, "b.txt").waitFor({ state: "detached" });
    rmSync(folder, { recursive: true });
    await page.waitForSelector(".state.failed");
    await screenshot(page, "live-gone");
  });
});

test("the row under the pointer and a name that is being typed stay", () => {
  const folder = ownFolder("steady", numbered(300));
  return withPage("alice", { follows: true, path: "/projects/steady" }, async (page) => {
    await page.evaluate(() => document.getElementById("view").scrollTo(0, 3000));
    await row(page, "file 090.txt").hover();
    const before = await boxOf(row(page, "file 090.txt"));
    write(folder, { "a.txt": "", "b.txt": "", "file 089 and a half.txt": "" });
    rmSync(`${folder}/file 001.txt`);
    await row(page, "file 089 and a half.txt").waitFor();
    assert.deepEqual(await boxOf(row(page, "file 090.txt")), before);

    await choose(page, "file 090.txt");
    await page.keyboard.press("F2");
    await page.fill("input.in-place", "typed so far.txt");
    const typed = await boxOf(page.locator("input.in-place"));
    write(folder, { "c.txt": "" });
    await page.waitForTimeout(2500); // longer than from one question to the next
    assert.deepEqual(await boxOf(page.locator("input.in-place")), typed);
    await page.keyboard.press("Enter");
    await row(page, "typed so far.txt").waitFor();
    await until("the name on disk", () => existsSync(`${folder}/typed so far.txt`));
    await page.evaluate(() => document.getElementById("view").scrollTo(0, 0));
    await row(page, "c.txt").waitFor();
  });
});
