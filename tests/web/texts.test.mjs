// Texts: edited in place without a byte changed that nobody touched, and never over somebody else's work.
import assert from "node:assert/strict";
import { existsSync, readFileSync, unlinkSync } from "node:fs";
import { join } from "node:path";
import { before, test } from "node:test";
import { choose, findings, press, row, rowsReady, screenshot, withPage } from "./browser.mjs";
import { ownFolder, write as writeIn } from "./support.mjs";

const here = { path: "/projects/texts" };
const at = (name) => join(folder, name);
const write = (name, content) => writeIn(folder, { [name]: content });
let folder;

before(() => {
  folder = ownFolder("texts");
});

async function openEditor(page, name) {
  await choose(page, name);
  await page.keyboard.press("F4");
  await page.locator(".editor .cm-focused").waitFor();
}

const state = (page, text) => page.locator(".editor [role=status]", { hasText: new RegExp(`^${text}$`) }).waitFor();

async function leave(page) {
  await page.keyboard.press("Escape");
  await page.locator(".editor").waitFor({ state: "detached" });
}

test("bytes that nobody touched stay, whatever they mean", async () => {
  const utf16 = (text) => Buffer.from(text, "utf16le");
  const cases = [
    ["unix.txt", Buffer.from("one\ntwo\n"), Buffer.from("one\ntwo\nx")],
    ["no end.py", Buffer.from("def f():\n  return 1"), Buffer.from("def f():\n  return 1x")],
    ["dos.txt", Buffer.from("one\r\ntwo\r\n"), Buffer.from("one\r\ntwo\r\nx")],
    ["mixed.txt", Buffer.from("a\r\nb\nc\rd\n"), Buffer.from("a\r\nb\nc\rd\nx")],
    ["bom.txt", Buffer.from("\uFEFFKäse\r\n"), Buffer.from("\uFEFFKäse\r\nx")],
    ["wide.txt", utf16("\uFEFFCafé\n"), utf16("\uFEFFCafé\nx")],
    ["big-endian.txt", utf16("\uFEFFCafé\n").swap16(), utf16("\uFEFFCafé\nx").swap16()],
    ["latin.txt", Buffer.from("Café \x80\x81\n", "latin1"), Buffer.from("Café \x80\x81\nx", "latin1")],
  ];
  for (const [name, content] of cases) write(name, content);
  await withPage("alice", here, async (page) => {
    for (const [name, , wanted] of cases) {
      await openEditor(page, name);
      await page.keyboard.press("Control+End");
      await page.keyboard.type("x");
      await state(page, "Not saved yet");
      await page.keyboard.press("Control+s");
      await state(page, "Saved");
      assert.deepEqual(readFileSync(at(name)), wanted, name);
      await leave(page);
    }

    // What an encoding does not have is refused with words, and nothing is stored.
    await openEditor(page, "latin.txt");
    await page.keyboard.type("Ж");
    await page.keyboard.press("Control+s");
    await page.locator(".toast", { hasText: "“Ж” in line 1 does not exist in Windows-1252" }).waitFor();
    assert.deepEqual(readFileSync(at("latin.txt")), cases.at(-1)[2]);
    await press(page, ".toast", "“Ж” in line 1", "Save as UTF-8");
    await state(page, "Saved");
    assert.equal(readFileSync(at("latin.txt"), "utf8"), "ЖCafé €\u0081\nx");
    await leave(page);

    // What cannot be written again as it was is only read.
    write("broken.txt", Buffer.from([0xef, 0xbb, 0xbf, 0x41, 0xff]));
    await page.keyboard.press("Alt+r");
    await openEditor(page, "broken.txt");
    await page.locator(".editor-notice", { hasText: "Some bytes of this file do not exist in UTF-8" }).waitFor();
    await page.keyboard.type("x");
    await state(page, "Read only");
    await page.selectOption(".editor select", "windows-1252");
    await state(page, "Saved");
    await leave(page);
  });
});

