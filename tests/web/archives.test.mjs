// Archives: looked into like folders, taken out in parts, made in other formats and with a password.
import assert from "node:assert/strict";
import { execFileSync } from "node:child_process";
import { existsSync, readFileSync } from "node:fs";
import { test } from "node:test";
import { choose, findings, row, screenshot, wentWell, withPage } from "./browser.mjs";
import { ownFolder } from "./support.mjs";

function packed(folder, name, files) {
  const from = ownFolder(`${folder}-source`, files);
  const own = ownFolder(folder);
  execFileSync("tar", ["-C", from, "-czf", `${own}/${name}`, ...new Set(Object.keys(files).map((one) => one.split("/")[0]))]);
  return own;
}

const FILES = { "trip/day 10.txt": "ten", "trip/day 2.txt": "two", "trip/notes/plan.md": "# Plan" };

test("looked into by the keyboard, one file downloaded, two extracted", () => {
  const own = packed("inside", "trip.tar.gz", FILES);
  return withPage("alice", { path: "/projects/inside" }, async (page) => {
    await row(page, "trip.tar.gz").dblclick();
    const view = page.locator(".archive");
    const name = (text) => view.locator(".archive-name", { hasText: text });
    await name("trip").focus();
    await page.keyboard.press("Enter");
    await name("day 10").waitFor();
    assert.deepEqual(await view.locator(".archive-name").allInnerTexts(), ["notes", "day 2.txt", "day 10.txt"]);
    assert.deepEqual(await findings(page), []);
    await name("notes").focus();
    await page.keyboard.press("ArrowRight");
    await name("plan.md").waitFor();
    await page.keyboard.press("ArrowLeft");
    await name("day 2").waitFor();
    const [download] = await Promise.all([page.waitForEvent("download"), name("day 2").click()]);
    assert.equal(readFileSync(await download.path(), "utf8"), "two");
    await name("day 2").focus();
    await page.keyboard.press(" ");
    await page.keyboard.press("ArrowDown");
    await page.keyboard.press(" ");
    await view.locator("text=2 chosen").waitFor();
    await screenshot(page, "archive");
    await view.locator("button", { hasText: "Extract into its own folder" }).click();
    await view.waitFor({ state: "detached" });
    await row(page, "trip").waitFor();
    await wentWell(page, "trip.tar.gz");
    assert.ok(!existsSync(`${own}/trip/notes`));
    assert.equal(readFileSync(`${own}/trip/day 10.txt`, "utf8"), "ten");
  });
});

test("packed with a password, opened with it", () => {
  const own = ownFolder("secret", { "plan.txt": "hidden" });
  return withPage("alice", { path: "/projects/secret" }, async (page) => {
    await choose(page, "plan.txt");
    await page.click("[aria-label='More actions']");
    await page.click(".menu >> text=Pack…");
    const dialog = page.locator(".dialog");
    await dialog.locator("[name=format]").selectOption("7z");
    assert.equal(await dialog.locator("[name=name]").inputValue(), "plan.7z");
    assert.ok(await dialog.locator("[name=password]").isHidden());
    await dialog.locator("[name=format]").selectOption("zip");
    await dialog.locator("[name=password]").fill("p\u00E9 +&");
    await screenshot(page, "pack");
    await page.keyboard.press("Enter");
    await wentWell(page, "Pack “plan.txt”");
    assert.ok(!readFileSync(`${own}/plan.zip`, "latin1").includes("hidden"));
    await row(page, "plan.zip").dblclick();
    await page.locator(".archive-notes", { hasText: "asks for the password" }).waitFor();
    await page.locator(".archive-name", { hasText: "plan.txt" }).click();
    await page.fill(".dialog input[type=password]", "p\u00E9 +&");
    const [download] = await Promise.all([page.waitForEvent("download"), page.keyboard.press("Enter")]);
    assert.equal(readFileSync(await download.path(), "utf8"), "hidden");
  });
});
