import { choose, go } from "./browser.mjs";

// Goes through the main states of the page; `at(page, state, part)` looks at each, `part` being what is new in it.
export async function visitStates(page, at) {
  const press = (keys) => page.keyboard.press(keys);
  await at(page, "home");
  await go(page, "/projects");
  await page.waitForSelector("#view >> text=notes.md");
  await at(page, "list");
  await press("Alt+s");
  await page.waitForSelector(".treemap");
  await at(page, "space", ".dialog");
  await press("Escape");
  await page.waitForSelector(".dialog", { state: "detached" });
  await choose(page, "notes.md");
  await at(page, "chosen");
  for (const [keys, opened, state, part] of [
    ["Shift+F10", ".menu", "context menu", ".menu"],
    ["F2", ".in-place", "rename"],
    ["Alt+n", ".dialog", "new folder"], // with what lies behind a dialog
    ["Alt+Enter", ".why li", "properties", ".dialog"],
    ["Alt+p", ".permissions .rights", "permissions", ".dialog"],
    ["Control+k", ".dialog", "share a link", ".dialog"],
    ["?", ".dialog", "shortcuts", ".dialog"],
    [" ", ".preview .text-shown > .scrolls", "preview"],
  ]) {
    await press(keys);
    await page.waitForSelector(opened);
    await at(page, state, part);
    await press("Escape");
    await page.waitForSelector(opened, { state: "detached" });
  }
  await page.click("#settings-button");
  await at(page, "settings", ".menu");
  await press("Escape");
  await page.click("#account-button");
  await page.click(".menu >> text=/public links|öffentlichen? links/i");
  await at(page, "links", ".dialog");
  await press("Escape");
  await press("Alt+2");
  await page.waitForSelector("#view.grid .row");
  await at(page, "grid");
  await press("Alt+1");
  await page.click("#search-button");
  await at(page, "search panel");
  await page.fill("[name=name]", "plan");
  await press("Enter");
  await page.waitForSelector("#view >> text=plan.pdf");
  await page.waitForFunction(() => !document.querySelector("#status .running"));
  await at(page, "results");
}