test("what somebody else changed meanwhile is compared, not replaced", () =>
  withPage(
    "alice",
    here,
    async (page) => {
      const begin = async () => {
        write("shared.txt", "first\nsecond\nthird\n");
        await page.keyboard.press("Alt+r");
        await openEditor(page, "shared.txt");
        await page.keyboard.type("mine ");
        write("shared.txt", "first\ntheirs\nthird\n");
        await page.keyboard.press("Control+s");
        await page.locator(".dialog.compare .cm-mergeView .cm-changedLine").first().waitFor();
        assert.equal(readFileSync(at("shared.txt"), "utf8"), "first\ntheirs\nthird\n");
      };
      await begin();
      assert.deepEqual(await findings(page, ".dialog.compare"), []);
      await screenshot(page, "texts compared");
      await page.keyboard.press("Escape");
      await state(page, "Not saved yet");
      await page.keyboard.press("Control+s");
      await page.click(".dialog.compare >> text=Keep both");
      await page.locator(".editor-name", { hasText: "shared (2).txt" }).waitFor();
      await row(page, "shared (2).txt").waitFor({ state: "attached" }); // or the rows would move under the next click
      assert.equal(readFileSync(at("shared (2).txt"), "utf8"), "mine first\nsecond\nthird\n");
      assert.equal(readFileSync(at("shared.txt"), "utf8"), "first\ntheirs\nthird\n");
      await leave(page);

      await begin();
      await page.click(".dialog.compare >> text=Take mine");
      await state(page, "Saved");
      assert.equal(readFileSync(at("shared.txt"), "utf8"), "mine first\nsecond\nthird\n");
      await leave(page);

      await begin();
      await page.click(".dialog.compare >> text=Take theirs");
      await state(page, "Saved");
      await page.locator(".editor .cm-line", { hasText: "theirs" }).waitFor();
      unlinkSync(at("shared.txt"));
      await page.keyboard.type("again ");
      await page.keyboard.press("Control+s");
      await page.click(".dialog >> text=Create it again");
      await state(page, "Saved");
      assert.equal(readFileSync(at("shared.txt"), "utf8"), "again first\ntheirs\nthird\n");
      await leave(page);
    },
    [/412/, /404/],
  ));

test("a new text; changes that are not saved keep the editor open", () =>
  withPage("alice", { ...here, hasTouch: true }, async (page) => {
    await page.tap("#toolbar >> text=New text file");
    await page.fill(".dialog .input", "notes.md");
    await page.keyboard.press("Enter");
    await page.locator(".editor .cm-focused").waitFor();
    await page.keyboard.type("# Notes");
    await page.locator(".editor .tok-heading").first().waitFor();
    await screenshot(page, "texts editor");
    assert.deepEqual(await findings(page, ".editor"), []);
    await page.keyboard.press("Escape");
    await page.click(".dialog >> text=Go on editing");
    await page.goBack();
    await page.click(".dialog >> text=Save your changes?");
    await page.click(".dialog footer >> text=Save");
    await page.locator(".editor").waitFor({ state: "detached" });
    assert.equal(readFileSync(at("notes.md"), "utf8"), "# Notes");
    await rowsReady(page);

    await openEditor(page, "notes.md");
    await page.keyboard.type("thrown away");
    const unload = await page.evaluate(() => !dispatchEvent(new Event("beforeunload", { cancelable: true })));
    assert.ok(unload);
    await page.keyboard.press("Escape");
    await page.click(".dialog >> text=Discard");
    await page.locator(".editor").waitFor({ state: "detached" });
    assert.equal(readFileSync(at("notes.md"), "utf8"), "# Notes");
    assert.equal(await page.evaluate(() => location.hash), "#/projects/texts");

    // From the preview, which shows it again afterwards.
    await row(page, "notes.md").dblclick();
    await page.click(".preview [data-does=edit]");
    await page.locator(".editor .cm-focused").waitFor();
    await page.keyboard.press("Control+End");
    await page.keyboard.type("\nmore");
    await page.keyboard.press("Control+s");
    await state(page, "Saved");
    await leave(page);
    await page.locator(".preview", { hasText: "more" }).waitFor();
    assert.ok(existsSync(at("notes.md")));
  }));
