// Earlier versions of a file and of a folder: looked at, restored beside and over, and found again after a deletion.
import assert from "node:assert/strict";
import { chownSync, existsSync, mkdirSync, readdirSync, readFileSync, rmSync, statSync, utimesSync, writeFileSync } from "node:fs";
import { dirname, join } from "node:path";
import { after, beforeEach, test } from "node:test";
import { choose, findings, press, row, screenshot, withPage } from "./browser.mjs";
import { AGAIN, ownFolder, until } from "./support.mjs";

const projects = process.env.ORVEL_TEST_PROJECTS;
const folder = join(projects, "versions");
const snapshots = join(projects, ".snapshots");
const OLD = "@GMT-2026.10.01-12.00.00";
const OLDER = "@GMT-2026.09.01-12.00.00";

function keep(snapshot, path, text) {
  const file = join(snapshots, snapshot, "versions", path);
  mkdirSync(dirname(file), { recursive: true });
  writeFileSync(file, text);
  utimesSync(file, 1000, text.length);
}

beforeEach(() => {
  const { uid, gid } = statSync(join(projects, "notes.md"));
  ownFolder("versions", { "plan.txt": "the plan as it is now\n" });
  for (const path of ["", "plan.txt"]) chownSync(join(folder, path), uid, gid);
  keep(OLD, "plan.txt", "the plan of October\n");
  keep(OLD, "lost/letter.txt", "dear reader\n");
  keep(OLDER, "plan.txt", "the first plan\n");
});
after(() => rmSync(snapshots, { recursive: true, ...AGAIN }));

const textOf = (path) => (existsSync(join(folder, path)) ? readFileSync(join(folder, path), "utf8") : "");
const restored = (page, what) => press(page, ".activity-card.good", `Restore “${what}” as it was`, "Remove from the list");

test("of a file: compared, looked at, beside and over", () =>
  withPage("alice", { path: "/projects/versions" }, async (page) => {
    await choose(page, "plan.txt");
    await page.keyboard.press("Alt+v");
    await page.waitForSelector(".versions-list li:nth-child(2) >> text=7 B less than now");
    await screenshot(page, "versions-file");
    assert.deepEqual(await findings(page, ".dialog.versions"), []);
    await page.keyboard.press("Enter"); // the first button has the focus
    await page.waitForSelector(".versions-look >> text=the plan of October");
    await screenshot(page, "versions-look");
    await page.keyboard.press("Enter");
    const row2 = page.locator(".versions-list li").nth(1);
    await row2.getByRole("button", { name: /^Restore beside/ }).click();
    await until("the file beside", () => readdirSync(folder).some((name) => /^plan \(2026-09-01 .*\)\.txt$/.test(name)));
    await restored(page, "plan.txt");
    await row(page, "plan.txt").waitFor();

    await choose(page, "plan.txt");
    await page.keyboard.press("Alt+v");
    await page.locator(".versions-list li").first().getByRole("button", { name: /^Restore:/ }).click();
    await page.waitForSelector(".dialog >> text=What is there now goes to the recycle bin");
    await page.locator(".dialog footer .button.primary").click();
    await until("the file of October", () => textOf("plan.txt") === "the plan of October\n");
    await press(page, ".activity-card.good", "Restore “plan.txt” as it was", "Remove from the list");
  }));

test("of a folder, by touch: what is gone comes back", () =>
  withPage("alice", { path: "/projects", locale: "de-DE", colorScheme: "dark", viewport: { width: 390, height: 780 }, isMobile: true, hasTouch: true }, async (page) => {
    await row(page, "versions").locator(".more").tap();
    await page.tap(".menu >> text=Frühere Versionen");
    await page.waitForSelector(".versions-list li:nth-child(2)");
    await screenshot(page, "versions-phone");
    assert.deepEqual(await findings(page, ".dialog.versions"), []);
    await page.locator(".versions-list li").first().getByRole("button", { name: /^Öffnen/ }).tap();
    await page.waitForSelector(".versions-banner >> text=Nur zum Lesen");
    await page.tap(".versions-list .link >> text=lost");
    await page.waitForSelector(".versions-banner >> text=lost");
    await screenshot(page, "versions-folder-phone");
    assert.deepEqual(await findings(page, ".dialog.versions"), []);
    await page.tap(".versions-banner button");
    await page.waitForSelector(".versions-list .link >> text=plan");
    await page.tap(".versions-list .link >> text=lost");
    await page.waitForSelector(".versions-list .link >> text=letter");
    await page.locator(".versions-list li").first().getByRole("button", { name: /^Wiederherstellen/ }).tap();
    await page.locator(".dialog footer .button.primary").tap();
    await until("the letter", () => textOf("lost/letter.txt") === "dear reader\n");
    await page.getByText("„letter.txt“ zurückholen, wie es war: 1 erledigt").first().waitFor({ state: "attached" });
  }));

test("where there are none it says so, in forced colours", () =>
  withPage("alice", { path: "/photo", forcedColors: "active" }, async (page) => {
    await page.keyboard.press("Alt+v");
    await page.waitForSelector(".versions-empty >> text=There are no snapshots of this place");
    await screenshot(page, "versions-none");
  }));
