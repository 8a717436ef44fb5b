// The pictures of the README, made anew:
//   ORVEL_TEST_SCREENSHOTS=$PWD/docs/screenshots tests/web/run.sh $PWD/script/server $PWD/build/dev $PWD/script/readme_pictures.mjs
import { rmSync, writeFileSync } from "node:fs";
import { test } from "node:test";
import { browser, drawn, row, rowsReady, screenshot, withPage } from "../tests/web/browser.mjs";

const LOADED = ".thumbnail.loaded img";
const SCRIPT = `#!/usr/bin/env python3
"""Names photos by the day they were taken."""
from pathlib import Path
from datetime import datetime

FORMAT = "%Y-%m-%d %H.%M"


def rename(folder: Path) -> int:
    count = 0
    for photo in sorted(folder.glob("*.jpg")):
        taken = datetime.fromtimestamp(photo.stat().st_mtime)
        photo.rename(photo.with_stem(taken.strftime(FORMAT)))
        count += 1
    return count
`;

const thumbnails = (page, count) => page.waitForFunction(([what, wanted]) => document.querySelectorAll(what).length >= wanted, [LOADED, count]);

async function picture(page, name) {
  await rowsReady(page);
  await drawn(page);
  await screenshot(page, name);
}

test("tiles", () =>
  withPage("alice", { path: "/photo/Landscapes" }, async (page) => {
    await page.keyboard.press("Alt+2");
    await thumbnails(page, 12);
    await row(page, "Dusk.png").click();
    await picture(page, "grid");
  }));

test("a list, and what can be undone", () =>
  withPage("alice", { path: "/photo" }, async (page) => {
    await row(page, "IMG_0006.mp4").click();
    await page.keyboard.press("Delete");
    await page.locator(".activity-card", { hasText: "Undo" }).waitFor();
    await row(page, "IMG_0004.mp4").click();
    await picture(page, "list");
    await page.click(".activity-card >> text=Undo");
    await row(page, "IMG_0006.mp4").waitFor();
  }));

test("a search", () =>
  withPage("alice", { path: "/" }, async (page) => {
    await page.click("#search-button");
    await page.fill("[name=name]", "IMG_00*");
    await page.keyboard.press("Enter");
    await page.waitForSelector("#view .row >> text=IMG_0001");
    await page.waitForFunction(() => !document.querySelector("#status .running"));
    await picture(page, "search");
  }));

test("dark, in German: the editor", () =>
  withPage("alice", { path: "/projects", colorScheme: "dark", locale: "de-DE" }, async (page) => {
    const file = `${process.env.ORVEL_TEST_PROJECTS}/by day.py`;
    writeFileSync(file, SCRIPT);
    await page.keyboard.press("Alt+r");
    await row(page, "by day.py").click();
    await page.keyboard.press("F4");
    await page.waitForSelector(".editor .tok-keyword");
    await picture(page, "dark");
    rmSync(file);
  }));

test("what a visitor of a link sees on a phone", () =>
  withPage("alice", { path: "/photo" }, async (page) => {
    await row(page, "Landscapes").click();
    await page.click("#toolbar >> text=Share a link");
    await page.fill("[name=password]", "");
    await page.click(".dialog >> text=Create link");
    const address = await page.inputValue(".address");
    const context = await browser.newContext({ viewport: { width: 390, height: 780 }, deviceScaleFactor: 2, isMobile: true, hasTouch: true, locale: "en-GB" });
    const visitor = await context.newPage();
    await visitor.goto(address);
    await visitor.waitForFunction(() => [...document.querySelectorAll(".tiles img:not(.picture)")].slice(0, 4).every((one) => one.complete && one.naturalWidth > 0));
    await screenshot(visitor, "phone");
    await context.close();
  }));
