// Permissions: seen, changed with all that lies inside, undone; and what shuts oneself out asked about.
import assert from "node:assert/strict";
import { chmodSync, chownSync, statSync, symlinkSync } from "node:fs";
import { join } from "node:path";
import { beforeEach, test } from "node:test";
import { choose, findings, press, row, screenshot, withPage } from "./browser.mjs";
import { ownFolder, until } from "./support.mjs";

const projects = process.env.ORVEL_TEST_PROJECTS;
const folder = join(projects, "rights");
const PATHS = ["", "in", "in/g.txt", "f.txt"];

beforeEach(() => {
  const { uid, gid } = statSync(join(projects, "notes.md"));
  ownFolder("rights", { "in/g.txt": "g", "f.txt": "f" });
  symlinkSync("../notes.md", join(folder, "link"));
  for (const path of PATHS) {
    chownSync(join(folder, path), uid, gid);
    chmodSync(join(folder, path), path.endsWith("txt") ? 0o640 : 0o750);
  }
});

const modes = () => PATHS.map((path) => (statSync(join(folder, path)).mode & 0o777).toString(8)).join(" ");
const modesAre = (wanted) => until(`modes ${wanted}`, () => modes() === wanted);
const box = (page, who, what) => page.getByRole("checkbox", { name: `${who}: ${what}`, exact: true });

test("of a folder with all that lies inside, and back", () =>
  withPage("alice", { path: "/projects" }, async (page) => {
    const before = statSync(join(projects, "notes.md")).mode;
    await choose(page, "rights");
    await page.keyboard.press("Alt+p");
    await page.waitForSelector(".permissions .rights");
    await box(page, "Everybody else", "Read").check();
    await box(page, "Everybody else", "Enter, run").check();
    await page.fill("[data-adds=access] input", "bob");
    await page.keyboard.press("Enter");
    await box(page, "User bob", "Write").check();
    await page.getByLabel("Also change everything inside").check();
    await page.waitForSelector(".permissions .summary >> text=everything inside, except links");
    await screenshot(page, "permissions-changed");
    assert.deepEqual(await findings(page, ".permissions"), []);
    await page.click(".permissions button[type=submit]");
    await modesAre("775 775 664 664");
    await press(page, ".activity-card.good", "Change permissions of “rights”", "Undo");
    await modesAre("750 750 640 640");
    await press(page, ".activity-card.good", "Undo: Change permissions of “rights”", "Remove from the list");
    assert.equal(statSync(join(projects, "notes.md")).mode, before, "behind the link");

    await page.keyboard.press("Alt+p");
    await page.click(".permissions >> text=What may somebody do?");
    await page.fill("[data-adds=who] input", "alice");
    await page.keyboard.press("Enter");
    await page.waitForSelector(".permissions .answer >> text=User alice may read, write, enter or run: as the owner.");
    await screenshot(page, "permissions-asked");
    assert.deepEqual(await findings(page, ".permissions"), []);
    await page.fill("[data-adds=who] input", "nobody-here");
    await page.keyboard.press("Enter");
    await page.waitForSelector(".permissions .answer .complaint");
  }));

test("several at once, with the owner's own rights, by touch", () =>
  withPage("alice", { path: "/projects/rights", locale: "de-DE", colorScheme: "dark", viewport: { width: 390, height: 780 }, isMobile: true, hasTouch: true }, async (page) => {
    await row(page, "f.txt").locator(".more").tap();
    await page.tap(".menu >> text=Berechtigungen");
    await page.waitForSelector(".permissions .rights");
    await screenshot(page, "permissions-phone");
    assert.deepEqual(await findings(page, ".permissions"), []);
    const owner = page.locator(".rights input").first();
    await owner.tap();
    await page.tap(".permissions button[type=submit]");
    await page.waitForSelector(".dialog >> text=Sie sperren sich selbst aus");
    await screenshot(page, "permissions-loss");
    await page.tap(".dialog >> text=Abbrechen");
    await page.waitForSelector(".dialog", { state: "detached" });
    assert.equal(modes(), "750 750 640 640");
    await row(page, "f.txt").locator(".more").tap();
    await page.tap(".menu >> text=Berechtigungen");
    await owner.tap();
    await page.tap(".permissions button[type=submit]");
    await page.tap(".dialog >> text=Trotzdem ändern");
    await modesAre("750 750 640 240");
    await page.getByText("Berechtigungen von „f.txt“ ändern: 1 erledigt").waitFor({ state: "attached" });
  }));

test("what is mixed shows so, and stays unless it is touched", () =>
  withPage("alice", { path: "/projects/rights" }, async (page) => {
    await row(page, "f.txt").waitFor();
    await page.keyboard.press("Control+a");
    await page.keyboard.press("Shift+F10");
    await page.click(".menu >> text=Permissions");
    await page.waitForSelector(".permissions .rights");
    assert.ok(await box(page, "Owner alice", "Enter, run").evaluate((one) => one.indeterminate));
    await box(page, "Group users", "Write").check();
    await screenshot(page, "permissions-many");
    await page.click(".permissions button[type=submit]");
    await modesAre("750 770 640 660");
    await press(page, ".activity-card", "Change permissions of 2 items", "Remove from the list");
  }));
